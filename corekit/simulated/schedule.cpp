#include "corekit/simulated/host_nodes.h"

#include <algorithm>

namespace {

constexpr i64 WHOLE = 1000000;  // microseconds of a second

struct Pcpu {
    Entity *entity;
    i64 asked = 0;  // by what runs nowhere else
    i64 left = WHOLE;
    bool busyStated, worldletStated;
};

struct Schedule {
    Host *host;
    std::vector<Pcpu> pcpus;
    i64 asked = 0;             // by what runs anywhere
    i64 left = 0;              // for them
    std::vector<size_t> open;  // pcpus that have time left
    size_t next = 0;           // of those, the one whose turn it is
};

// Of one vcpu or worldlet.
i64 Used(const PlannedRun &run) {
    return run.isWorldlet ? run.entity->value[USED] / 1000 : run.entity->value[USED];
}

// Who asked for more than there is gets a share, and is ready for the rest of what it asked.
void Scale(const PlannedRun &run, i64 given, i64 asked) {
    i64 *value = run.entity->value;
    i64 unit = run.isWorldlet ? 1000 : 1;
    i64 used = Used(run);
    if (asked > given) {
        i64 share = used * given / asked;
        value[READY] += (used - share) * unit;
        value[USED] = share * unit;
    }
}

void Place(Schedule *schedule, Pcpu *pcpu, const PlannedRun &run, i64 used) {
    pcpu->left -= used;
    if (!pcpu->busyStated) {
        NodesAddRate(schedule->host, pcpu->entity, run.entity->load, USED, used);
    }
    if (run.isWorldlet && !pcpu->worldletStated) {
        NodesAddRate(schedule->host, pcpu->entity, run.entity->load, IN_WORLDLETS, used);
    }
}

// On the pcpus in turn, each vcpu on one as far as that has time for it.
void Spread(Schedule *schedule, const PlannedRun &run) {
    for (i64 i = 0; i < run.count; i++) {
        for (i64 rest = Used(run); rest > 0 && !schedule->open.empty();) {
            schedule->next %= schedule->open.size();
            Pcpu *pcpu = &schedule->pcpus[schedule->open[schedule->next]];
            i64 piece = std::min(rest, pcpu->left);
            Place(schedule, pcpu, run, piece);
            rest -= piece;
            if (pcpu->left == 0) {
                schedule->open[schedule->next] = schedule->open.back();
                schedule->open.pop_back();
            } else {
                schedule->next++;
            }
        }
    }
}

Schedule Collect(Host *host) {
    Schedule schedule = {host, {}, 0, 0, {}, 0};
    for (const auto &[number, entity] : host->pcpus) {
        schedule.pcpus.push_back({entity, 0, WHOLE, entity->value[USED] >= 0, entity->value[IN_WORLDLETS] >= 0});
        entity->value[USED] = std::max<i64>(entity->value[USED], 0);
        entity->value[IN_WORLDLETS] = std::max<i64>(entity->value[IN_WORLDLETS], 0);
    }
    for (PlannedRun &run : host->plan.runs) {
        run.pcpu = run.pcpu < static_cast<i64>(schedule.pcpus.size()) ? run.pcpu : UNSTATED;
        i64 asked = Used(run) * run.count;
        (run.pcpu == UNSTATED ? schedule.asked : schedule.pcpus[static_cast<size_t>(run.pcpu)].asked) += asked;
    }
    return schedule;
}

}  // namespace

void ScheduleSettle(Host *host) {
    Schedule schedule = Collect(host);
    for (const PlannedRun &run : host->plan.runs) {
        if (run.pcpu != UNSTATED) {
            Pcpu *pcpu = &schedule.pcpus[static_cast<size_t>(run.pcpu)];
            Scale(run, WHOLE, pcpu->asked);
            Place(&schedule, pcpu, run, Used(run) * run.count);
        }
    }
    for (size_t i = 0; i < schedule.pcpus.size(); i++) {
        schedule.left += schedule.pcpus[i].left;
        if (schedule.pcpus[i].left > 0) {
            schedule.open.push_back(i);
        }
    }
    for (const PlannedRun &run : host->plan.runs) {
        if (run.pcpu == UNSTATED) {
            Scale(run, schedule.left, schedule.asked);
            Spread(&schedule, run);
        }
    }
    // A worldlet waits whenever it neither runs nor is ready, whatever its load.
    for (const PlannedRun &run : host->plan.runs) {
        if (run.isWorldlet && !run.waitStated) {
            i64 active = run.entity->value[USED] + run.entity->value[READY];
            NodesAddRate(host, run.entity, run.entity->load, WAIT, -active);
            NodesAddRate(host, run.entity, nullptr, WAIT, std::max(active, WHOLE * 1000));
        }
    }
}
