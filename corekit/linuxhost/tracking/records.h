// What the programs in the kernel and their loader share: the records of the maps, and how a sample finds its bucket.
// Plain structs of fixed integers, in the C that both compilers read. Counters only grow.
#pragma once

#ifdef __bpf__
#include "corekit/linuxhost/tracking/kernel_types.h"
#else
#include <linux/types.h>
#endif

// A sample lies in the first bucket whose limit it doesn't exceed, and in the one behind the last limit when it exceeds
// all. Tables are filled up to one length, so that one search of five steps serves all of them.
enum { LIMITS = 31 };
enum { SIZE_BUCKETS = 12, INTERVAL_BUCKETS = 19, PERIOD_BUCKETS = 20, BUCKETS = 20 };  // the last one has no limit
#define NO_LIMIT 0x7fffffffffffffffULL
#define NO_LIMITS_4 NO_LIMIT, NO_LIMIT, NO_LIMIT, NO_LIMIT

// Bytes, Ethernet header included, check sum not.
static const __u64 SIZE_LIMITS[LIMITS] = {
    64,    128,         256,         512,         768,         1024,     1280,     1514,     4096,    9014,
    32768, NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4, NO_LIMIT, NO_LIMIT, NO_LIMIT, NO_LIMIT};

// Nanoseconds, all of them whole microseconds: of the time between two packets, and of a thread's periods.
static const __u64 INTERVAL_LIMITS[LIMITS] = {1000,        2000,        5000,        10000,     20000,     50000,
                                              100000,      200000,      500000,      1000000,   2000000,   5000000,
                                              10000000,    20000000,    50000000,    100000000, 200000000, 500000000,
                                              NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4, NO_LIMIT};
static const __u64 PERIOD_LIMITS[LIMITS] = {1000,       2000,        5000,        10000,      20000,     50000,
                                            100000,     200000,      500000,      1000000,    2000000,   5000000,
                                            10000000,   20000000,    50000000,    100000000,  200000000, 500000000,
                                            1000000000, NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4};

// A direction of an interface, from its own point of view; a key of a map too.
enum PortDirection { PORT_RECEIVES, PORT_SENDS };
struct TrackedPort {
    __u32 netns;  // inode of the network namespace, as in /proc/self/ns/net; an index is used again in each
    __u32 index;
    __u32 direction;
};
enum PortFamily { PORT_SIZES, PORT_INTERVALS, PORT_FAMILIES };

// What the maps hold at most. They take memory for what is watched, but slots and the heads of their tables.
enum { PORT_SLOTS = 8192, THREADS_MOST = 2048, VECTORS_MOST = 2048, CPUS_MOST = 8192 };

// One page that each sample needs, shared with the reader, who fills it.
enum { FILTER_WORDS = 256, FILTER_BITS = 64 * FILTER_WORDS };
struct Shared {
    __u64 filter[FILTER_WORDS];  // a bit for each number that may be watched, by its lowest bits
    __u64 limits[2][LIMITS];
};

enum { HEADER_MOST = 64 };  // bytes of a link header; where none is known, a larger number stands

// Of a port that is watched: what the reader orders, and what all CPUs share. Fills a cache line, as each packet writes
// it.
struct PortSlot {
    __u32 wants;  // bits of PortFamily
    __u32 epochs[PORT_FAMILIES];
    __u32 reserved[1];
    __u64 last;  // ns; when a packet last came, 0 before
    __u64 reserved2[5];
};

// The least and the largest can't be told by differences. So each read begins a new epoch, and they are kept for that
// and the one ahead, which the read then takes.
struct Extremes {
    __u64 min;
    __u64 max;
    __u32 epoch;  // another one's: no samples
    __u32 reserved;
};
struct PortCounts {            // each sample touches the head and a bucket: two cache lines
    struct Extremes spans[2];  // by the lowest bit of their epoch
    __u64 sum;
    __u64 buckets[BUCKETS];
};
struct PortRow {  // on one CPU
    __u32 slot;
    __u32 reserved;
    struct PortCounts families[PORT_FAMILIES];
};

enum ThreadPeriod { PERIOD_RUN, PERIOD_READY, PERIOD_WAIT, PERIODS };
struct PeriodCounts {
    __u64 sum;  // ns
    __u64 buckets[BUCKETS];
};
struct PeriodRow {
    __u64 task;   // the kernel's address of it; 0 until it is seen
    __u64 born;   // ns of the boot clock when it began
    __u64 since;  // ns; when its period began
    __u32 state;  // 1 + ThreadPeriod; 0 until it is known
    __u32 reserved;
    struct PeriodCounts periods[PERIODS];
};

struct VectorRow {  // on one CPU
    __u64 count;
    __u64 time;   // ns
    __u64 since;  // ns; 0: no handler runs
};

#define NO_CACHE 0xffffffffU
struct MoveRow {
    __u64 born;
    __u64 moves;
};

// A thread as its scheduler has it; what `known` lacks this kernel doesn't keep.
enum TaskFigure { TASK_READY = 1, TASK_REMOTE_WAKEUPS = 2 };
struct TaskSamples {
    __u32 tid;
    __u32 pid;
    __u64 born;           // ns of the boot clock
    __u64 run;            // ns, up to a tick old while it runs
    __u64 ready;          // ns in a run queue
    __u64 runs;           // times that it got a CPU; known with `ready`
    __u64 migrations;     // between CPUs
    __u64 remoteWakeups;  // counted only with kernel.sched_schedstats
    __u32 known;
    __u32 reserved;
};

#ifndef __cplusplus
#define static_assert _Static_assert
#endif
static_assert(sizeof(struct TrackedPort) == 12 && sizeof(struct PortSlot) == 64, "");
static_assert(sizeof(struct PortCounts) == 216 && sizeof(struct PortRow) == 440, "");
static_assert(sizeof(struct PeriodRow) == 536 && sizeof(struct VectorRow) == 24, "");
static_assert(sizeof(struct TaskSamples) == 64 && sizeof(struct Shared) <= 4096, "");

// The kernel follows a sum within its bounds, but in 6.1 not the OR that the compiler would make of it.
#ifdef __bpf__
#define KEEP_SUM(number) asm volatile("" : "+r"(number))
#else
#define KEEP_SUM(number)
#endif

// Without branches, which no CPU could foretell. Samples and limits lie below 2^63.
static inline __u32 BucketOf(const __u64 limits[LIMITS], __u64 sample) {
    __u64 bucket = (limits[15] - sample) >> 63 << 4;
    KEEP_SUM(bucket);
    bucket += (limits[bucket + 7] - sample) >> 63 << 3;
    KEEP_SUM(bucket);
    bucket += (limits[bucket + 3] - sample) >> 63 << 2;
    KEEP_SUM(bucket);
    bucket += (limits[bucket + 1] - sample) >> 63 << 1;
    KEEP_SUM(bucket);
    return (__u32)(bucket + ((limits[bucket] - sample) >> 63));
}
