#include "report/input/source.h"

#include "report/support/message.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

namespace report {
namespace {

constexpr size_t kPacked = 64 << 10;
constexpr unsigned char kMagic[] = {0x1f, 0x8b};
constexpr int kGzipOnly = 16 + MAX_WBITS;

bool Readable(int fd) {
    pollfd entry = {fd, POLLIN, 0};
    return poll(&entry, 1, 0) > 0;
}

SourceState ReadFile(Source *source, void *to, size_t room, bool wait, size_t *size) {
    if (source->ended) {
        return SourceState::End;
    }
    for (;;) {
        if (!wait && !Readable(source->fd)) {
            return SourceState::Nothing;
        }
        ssize_t got = read(source->fd, to, room);
        if (got > 0) {
            *size = static_cast<size_t>(got);
            source->taken += *size;
            return SourceState::Fine;
        }
        if (got == 0) {
            source->ended = true;
            return SourceState::End;
        }
        if (errno == EAGAIN) {
            pollfd entry = {source->fd, POLLIN, 0};
            poll(&entry, 1, wait ? -1 : 0);
        } else if (errno != EINTR) {
            Tell("%s: byte %llu: can't read: %s", source->name.c_str(), static_cast<unsigned long long>(source->taken),
                 strerror(errno));
            return SourceState::Failed;
        }
    }
}

unsigned long long PackedPlace(const Source *source) {
    return source->taken - source->stream.avail_in;
}

SourceState BadGzip(const Source *source, const char *expected) {
    Tell("%s: byte %llu: damaged: expected %s", source->name.c_str(), PackedPlace(source), expected);
    return SourceState::Failed;
}

// More packed bytes into the buffer, behind those that are there.
SourceState Refill(Source *source, bool wait) {
    if (source->stream.avail_in > 0) {
        std::memmove(source->packed, source->stream.next_in, source->stream.avail_in);
    }
    source->stream.next_in = source->packed;
    size_t size = 0;
    SourceState state =
        ReadFile(source, source->packed + source->stream.avail_in, kPacked - source->stream.avail_in, wait, &size);
    source->stream.avail_in += static_cast<unsigned>(size);
    return state;
}

// Behind a member: another one, zeros up to the end of the file, or the end.
SourceState NextMember(Source *source, bool wait) {
    z_stream *stream = &source->stream;
    while (stream->avail_in > 0 && *stream->next_in == 0) {
        stream->next_in++;
        stream->avail_in--;
    }
    if (stream->avail_in < sizeof kMagic) {
        SourceState state = Refill(source, wait);
        if (state != SourceState::End) {
            return state;
        }
        return stream->avail_in == 0 ? state : BadGzip(source, "another gzip member, or the end of the file");
    }
    if (std::memcmp(stream->next_in, kMagic, sizeof kMagic) != 0) {
        return BadGzip(source, "another gzip member, or the end of the file");
    }
    inflateReset(stream);
    source->between = false;
    return SourceState::Fine;
}

SourceState Inflate(Source *source, char *to, size_t room, bool wait, size_t *size) {
    z_stream *stream = &source->stream;
    stream->next_out = reinterpret_cast<unsigned char *>(to);
    stream->avail_out = static_cast<unsigned>(std::min<size_t>(room, 1 << 30));
    unsigned before = stream->avail_out;
    for (;;) {
        if (source->between) {
            SourceState state = NextMember(source, wait);
            if (state != SourceState::Fine) {
                return state;
            }
            continue;
        }
        int result = inflate(stream, Z_SYNC_FLUSH);
        source->between = result == Z_STREAM_END;
        *size = before - stream->avail_out;
        if (*size > 0) {
            return SourceState::Fine;
        }
        if (result == Z_DATA_ERROR || result == Z_NEED_DICT || result == Z_MEM_ERROR) {
            return BadGzip(source, "gzip data");
        }
        if (!source->between && stream->avail_in == 0) {
            SourceState state = Refill(source, wait);
            if (state == SourceState::End) {
                Tell("%s: byte %llu: the gzip data are cut here", source->name.c_str(), PackedPlace(source));
            }
            if (state != SourceState::Fine) {
                return state;
            }
        }
    }
}

// The bytes that were read already are the first of a gzip file.
SourceState BeginGzip(Source *source, const char *first, size_t size) {
    source->packed = static_cast<unsigned char *>(std::malloc(kPacked));
    if (source->packed == nullptr || inflateInit2(&source->stream, kGzipOnly) != Z_OK) {
        return BadGzip(source, "memory for it");
    }
    std::memcpy(source->packed, first, size);
    source->stream.next_in = source->packed;
    source->stream.avail_in = static_cast<unsigned>(size);
    source->gzip = true;
    return SourceState::Fine;
}

}  // namespace

bool SourceOpen(Source *source, const std::string &file) {
    *source = Source{};
    source->name = file == "-" ? "standard input" : file;
    source->fd = file == "-" ? fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 0) : open(file.c_str(), O_RDONLY | O_CLOEXEC);
    if (source->fd < 0) {
        Tell("%s: can't open: %s", source->name.c_str(), strerror(errno));
    }
    return source->fd >= 0;
}

SourceState SourceRead(Source *source, char *to, size_t room, bool wait, size_t *size) {
    *size = 0;
    if (source->gzip) {
        return Inflate(source, to, room, wait, size);
    }
    SourceState state = ReadFile(source, to, source->sniffed ? room : std::min(room, kPacked), wait, size);
    if (state != SourceState::Fine || source->sniffed) {
        return state;
    }
    source->sniffed = true;
    if (static_cast<unsigned char>(to[0]) != kMagic[0]) {
        return state;
    }
    state = BeginGzip(source, to, *size);
    *size = 0;
    return state == SourceState::Fine ? Inflate(source, to, room, wait, size) : state;
}

void SourceClose(Source *source) {
    if (source->fd >= 0) {
        close(source->fd);
    }
    inflateEnd(&source->stream);
    std::free(source->packed);
    *source = Source{};
}

}  // namespace report
