#include "corekit/linuxhost/file.h"

#include <algorithm>
#include <charconv>
#include <cstring>
#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

namespace {

constexpr size_t FIRST_READ = 4096;
constexpr u32 RESERVE = 64;  // descriptors left to the program that loaded us

u32 keptFiles = 0;
constexpr u32 UNASKED = 0xffffffff;
u32 keptLimit = UNASKED;
bool shortageTold = false;

u32 KeptLimit() {
    if (keptLimit == UNASKED) {
        rlimit limit = {};
        rlim_t soft = getrlimit(RLIMIT_NOFILE, &limit) == 0 ? limit.rlim_cur : 0;
        keptLimit = soft > RESERVE ? static_cast<u32>(std::min<rlim_t>(soft - RESERVE, 1 << 20)) : 0;
    }
    return keptLimit;
}

void TellShortage() {
    TellOnce(&shortageTold,
             "corekit: too few descriptors to keep more than %u files open; each further read opens its file, which is "
             "slower (see ulimit -n)\n",
             keptFiles);
}

int OpenAt(int directory, const std::string &path) {
    int descriptor = -1;
    do {
        descriptor = openat(directory, path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK);
    } while (descriptor < 0 && errno == EINTR);
    return descriptor;
}

// Reads to the end: the kernel may hand a file over in pieces, and only 0 says that it is whole.
Outcome ReadAll(int descriptor, u32 limit, bool line, ProcBuffer *buffer, std::string_view *text) {
    std::vector<char> &bytes = buffer->bytes;
    size_t used = 0;
    for (;;) {
        if (bytes.size() < used + FIRST_READ / 2) {
            bytes.resize(std::max(FIRST_READ, 2 * bytes.size()));
        }
        ssize_t got = pread(descriptor, bytes.data() + used, bytes.size() - used, static_cast<off_t>(used));
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got < 0) {
            return ErrnoOutcome(errno);
        }
        used += static_cast<size_t>(got);
        if (used > limit) {
            return BROKEN;
        }
        if (got == 0 || (line && bytes[used - 1] == '\n')) {
            *text = {bytes.data(), used};
            return FINE;
        }
    }
}

bool IsBlank(char c) {
    return c == ' ' || c == '\t';
}

void SkipBlanks(std::string_view *rest) {
    while (!rest->empty() && IsBlank(rest->front())) {
        rest->remove_prefix(1);
    }
}

}  // namespace

Outcome ProcRootOpen(ProcRoot *root, const char *proc, const char *sys) {
    constexpr int flags = O_PATH | O_DIRECTORY | O_CLOEXEC;
    root->proc = open(proc, flags);
    Outcome outcome = root->proc >= 0 ? FINE : ErrnoOutcome(errno);
    root->sys = open(sys, flags);
    return root->sys >= 0 ? outcome : ErrnoOutcome(errno);
}

void ProcRootClose(ProcRoot *root) {
    for (int *directory : {&root->proc, &root->sys}) {
        if (*directory >= 0) {
            close(*directory);
        }
        *directory = -1;
    }
}

void ProcLimitKept(u32 files) {
    keptLimit = files;
}

bool ProcKeepOne() {
    if (keptFiles >= KeptLimit()) {
        TellShortage();
        return false;
    }
    keptFiles++;
    return true;
}

void ProcReleaseOne() {
    keptFiles--;
}

Outcome ProcOpen(ProcFile *file, int directory, const std::string &path, u32 limit) {
    *file = {directory, -1, false, false, limit, path};
    int descriptor = OpenAt(directory, path);
    if (descriptor < 0) {
        if (errno != EMFILE && errno != ENFILE) {
            return ErrnoOutcome(errno);
        }
        TellShortage();
        return FINE;
    }
    if (ProcKeepOne()) {
        file->descriptor = descriptor;
        file->kept = true;
        return FINE;
    }
    close(descriptor);
    return FINE;
}

Outcome ProcRead(ProcFile *file, ProcBuffer *buffer, std::string_view *text) {
    *text = {};
    return file->kept ? ReadAll(file->descriptor, file->limit, file->line, buffer, text)
                      : ProcReadOnce(file->directory, file->path, file->limit, buffer, text);
}

void ProcClose(ProcFile *file) {
    if (file->kept) {
        close(file->descriptor);
        ProcReleaseOne();
    }
    file->descriptor = -1;
    file->kept = false;
}

Outcome ProcReadOnce(int directory, const std::string &path, u32 limit, ProcBuffer *buffer, std::string_view *text) {
    *text = {};
    int descriptor = OpenAt(directory, path);
    if (descriptor < 0) {
        return ErrnoOutcome(errno);
    }
    Outcome outcome = ReadAll(descriptor, limit, false, buffer, text);
    close(descriptor);
    return outcome;
}

std::string_view ProcTakeLine(std::string_view *rest) {
    size_t end = std::min(rest->find('\n'), rest->size());
    std::string_view line = rest->substr(0, end);
    rest->remove_prefix(std::min(end + 1, rest->size()));
    return line;
}

std::string_view ProcTakeWord(std::string_view *rest) {
    SkipBlanks(rest);
    size_t end = 0;
    while (end < rest->size() && !IsBlank((*rest)[end])) {
        end++;
    }
    std::string_view word = rest->substr(0, end);
    rest->remove_prefix(end);
    return word;
}

bool ProcTakeNumber(std::string_view *rest, u64 *number) {
    std::string_view text = *rest;
    SkipBlanks(&text);
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), *number);
    if (error != std::errc()) {
        return false;
    }
    text.remove_prefix(static_cast<size_t>(end - text.data()));
    *rest = text;
    return true;
}

bool ProcNumber(std::string_view text, u64 *number) {
    u64 value = 0;
    if (text.empty() || IsBlank(text.front()) || !ProcTakeNumber(&text, &value) || !text.empty()) {
        return false;
    }
    *number = value;
    return true;
}

bool ProcFindKey(std::string_view text, std::string_view key, std::string_view *value) {
    while (!text.empty()) {
        std::string_view line = ProcTakeLine(&text);
        if (line.substr(0, key.size()) != key) {
            continue;
        }
        line.remove_prefix(key.size());
        SkipBlanks(&line);
        if (line.empty() || line.front() != ':') {
            continue;
        }
        line.remove_prefix(1);
        SkipBlanks(&line);
        *value = line;
        return true;
    }
    return false;
}
