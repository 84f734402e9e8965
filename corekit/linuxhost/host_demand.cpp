// What the kernel counts for this process alone, from the first time that somebody asks until the process ends: the
// part that does it, periods of vcpus, and migrations between caches.
#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"

#include <algorithm>
#include <sched.h>
#include <sys/stat.h>

namespace {

enum VcpuPeriod : u32 { PERIOD_COSTOP = PERIODS };  // one more, which Linux does not have

// The histograms of a thread that was listed, which are counted from its first read on.
Outcome ReadPeriods(LinuxHost *host, u32 tid, u32 period, const ThreadSamples **samples) {
    OnDemand *demand = &host->demand;
    auto [found, added] = demand->vcpus.try_emplace(tid);
    Outcome outcome = added ? demand->table->threadWatch(demand->tracking, tid) : FINE;
    if (outcome != FINE) {
        demand->vcpus.erase(found);
        return outcome;
    }
    if (added) {
        demand->table->threadUnwatch(demand->tracking, NO_THREAD);
    }
    VcpuPeriods *vcpu = &found->second;
    if (PassJoin(&vcpu->pass, &vcpu->served[period], host->now())) {
        outcome = demand->table->threadRead(demand->tracking, tid, &vcpu->samples);
    }
    *samples = &vcpu->samples;
    return outcome;
}

void PutPeriods(const PeriodSamples &samples, char *record) {
    using namespace histogram;
    Put(record, COUNT, samples.count);
    for (u32 bucket = 0; bucket < PERIOD_BUCKETS; bucket++) {
        u64 limit = bucket < PERIOD_BUCKETS - 1 ? PERIOD_LIMITS[bucket] / NANOSECONDS : UINT64_MAX;
        Put(record, BucketCount(bucket), samples.buckets[bucket]);
        Put(record, BucketLimit(bucket), limit);
    }
}

KnfStatus TrackPeriods(LinuxHost *host, bool on) {
    OnDemand *demand = &host->demand;
    Outcome outcome = FINE;
    if (on && !demand->periods) {
        const TrackingTable *table = HostTracking(host);
        outcome = table != nullptr ? table->threadWatch(demand->tracking, NO_THREAD) : UNSUPPORTED;
    }
    if (outcome != FINE) {
        HostTellRefusal(host, "histograms of vcpus");
        return StatusOf(outcome);
    }
    if (!on && demand->periods) {
        demand->vcpus.try_emplace(NO_THREAD);
        for (const auto &[tid, vcpu] : demand->vcpus) {
            demand->table->threadUnwatch(demand->tracking, tid);
        }
        demand->vcpus.clear();
    }
    demand->periods = on;
    return STATUS_OK;
}

// Whether all CPUs that the thread may run on share their last-level cache.
bool IsBoundInside(const CpuTopology &topology, u32 tid) {
    cpu_set_t allowed[8] = {};
    u32 inside = NO_CPU;
    if (sched_getaffinity(static_cast<pid_t>(tid), sizeof allowed, allowed) != 0) {
        return false;
    }
    for (u32 cpu = 0; cpu < std::min<size_t>(topology.cpus, 8 * sizeof allowed); cpu++) {
        u32 cache = CPU_ISSET_S(cpu, sizeof allowed, allowed) ? topology.lastCache[cpu] : NO_CPU;
        if (cache != NO_CPU && inside != NO_CPU && cache != inside) {
            return false;
        }
        inside = cache != NO_CPU ? cache : inside;
    }
    return true;
}

// A thread that may leave its cache is watched from the first read on that finds it so.
bool WatchMoves(LinuxHost *host, const CpuTopology &topology, u32 tid) {
    OnDemand *demand = &host->demand;
    if (demand->movers.contains(tid)) {
        return true;
    }
    if (demand->movesRefused || IsBoundInside(topology, tid)) {
        return false;
    }
    const TrackingTable *table = HostTracking(host);
    Outcome outcome = UNSUPPORTED;
    if (table != nullptr && demand->movers.empty()) {
        outcome = table->movesCaches(demand->tracking, topology.lastCache.data(), topology.cpus);
    } else if (table != nullptr) {
        outcome = FINE;
    }
    outcome = outcome == FINE ? table->movesWatch(demand->tracking, tid) : outcome;
    demand->movesRefused = outcome == UNSUPPORTED || outcome == REFUSED;
    return outcome == FINE && demand->movers.insert(tid).second;
}

}  // namespace

const TrackingTable *HostTracking(LinuxHost *host) {
    OnDemand *demand = &host->demand;
    if (!demand->opened) {
        demand->opened = true;
        demand->table = TrackingOpen(&demand->reason);
        demand->tracking = demand->table != nullptr ? demand->table->open() : nullptr;
        demand->table = demand->tracking != nullptr ? demand->table : nullptr;
    }
    return demand->table;
}

void HostTrackingClose(LinuxHost *host) {
    if (host->demand.table != nullptr) {
        host->demand.table->close(host->demand.tracking);
    }
    host->demand = OnDemand();
}

Outcome HostAsk(LinuxHost *host, TrackingGroup group) {
    const TrackingTable *table = HostTracking(host);
    return table != nullptr ? table->ask(host->demand.tracking, group) : UNSUPPORTED;
}

void HostTellRefusal(LinuxHost *host, const char *what) {
    const OnDemand &demand = host->demand;
    const char *reason = demand.table != nullptr ? demand.table->reason(demand.tracking) : demand.reason;
    TellOnce(&host->toldRefusal, "corekit: %s can't be counted: %s\n", what, reason);
}

u32 HostNetwork(LinuxHost *host) {
    struct stat place = {};
    if (host->demand.netns == 0 && fstatat(host->root.proc, "self/ns/net", &place, 0) == 0) {
        host->demand.netns = static_cast<u32>(place.st_ino);
    }
    return host->demand.netns;
}

u64 HostCacheMoves(LinuxHost *host, u32 tid) {
    const CpuTopology *topology = HostTopology(host);
    u64 moves = 0;
    if (topology != nullptr && topology->lastCaches > 1 && WatchMoves(host, *topology, tid)) {
        host->demand.table->movesRead(host->demand.tracking, tid, &moves);
    }
    return moves;
}

KnfStatus OptionSet(LinuxHost *host, const Params &keys, const Params &input) {
    if (keys[0].text != "Cpu" || keys[1].text != "TrackHistos") {
        return STATUS_NOT_WRITABLE;
    }
    bool valid = input.size() == 1 && !input[0].isText && (input[0].number == 0 || input[0].number == 1);
    return valid ? TrackPeriods(host, input[0].number != 0) : STATUS_BAD_PARAM;
}

KnfStatus VcpuHistoGet(LinuxHost *host, const Params &keys, char *record) {
    constexpr const char *KINDS[] = {"RUN", "READY", "WAIT", "COSTOP"};  // as ThreadPeriod and VcpuPeriod
    const auto *kind = std::find(std::begin(KINDS), std::end(KINDS), keys[1].text);
    bool listed = keys[0].number > 0 && keys[0].number <= INT32_MAX &&
                  host->uses.find(static_cast<u32>(keys[0].number)) != host->uses.end();
    if (!host->demand.periods || kind == std::end(KINDS) || !listed) {
        return STATUS_NOT_FOUND;
    }
    auto period = static_cast<u32>(kind - std::begin(KINDS));
    const ThreadSamples *samples = nullptr;
    Outcome outcome = ReadPeriods(host, static_cast<u32>(keys[0].number), period, &samples);
    if (outcome == FINE) {
        PutPeriods(period == PERIOD_COSTOP ? PeriodSamples() : samples->periods[period], record);
    }
    return StatusOf(outcome);
}
