#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"

#include <algorithm>
#include <unistd.h>

namespace {

// Which node of a thread is read: each is an instance of its own.
enum ThreadNode : u8 { THREAD_STATES, THREAD_EVENTS, THREAD_MOVES, THREAD_CACHE_MOVES };

constexpr u32 NO_WORLDLET = 0xffffffff;

Threads *OpenThreads(LinuxHost *host) {
    if (!host->threadsOpen) {
        host->threadsOpen = ThreadsOpen(&host->threads, &host->root, true) == FINE;
    }
    return host->threadsOpen ? &host->threads : nullptr;
}

// A thread that was watched at some time. Its nodes are read one after another.
ThreadUse *UseOf(LinuxHost *host, int64_t id) {
    if (host->use == nullptr || host->use->tid != id) {
        auto found = id > 0 && id <= INT32_MAX ? host->uses.find(static_cast<u32>(id)) : host->uses.end();
        host->use = found != host->uses.end() ? &found->second : nullptr;
    }
    return host->use;
}

// Of what is not watched, which spares each read of a vcpu the call.
bool IsSelf(LinuxHost *host, int64_t id) {
    return UseOf(host, id) == nullptr && id == getpid();
}

Outcome Watch(LinuxHost *host, ThreadUse *use, u32 wanted) {
    Threads *threads = OpenThreads(host);
    use->opened = true;
    return threads != nullptr ? ThreadWatch(threads, use->pid, use->tid, wanted) : UNSUPPORTED;
}

// A thread that is going to be read. One of another process is another one.
ThreadUse *List(LinuxHost *host, u32 pid, u32 tid, bool vcpu) {
    ThreadUse *use = &host->uses[tid];
    if (use->pid != pid) {
        *use = ThreadUse();
        use->tid = tid;
        use->pid = pid;
    }
    use->vcpu = use->vcpu || vcpu;
    use->opened = false;  // one that ended may have come again
    use->walked = 0;
    return use;
}

Outcome ReadThread(LinuxHost *host, int64_t id, ThreadNode node, const ThreadRow **row) {
    Threads *threads = OpenThreads(host);
    ThreadUse *use = UseOf(host, id);
    if (threads == nullptr || use == nullptr) {
        return threads == nullptr ? UNSUPPORTED : GONE;
    }
    if (use->vcpu && HostWalks(host)) {
        return HostReadWalked(host, use, &use->served[node], row);
    }
    if (!use->opened) {
        if (Outcome outcome = Watch(host, use, THREAD_TIMES | THREAD_MIGRATIONS); outcome != FINE) {
            return outcome;
        }
    }
    PassJoin(&use->pass, &use->served[node], host->now());
    return ThreadRead(threads, use->tid, use->pass.generation, row);
}

// A vcpu that was listed. Of the calling process itself only the times are of use to anyone: what else there is to ask
// of a vcpu is 0 and costs nothing.
Outcome ReadVcpu(LinuxHost *host, int64_t id, ThreadNode node, const ThreadRow **row) {
    static const ThreadRow NOTHING = {};
    if (IsSelf(host, id)) {
        *row = &NOTHING;
        return FINE;
    }
    return ReadThread(host, id, node, row);
}

// The guest behind an id that stands for it; null unless its vcpus can be told.
const Guest *GuestOf(LinuxHost *host, int64_t id) {
    if (HostScan(host) != FINE) {
        return nullptr;
    }
    const std::vector<Guest> &guests = host->guests.guests;
    auto at = std::lower_bound(guests.begin(), guests.end(), id,
                               [](const Guest &guest, int64_t pid) { return guest.pid < pid; });
    return at != guests.end() && at->pid == id && !at->vcpus.empty() ? &*at : nullptr;
}

// Leader, cartel and group of a guest are all its process.
KnfStatus ChainGet(LinuxHost *host, const Params &keys, FieldLayout field, char *record) {
    const Guest *guest = GuestOf(host, keys[0].number);
    if (guest == nullptr) {
        return STATUS_NOT_FOUND;
    }
    Put(record, field, guest->pid);
    return STATUS_OK;
}

void AddWorker(LinuxHost *host, const std::string &name, const WorkerThread &thread, Params *entries) {
    if (host->workers.insert_or_assign(name, thread).second) {
        entries->push_back(ParamOf(name));
    }
}

// The kernel gives all transmit threads of some drivers one name: those bear their number behind it.
void AddNicThreads(LinuxHost *host, Params *entries) {
    std::unordered_map<std::string, u32> times;
    for (const WorkerThread &thread : host->guests.nics) {
        times[thread.name]++;
    }
    for (const WorkerThread &thread : host->guests.nics) {
        std::string name = thread.name;
        if (times[thread.name] > 1) {
            name.append("/").append(std::to_string(thread.tid));
        }
        AddWorker(host, name, thread, entries);
    }
}

}  // namespace

KnfStatus CartelGet(LinuxHost *host, const Params &keys, char *record) {
    return ChainGet(host, keys, vcpu_chain::CARTEL, record);
}

KnfStatus GroupGet(LinuxHost *host, const Params &keys, char *record) {
    return ChainGet(host, keys, vcpu_chain::GROUP, record);
}

KnfStatus LeaderGet(LinuxHost *host, const Params &keys, char *record) {
    return ChainGet(host, keys, vcpu_chain::LEADER, record);
}

KnfStatus VcpuList(LinuxHost *host, const Params &keys, Params *entries) {
    const Guest *guest = GuestOf(host, keys[0].number);
    if (guest == nullptr) {
        return STATUS_NOT_FOUND;
    }
    for (u32 tid : guest->vcpus) {
        List(host, guest->pid, tid, true);
        entries->push_back(ParamOf(int64_t{tid}));
    }
    return STATUS_OK;
}

KnfStatus VcpuTimesGet(LinuxHost *host, const Params &keys, char *record) {
    if (IsSelf(host, keys[0].number)) {
        SelfRow self = SelfRead();
        Put(record, vcpu_times::ELAPSED, self.elapsed / NANOSECONDS);
        Put(record, vcpu_times::USED, self.run / NANOSECONDS);
        return STATUS_OK;
    }
    const ThreadRow *row = nullptr;
    Outcome outcome = ReadVcpu(host, keys[0].number, THREAD_STATES, &row);
    if (outcome == FINE && (row->known & THREAD_TIMES) == 0) {
        outcome = UNSUPPORTED;
    }
    if (outcome == FINE) {
        Put(record, vcpu_times::ELAPSED, row->life / NANOSECONDS);
        Put(record, vcpu_times::USED, row->run / NANOSECONDS);
        Put(record, vcpu_times::READY, row->ready / NANOSECONDS);
    }
    return StatusOf(outcome);
}

// Nothing here counts what the record holds; it is served so that the times and migrations beside it are.
KnfStatus VcpuEventsGet(LinuxHost *host, const Params &keys, char * /*record*/) {
    const ThreadRow *row = nullptr;
    return StatusOf(ReadVcpu(host, keys[0].number, THREAD_EVENTS, &row));
}

KnfStatus VcpuMigrationsGet(LinuxHost *host, const Params &keys, char *record) {
    const ThreadRow *row = nullptr;
    Outcome outcome = ReadVcpu(host, keys[0].number, THREAD_MOVES, &row);
    if (outcome == FINE) {
        Put(record, vcpu_migrations::COUNT, row->migrations);
    }
    return StatusOf(outcome);
}

KnfStatus VcpuCacheMigrationsGet(LinuxHost *host, const Params &keys, char *record) {
    const ThreadRow *row = nullptr;
    if (keys[1].text != "L3") {
        return STATUS_NOT_FOUND;
    }
    Outcome outcome = ReadVcpu(host, keys[0].number, THREAD_CACHE_MOVES, &row);
    if (outcome == FINE && !IsSelf(host, keys[0].number)) {
        Put(record, vcpu_migrations::COUNT, HostCacheMoves(host, static_cast<u32>(keys[0].number)));
    }
    return StatusOf(outcome);
}

KnfStatus WorldletList(LinuxHost *host, const Params & /*keys*/, Params *entries) {
    if (Outcome outcome = HostScan(host); outcome != FINE) {
        return StatusOf(outcome);
    }
    host->workers.clear();
    for (const Guest &guest : host->guests.guests) {
        for (const WorkerThread &thread : guest.vhost) {
            std::string owner = std::to_string(guest.pid);
            AddWorker(host, "NetWdt-Async-" + owner + "-vhost-" + std::to_string(thread.tid), thread, entries);
        }
    }
    AddNicThreads(host, entries);
    return STATUS_OK;
}

KnfStatus WorldletGet(LinuxHost *host, const Params &keys, char *record) {
    using namespace worldlet_stats;
    auto found = host->workers.find(keys[0].text);
    if (found == host->workers.end()) {
        return STATUS_NOT_FOUND;
    }
    const WorkerThread &worker = found->second;
    if (host->uses.find(worker.tid) == host->uses.end()) {
        Watch(host, List(host, worker.pid, worker.tid, false),
              THREAD_TIMES | THREAD_MIGRATIONS | THREAD_REMOTE_WAKEUPS | THREAD_AFFINITY);
    }
    const ThreadRow *row = nullptr;
    Outcome outcome = ReadThread(host, worker.tid, THREAD_STATES, &row);
    if (outcome == FINE && (row->known & THREAD_TIMES) == 0) {
        outcome = UNSUPPORTED;
    }
    if (outcome != FINE) {
        return StatusOf(outcome);
    }
    Put(record, AFFINE_PCPU, (row->known & THREAD_AFFINITY) != 0 ? row->affinity : NO_CPU);
    Put(record, AFFINE_WORLDLET, NO_WORLDLET);
    Put(record, RUNS, row->runs);
    // What can't be read once stays as it was, 0 at first: a total must not step back.
    Put(record, MIGRATIONS, row->migrations);
    Put(record, REMOTE_ACTS, row->remoteWakeups);
    Put(record, USED, row->run);
    Put(record, READY, row->ready);
    Put(record, WAIT, row->life - std::min(row->life, row->run + row->ready));
    return STATUS_OK;
}
