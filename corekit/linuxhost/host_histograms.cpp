// Histograms of ports, which the kernel counts for this process alone from the first start on. It counts only upwards:
// a reset forgets what was read until then.
#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"

#include <algorithm>

namespace {

// How histograms of a family stand in their records.
struct Family {
    const __u64 *limits;  // in the kernel's unit
    u32 count;
    u64 unit;  // so many of the kernel's make one of the record's
};
constexpr __u64 CLUSTER_LIMITS[] = {1, 2, 3, 4, 6, 8, 12, 16, 24, 32, 48, 64, 96, 128};
constexpr Family CLUSTERS = {CLUSTER_LIMITS, std::size(CLUSTER_LIMITS), 1};
const Family FAMILIES[PORT_FAMILIES] = {{SIZE_LIMITS, SIZE_BUCKETS - 1, 1},
                                        {INTERVAL_LIMITS, INTERVAL_BUCKETS - 1, NANOSECONDS}};

// Adds what the kernel has counted since it was last asked. What it can't tell stays as it was.
void Collect(LinuxHost *host, PortFamily family, PortHistogram *histogram) {
    PortSamples now = {};
    const OnDemand &demand = host->demand;
    if (!histogram->running || demand.table->portRead(demand.tracking, &histogram->port, family, &now) != FINE) {
        return;
    }
    PortSamples *since = &histogram->since;
    if (now.max != 0) {
        since->min = since->max == 0 ? now.min : std::min(since->min, now.min);
        since->max = std::max(since->max, now.max);
    }
    since->count += now.count - histogram->last.count;
    since->sum += now.sum - histogram->last.sum;
    for (u32 bucket = 0; bucket < BUCKETS; bucket++) {
        since->buckets[bucket] += now.buckets[bucket] - histogram->last.buckets[bucket];
    }
    histogram->last = now;
    histogram->readAt = host->now();
}

void Stop(LinuxHost *host, PortFamily family, PortHistogram *histogram) {
    if (histogram->running) {
        Collect(host, family, histogram);
        host->demand.table->portStop(host->demand.tracking, &histogram->port, family);
        histogram->running = false;
        histogram->last = {};
    }
}

// A reader resets behind each read: what came between the two belongs to the next span.
void Reset(LinuxHost *host, PortFamily family, PortHistogram *histogram) {
    if (host->now() - histogram->readAt > PASS_FLOOR) {
        Collect(host, family, histogram);
    }
    histogram->since = {};
}

// What these receive, their driver hands to the stack in the name of the interface below.
bool IsBlind(const Link &link) {
    return link.kind == KIND_VLAN || link.kind == KIND_TEAM || link.kind == KIND_MACVLAN || link.kind == KIND_MACVTAP;
}

// The histograms of an interface as it is now; those of another one of its index end.
PortHistograms *Begin(LinuxHost *host, const Link &link) {
    PortHistograms *port = &host->demand.ports[link.index];
    if (port->birth == link.birth) {
        return port;
    }
    for (u32 family = 0; family < PORT_FAMILIES; family++) {
        for (u32 side = 0; side < HISTOGRAM_SIDES; side++) {
            PortHistogram *histogram = &port->of[family][side];
            bool receives = (side == HISTOGRAM_INPUT) == HostSeenFromOutside(link);
            Stop(host, static_cast<PortFamily>(family), histogram);
            *histogram = PortHistogram();
            histogram->port = {HostNetwork(host), link.index, receives ? PORT_RECEIVES : PORT_SENDS};
            histogram->blind = receives && IsBlind(link);
        }
    }
    port->birth = link.birth;
    return port;
}

// A histogram that can't be counted is served without samples, and that is said: a port that fails is lost for good.
KnfStatus Start(LinuxHost *host, PortFamily family, PortHistogram *histogram) {
    if (histogram->blind) {
        TellOnce(
            &host->toldBlind,
            "corekit: what VLANs, bonds, teams, macvlans and macvtaps receive can't be seen: these histograms stay empty\n");
        return STATUS_OK;
    }
    const TrackingTable *table = HostTracking(host);
    Outcome outcome = UNSUPPORTED;
    if (table != nullptr && histogram->port.netns != 0) {
        outcome = table->portStart(host->demand.tracking, &histogram->port, family);
    }
    histogram->running = outcome == FINE;
    if (outcome != FINE) {
        HostTellRefusal(host, "histograms of ports");
    } else if (histogram->port.index != NO_INTERFACE) {
        TrackedPort nobody = {histogram->port.netns, NO_INTERFACE, PORT_SENDS};
        table->portStop(host->demand.tracking, &nobody, PORT_SIZES);
    }
    return StatusOf(outcome);
}

// The port of these two keys, if it was started; it may have gone since.
PortHistograms *StartedOf(LinuxHost *host, const Params &keys) {
    int64_t index = keys[1].number;
    auto found =
        index > 0 && index <= UINT32_MAX ? host->demand.ports.find(static_cast<u32>(index)) : host->demand.ports.end();
    return found != host->demand.ports.end() ? &found->second : nullptr;
}

// Operations on what was started never fail, wherever the port has gone.
KnfStatus Operate(LinuxHost *host, const Params &keys, const Params &input, PortFamily family) {
    constexpr const char *SIDES[HISTOGRAM_SIDES] = {"input", "output"};
    auto side = input.size() == 2 ? std::find(std::begin(SIDES), std::end(SIDES), input[1].text) : std::end(SIDES);
    if (side == std::end(SIDES) || !input[0].isText) {
        return STATUS_BAD_PARAM;
    }
    const std::string &operation = input[0].text;
    bool start = operation == "start";
    if (!start && operation != "reset" && operation != "stop") {
        return STATUS_BAD_PARAM;
    }
    const Link *link = start ? HostPort(host, keys) : nullptr;
    PortHistograms *port = link != nullptr ? Begin(host, *link) : start ? nullptr : StartedOf(host, keys);
    if (port == nullptr || family == PORT_FAMILIES) {  // clusters have nothing that runs
        return port == nullptr ? STATUS_NOT_FOUND : STATUS_OK;
    }
    PortHistogram *histogram = &port->of[family][side - std::begin(SIDES)];
    if (start) {
        return histogram->running ? STATUS_OK : Start(host, family, histogram);
    }
    operation == "stop" ? Stop(host, family, histogram) : Reset(host, family, histogram);
    return STATUS_OK;
}

void PutSamples(const PortSamples &samples, const Family &family, char *record) {
    using namespace histogram;
    Put(record, MIN, samples.min / family.unit);
    Put(record, MAX, samples.max / family.unit);
    Put(record, MEAN, samples.count != 0 ? samples.sum / samples.count / family.unit : 0);
    Put(record, COUNT, samples.count);
    for (u32 bucket = 0; bucket < family.count; bucket++) {
        Put(record, BucketCount(bucket), samples.buckets[bucket]);
        Put(record, BucketLimit(bucket), family.limits[bucket] / family.unit);
    }
    Put(record, BucketCount(family.count), samples.buckets[family.count]);
}

// Null as well when the port left its switch, or is another one by now.
PortHistograms *ReadOf(LinuxHost *host, const Params &keys) {
    const Link *link = HostPort(host, keys);
    PortHistograms *port = link != nullptr ? StartedOf(host, keys) : nullptr;
    return port != nullptr && port->birth == link->birth ? port : nullptr;
}

KnfStatus SamplesGet(LinuxHost *host, const Params &keys, PortFamily family, HistogramSide side, char *record) {
    PortHistograms *port = ReadOf(host, keys);
    if (port == nullptr) {
        return STATUS_NOT_FOUND;
    }
    Collect(host, family, &port->of[family][side]);
    PutSamples(port->of[family][side].since, FAMILIES[family], record);
    return STATUS_OK;
}

}  // namespace

bool HostTakesHistograms(LinuxHost *host) {
    OnDemand *demand = &host->demand;
    if (!demand->asked) {
        demand->asked = true;
        PortHistogram nobody = {{HostNetwork(host), NO_INTERFACE, PORT_SENDS}};
        demand->histograms = Start(host, PORT_SIZES, &nobody) == STATUS_OK;
    }
    return demand->histograms;
}

KnfStatus ClustersSet(LinuxHost *host, const Params &keys, const Params &input) {
    return Operate(host, keys, input, PORT_FAMILIES);
}

KnfStatus SizesSet(LinuxHost *host, const Params &keys, const Params &input) {
    return Operate(host, keys, input, PORT_SIZES);
}

KnfStatus IntervalsSet(LinuxHost *host, const Params &keys, const Params &input) {
    return Operate(host, keys, input, PORT_INTERVALS);
}

// Linux hands packets over one by one.
KnfStatus ClustersGet(LinuxHost *host, const Params &keys, char *record) {
    PutSamples({}, CLUSTERS, record);
    return ReadOf(host, keys) != nullptr ? STATUS_OK : STATUS_NOT_FOUND;
}

KnfStatus SizesInGet(LinuxHost *host, const Params &keys, char *record) {
    return SamplesGet(host, keys, PORT_SIZES, HISTOGRAM_INPUT, record);
}

KnfStatus SizesOutGet(LinuxHost *host, const Params &keys, char *record) {
    return SamplesGet(host, keys, PORT_SIZES, HISTOGRAM_OUTPUT, record);
}

KnfStatus IntervalsInGet(LinuxHost *host, const Params &keys, char *record) {
    return SamplesGet(host, keys, PORT_INTERVALS, HISTOGRAM_INPUT, record);
}

KnfStatus IntervalsOutGet(LinuxHost *host, const Params &keys, char *record) {
    return SamplesGet(host, keys, PORT_INTERVALS, HISTOGRAM_OUTPUT, record);
}
