// The bytes of one input: a file or standard input, plain or gzip, which is seen by its first bytes. Reads what is
// there and waits for no full buffer. Owned by the record stream; holds 64 KiB and zlib's window for gzip, nothing for
// plain.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <zlib.h>

namespace report {

enum class SourceState {
    Fine,
    Nothing,  // for now; only without waiting
    End,
    Failed,  // told on standard error
};

struct Source {
    std::string name;  // as in messages
    int fd = -1;
    bool sniffed = false;  // whether it is gzip is known
    bool gzip = false;
    bool between = false;  // behind a member of a gzip file
    bool ended = false;    // the file has no more bytes
    uint64_t taken = 0;    // bytes of the file that were read
    z_stream stream = {};
    unsigned char *packed = nullptr;  // of gzip
};

// "-" is standard input. False, told, when it can't be opened.
bool SourceOpen(Source *source, const std::string &file);
// Puts 1 to `room` bytes at `to`. A gzip file that is cut ends there, told.
SourceState SourceRead(Source *source, char *to, size_t room, bool wait, size_t *size);
void SourceClose(Source *source);

}  // namespace report
