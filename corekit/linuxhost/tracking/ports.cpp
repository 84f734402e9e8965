#include "corekit/linuxhost/tracking/part.h"

#include <algorithm>
#include <cstring>
#include <numeric>
#include <sys/mman.h>
#include <tuple>

namespace {

enum { MAP_ROWS, MAP_SLOTS };  // in the order of packets.bpf.c

int Map(const Tracking &tracking, u32 map) {
    return tracking.groups[TRACKING_PACKETS].programs.maps[map];
}

// The kernel reads what is written here while it counts.
template <typename Number>
void Order(Number *where, Number value) {
    __atomic_store_n(where, value, __ATOMIC_RELEASE);
}

constexpr size_t SLOTS_SIZE = PORT_SLOTS * sizeof(PortSlot);

void CloseUnused(Tracking *tracking) {
    if (tracking->ports.empty()) {
        if (tracking->slots != nullptr) {
            munmap(tracking->slots, SLOTS_SIZE);
        }
        tracking->slots = nullptr;
        GroupClose(tracking, TRACKING_PACKETS);
    }
}

Outcome Open(Tracking *tracking) {
    if (Outcome outcome = GroupNeed(tracking, TRACKING_PACKETS); outcome != FINE || tracking->slots != nullptr) {
        return outcome;
    }
    tracking->slots = static_cast<PortSlot *>(MapShare(Map(*tracking, MAP_SLOTS), SLOTS_SIZE));
    tracking->freeSlots.resize(PORT_SLOTS);
    std::iota(tracking->freeSlots.begin(), tracking->freeSlots.end(), 0);
    return tracking->slots != nullptr ? FINE : FailWith(tracking, -errno, "packets");
}

// A row of zeros for each CPU.
int Insert(Tracking *tracking, const TrackedPort &port, u32 slot) {
    tracking->slots[slot] = PortSlot();
    PortRow row = {};
    row.slot = slot;
    tracking->buffer.resize(sizeof row * tracking->cpus.size());
    for (size_t i = 0; i < tracking->cpus.size(); i++) {
        memcpy(tracking->buffer.data() + i * sizeof row, &row, sizeof row);
    }
    return MapUpdate(Map(*tracking, MAP_ROWS), &port, tracking->buffer.data(), BPF_ANY);
}

Outcome Watch(Tracking *tracking, const TrackedPort &port, WatchedPort **watched) {
    auto found = tracking->ports.find(port);
    if (found == tracking->ports.end()) {
        if (tracking->freeSlots.empty()) {
            return Fail(tracking, BROKEN, std::to_string(PORT_SLOTS / 2) + " ports are the most");
        }
        u32 slot = tracking->freeSlots.front();
        if (int error = Insert(tracking, port, slot); error != 0) {
            return FailWith(tracking, error, "packets");
        }
        tracking->freeSlots.pop_front();
        found = tracking->ports.emplace(port, WatchedPort{slot, {}}).first;
        FilterAdmit(tracking, TRACKING_PACKETS, port.index, true);
    }
    *watched = &found->second;
    return FINE;
}

void Unwatch(Tracking *tracking, std::map<TrackedPort, WatchedPort, PortBefore>::iterator port) {
    FilterAdmit(tracking, TRACKING_PACKETS, port->first.index, false);
    MapDelete(Map(*tracking, MAP_ROWS), &port->first);
    tracking->freeSlots.push_back(port->second.slot);
    tracking->ports.erase(port);
    CloseUnused(tracking);
}

void Merge(const Extremes &span, u32 epoch, PortSamples *samples, bool *any) {
    if (span.epoch == epoch) {
        samples->min = *any ? std::min(samples->min, u64{span.min}) : u64{span.min};
        samples->max = std::max(samples->max, u64{span.max});
        *any = true;
    }
}

// The sum over all CPUs since the row was made. Ends the epoch.
Outcome ReadRow(Tracking *tracking, const TrackedPort &port, u32 slot, PortFamily family, PortSamples *samples) {
    u32 epoch = tracking->slots[slot].epochs[family];
    Order(&tracking->slots[slot].epochs[family], epoch + 1);
    if (int error = MapLookupCpus(tracking, Map(*tracking, MAP_ROWS), &port, sizeof(PortRow)); error != 0) {
        return FailWith(tracking, error, "packets");
    }
    *samples = {};
    bool any = false;
    for (size_t i = 0; i < tracking->cpus.size(); i++) {
        PortRow row;
        memcpy(&row, tracking->buffer.data() + i * sizeof row, sizeof row);
        const PortCounts &counts = row.families[family];
        samples->sum += counts.sum;
        for (u32 bucket = 0; bucket < BUCKETS; bucket++) {
            samples->buckets[bucket] += counts.buckets[bucket];
        }
        Merge(counts.spans[epoch & 1], epoch, samples, &any);
    }
    return FINE;
}

}  // namespace

bool PortBefore::operator()(const TrackedPort &left, const TrackedPort &right) const {
    return std::tie(left.netns, left.index, left.direction) < std::tie(right.netns, right.index, right.direction);
}

Outcome PortStart(Tracking *tracking, const TrackedPort *port, PortFamily family) {
    WatchedPort *watched = nullptr;
    Outcome outcome = Open(tracking);
    if (outcome == FINE) {
        outcome = Watch(tracking, *port, &watched);
    }
    if (watched == nullptr) {
        CloseUnused(tracking);
        return outcome;
    }
    PortSlot *slot = &tracking->slots[watched->slot];
    if ((slot->wants & 1U << family) != 0) {
        return FINE;
    }
    PortSamples before = {};
    outcome = ReadRow(tracking, *port, watched->slot, family, &before);
    if (outcome == FINE) {
        watched->bases[family].sum = before.sum;
        std::copy(std::begin(before.buckets), std::end(before.buckets), watched->bases[family].buckets);
        if (family == PORT_INTERVALS) {
            Order(&slot->last, __u64{0});
        }
        Order(&slot->wants, slot->wants | 1U << family);
    } else if (slot->wants == 0) {
        Unwatch(tracking, tracking->ports.find(*port));
    }
    return outcome;
}

Outcome PortRead(Tracking *tracking, const TrackedPort *port, PortFamily family, PortSamples *samples) {
    auto found = tracking->ports.find(*port);
    if (found == tracking->ports.end() || (tracking->slots[found->second.slot].wants & 1U << family) == 0) {
        return Fail(tracking, GONE, "not watched");
    }
    Outcome outcome = ReadRow(tracking, *port, found->second.slot, family, samples);
    const PortCounts &base = found->second.bases[family];
    samples->sum -= base.sum;
    for (u32 bucket = 0; bucket < BUCKETS; bucket++) {
        samples->buckets[bucket] -= base.buckets[bucket];
        samples->count += samples->buckets[bucket];
    }
    return outcome;
}

void PortStop(Tracking *tracking, const TrackedPort *port, PortFamily family) {
    auto found = tracking->ports.find(*port);
    if (found == tracking->ports.end()) {
        return;
    }
    PortSlot *slot = &tracking->slots[found->second.slot];
    Order(&slot->wants, slot->wants & ~(1U << family));
    if (slot->wants == 0) {
        Unwatch(tracking, found);
    }
}

void PortsClose(Tracking *tracking) {
    tracking->ports.clear();
    CloseUnused(tracking);
}
