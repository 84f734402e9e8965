#include "report/input/record_stream.h"

#include "report/input/json_line.h"
#include "report/input/layout.h"
#include "report/input/source.h"
#include "report/input/text.h"
#include "report/support/message.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

namespace report {

enum class Inside { Nothing, Line, Document };

struct RecordStream {
    std::vector<std::string> files;
    uint32_t bound = 0;
    size_t nextFile = 0;
    Source source;
    const char *file = nullptr;
    bool reading = false;  // a file is open
    bool ended = false;    // it has no more bytes
    bool broken = false;   // some file was
    uint64_t fileRecords = 0;

    // The unread bytes of the file are buffer[begin, end). Behind them there is room for a zero.
    char *buffer = nullptr;
    size_t capacity = 0, begin = 0, end = 0;
    uint64_t place = 0;  // of `begin` in the file, unpacked
    Inside inside = Inside::Nothing;
    size_t looked = 0;  // bytes of a line that hold no line end

    LayoutReader layout = {};
    std::string rawHost;  // of the document, as it stands there
    std::string host, json;
    StreamTally tally = {};

    std::string_view Rest() const { return {buffer + begin, end - begin}; }
};

namespace {

constexpr size_t kFirstBuffer = 256 << 10;
constexpr size_t kReadRoom = 64 << 10;  // at least
constexpr size_t kReadMost = 256 << 10;
constexpr size_t kLongestText = 8 << 10;  // more than any bound, with the words behind it

enum class Step { Again, Record, FileEnd, FileBroken };

unsigned long long PlaceOf(const RecordStream *stream, size_t offset) {
    return stream->place + offset;
}

void Consume(RecordStream *stream, size_t size) {
    stream->begin += size;
    stream->place += size;
    stream->looked = 0;
}

// What was expected, as a message shows it.
std::string Shown(std::string_view words, bool isText) {
    std::string shown;
    for (char byte : words) {
        shown += byte == '\n' ? std::string("\\n") : std::string(1, byte);
    }
    return isText ? "a text that ends with " + shown : shown;
}

Step Damaged(RecordStream *stream, size_t offset, const std::string &expected) {
    Tell("%s: byte %llu: expected %s", stream->source.name.c_str(), PlaceOf(stream, offset), expected.c_str());
    return Step::FileBroken;
}

void TellCut(RecordStream *stream, const char *how) {
    stream->tally.cut++;
    Tell("%s: byte %llu: the record that begins here is cut%s; %llu whole before it", stream->source.name.c_str(),
         PlaceOf(stream, 0), how, static_cast<unsigned long long>(stream->fileRecords));
}

// Room to read into, and for a zero behind it. False when there is no memory. What was handed out goes as soon as
// moving the rest costs no more than that took to read.
bool MakeRoom(RecordStream *stream) {
    size_t used = stream->end - stream->begin;
    if (stream->buffer != nullptr && stream->begin >= used && stream->begin > 0) {
        std::memmove(stream->buffer, stream->buffer + stream->begin, used);
        stream->begin = 0;
        stream->end = used;
    }
    if (stream->capacity - stream->end > kReadRoom) {
        return true;
    }
    size_t capacity = std::max(kFirstBuffer, stream->capacity * 2);
    char *buffer = static_cast<char *>(std::realloc(stream->buffer, capacity));
    if (buffer != nullptr) {
        stream->buffer = buffer;
        stream->capacity = capacity;
    }
    return buffer != nullptr;
}

// More bytes behind those that are there. Nothing: none for now.
SourceState Fill(RecordStream *stream, bool wait) {
    if (stream->end - stream->begin > stream->bound) {
        Tell("%s: byte %llu: expected a record of %u bytes at most", stream->source.name.c_str(), PlaceOf(stream, 0),
             stream->bound);
        return SourceState::Failed;
    }
    if (!MakeRoom(stream)) {
        Tell("%s: byte %llu: no memory for this record", stream->source.name.c_str(), PlaceOf(stream, 0));
        return SourceState::Failed;
    }
    size_t size = 0;
    size_t room = std::min(stream->capacity - stream->end - 1, kReadMost);
    SourceState state = SourceRead(&stream->source, stream->buffer + stream->end, room, wait, &size);
    stream->end += size;
    stream->buffer[stream->end] = '\0';
    stream->ended |= state == SourceState::End;
    return state;
}

Step More(RecordStream *stream) {
    return Fill(stream, true) == SourceState::Failed ? Step::FileBroken : Step::Again;
}

bool IsBlank(char byte) {
    return byte == ' ' || byte == '\n' || byte == '\t' || byte == '\r';
}

// Between documents and lines: what comes next?
Step Look(RecordStream *stream) {
    std::string_view rest = stream->Rest();
    size_t blank = 0;
    while (blank < rest.size() && IsBlank(rest[blank])) {
        blank++;
    }
    Consume(stream, blank);
    rest.remove_prefix(blank);
    if (rest.starts_with(kLineHead)) {
        stream->inside = Inside::Line;
        return Step::Again;
    }
    if (rest.starts_with(kDocumentHead)) {
        stream->inside = Inside::Document;
        LayoutBegin(&stream->layout, true);
        return Step::Again;
    }
    if (!kLineHead.starts_with(rest) && !kDocumentHead.starts_with(rest)) {
        const char *hint = rest[0] == '{' ? "; jq and the like change a report's layout: feed it as lines" : "";
        return Damaged(stream, 0, Shown(kDocumentHead, false) + " or " + Shown(kLineHead, false) + hint);
    }
    if (!stream->ended) {
        return More(stream);
    }
    if (!rest.empty()) {
        TellCut(stream, "");
    } else if (stream->fileRecords == 0) {
        Tell("%s: no record in it", stream->source.name.c_str());
    }
    return Step::FileEnd;
}

Step LineRecord(RecordStream *stream, std::string_view line, RecordText *record) {
    stream->host.clear();
    TextAppendUnescaped(&stream->host, JsonLineHost(line));
    *record = {line, stream->host, stream->tally.records, stream->file, false};
    return Step::Record;
}

// A line is JSON, where no text holds the beginning of another line: a cut one may have one behind it.
Step TakeLine(RecordStream *stream, RecordText *record) {
    std::string_view rest = stream->Rest();
    const void *found = std::memchr(rest.data() + stream->looked, '\n', rest.size() - stream->looked);
    if (found == nullptr && !stream->ended) {
        stream->looked = rest.size();
        return More(stream);
    }
    size_t size = found == nullptr ? rest.size() : static_cast<size_t>(static_cast<const char *>(found) - rest.data());
    std::string_view line = rest.substr(0, size);
    const char *expected = nullptr;
    long wrong = JsonLineCheck(line, &expected);
    if (wrong >= 0) {
        size_t again = line.rfind(kLineHead);
        if (again != 0) {
            TellCut(stream, "");
            Consume(stream, again);
            return Step::Again;
        }
        if (found == nullptr && static_cast<size_t>(wrong) == size) {
            TellCut(stream, "");
            Consume(stream, size);
            return Step::FileEnd;
        }
        return Damaged(stream, static_cast<size_t>(wrong), expected);
    }
    Consume(stream, size);
    stream->inside = Inside::Nothing;
    return LineRecord(stream, line, record);
}

Step DocumentRecord(RecordStream *stream, RecordText *record) {
    LayoutReader *layout = &stream->layout;
    const char *unit = stream->buffer + stream->begin;
    if (layout->first) {
        const TextPlace &host = layout->texts.front();
        stream->rawHost.assign(unit + host.start, host.end - host.start);
        stream->host.clear();
        TextAppendUtf8(&stream->host, stream->rawHost);
    }
    LayoutAccept(layout);
    uint64_t mended = 0;
    LayoutCompose(*layout, unit, stream->rawHost, &stream->json, &mended);
    stream->tally.mended += mended;
    *record = {stream->json, stream->host, stream->tally.records, stream->file, mended > 0};
    Consume(stream, layout->at);
    LayoutBegin(layout, false);
    return Step::Record;
}

Step GoOnBehind(RecordStream *stream, size_t size) {
    Consume(stream, size);
    stream->inside = Inside::Nothing;
    return Step::Again;
}

// The document can't go on. It was cut within a text if another one begins behind it.
Step DamagedDocument(RecordStream *stream) {
    const LayoutReader &layout = stream->layout;
    std::string_view rest = stream->Rest();
    size_t blank = std::min(rest.find_first_not_of(" \n"), rest.size());
    std::string_view next = rest.substr(blank);
    if (!layout.first && (next.starts_with(kDocumentHead) || next.starts_with(kLineHead))) {
        return GoOnBehind(stream, blank);
    }
    size_t window = layout.farthest + kLongestText;
    size_t head = rest.substr(0, window).find(kDocumentHead, layout.farthest + 1);
    if (head != std::string_view::npos) {
        TellCut(stream, ", and another report begins behind it");
        return GoOnBehind(stream, head);
    }
    if (!stream->ended && rest.size() < window) {
        return More(stream);
    }
    return Damaged(stream, layout.farthest, Shown(layout.expected, layout.isText));
}

// Nothing more will come for a record that was right so far.
Step CutDocument(RecordStream *stream) {
    std::string_view rest = stream->Rest();
    if (!std::string_view("\n] }\n").starts_with(rest) && !std::string_view(",\n").starts_with(rest)) {
        TellCut(stream, "");
    }
    return Step::FileEnd;
}

Step TakeUnit(RecordStream *stream, RecordText *record) {
    LayoutReader *layout = &stream->layout;
    const char *unit = stream->buffer + stream->begin;
    auto size = static_cast<uint32_t>(stream->end - stream->begin);
    Reading reading = LayoutGoOn(layout, unit, size, false);
    if (reading == Reading::More && !stream->ended) {
        return More(stream);
    }
    bool cut = reading == Reading::More && !LayoutTriesAgain(*layout);
    if (reading == Reading::More) {
        reading = LayoutGoOn(layout, unit, size, true);
    }
    switch (reading) {
    case Reading::RecordSoFar:
        if (!stream->ended && Fill(stream, false) == SourceState::Fine) {
            return Step::Again;
        }
        return DocumentRecord(stream, record);
    case Reading::Record:
        return DocumentRecord(stream, record);
    case Reading::DocumentEnd:
        return GoOnBehind(stream, layout->at);
    case Reading::Cut:
        if (stream->Rest().substr(0, layout->cut).find_first_not_of(",\n") != std::string_view::npos) {
            TellCut(stream, ", and another report begins behind it");
        }
        return GoOnBehind(stream, layout->cut);
    default:
        return cut ? CutDocument(stream) : DamagedDocument(stream);
    }
}

void CloseFile(RecordStream *stream) {
    SourceClose(&stream->source);
    stream->reading = false;
}

bool OpenNext(RecordStream *stream) {
    const std::string &file = stream->files[stream->nextFile++];
    stream->file = file.c_str();
    stream->ended = false;
    stream->fileRecords = 0;
    stream->begin = stream->end = 0;
    stream->place = 0;
    stream->looked = 0;
    stream->inside = Inside::Nothing;
    stream->reading = SourceOpen(&stream->source, file);
    return stream->reading;
}

}  // namespace

RecordStream *RecordStreamOpen(const std::vector<std::string> &files, uint32_t bound) {
    auto *stream = new RecordStream;
    stream->files = files.empty() ? std::vector<std::string>{"-"} : files;
    stream->bound = bound;
    return stream;
}

StreamState RecordStreamNext(RecordStream *stream, RecordText *record) {
    for (;;) {
        if (!stream->reading) {
            if (stream->nextFile == stream->files.size()) {
                return stream->broken ? StreamState::Broken : StreamState::End;
            }
            stream->broken |= !OpenNext(stream);
            continue;
        }
        Step step = stream->buffer == nullptr           ? More(stream)
                    : stream->inside == Inside::Nothing ? Look(stream)
                    : stream->inside == Inside::Line    ? TakeLine(stream, record)
                                                        : TakeUnit(stream, record);
        if (step == Step::Record) {
            stream->tally.records++;
            stream->fileRecords++;
            return StreamState::Record;
        }
        if (step != Step::Again) {
            stream->broken |= step == Step::FileBroken;
            CloseFile(stream);
        }
    }
}

StreamTally RecordStreamTally(const RecordStream *stream) {
    return stream->tally;
}

void RecordStreamClose(RecordStream *stream) {
    if (stream->tally.mended > 0) {
        Tell("%llu texts in %llu records were mended: quotes, backslashes, control bytes, or no UTF-8",
             static_cast<unsigned long long>(stream->tally.mended),
             static_cast<unsigned long long>(stream->tally.records));
    }
    CloseFile(stream);
    std::free(stream->buffer);
    delete stream;
}

}  // namespace report
