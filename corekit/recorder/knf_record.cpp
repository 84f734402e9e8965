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
    "The last line printed is the command that replays them. SIGINT ends it early with the files so far.\n"
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

volatile std::sig_atomic_t stopSignal = 0;

void OnStop(int signal) {
    stopSignal = signal;
}

// The number of an option. Says what is expected where it is none.
i64 Number(const char *option, const char *unit, i64 low, i64 high, bool *valid) {
    char *end = nullptr;
    i64 number = strtoll(optarg, &end, 10);
    if (end == optarg || *end != 0 || number < low || number > high) {
        fprintf(stderr, "knf-record: %s %s: expected a whole number of %s from %lld to %lld\n", option, optarg, unit,
                low, high);
        *valid = false;
    }
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
            settings.interval = Number("-i", "seconds", 0, 86400, &settings.valid);
        } else if (letter == 'n') {
            settings.count = Number("-n", "snapshots", 1, 1000000, &settings.valid);
        } else if (letter == 'd') {
            settings.dump = optarg;
        } else {
            settings.help = letter == 'h';
            settings.valid = settings.valid && letter == 'h';
        }
    }
    std::string problem;
    bool either = (settings.prefix == nullptr) != (settings.dump == nullptr);
    if (settings.valid && optind < argc) {
        problem = std::string(argv[optind]) + ": expected an option";
    } else if (settings.valid && !either) {
        problem = "expected either -o PREFIX or --dump FILE";
    } else if (settings.prefix != nullptr && strchr(settings.prefix, ':') != nullptr) {
        problem = "a colon in PREFIX would part the list of files in a replay";
    }
    if (!problem.empty() && !settings.help) {
        fprintf(stderr, "knf-record: %s\n", problem.c_str());
    }
    settings.valid = settings.valid && either && problem.empty();
    return settings;
}

// A signal between the look at the flag and the wait stays pending until ppoll opens the mask, and ends it.
void Wait(i64 seconds, const sigset_t &signals) {
    sigset_t before;
    sigprocmask(SIG_BLOCK, &signals, &before);
    timespec time = {static_cast<time_t>(seconds), 0};
    if (stopSignal == 0) {
        ppoll(nullptr, 0, &time, &before);
    }
    sigprocmask(SIG_SETMASK, &before, nullptr);
}

// Whether all that was printed went out. Says why not.
bool Printed() {
    if (fflush(stdout) == 0 && ferror(stdout) == 0) {
        return true;
    }
    fprintf(stderr, "knf-record: standard output: %s\n", strerror(errno));
    return false;
}

// One snapshot. False when there is none: stopped, nothing to be read, or the file can't be written.
bool RecordFile(const std::string &path) {
    Recorder recorder = {{}, 0, 0, 0, &stopSignal, isatty(STDERR_FILENO) != 0};
    RecordHost(&recorder);
    if (stopSignal != 0) {
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
    return true;
}

// Returns the signals that end the recording. A file that grows too large and a reader of standard output that went
// away show as failed writes instead.
sigset_t CatchSignals() {
    struct sigaction action = {};
    action.sa_handler = SIG_IGN;
    sigaction(SIGXFSZ, &action, nullptr);
    sigaction(SIGPIPE, &action, nullptr);
    action.sa_handler = OnStop;
    sigset_t signals;
    sigemptyset(&signals);
    for (int signal : {SIGINT, SIGTERM, SIGHUP}) {
        struct sigaction before = {};
        sigaction(signal, nullptr, &before);
        if (signal != SIGHUP || before.sa_handler != SIG_IGN) {  // nohup
            sigaction(signal, &action, nullptr);
            sigaddset(&signals, signal);
        }
    }
    return signals;
}

// As one word of a shell's command, whatever its bytes are.
std::string Quoted(const std::string &text) {
    constexpr char plain[] = "0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ_./:,+@%-";
    if (text.find_first_not_of(plain) == text.npos) {
        return text;
    }
    std::string quoted = "'";
    for (char byte : text) {
        quoted += byte == '\'' ? "'\\''" : std::string(1, byte);
    }
    return quoted + "'";
}

int Record(const Settings &settings) {
    sigset_t signals = CatchSignals();
    SnapshotClear(settings.prefix);
    HckSyscall_Init(1, 0, 0);
    std::string written;
    bool good = true;
    bool printed = true;
    i64 taken = 0;
    for (; taken < settings.count && good; taken += good ? 1 : 0) {
        if (taken > 0) {
            Wait(settings.interval, signals);
        }
        std::string path = std::string(settings.prefix) + "." + std::to_string(taken);
        good = RecordFile(path);
        written += good ? ":" + path : "";
        printed = printed && Printed();
    }
    if (stopSignal != 0 && !good) {
        fprintf(stderr, "knf-record: stopped after %lld of %lld snapshots: %s\n", taken, settings.count,
                strsignal(stopSignal));
    }
    if (taken > 0 && printed) {
        // A record of a replay lies between two snapshots; one alone tells the ports.
        printf("lan-meter %s -c %s\n", taken > 1 ? "-A" : "-l", Quoted(written.substr(1)).c_str());
        printed = printed && Printed();
    }
    return taken > 0 && (good || stopSignal != 0) && printed ? 0 : 1;
}

void PrintParams(const Params &params) {
    for (const KnfParamRec &param : params) {
        std::string text;
        ParamAppendText(&text, param);
        printf(" %s", text.c_str());
    }
}

void PrintEntry(const SnapshotEntry &entry) {
    printf("%s %u", entry.kind == ENTRY_LIST ? "list" : "record", entry.node);
    PrintParams(entry.keys);
    if (entry.kind == ENTRY_LIST) {
        fputs(" =", stdout);
        PrintParams(entry.list);
        putchar('\n');
        return;
    }
    printf(" size=%zu ", entry.record.size());
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
    printf("snapshot version=%u bytes=%zu time=%u.%09u signature", SNAPSHOT_VERSION, snapshot->file.size(),
           snapshot->seconds, snapshot->nanoseconds);
    PrintParams({ParamOf(snapshot->signature)});
    putchar('\n');
    SnapshotEach(snapshot.get(), PrintEntry);
    return Printed() ? 0 : 1;
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
