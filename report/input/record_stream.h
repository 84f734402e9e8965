// Reads reports and hands out their records, each as one line of valid JSON. Takes what lan-meter writes, and what
// `lan-report records` made of it; plain or gzip, several files as one series, streams without an end. A record comes
// out as soon as its last byte came. Keeps one record in memory, and its line; one above 256 MiB is refused.
//
// A report names things with nothing escaped, so it is read by its fixed layout and not as JSON (layout.h tells how):
// each text ends where the layout goes on, and comes out escaped (text.h). Bytes of numbers are handed on as they are.
// A report that another program printed anew, as with `jq .`, has another layout and is refused; feed it as lines:
// jq -c '.sysinfo.hostname as $h | .stats[] | {host:$h} + .'
//
// What was interrupted ends with its last whole record. Behind it, and behind a whole document, another one may begin.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace report {

// A record, valid until the next call. `{"host": "labhost", "time": 1795385190, "interval": 1, ... }`, without a
// line end: the record's own keys in their order, and the host's name before them.
struct RecordText {
    std::string_view json;
    std::string_view host;  // with nothing escaped, in UTF-8
    uint64_t number;        // from 0, over all files
    const char *file;       // where it came from, "-" for standard input
    bool mended;            // a text in it was no JSON as it stood
};

enum class StreamState {
    Record,
    End,     // all files were read; what was cut was told
    Broken,  // an input failed, or is no report from some byte on: told with file, byte and what was expected
};

struct RecordStream;

constexpr uint32_t kRecordBound = 256 << 20;

// No files: standard input. "-" is standard input too. Never null; a file that can't be opened shows at its turn.
RecordStream *RecordStreamOpen(const std::vector<std::string> &files, uint32_t bound = kRecordBound);
// The next whole record. After a broken file goes on with the next one; Broken comes at the end of all files then.
StreamState RecordStreamNext(RecordStream *stream, RecordText *record);
// Whole records, texts that had to be mended, and records that were cut.
struct StreamTally {
    uint64_t records, mended, cut;
};
StreamTally RecordStreamTally(const RecordStream *stream);
// Tells how many texts had to be mended, if any.
void RecordStreamClose(RecordStream *stream);

}  // namespace report
