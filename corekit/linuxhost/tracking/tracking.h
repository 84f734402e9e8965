// What the kernel counts only while somebody asks: programs in it that end with this process, however it ends. They
// stand in a shared object of their own beside the library, which is opened when something is first watched. A group of
// programs is loaded and attached with the first thing that is watched in it, and gone again with the last: nothing is
// paid for what nobody asks for. Needs CAP_BPF and CAP_PERFMON, and a kernel (6.1 or later) with type data.
//
// All counters only grow from 0 at their start; a reset is a copy that the reader keeps.
#pragma once

#include "corekit/linuxhost/rows.h"
#include "corekit/linuxhost/tracking/records.h"

enum TrackingGroup : u32 {
    TRACKING_PACKETS,  // sizes and intervals of an interface's packets
    TRACKING_RUNS,     // periods of threads: running, ready, waiting
    TRACKING_VECTORS,  // interrupts
    TRACKING_MOVES,    // of threads between last-level caches
    TRACKING_TASKS,    // figures of many threads in one pass
    TRACKING_GROUPS
};

// Of a port. A sample is a packet as the driver and the stack hand it to each other, which is what the interface counts
// as one: an offload packet is one sample. What comes to a VLAN, bond, team, macvlan or macvtap goes no such way and is
// never seen, so don't ask for these. Whoever watches an index stops when its interface goes: the next one to bear it
// would go on in the same row.
struct PortSamples {
    u64 count;  // of all buckets
    u64 sum;    // bytes or ns
    u64 min;    // of the samples since the last read; 0 when there were none. So each read must be merged into what
    u64 max;    // the reader keeps since its own reset.
    u64 buckets[BUCKETS];
};

struct PeriodSamples {
    u64 count;
    u64 sum;  // ns
    u64 buckets[BUCKETS];
};
// A period counts when it ends; the one in which the watch begins never does. READY is the time in a run queue, WAIT
// that of sleep.
struct ThreadSamples {
    u64 born;  // ns of CLOCK_BOOTTIME when the thread began; 0 until it was seen. Nothing of a later one is counted.
    PeriodSamples periods[PERIODS];
};

struct VectorSamples {
    u64 count;  // interrupts, one also where several devices share the number
    u64 time;   // ns in their handlers, without what those leave to softirqs and threads
};

struct Tracking;  // one reader's; not for two threads at once

// Outcomes: UNSUPPORTED by this kernel or this part of it, REFUSED to this user, GONE when it is not watched, BROKEN
// for anything else. `reason` tells the last one that was not FINE in words.
struct TrackingTable {
    u32 version;
    Tracking *(*open)();  // loads nothing; null without memory
    void (*close)(Tracking *tracking);
    const char *(*reason)(const Tracking *tracking);  // one line without its end; until the next call
    // Whether the group can be used, by loading it once; nothing stays loaded.
    Outcome (*ask)(Tracking *tracking, TrackingGroup group);

    // Again for what runs already: FINE, nothing changes. A start begins at 0.
    Outcome (*portStart)(Tracking *tracking, const TrackedPort *port, PortFamily family);
    Outcome (*portRead)(Tracking *tracking, const TrackedPort *port, PortFamily family, PortSamples *samples);
    void (*portStop)(Tracking *tracking, const TrackedPort *port, PortFamily family);

    // Threads by the number that the first PID namespace has for them; elsewhere UNSUPPORTED.
    Outcome (*threadWatch)(Tracking *tracking, u32 tid);
    Outcome (*threadRead)(Tracking *tracking, u32 tid, ThreadSamples *samples);
    void (*threadUnwatch)(Tracking *tracking, u32 tid);

    // By the number in /proc/interrupts.
    Outcome (*vectorWatch)(Tracking *tracking, u32 irq);
    // On each of so many CPUs, from the first on: one look at the kernel for all. 0 for a CPU that is not there.
    Outcome (*vectorRead)(Tracking *tracking, u32 irq, u32 cpus, VectorSamples *samples);
    void (*vectorUnwatch)(Tracking *tracking, u32 irq);

    // The cache of each CPU, before the first watch; a CPU past the end, or with a cache of ~0, has none to move from.
    Outcome (*movesCaches)(Tracking *tracking, const u32 *cacheOfCpu, u32 cpus);
    Outcome (*movesWatch)(Tracking *tracking, u32 tid);
    Outcome (*movesRead)(Tracking *tracking, u32 tid, u64 *moves);
    void (*movesUnwatch)(Tracking *tracking, u32 tid);

    // All threads of one process, or of all processes for 0. The rows stay until the next call. No rows and FINE when
    // the process went. The group stays loaded, which costs no CPU time, until `tasksEnd`.
    Outcome (*tasksRead)(Tracking *tracking, u32 pid, const TaskSamples **rows, u32 *count);
    void (*tasksEnd)(Tracking *tracking);
};

constexpr u32 TRACKING_VERSION = 1;
constexpr char TRACKING_FILE[] = "libcorekit-tracking.so";
constexpr char TRACKING_SYMBOL[] = "corekitTracking";  // the table

// Opens the part in the folder that holds this code, or in the library folder beside it; never closed again. Null when
// it is missing, can't be opened, or is of another version: `*reason` then says so in one line, for good. Costs nothing
// the second time.
const TrackingTable *TrackingOpen(const char **reason);
