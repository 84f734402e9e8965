#include "corekit/linuxhost/tracking/part.h"

namespace {

enum { MAP_THREADS, MAP_CACHES };  // in the order of runs.bpf.c and moves.bpf.c

int Map(const Tracking &tracking, TrackingGroup group, u32 map) {
    return tracking.groups[group].programs.maps[map];
}

void CloseUnused(Tracking *tracking, TrackingGroup group, const std::unordered_set<u32> &watched) {
    if (watched.empty()) {
        GroupClose(tracking, group);
    }
}

template <typename Row>
Outcome Watch(Tracking *tracking, TrackingGroup group, std::unordered_set<u32> *watched, u32 tid) {
    const Row row = {};
    int error = watched->count(tid) == 0 ? MapUpdate(Map(*tracking, group, MAP_THREADS), &tid, &row, BPF_ANY) : 0;
    if (error == 0) {
        watched->insert(tid);
        return FINE;
    }
    return error == -E2BIG ? Fail(tracking, BROKEN, std::to_string(THREADS_MOST) + " threads are the most")
                           : FailWith(tracking, error, "threads");
}

template <typename Row>
Outcome Read(Tracking *tracking, TrackingGroup group, const std::unordered_set<u32> &watched, u32 tid, Row *row) {
    if (watched.count(tid) == 0) {
        return Fail(tracking, GONE, "not watched");
    }
    int error = MapLookup(Map(*tracking, group, MAP_THREADS), &tid, row);
    return error == 0 ? FINE : FailWith(tracking, error, "threads");
}

void Unwatch(Tracking *tracking, TrackingGroup group, std::unordered_set<u32> *watched, u32 tid) {
    if (watched->erase(tid) != 0) {
        MapDelete(Map(*tracking, group, MAP_THREADS), &tid);
        CloseUnused(tracking, group, *watched);
    }
}

int FillCaches(Tracking *tracking) {
    int error = 0;
    for (u32 cpu = 0; cpu < CPUS_MOST && error == 0 && cpu <= tracking->cpus.back(); cpu++) {
        u32 cache = cpu < tracking->caches.size() ? tracking->caches[cpu] : NO_CACHE;
        error = MapUpdate(Map(*tracking, TRACKING_MOVES, MAP_CACHES), &cpu, &cache, BPF_ANY);
    }
    return error;
}

}  // namespace

Outcome RunWatch(Tracking *tracking, u32 tid) {
    if (tracking->runs.count(tid) != 0) {
        return FINE;
    }
    Outcome outcome = GroupNeed(tracking, TRACKING_RUNS);
    if (outcome == FINE) {
        outcome = Watch<PeriodRow>(tracking, TRACKING_RUNS, &tracking->runs, tid);
    }
    if (outcome == FINE) {
        FilterAdmit(tracking, TRACKING_RUNS, tid, true);
    }
    CloseUnused(tracking, TRACKING_RUNS, tracking->runs);
    return outcome;
}

Outcome RunRead(Tracking *tracking, u32 tid, ThreadSamples *samples) {
    PeriodRow row = {};
    Outcome outcome = Read(tracking, TRACKING_RUNS, tracking->runs, tid, &row);
    *samples = {};
    samples->born = row.born;
    for (u32 i = 0; i < PERIODS; i++) {
        PeriodSamples *period = &samples->periods[i];
        period->sum = row.periods[i].sum;
        for (u32 bucket = 0; bucket < BUCKETS; bucket++) {
            period->buckets[bucket] = row.periods[i].buckets[bucket];
            period->count += period->buckets[bucket];
        }
    }
    return outcome;
}

void RunUnwatch(Tracking *tracking, u32 tid) {
    if (tracking->runs.count(tid) != 0) {
        FilterAdmit(tracking, TRACKING_RUNS, tid, false);
    }
    Unwatch(tracking, TRACKING_RUNS, &tracking->runs, tid);
}

Outcome MovesCaches(Tracking *tracking, const u32 *cacheOfCpu, u32 cpus) {
    tracking->caches.assign(cacheOfCpu, cacheOfCpu + cpus);
    int error = tracking->groups[TRACKING_MOVES].loaded ? FillCaches(tracking) : 0;
    return error == 0 ? FINE : FailWith(tracking, error, "moves");
}

Outcome MovesWatch(Tracking *tracking, u32 tid) {
    Outcome outcome = GroupNeed(tracking, TRACKING_MOVES);
    if (int error = outcome == FINE && tracking->moves.empty() ? FillCaches(tracking) : 0; error != 0) {
        outcome = FailWith(tracking, error, "moves");
    }
    if (outcome == FINE) {
        outcome = Watch<MoveRow>(tracking, TRACKING_MOVES, &tracking->moves, tid);
    }
    CloseUnused(tracking, TRACKING_MOVES, tracking->moves);
    return outcome;
}

Outcome MovesRead(Tracking *tracking, u32 tid, u64 *moves) {
    MoveRow row = {};
    Outcome outcome = Read(tracking, TRACKING_MOVES, tracking->moves, tid, &row);
    *moves = row.moves;
    return outcome;
}

void MovesUnwatch(Tracking *tracking, u32 tid) {
    Unwatch(tracking, TRACKING_MOVES, &tracking->moves, tid);
}
