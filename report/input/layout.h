// The layout of a report, byte by byte, and a reader that goes along it. The collector prints each record with the same
// fixed words, spaces and line ends, and puts texts between them with nothing escaped, so a text may hold anything:
// also quotes, line ends, and the words that follow it. The reader goes on where more bytes come; it keeps the places
// of the texts (20 bytes each), no copy of the record, and goes back over what it read only where a text could end
// twice.
//
// Where a text ends:
// - At the first place within its bound (in bytes, as large as the collector's own room for it) behind which the whole
//   rest of the record and the beginning of what follows it have the layout. So an imitation of a few words of the
//   layout, of a part of a port or of the end of a record is text: what stands behind it does not go on as it should.
// - A port's name and switch are one text, which is divided at its last `", "switch": "`.
// - A record behind which nothing goes on is taken if no reading got farther.
// - All records of a document have the same ports at the same places, and are counted. A reading that breaks that
//   is taken only if there is no other.
// Nothing can tell these from what they imitate, as the very same bytes could be the honest report of another host:
// - a name that holds the whole rest of its port, and the beginning of another port up to that one's name, in the first
//   record of its document: it is read as two ports. Likewise a worldlet's name, as two worldlets.
// - a name that holds the rest of the record and the beginning of the next one, with the right iteration: two records.
// - a switch whose name holds `", "switch": "`: that part goes to the port's name. Likewise parameters of coalescing
//   that hold `", "params": "`.
// - a name that holds the end of a record, when the file ends or the stream pauses just there.
// - a name that holds the rest of its line or port, and a document up to a port's name: a run that was killed, and
//   another one.
// - a document that was cut within a name, and another one behind it in the same file: the name goes on, if all that is
//   behind it up to the next port fits its bound.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_set>
#include <vector>

namespace report {

constexpr std::string_view kDocumentHead = "{ \"sysinfo\": { \"hostname\": \"";

enum class Reading {
    More,         // all is right so far
    Record,       // a whole record
    RecordSoFar,  // one as well, if there is nothing more behind it for now
    DocumentEnd,
    Cut,      // a new document begins at `cut`
    Damaged,  // no reading goes on
};

// A text that was read, and how far other ends were tried.
struct TextPlace {
    uint32_t start, end;  // within the unit
    uint32_t split;       // of a port: where the name ends and the switch follows; else 0
    uint32_t port;        // ports ahead of it
    uint8_t step;
};

// A port's number in the record; false when there was none, as in {}.
struct PortNumber {
    int64_t number;
    bool known;
    bool operator==(const PortNumber &) const = default;
};

// Reads units of a document: its head with the first record, or a comma with one more, or its end.
struct LayoutReader {
    std::vector<TextPlace> texts;
    std::vector<PortNumber> ports;
    int64_t iteration;
    uint32_t body;  // where the record's first key stands
    uint32_t at;    // what is read so far; behind a record: its end

    // Where no reading goes on, of all that were tried the farthest.
    uint32_t farthest;
    std::string_view expected;  // words that had to be here, or the end of a text by these words
    bool isText;
    uint32_t cut;

    // Inner state.
    std::vector<PortNumber> known;  // of the records before in this document
    bool first;                     // unit of a document
    bool strict;                    // ports and iteration have to fit the records before
    bool refused;                   // a reading did not
    uint32_t lastWrong;             // as farthest and expected, of the reading at hand
    std::string_view lastExpected;
    uint32_t wholeEnd;  // of a record, if the farthest thing that was wrong stood behind it; else 0
    uint32_t takenEnd;  // of a record that is taken, as nothing goes on
    bool back;          // the next thing is another end of the last text
    uint8_t step;
    std::unique_ptr<LayoutReader> behind;  // looks whether a document is really one, that begins at behindAt
    uint32_t behindAt;
    bool isBehind;                      // this reader does so for another one
    std::unordered_set<uint64_t> dead;  // ends of texts behind which nothing is right
};

// Begins with the unit behind the one read last. `first`: of a document.
void LayoutBegin(LayoutReader *reader, bool first);
// Goes on. `text` is the unit from its first byte, with a zero behind its `size` bytes; `last`: nothing more will come.
Reading LayoutGoOn(LayoutReader *reader, const char *text, uint32_t size, bool last);
// Whether the reading came upon something wrong, and was about to look for another end of a text.
bool LayoutTriesAgain(const LayoutReader &reader);
// Nothing more is there for now, so RecordSoFar is meant. Takes over what the record tells of its document.
void LayoutAccept(LayoutReader *reader);
// The unit's record as one line of JSON. Counts texts that had to be mended.
void LayoutCompose(const LayoutReader &reader, const char *text, std::string_view host, std::string *json,
                   uint64_t *mended);

}  // namespace report
