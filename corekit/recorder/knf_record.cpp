// knf-record: takes snapshots of the live host for a later replay, and shows what a snapshot holds.
#include "corekit/node_source.h"
#include "corekit/recorder/record.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <getopt.h>
#include <memory>
#include <poll.h>
#include <signal.h>
#include <unistd.h>

namespace {

constexpr char USAGE[] =
    "Usage: knf-record -o PREFIX [-i SECONDS] [-n COUNT]\n"
    "       knf-record --dump FILE\n"
    "Takes COUNT (2) snapshots of the host, SECONDS (10) apart, into the files PREFIX.0, PREFIX.1 and so on.\n"
    "The last line printed tells how to replay them. SIGINT ends it early with the files so far.\n"
    "  --dump FILE  print a snapshot as text: a line for itself, then one for each record and list\n"
    "  -h           this message\n";

struct Settings {
    const char *prefix = nullptr;
    i64 interval = 10;
    i64 count = 2;
    const char *dump = nullptr;
    bool help = false;
    bool valid = true;
};

volatile std::sig_atomic_t stopRequested = 0;

void OnStop(int /*signal*/) {
    stopRequested = 1;
}

i64 Number(const char *text, i64 low, i64 high, bool *valid) {
    char *end = nullptr;
    i64 number = strtoll(text, &end, 10);
    *valid = *valid && end != text && *end == 0 && number >= low && number <= high;
    return number;
}

Settings ParseArguments(int argc, char **argv) {
    const option names[] = {
        {"dump", required_argument, nullptr, 'd'}, {"help", no_argument, nullptr, 'h'}, {nullptr, 0, nullptr, 0}};
    Settings settings;
    for (int letter = 0; (letter = getopt_long(argc, argv, "o:i:n:h", names, nullptr)) != -1;) {
        if (letter == 'o') {
            settings.prefix = optarg;
        } else if (letter == 'i') {
            settings.interval = Number(optarg, 0, 86400, &settings.valid);
        } else if (letter == 'n') {
            settings.count = Number(optarg, 1, 1000000, &settings.valid);
        } else if (letter == 'd') {
            settings.dump = optarg;
        } else {
            settings.help = letter == 'h';
            settings.valid = settings.valid && letter == 'h';
        }
    }
    settings.valid = settings.valid && optind == argc && (settings.prefix == nullptr) != (settings.dump == nullptr);
    if (settings.prefix != nullptr && strchr(settings.prefix, ':') != nullptr) {
        fputs("knf-record: a colon in PREFIX would part the list of files in a replay\n", stderr);
        settings.valid = false;
    }
    return settings;
}

// A signal between the look at the flag and the wait stays pending until ppoll opens the mask, and ends it.
void Wait(i64 seconds, const sigset_t &signals) {
    sigset_t before;
    sigprocmask(SIG_BLOCK, &signals, &before);
    timespec time = {static_cast<time_t>(seconds), 0};
    if (stopRequested == 0) {
        ppoll(nullptr, 0, &time, &before);
    }
    sigprocmask(SIG_SETMASK, &before, nullptr);
}

// One snapshot. False when there is none: stopped, nothing to be read, or the file can't be written.
bool RecordFile(const std::string &path) {
    Recorder recorder = {{}, 0, 0, 0, &stopRequested, isatty(STDERR_FILENO) != 0};
    RecordHost(&recorder);
    if (stopRequested != 0) {
        return false;
    }
    if (recorder.draft.entries.empty()) {
        fputs("knf-record: no node of the host can be read\n", stderr);
        return false;
    }
    std::string file = SnapshotEncode(recorder.draft);
    if (int error = SnapshotStore(path, file)) {
        fprintf(stderr, "knf-record: %s: %s\n", path.c_str(), strerror(error));
        return false;
    }
    printf("%s: %llu records, %llu lists, %zu bytes; %llu reads failed\n", path.c_str(), recorder.records,
           recorder.lists, file.size(), recorder.failed);
    fflush(stdout);
    return true;
}

int Record(const Settings &settings) {
    struct sigaction action = {};
    action.sa_handler = OnStop;
    sigset_t signals;
    sigemptyset(&signals);
    for (int signal : {SIGINT, SIGTERM}) {
        sigaction(signal, &action, nullptr);
        sigaddset(&signals, signal);
    }
    HckSyscall_Init(1, 0, 0);
    std::string written;
    bool good = true;
    for (i64 i = 0; i < settings.count && good; i++) {
        if (i > 0) {
            Wait(settings.interval, signals);
        }
        std::string path = std::string(settings.prefix) + "." + std::to_string(i);
        good = RecordFile(path);
        written += good ? ":" + path : "";
    }
    if (!written.empty()) {
        printf("lan-meter -c %s\n", written.c_str() + 1);
    }
    return !written.empty() && (good || stopRequested != 0) ? 0 : 1;
}

std::string TextOf(const Params &params) {
    std::string text;
    for (const KnfParamRec &param : params) {
        text += ' ';
        ParamAppendText(&text, param);
    }
    return text;
}

void PrintEntry(const SnapshotEntry &entry) {
    std::string text = std::to_string(entry.node) + TextOf(entry.keys);
    if (entry.kind == ENTRY_LIST) {
        printf("list %s =%s\n", text.c_str(), TextOf(entry.list).c_str());
        return;
    }
    printf("record %s size=%zu ", text.c_str(), entry.record.size());
    for (char byte : entry.record) {
        printf("%02x", static_cast<u8>(byte));
    }
    putchar('\n');
}

int Dump(const char *path) {
    auto snapshot = std::make_unique<Snapshot>();
    if (KnfStatus status = SnapshotOpen(path, snapshot.get())) {
        fprintf(stderr, "knf-record: %s: %s\n", path, StatusText(status));
        return 1;
    }
    printf("snapshot version=%u bytes=%zu time=%u.%09u signature%s\n", SNAPSHOT_VERSION, snapshot->file.size(),
           snapshot->seconds, snapshot->nanoseconds, TextOf({ParamOf(snapshot->signature)}).c_str());
    SnapshotEach(snapshot.get(), PrintEntry);
    return fflush(stdout) == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char **argv) {
    Settings settings = ParseArguments(argc, argv);
    if (settings.help || !settings.valid) {
        fputs(USAGE, settings.help ? stdout : stderr);
        return settings.help ? 0 : 1;
    }
    return settings.dump != nullptr ? Dump(settings.dump) : Record(settings);
}
