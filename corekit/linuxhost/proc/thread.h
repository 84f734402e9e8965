// What the scheduler says of single threads: vcpus, vhost workers, kernel threads of NICs. A thread costs one read a
// generation for all its figures: about 1.6 us with its migrations by a perf event, 8 us with its sched file where
// no event is allowed. Owns two descriptors a thread.
#pragma once

#include "corekit/linuxhost/file.h"

#include <unordered_map>

// What a caller wants of a thread, and what a row knows. Unwanted figures are not read.
enum ThreadFigure : u32 {
    THREAD_TIMES = 1,  // run, ready, runs, life
    THREAD_MIGRATIONS = 2,
    THREAD_REMOTE_WAKEUPS = 4,  // needs kernel.sched_schedstats, and the slow file
    THREAD_AFFINITY = 8,        // told again every 10 s at most
};

struct ThreadRow {
    u32 known;          // bits of ThreadFigure
    u32 affinity;       // the one CPU that it may run on; NO_CPU when there are several
    u64 run;            // ns; up to a tick old while it runs
    u64 ready;          // ns in a run queue
    u64 runs;           // times that it got a CPU
    u64 life;           // ns since its start, which has a grain of 10 ms; run + ready + wait = life
    u64 migrations;     // since an unknown moment: only differences count
    u64 remoteWakeups;  // by another CPU
};

// A watched thread, for thread.cpp alone.
struct Thread {
    u32 wanted = 0;
    u64 generation = 0;
    bool sampled = false;  // the row is of that generation
    bool gone = false;
    u64 started = 0;      // ticks since boot; tells a thread from a later one of the same number
    u64 affinityAge = 0;  // ns of CLOCK_BOOTTIME when it was told
    int perf = -1;        // counts migrations
    bool perfTried = false;
    std::string directory;  // "PID/task/TID/"
    ProcFile times{};
    ProcFile sched{};
    ThreadRow row{};
};

struct Threads {
    const ProcRoot *root = nullptr;
    bool allowPerf = true;
    bool schedstats = false;               // kernel.sched_schedstats
    std::unordered_map<u64, Thread> open;  // by TID
    ProcBuffer buffer;
};

// The root must outlive the threads.
Outcome ThreadsOpen(Threads *threads, const ProcRoot *root, bool allowPerf);
// Begins to watch a thread of a process. Again for the same one: adds to what is wanted. GONE when it is no thread of
// that process; a thread whose file for a wanted figure is missing is FINE, its rows then don't know that figure.
Outcome ThreadWatch(Threads *threads, u32 pid, u32 tid, u32 wanted);
// The row of a watched thread; it stays valid until the next call. Read anew unless it is of this generation (not 0)
// already. GONE, and then for ever, when the thread ended or is not watched.
Outcome ThreadRead(Threads *threads, u32 tid, u64 generation, const ThreadRow **row);
void ThreadsClose(Threads *threads);

// Our own process, of all its threads; exact, 300 ns.
struct SelfRow {
    u64 run;      // ns
    u64 elapsed;  // ns of CLOCK_MONOTONIC
};
SelfRow SelfRead();
