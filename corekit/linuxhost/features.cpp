#include "corekit/linuxhost/features.h"

#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/netlink/counters.h"
#include "corekit/linuxhost/source.h"

#include <algorithm>
#include <fcntl.h>
#include <linux/netlink.h>
#include <net/if.h>
#include <unistd.h>

namespace {

constexpr u32 LOOPBACK = 1;  // index of the first interface, which is lo in each namespace

Answer OfOutcome(Outcome outcome) {
    return outcome == FINE                               ? ANSWER_YES
           : outcome == REFUSED                          ? ANSWER_NOT_ALLOWED
           : outcome == BROKEN || outcome == INTERRUPTED ? ANSWER_CANT_TELL
                                                         : ANSWER_NO;
}

Answer AskProcesses(LinuxHost *host) {
    return HostScan(host) != FINE || host->guests.processes == 0 ? ANSWER_NO
           : host->guests.hidden                                 ? ANSWER_NOT_ALLOWED
                                                                 : ANSWER_YES;
}

Answer AskTapHolders(LinuxHost *host) {
    Answer seen = AskProcesses(host);
    return seen == ANSWER_YES && host->guests.refused != 0 ? ANSWER_NOT_ALLOWED : seen;
}

Answer AskCpuTimes(LinuxHost *host) {
    return HostTopology(host) == nullptr ? ANSWER_NO : OfOutcome(CpusRead(&host->cpus, 1));
}

// A thread of another user, as a guest's may be; our own where those are hidden.
const Thread *Sample(LinuxHost *host) {
    if (!host->threadsOpen && ThreadsOpen(&host->threads, &host->root, true) != FINE) {
        return nullptr;
    }
    host->threadsOpen = true;
    for (u32 id : {u32{1}, static_cast<u32>(getpid())}) {
        const ThreadRow *row = nullptr;
        u32 wanted = THREAD_TIMES | THREAD_MIGRATIONS | THREAD_REMOTE_WAKEUPS;
        if (ThreadWatch(&host->threads, id, id, wanted) == FINE && ThreadRead(&host->threads, id, 1, &row) == FINE) {
            return &host->threads.open[id];
        }
    }
    return nullptr;
}

Answer AskThread(LinuxHost *host, u32 figure) {
    const Thread *thread = Sample(host);
    return thread == nullptr ? ANSWER_CANT_TELL : (thread->row.known & figure) != 0 ? ANSWER_YES : ANSWER_NO;
}

Answer AskSchedstat(LinuxHost *host) {
    return AskThread(host, THREAD_TIMES);
}

Answer AskMigrations(LinuxHost *host) {
    return AskThread(host, THREAD_MIGRATIONS);
}

Answer AskPerf(LinuxHost *host) {
    const Thread *thread = Sample(host);
    return thread == nullptr ? ANSWER_CANT_TELL : thread->perf >= 0 ? ANSWER_YES : ANSWER_NOT_ALLOWED;
}

Answer AskRemoteWakeups(LinuxHost *host) {
    return AskThread(host, THREAD_REMOTE_WAKEUPS);
}

Answer AskPortHistograms(LinuxHost *host) {
    return OfOutcome(HostNetwork(host) != 0 ? HostAsk(host, TRACKING_PACKETS) : UNSUPPORTED);
}

Answer AskVcpuHistograms(LinuxHost *host) {
    return OfOutcome(HostAsk(host, TRACKING_RUNS));
}

Answer AskInterrupts(LinuxHost *host) {
    return OfOutcome(HostAsk(host, TRACKING_VECTORS));
}

// CPUs that are off tell of no cache.
Answer AskCacheMoves(LinuxHost *host) {
    const CpuTopology *topology = HostTopology(host);
    u32 caches = topology != nullptr ? topology->lastCaches : 0;
    return caches == 0 ? ANSWER_CANT_TELL : caches == 1 ? ANSWER_YES : OfOutcome(HostAsk(host, TRACKING_MOVES));
}

Answer AskLinkCounters(LinuxHost *host) {
    LinkCounters counters;
    Outcome outcome = HostLinks(host);
    return OfOutcome(outcome == FINE ? CountersRead(&host->route, LOOPBACK, &counters) : outcome);
}

// To ask makes a kernel with modules load one, which a report does and this does not: it is asked when it is there.
Answer AskTcpSockets(LinuxHost *host) {
    TcpTotals totals;
    Outcome outcome = NetlinkOpen(&host->sockets.requests, NETLINK_SOCK_DIAG);
    bool loads = faccessat(host->root.sys, "module/tcp_diag", F_OK, 0) != 0 &&
                 faccessat(host->root.proc, "modules", F_OK, 0) == 0;
    return outcome == FINE && loads ? ANSWER_CANT_TELL
                                    : OfOutcome(outcome == FINE ? TcpSocketsRead(&host->sockets, &totals) : outcome);
}

bool OpenStack(LinuxHost *host) {
    host->stackOpen = host->stackOpen || StackOpen(&host->stack, host->root) == FINE;
    return host->stackOpen && StackRead(&host->stack, 1) == FINE;
}

Answer AskIpv6(LinuxHost *host) {
    return OpenStack(host) && StackKnows(host->stack.row, IP6_IN) ? ANSWER_YES : ANSWER_NO;
}

// One for all that is counted on demand, as only an attempt tells what is missing.
constexpr char TRACKING_CURE[] =
    "root, or CAP_BPF and CAP_PERFMON; a kernel with type data (CONFIG_DEBUG_INFO_BTF); libcorekit-tracking.so";

// clang-format off
constexpr Feature TABLE[] = {
    {"processes of other users", "", AskProcesses,
     "guests and threads of this user alone",
     "root, or /proc mounted without hidepid"},
    {"holders of taps", "", AskTapHolders,
     "guests of this user alone; other taps are plain ports with the name of the interface, without vcpus",
     "root, or CAP_SYS_PTRACE and CAP_DAC_READ_SEARCH"},
    {"times of CPUs", "", AskCpuTimes,
     "0, which nobody measured",
     "/proc"},
    {"times of threads", "", AskSchedstat,
     "no vcpus and no worldlets",
     "a kernel with CONFIG_SCHED_INFO"},
    {"migrations of threads", "", AskMigrations,
     "0, which nobody measured",
     "a kernel that has /proc/PID/sched, or what allows perf events"},
    {"migrations by perf event", "", AskPerf,
     "migrations from /proc/PID/task/TID/sched, which takes about 10 us more a thread",
     "root, CAP_PERFMON and CAP_SYS_PTRACE, or for guests of this user kernel.perf_event_paranoid=1"},
    {"remote wake-ups", "", AskRemoteWakeups,
     "0, which nobody measured",
     "sysctl kernel.sched_schedstats=1, on a kernel with CONFIG_SCHEDSTATS"},
    {"migrations between caches", "6.1", AskCacheMoves,
     "0, which nobody measured, unless all CPUs share a last-level cache or the vcpu is bound inside one",
     TRACKING_CURE},
    {"link counters alone", "4.7", AskLinkCounters,
     "no counters of interfaces, and so no port that can be watched",
     "a newer kernel"},
    {"packets of the wire", "", nullptr,
     "packets as the host of this virtual machine takes and hands them: one may stand for many on the wire",
     "a NIC that is no virtual one"},
    {"queues of NICs", "6.8", nullptr,
     "the channels that the driver tells; else one queue of each kind is taken for granted",
     "a newer kernel, or a driver that tells its channels"},
    {"counters of queues", "6.9", nullptr,
     "counters of the NIC's queue disciplines, which count what they hand to the driver; else no queues",
     "a newer kernel, and a driver that keeps them"},
    {"errors of queues", "6.10", nullptr,
     "drops of the NIC's queue disciplines; 0, which nobody measured, where the driver counts the packets of its queues "
     "but not their drops",
     "a newer kernel, and a driver that keeps them"},
    {"stops of queues", "6.10", nullptr,
     "0, which nobody measured",
     "a newer kernel, and a driver that keeps them"},
    {"TCP sockets", "4.19", AskTcpSockets,
     "no counts of TCP bytes and of received data segments",
     "a kernel with CONFIG_INET_DIAG; the module tcp_diag is loaded when a report first needs it"},
    {"IPv6 counters", "", AskIpv6,
     "0",
     "IPv6"},
    {"histograms of ports", "6.1", AskPortHistograms,
     "no histograms of ports, which each that asks for them says",
     TRACKING_CURE},
    {"histograms of vcpus", "6.1", AskVcpuHistograms,
     "no histograms of vcpus, which is said once",
     TRACKING_CURE},
    {"time of interrupts", "6.1", AskInterrupts,
     "no interrupts",
     TRACKING_CURE},
};
// clang-format on
static_assert(sizeof TABLE / sizeof *TABLE == FEATURES);

Outcome GetRecord(LinuxHost *host, u32 node, const Params &keys) {
    std::vector<char> record(NodeRecordSize(node));
    NodeSource source = LinuxHostSource(host);
    return source.get(host, node, keys, record.data(), static_cast<u32>(record.size())) == STATUS_OK ? FINE : GONE;
}

// What all transmit queues tell, once the source has read them as for a report.
u32 KnownOfQueues(LinuxHost *host, const Nic &nic) {
    u32 known = nic.count.transmit != 0 ? ~0U : 0;
    for (u32 queue = 0; queue < nic.count.transmit; queue++) {
        bool read = GetRecord(host, NODE_TXQ_STATS, {ParamOf(nic.name), ParamOf(int64_t{queue})}) == FINE;
        bool only = nic.source == QUEUES_UNTOLD;
        bool there = read && (only || queue < nic.queues.size());  // the name may be another NIC's by now
        known &= !there ? 0 : only ? u32{QUEUE_PACKETS | QUEUE_ERRORS} : nic.queues[queue].known;
    }
    return known;
}

bool OnWire(LinuxHost *host, const Nic &nic) {
    const Link *link = LinksFind(host->links, nic.hardware);
    constexpr const char *VIRTUAL[] = {"virtio", "xen", "vmbus"};
    return link != nullptr && std::none_of(std::begin(VIRTUAL), std::end(VIRTUAL),
                                           [link](const char *bus) { return strcmp(link->bus, bus) == 0; });
}

void TellNic(LinuxHost *host, const Link &link, HostTold *told) {
    if (GetRecord(host, NODE_TXQ_INFO, {ParamOf(std::string(link.name))}) != FINE) {
        return;
    }
    const Nic *nic = nullptr;  // the last one of this index, which each read may add to
    for (const auto &one : host->nics) {
        nic = one->index == link.index ? one.get() : nic;
    }
    if (nic != nullptr) {
        u32 known = KnownOfQueues(host, *nic);
        told->nics.push_back({nic->name, nic->count, nic->counted, nic->source, known, OnWire(host, *nic)});
    }
}

// Whether a thread bears the name of an interface, and not that of one whose name goes on with digits.
bool Bears(const std::string &thread, const char *name) {
    size_t at = thread.find(name);
    size_t end = at != std::string::npos ? at + strlen(name) : 0;
    return at != std::string::npos && (end == thread.size() || thread[end] < '0' || thread[end] > '9');
}

void TellPort(LinuxHost *host, const Link &link, HostTold *told) {
    i64 type = HostJoin(host, link)->type;
    told->ports += (link.flags & IFF_LOOPBACK) == 0 ? 1 : 0;
    told->stacks += type == PORT_HOST_STACK && OpenStack(host) ? 1 : 0;
    for (const WorkerThread &thread : host->guests.nics) {
        bool serves = type == PORT_UPLINK || type == PORT_HOST_STACK;
        told->worldlets += serves && Bears(thread.name, link.name) ? 1 : 0;
    }
    if (type == PORT_UPLINK) {
        TellNic(host, link, told);
    }
}

void TellGuests(LinuxHost *host, HostTold *told) {
    HostScan(host);
    told->guests = host->guests;
    for (const Guest &guest : told->guests.guests) {
        told->worldlets += guest.vcpus.empty() ? 0 : static_cast<u32>(guest.vhost.size());
    }
}

}  // namespace

const Feature &FeatureOf(FeatureId id) {
    return TABLE[id];
}

bool FeatureOfNics(FeatureId id) {
    return id >= FEATURE_WIRE_PACKETS && id <= FEATURE_QUEUE_STOPS;
}

Served NicServed(const NicTold &nic, FeatureId id) {
    bool close = nic.source == QUEUES_DISCIPLINES;
    u32 figure = id == FEATURE_QUEUE_COUNTERS ? QUEUE_PACKETS : id == FEATURE_QUEUE_ERRORS ? QUEUE_ERRORS : QUEUE_STOPS;
    if (id == FEATURE_WIRE_PACKETS) {
        return nic.wire ? SERVED : SERVED_CLOSE;
    }
    if (id == FEATURE_QUEUES) {
        return nic.counted ? SERVED : SERVED_CLOSE;
    }
    return (nic.known & figure) == 0 ? SERVED_NOT : close ? SERVED_CLOSE : SERVED;
}

void FeaturesAsk(LinuxHost *host, HostTold *told) {
    *told = HostTold();
    host->toldQueues = true;  // told below, NIC by NIC
    host->toldNetlink = true;
    TellGuests(host, told);
    for (u32 id = 0; id < FEATURES; id++) {
        told->answers[id] = TABLE[id].ask != nullptr ? TABLE[id].ask(host) : ANSWER_CANT_TELL;
    }
    const std::vector<Link> links = host->links.rows;  // to ask for a NIC takes in what changed, and moves the rows
    for (const Link &link : links) {
        if (!link.gone) {
            TellPort(host, link, told);
        }
    }
    told->vectors = static_cast<u32>(HostVectors(host).size());
    for (u32 id = FEATURE_WIRE_PACKETS; id <= FEATURE_QUEUE_STOPS && !told->nics.empty(); id++) {
        bool all = std::all_of(told->nics.begin(), told->nics.end(), [id](const NicTold &nic) {
            return NicServed(nic, static_cast<FeatureId>(id)) == SERVED;
        });
        told->answers[id] = all ? ANSWER_YES : ANSWER_NO;
    }
}

const char *AnswerText(Answer answer) {
    constexpr const char *TEXTS[] = {"no", "yes", "not allowed", "can't tell"};
    return TEXTS[answer];
}
