#include "corekit/linuxhost/proc/thread.h"

#include "corekit/linuxhost/proc/cpu.h"

#include <algorithm>
#include <ctime>
#include <linux/perf_event.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

constexpr u32 LIMIT = 65536;
constexpr u64 NANOSECONDS = 1000000000;
constexpr u64 AFFINITY_SPAN = 10 * NANOSECONDS;
constexpr size_t RULE = 20;  // dashes at least of the line that ends the head of a sched file

u64 Clock(clockid_t clock) {
    timespec now = {};
    clock_gettime(clock, &now);
    return static_cast<u64>(now.tv_sec) * NANOSECONDS + static_cast<u64>(now.tv_nsec);
}

// The name in brackets may hold anything, brackets too: what counts stands behind the last one.
bool ParseStarted(std::string_view stat, u64 *started) {
    size_t end = stat.rfind(')');
    std::string_view rest = end == std::string_view::npos ? std::string_view() : stat.substr(end + 1);
    for (int field = 3; field < 22; field++) {
        ProcTakeWord(&rest);
    }
    return ProcTakeNumber(&rest, started);
}

Outcome ReadStarted(Threads *threads, const Thread &thread, u64 *started) {
    std::string_view text;
    Outcome outcome = ProcReadOnce(threads->root->proc, thread.directory + "stat", LIMIT, &threads->buffer, &text);
    return outcome == FINE && !ParseStarted(text, started) ? BROKEN : outcome;
}

// The file of times is opened first: when it answers behind the start, the two are of one thread.
Outcome Identify(Threads *threads, Thread *thread) {
    ProcOpen(&thread->times, threads->root->proc, thread->directory + "schedstat", LIMIT);
    thread->times.line = true;
    return ReadStarted(threads, *thread, &thread->started);
}

void PerfOpen(Thread *thread, u32 tid) {
    perf_event_attr attributes = {};
    attributes.size = sizeof attributes;
    attributes.type = PERF_TYPE_SOFTWARE;
    attributes.config = PERF_COUNT_SW_CPU_MIGRATIONS;
    // A migration happens in the kernel: an event that leaves the kernel out opens well and counts nothing.
    if (!ProcKeepOne()) {
        return;
    }
    thread->perf = static_cast<int>(
        syscall(SYS_perf_event_open, &attributes, static_cast<pid_t>(tid), -1, -1, PERF_FLAG_FD_CLOEXEC));
    if (thread->perf < 0) {
        ProcReleaseOne();
    }
}

void Forget(Thread *thread) {
    ProcClose(&thread->times);
    ProcClose(&thread->sched);
    if (thread->perf >= 0) {
        close(thread->perf);
        ProcReleaseOne();
    }
    thread->perf = -1;
    thread->gone = true;
}

// A kernel that does not account shows three zeros of a thread that has run, as each one has that can be watched.
void ParseTimes(std::string_view text, ThreadRow *row) {
    bool good = ProcTakeNumber(&text, &row->run) && ProcTakeNumber(&text, &row->ready) &&
                ProcTakeNumber(&text, &row->runs) && (row->run | row->ready | row->runs) != 0;
    row->known |= good ? u32{THREAD_TIMES} : 0;
}

// The head of the file has the thread's name as it is, with line ends and all.
std::string_view BelowRule(std::string_view text) {
    while (!text.empty()) {
        std::string_view line = ProcTakeLine(&text);
        if (line.size() >= RULE && line.find_first_not_of('-') == std::string_view::npos) {
            return text;
        }
    }
    return {};
}

bool FindNumber(std::string_view text, std::initializer_list<const char *> keys, u64 *number) {
    std::string_view value;
    return std::any_of(keys.begin(), keys.end(),
                       [&](const char *key) { return ProcFindKey(text, key, &value) && ProcNumber(value, number); });
}

void ParseSched(std::string_view text, ThreadRow *row) {
    text = BelowRule(text);
    if (FindNumber(text, {"se.nr_migrations", "nr_migrations"}, &row->migrations)) {
        row->known |= THREAD_MIGRATIONS;
    }
    if (FindNumber(text, {"nr_wakeups_remote", "se.statistics.nr_wakeups_remote"}, &row->remoteWakeups)) {
        row->known |= THREAD_REMOTE_WAKEUPS;
    }
}

void ReadAffinity(Threads *threads, Thread *thread, u64 now) {
    std::string_view text;
    std::string_view list;
    thread->row.affinity = NO_CPU;
    if (ProcReadOnce(threads->root->proc, thread->directory + "status", LIMIT, &threads->buffer, &text) == FINE &&
        ProcFindKey(text, "Cpus_allowed_list", &list)) {
        thread->row.affinity = CpuListOnly(list);
        thread->row.known |= THREAD_AFFINITY;
    }
    thread->affinityAge = now;
}

void ReadMigrations(Threads *threads, Thread *thread) {
    ThreadRow *row = &thread->row;
    u64 count = 0;
    bool byPerf = thread->perf >= 0 && read(thread->perf, &count, sizeof count) == sizeof count;
    bool remote = (thread->wanted & THREAD_REMOTE_WAKEUPS) != 0 && threads->schedstats;
    std::string_view text;
    if ((!byPerf || remote) && ProcRead(&thread->sched, &threads->buffer, &text) == FINE) {
        ParseSched(text, row);
    }
    if (byPerf) {
        row->migrations = count;
        row->known |= THREAD_MIGRATIONS;
    }
    if (!remote) {
        row->known &= ~static_cast<u32>(THREAD_REMOTE_WAKEUPS);  // the file shows a 0 that nobody counted
    }
}

// The kept file of times comes last: while it answers, all that was read before it was the same thread's.
Outcome ReadTimes(Threads *threads, Thread *thread) {
    std::string_view text;
    Outcome outcome = ProcRead(&thread->times, &threads->buffer, &text);
    if (outcome == FINE) {
        ParseTimes(text, &thread->row);
    }
    bool missing = outcome == GONE && !thread->times.kept;  // on a kernel without this file
    if (thread->times.kept || (outcome != FINE && !missing)) {
        return outcome;
    }
    u64 started = 0;
    outcome = ReadStarted(threads, *thread, &started);
    return outcome == FINE && started != thread->started ? GONE : outcome;
}

u64 LifeOf(const Thread &thread, u64 now) {
    long ticks = sysconf(_SC_CLK_TCK);
    u64 tick = NANOSECONDS / static_cast<u64>(ticks > 0 ? ticks : 100);
    u64 started = thread.started < now / tick ? thread.started * tick : now;
    return now - started;
}

Outcome ReadRow(Threads *threads, Thread *thread) {
    u32 wanted = thread->wanted;
    u64 now = Clock(CLOCK_BOOTTIME);
    thread->row.known &= THREAD_AFFINITY;
    if ((wanted & THREAD_AFFINITY) != 0 && (thread->affinityAge == 0 || now - thread->affinityAge > AFFINITY_SPAN)) {
        ReadAffinity(threads, thread, now);
    }
    if ((wanted & (THREAD_MIGRATIONS | THREAD_REMOTE_WAKEUPS)) != 0) {
        ReadMigrations(threads, thread);
    }
    thread->row.life = LifeOf(*thread, now);
    return ReadTimes(threads, thread);
}

}  // namespace

Outcome ThreadsOpen(Threads *threads, const ProcRoot *root, bool allowPerf) {
    threads->root = root;
    threads->allowPerf = allowPerf;
    std::string_view text;
    threads->schedstats =
        ProcReadOnce(root->proc, "sys/kernel/sched_schedstats", LIMIT, &threads->buffer, &text) == FINE &&
        text.substr(0, 1) == "1";
    return root->proc >= 0 ? FINE : GONE;
}

Outcome ThreadWatch(Threads *threads, u32 pid, u32 tid, u32 wanted) {
    Thread *thread = &threads->open[tid];
    std::string directory = std::to_string(pid) + "/task/" + std::to_string(tid) + "/";
    if (thread->gone || thread->directory != directory) {
        Forget(thread);
        *thread = Thread();
        thread->directory = directory;
        Outcome outcome = Identify(threads, thread);
        if (outcome != FINE) {
            Forget(thread);
            threads->open.erase(tid);
            return outcome;
        }
    }
    bool more = (wanted & ~thread->wanted) != 0;
    thread->wanted |= wanted;
    thread->sampled = thread->sampled && !more;
    if ((thread->wanted & THREAD_MIGRATIONS) != 0 && threads->allowPerf && !thread->perfTried) {
        thread->perfTried = true;
        PerfOpen(thread, tid);
    }
    bool byText = (thread->wanted & THREAD_MIGRATIONS) != 0 && thread->perf < 0;
    bool remote = (thread->wanted & THREAD_REMOTE_WAKEUPS) != 0 && threads->schedstats;
    if ((byText || remote) && thread->sched.path.empty()) {
        ProcOpen(&thread->sched, threads->root->proc, directory + "sched", LIMIT);
    }
    return FINE;
}

Outcome ThreadRead(Threads *threads, u32 tid, u64 generation, const ThreadRow **row) {
    auto found = threads->open.find(tid);
    if (found == threads->open.end() || found->second.gone) {
        return GONE;
    }
    Thread *thread = &found->second;
    *row = &thread->row;
    if (thread->sampled && thread->generation == generation) {
        return FINE;
    }
    Outcome outcome = ReadRow(threads, thread);
    thread->sampled = outcome == FINE;
    thread->generation = generation;
    if (outcome == GONE) {
        Forget(thread);
    }
    return outcome;
}

void ThreadsClose(Threads *threads) {
    for (auto &[tid, thread] : threads->open) {
        Forget(&thread);
    }
    threads->open.clear();
}

SelfRow SelfRead() {
    return {Clock(CLOCK_PROCESS_CPUTIME_ID), Clock(CLOCK_MONOTONIC)};
}
