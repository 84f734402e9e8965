// Sizes and intervals of the packets of watched ports, where driver and stack hand them to each other: once a packet,
// where the interface counts it.
#include "corekit/linuxhost/tracking/records.h"

#include <bpf/bpf_helpers.h>

char LICENSE[] SEC("license") = "Dual BSD/GPL";

struct {
    __uint(type, BPF_MAP_TYPE_PERCPU_HASH);
    __uint(map_flags, BPF_F_NO_PREALLOC);
    __uint(max_entries, PORT_SLOTS);
    __type(key, struct TrackedPort);
    __type(value, struct PortRow);
} rows SEC(".maps");

struct {
    __uint(type, BPF_MAP_TYPE_ARRAY);
    __uint(map_flags, BPF_F_MMAPABLE);
    __uint(max_entries, PORT_SLOTS);
    __type(key, __u32);
    __type(value, struct PortSlot);
} slots SEC(".maps");

struct Shared shared;

static __always_inline void Count(struct PortCounts *counts, const __u64 *limits, __u32 epoch, __u64 sample) {
    struct Extremes *span = &counts->spans[epoch & 1];
    if (span->epoch != epoch || sample < span->min) {
        span->min = sample;
    }
    if (span->epoch != epoch || sample > span->max) {
        span->max = sample;
    }
    span->epoch = epoch;
    counts->sum += sample;
    __u32 bucket = BucketOf(limits, sample);
    if (bucket < BUCKETS) {
        counts->buckets[bucket]++;
    }
}

// The packet ahead may be another CPU's, even one that is about to be told later.
static __always_inline void CountInterval(struct PortSlot *slot, struct PortRow *row) {
    __u64 now = bpf_ktime_get_ns();
    __u64 last = __sync_lock_test_and_set(&slot->last, now);
    if (last != 0) {
        Count(&row->families[PORT_INTERVALS], shared.limits[PORT_INTERVALS], slot->epochs[PORT_INTERVALS],
              now > last ? now - last : 0);
    }
}

static __always_inline int Packet(const struct net_device *dev, __u32 direction, __u32 bytes) {
    __u32 index = (__u32)dev->ifindex;
    if ((shared.filter[index / 64 % FILTER_WORDS] >> index % 64 & 1) == 0) {
        return 0;
    }
    struct TrackedPort port = {dev->nd_net.net->ns.inum, index, direction};
    struct PortRow *row = bpf_map_lookup_elem(&rows, &port);
    struct PortSlot *slot = row != 0 ? bpf_map_lookup_elem(&slots, &row->slot) : 0;
    if (slot == 0) {
        return 0;
    }
    if ((slot->wants & 1 << PORT_SIZES) != 0) {
        Count(&row->families[PORT_SIZES], shared.limits[PORT_SIZES], slot->epochs[PORT_SIZES], bytes);
    }
    if ((slot->wants & 1 << PORT_INTERVALS) != 0) {
        CountInterval(slot, row);
    }
    return 0;
}

// What the driver took. What it refused comes again, and what it dropped the interface doesn't count as sent.
SEC("tp_btf/net_dev_xmit")
int Sent(__u64 *ctx) {
    return (int)ctx[1] == 0 ? Packet((const struct net_device *)ctx[2], PORT_SENDS, (__u32)ctx[3]) : 0;
}

// By one of five doors, each with the link header taken off.
static __always_inline int Received(const struct sk_buff *skb) {
    __u32 header = (__u32)(skb->data - skb->head) - skb->mac_header;
    return Packet(skb->dev, PORT_RECEIVES, skb->len + (header < HEADER_MOST ? header : 0));
}

SEC("tp_btf/netif_receive_skb_entry")
int ReceivedOne(__u64 *ctx) {
    return Received((const struct sk_buff *)ctx[0]);
}

SEC("tp_btf/netif_receive_skb_list_entry")
int ReceivedList(__u64 *ctx) {
    return Received((const struct sk_buff *)ctx[0]);
}

SEC("tp_btf/netif_rx_entry")
int ReceivedLater(__u64 *ctx) {
    return Received((const struct sk_buff *)ctx[0]);
}

SEC("tp_btf/napi_gro_receive_entry")
int ReceivedMerging(__u64 *ctx) {
    return Received((const struct sk_buff *)ctx[0]);
}

SEC("tp_btf/napi_gro_frags_entry")
int ReceivedFragments(__u64 *ctx) {
    return Received((const struct sk_buff *)ctx[0]);
}
