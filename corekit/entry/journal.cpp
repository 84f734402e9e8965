#include "corekit/entry/journal.h"

#include "corekit/entry/setting.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <new>
#include <unistd.h>
#include <utility>

namespace {

struct Journal {
    int setFd;
    int traceFd;
    bool recording = false;
    std::vector<std::string> recorded;
};

int OpenNamed(const char *variable) {
    const char *path = Setting(variable);
    if (path == nullptr) {
        return -1;
    }
    int fd = open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
    if (fd < 0) {
        fprintf(stderr, "%s: %s: %s\n", variable, path, strerror(errno));
    }
    return fd;
}

// Never destroyed: calls may still come while the process ends.
Journal &TheJournal() {
    static auto *journal = new Journal{OpenNamed("COREKIT_JOURNAL"), OpenNamed("COREKIT_TRACE"), false, {}};
    return *journal;
}

void WriteLine(int fd, const std::string &line) {
    if (fd >= 0 && write(fd, line.data(), line.size()) != static_cast<ssize_t>(line.size())) {
        fprintf(stderr, "corekit: a journal line is lost: %s\n", strerror(errno));
    }
}

}  // namespace

bool journalSilent = false;

bool JournalAsked(bool isSet) {
    try {
        const Journal &journal = TheJournal();
        journalSilent = !journal.recording && journal.traceFd < 0 && journal.setFd < 0;
        return journal.recording || journal.traceFd >= 0 || (isSet && journal.setFd >= 0);
    } catch (const std::bad_alloc &) {
        return false;
    }
}

void JournalLine(bool isSet, std::string line) {
    Journal &journal = TheJournal();
    if (journal.recording) {
        journal.recorded.push_back(line);
    }
    line += '\n';
    WriteLine(journal.traceFd, line);
    WriteLine(isSet ? journal.setFd : -1, line);
}

void JournalRecord(bool on) {
    Journal &journal = TheJournal();
    journal.recording = on;
    journalSilent = false;
    journal.recorded.clear();
}

const std::vector<std::string> &JournalRecorded() {
    return TheJournal().recorded;
}

std::string CallText(const char *name, const uint32_t *node, const Params &keys, const Params *input, KnfStatus status,
                     uint32_t list) {
    std::string line = name;
    if (node != nullptr) {
        line += ' ' + std::to_string(*node);
    }
    for (const KnfParamRec &key : keys) {
        line += ' ';
        ParamAppendText(&line, key);
    }
    if (input != nullptr) {
        line += " :";
        for (const KnfParamRec &argument : *input) {
            line += ' ';
            ParamAppendText(&line, argument);
        }
    }
    char end[24];
    snprintf(end, sizeof end, " -> %#x", status);
    line += status == 0 ? " -> 0x0" : end;
    return list != 0 ? line + " #" + std::to_string(list) : line;
}
