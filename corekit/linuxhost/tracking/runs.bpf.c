// Periods of watched threads. The scheduler tells a thread's events one after another, under the lock of its run queue,
// so that a row is written by one CPU at a time.
#include "corekit/linuxhost/tracking/records.h"

#include <bpf/bpf_helpers.h>

char LICENSE[] SEC("license") = "Dual BSD/GPL";

struct {
    __uint(type, BPF_MAP_TYPE_HASH);
    __uint(map_flags, BPF_F_NO_PREALLOC);
    __uint(max_entries, THREADS_MOST);
    __type(key, __u32);
    __type(value, struct PeriodRow);
} threads SEC(".maps");

struct Shared shared;

// Of the thread that the row was first found for, and not of a later one of its number.
static __always_inline struct PeriodRow *Find(const struct task_struct *task) {
    __u32 tid = (__u32)task->pid;
    if ((shared.filter[tid / 64 % FILTER_WORDS] >> tid % 64 & 1) == 0) {
        return 0;
    }
    struct PeriodRow *row = bpf_map_lookup_elem(&threads, &tid);
    if (row != 0 && row->task == 0) {
        row->task = (__u64)task;
        row->born = task->start_boottime;
    }
    return row != 0 && row->task == (__u64)task ? row : 0;
}

// Ends a period and begins the next. The first one begins at an unknown time. Clocks of two CPUs may differ by some ns.
static __always_inline void Step(struct PeriodRow *row, __u32 state) {
    __u64 now = bpf_ktime_get_ns();
    __u32 period = row->state - 1;
    if (period < PERIODS) {
        __u64 length = now > row->since ? now - row->since : 0;
        row->periods[period].sum += length;
        __u32 bucket = BucketOf(shared.limits[0], length);
        if (bucket < BUCKETS) {
            row->periods[period].buckets[bucket]++;
        }
    }
    row->state = state;
    row->since = now;
}

// A thread that leaves its CPU sleeps, unless it was preempted or is still runnable.
SEC("tp_btf/sched_switch")
int Switch(__u64 *ctx) {
    const struct task_struct *leaves = (const struct task_struct *)ctx[1];
    struct PeriodRow *row = Find(leaves);
    if (row != 0) {
        bool sleeps = (ctx[0] & 0xff) == 0 && leaves->__state != 0;
        Step(row, sleeps ? PERIOD_WAIT + 1 : PERIOD_READY + 1);
    }
    row = Find((const struct task_struct *)ctx[2]);
    if (row != 0) {
        Step(row, PERIOD_RUN + 1);
    }
    return 0;
}

// Also told of a thread that had not yet gone to sleep.
SEC("tp_btf/sched_wakeup")
int Wakeup(__u64 *ctx) {
    struct PeriodRow *row = Find((const struct task_struct *)ctx[0]);
    if (row != 0 && row->state == PERIOD_WAIT + 1) {
        Step(row, PERIOD_READY + 1);
    }
    return 0;
}
