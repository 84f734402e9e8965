// Interrupts of watched numbers, on each CPU.
#include "corekit/linuxhost/tracking/records.h"

#include <bpf/bpf_helpers.h>

char LICENSE[] SEC("license") = "Dual BSD/GPL";

struct {
    __uint(type, BPF_MAP_TYPE_PERCPU_HASH);
    __uint(map_flags, BPF_F_NO_PREALLOC);
    __uint(max_entries, VECTORS_MOST);
    __type(key, __u32);
    __type(value, struct VectorRow);
} vectors SEC(".maps");

SEC("tp_btf/irq_handler_entry")
int Enter(__u64 *ctx) {
    __u32 irq = (__u32)ctx[0];
    struct VectorRow *row = bpf_map_lookup_elem(&vectors, &irq);
    if (row != 0) {
        row->since = bpf_ktime_get_ns();
    }
    return 0;
}

// Devices that share a number are asked one after another; the last one ends the interrupt.
SEC("tp_btf/irq_handler_exit")
int Leave(__u64 *ctx) {
    __u32 irq = (__u32)ctx[0];
    struct VectorRow *row = bpf_map_lookup_elem(&vectors, &irq);
    if (row == 0 || row->since == 0) {
        return 0;
    }
    row->time += bpf_ktime_get_ns() - row->since;
    row->since = 0;
    if (((const struct irqaction *)ctx[1])->next == 0) {
        row->count++;
    }
    return 0;
}
