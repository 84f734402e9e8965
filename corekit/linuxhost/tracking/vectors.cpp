#include "corekit/linuxhost/tracking/part.h"

#include <algorithm>
#include <cstring>

namespace {

int Map(const Tracking &tracking) {
    return tracking.groups[TRACKING_VECTORS].programs.maps[0];
}

}  // namespace

Outcome VectorWatch(Tracking *tracking, u32 irq) {
    Outcome outcome = GroupNeed(tracking, TRACKING_VECTORS);
    if (outcome != FINE || tracking->vectors.count(irq) != 0) {
        return outcome;
    }
    tracking->buffer.assign(sizeof(VectorRow) * tracking->cpus.size(), 0);
    int error = MapUpdate(Map(*tracking), &irq, tracking->buffer.data(), BPF_ANY);
    if (error == 0) {
        tracking->vectors.insert(irq);
        return FINE;
    }
    if (tracking->vectors.empty()) {
        GroupClose(tracking, TRACKING_VECTORS);
    }
    return error == -E2BIG ? Fail(tracking, BROKEN, std::to_string(VECTORS_MOST) + " interrupts are the most")
                           : FailWith(tracking, error, "interrupts");
}

Outcome VectorRead(Tracking *tracking, u32 irq, u32 cpus, VectorSamples *samples) {
    std::fill(samples, samples + cpus, VectorSamples());
    if (tracking->vectors.count(irq) == 0) {
        return Fail(tracking, GONE, "not watched");
    }
    if (int error = MapLookupCpus(tracking, Map(*tracking), &irq, sizeof(VectorRow)); error != 0) {
        return FailWith(tracking, error, "interrupts");
    }
    const char *place = tracking->buffer.data();
    for (u32 cpu : tracking->cpus) {
        VectorRow row;
        memcpy(&row, place, sizeof row);
        place += sizeof row;
        if (cpu < cpus) {
            samples[cpu] = {row.count, row.time};
        }
    }
    return FINE;
}

void VectorUnwatch(Tracking *tracking, u32 irq) {
    if (tracking->vectors.erase(irq) != 0) {
        MapDelete(Map(*tracking), &irq);
        if (tracking->vectors.empty()) {
            GroupClose(tracking, TRACKING_VECTORS);
        }
    }
}
