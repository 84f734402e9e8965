// Figures of all vcpus by one walk of the kernel over its threads, where so many are watched that it pays.
#include "corekit/linuxhost/host.h"

#include <algorithm>
#include <ctime>

namespace {

// A walk takes about 17 us and 0.15 us a thread of the host, and 3 ms once. A vcpu's files take 1.7 us a pass and more
// on a busy host, and 20 us once. So it pays for a single report from about 130 vcpus on, unless threads that nobody
// asks for are many.
constexpr u32 WALK_FROM = 128;
constexpr u32 WALK_SHARE = 12;  // of all threads one in so many must be watched

u64 BootTime() {
    timespec now = {};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return static_cast<u64>(now.tv_sec) * 1000000000 + static_cast<u64>(now.tv_nsec);
}

// A later thread of the same number, or of another process, is another one.
void Take(LinuxHost *host, const TaskSamples &task, u64 now) {
    auto found = host->uses.find(task.tid);
    ThreadUse *use = found != host->uses.end() ? &found->second : nullptr;
    if (use == nullptr || !use->vcpu || use->pid != task.pid || (use->walked != 0 && use->born != task.born)) {
        return;
    }
    use->born = task.born;
    use->walked = host->demand.walk.generation;
    use->row.known = THREAD_TIMES | THREAD_MIGRATIONS;
    use->row.run = task.run;
    use->row.ready = task.ready;
    use->row.runs = task.runs;
    use->row.life = now - std::min(now, task.born);
    use->row.migrations = task.migrations;
}

// When the kernel does not tell, all stays as last told.
void Walk(LinuxHost *host) {
    OnDemand *demand = &host->demand;
    const TaskSamples *tasks = nullptr;
    u32 count = 0;
    u64 now = BootTime();
    if (demand->table->tasksRead(demand->tracking, 0, &tasks, &count) == FINE) {
        for (u32 i = 0; i < count; i++) {
            Take(host, tasks[i], now);
        }
        return;
    }
    for (auto &[tid, use] : host->uses) {
        use.walked = use.walked != 0 ? demand->walk.generation : 0;
    }
}

bool WalkPays(LinuxHost *host) {
    auto listed = static_cast<u32>(
        std::count_if(host->uses.begin(), host->uses.end(), [](const auto &use) { return use.second.vcpu; }));
    const TrackingTable *table = listed >= WALK_FROM ? HostTracking(host) : nullptr;
    const TaskSamples *tasks = nullptr;
    u32 count = 0;
    if (table == nullptr || table->tasksRead(host->demand.tracking, 0, &tasks, &count) != FINE) {
        return false;
    }
    bool pays = count != 0 && (tasks->known & TASK_READY) != 0 && count / WALK_SHARE <= listed;
    if (!pays) {
        table->tasksEnd(host->demand.tracking);
    }
    return pays;
}

}  // namespace

bool HostWalks(LinuxHost *host) {
    OnDemand *demand = &host->demand;
    if (!demand->walkDecided) {
        demand->walkDecided = true;
        demand->walks = WalkPays(host);
    }
    return demand->walks;
}

Outcome HostReadWalked(LinuxHost *host, ThreadUse *use, u32 *served, const ThreadRow **row) {
    OnDemand *demand = &host->demand;
    if (PassJoin(&demand->walk, served, host->now()) || use->walked == 0) {
        Walk(host);
    }
    *row = &use->row;
    return use->walked == demand->walk.generation ? FINE : GONE;
}
