// Moves of watched threads between last-level caches.
#include "corekit/linuxhost/tracking/records.h"

#include <bpf/bpf_helpers.h>

char LICENSE[] SEC("license") = "Dual BSD/GPL";

struct {
    __uint(type, BPF_MAP_TYPE_HASH);
    __uint(map_flags, BPF_F_NO_PREALLOC);
    __uint(max_entries, THREADS_MOST);
    __type(key, __u32);
    __type(value, struct MoveRow);
} threads SEC(".maps");

struct {
    __uint(type, BPF_MAP_TYPE_ARRAY);
    __uint(max_entries, CPUS_MOST);
    __type(key, __u32);
    __type(value, __u32);
} caches SEC(".maps");

SEC("tp_btf/sched_migrate_task")
int Migrate(__u64 *ctx) {
    const struct task_struct *task = (const struct task_struct *)ctx[0];
    __u32 tid = (__u32)task->pid;
    struct MoveRow *row = bpf_map_lookup_elem(&threads, &tid);
    if (row == 0) {
        return 0;
    }
    if (row->born == 0) {
        row->born = task->start_boottime;
    }
    __u32 from = task->thread_info.cpu;
    __u32 to = (__u32)ctx[1];
    const __u32 *old = bpf_map_lookup_elem(&caches, &from);
    const __u32 *new = bpf_map_lookup_elem(&caches, &to);
    if (row->born == task->start_boottime && old != 0 && new != 0 &&
        *old != *new &&*old != NO_CACHE &&*new != NO_CACHE) {
        row->moves++;
    }
    return 0;
}
