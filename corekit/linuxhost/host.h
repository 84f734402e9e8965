// The Linux host behind its source: what was asked of the kernel so far, joined from the rows that the rooms hand over.
// For the files of the source alone. Lists are made when they are asked for; what comes later shows in the next list,
// and what went fails.
#pragma once

#include "corekit/linuxhost/host_rows.h"
#include "corekit/linuxhost/netlink/links.h"
#include "corekit/linuxhost/netlink/neighbours.h"
#include "corekit/linuxhost/netlink/sockets.h"
#include "corekit/linuxhost/proc/cpu.h"
#include "corekit/linuxhost/proc/stack.h"
#include "corekit/linuxhost/proc/thread.h"
#include "corekit/node_source.h"
#include "corekit/nodes.h"

#include <cstring>

constexpr u64 NOTICE_LOOK = 5000000;  // ns between two looks for changed interfaces
constexpr u64 NANOSECONDS = 1000;     // of a microsecond

// The switch of interfaces that are on none. No interface can bear this name, and it is one word of a file.
constexpr char NO_SWITCH[] = "no/switch";

// Open vSwitch has one datapath for all its bridges. A port to the host's stack, as each bridge has one, doesn't name
// it as its master, as all others do.
constexpr char DATAPATH[] = "ovs-system";

struct LinuxHost {
    u64 (*now)() = nullptr;  // ns, never back; a test's own
    ProcRoot root{};

    NetlinkSocket route;
    NetlinkSocket generic;
    NetlinkSocket notices;
    LinkTable links;
    bool loaded = false;
    bool stale = false;      // notices were lost, and the table was not read anew yet
    u32 reloads = 0;         // of the table, after notices were lost
    bool sysIsOurs = false;  // /sys is known to show our network namespace
    u64 clock = 0;           // when the present read began
    u64 lookedAt = 0;

    u32 change = 1;           // of links, guests or addresses
    u32 linkChange = 0;       // of the table, as far as `members` goes
    std::vector<u32> lowers;  // interfaces that a macvlan or macvtap stands on, ascending
    u32 datapath = 0;         // index of DATAPATH; 0: none
    std::vector<SwitchEntry> switches;
    std::vector<Member> members;            // ascending by switch, then index
    std::unordered_set<std::string> shown;  // names of switches that were listed, or asked for

    bool scanned = false;
    u32 scans = 0;
    Guests guests{};
    bool addressed = false;
    std::vector<u32> addresses;
    bool neighboured = false;
    std::vector<Learned> learned;

    std::unordered_map<u32, Port> ports;  // none ever leaves
    Port *read = nullptr;                 // the one that was last looked for by a read
    Port *dumped = nullptr;               // and by a dump
    Pass counting{};
    bool whole = false;  // the counters of this generation are of a dump
    std::vector<std::unique_ptr<Nic>> nics;
    Families families{};

    bool cpusOpen = false;
    Cpus cpus{};
    Pass cpuPass{};
    std::vector<u32> cpuServed;

    bool stackOpen = false;
    Stack stack{};
    Pass stackPass{};
    u32 stackServed[STACK_RECORDS] = {};
    TcpSockets sockets;
    TcpTotals tcp{};  // as last told

    bool threadsOpen = false;
    Threads threads{};
    std::unordered_map<u32, ThreadUse> uses;                // none ever leaves
    ThreadUse *use = nullptr;                               // the last one
    std::unordered_map<std::string, WorkerThread> workers;  // by the name of the worldlet

    OnDemand demand{};

    bool toldNetlink = false;  // what was said once
    bool toldQueues = false;
    bool toldSockets = false;
    bool toldCpus = false;
    bool toldCrowd = false;
    bool toldTap = false;
    bool toldRefusal = false;
    bool toldBlind = false;
};

// Writing records, which are all zeros before.
inline void Put(char *record, FieldLayout field, u64 value) {
    memcpy(record + field.offset, &value, field.width);
}
void PutText(char *record, FieldLayout field, const char *text);
KnfStatus StatusOf(Outcome outcome);

// host_ports.cpp: switches, ports and who is behind them.
// Interfaces as they are now, within NOTICE_LOOK.
Outcome HostLinks(LinuxHost *host);
// New lists from here on: guests and addresses are looked for again when they are needed.
void HostForget(LinuxHost *host);
Outcome HostScan(LinuxHost *host);
// An interface that was asked for; null when it was not. Reads and dumps come in the same order each time, so the one
// that followed `*last` before is looked at first.
inline Port *HostFind(LinuxHost *host, u32 index, Port **last, Port *Port::*next) {
    Port *guess = *last != nullptr && (*last)->index != index ? (*last)->*next : *last;
    if (guess == nullptr || guess->index != index) {
        auto found = host->ports.find(index);
        if (found == host->ports.end()) {
            return nullptr;
        }
        guess = &found->second;
        if (*last != nullptr) {
            (*last)->*next = guess;
        }
    }
    return *last = guess;
}
// The same for a read; made when it is not there.
Port *HostPortOf(LinuxHost *host, u32 index);
// Type, tap and switch of a link. The port of a link that was asked for keeps them while nothing changes.
Port *HostJoin(LinuxHost *host, const Link &link);
u32 HostSwitchOf(const LinuxHost &host, const Link &link);
// The interface of these two keys, as long as it is on that switch; null when it went, moved, or is another one.
const Link *HostPort(LinuxHost *host, const Params &keys);

// host_sysfs.cpp. Marks each link by the number that /sys has for its interface, which keeps it through new names,
// switches and namespaces and leaves it to no other. A link whose marked interface is no more is taken for another one.
// Nothing happens where /sys is not known to show our network namespace.
void HostMark(LinuxHost *host);
void HostMarkOne(LinuxHost *host, Link *link);
// The parent devices of NICs, which a kernel before 5.14 does not tell by netlink. Of an interface that /sys shows with
// another index or address, nothing is believed.
void HostFindParents(LinuxHost *host);

// host_counters.cpp. What a port's client sent is what its interface received.
bool HostSeenFromOutside(const Link &link);
// The running counters of an interface, of a generation that `served` was not served from before.
Outcome HostCounters(LinuxHost *host, u32 index, u32 Port::*served, const LinkCounters **counters);

// host_cpus.cpp. Null when the CPUs can't be told.
const CpuTopology *HostTopology(LinuxHost *host);

// host_demand.cpp. The part that counts on demand, opened by the first call; null when it can't be.
const TrackingTable *HostTracking(LinuxHost *host);
void HostTrackingClose(LinuxHost *host);
// Whether it can count something, which takes about as long as to begin with it.
Outcome HostAsk(LinuxHost *host, TrackingGroup group);
// Says once why the kernel does not count what the user has asked for.
void HostTellRefusal(LinuxHost *host, const char *what);
// The inode of our network namespace; 0 when it is not told.
u32 HostNetwork(LinuxHost *host);
// Migrations of a vcpu between last-level caches; 0 where there is one, the vcpu is bound inside one, or nobody counts.
u64 HostCacheMoves(LinuxHost *host, u32 tid);

// host_walk.cpp. Whether one walk over all threads is to tell of the vcpus in place of two files each: decided once, by
// the first read of one, when all that a run watches are listed.
bool HostWalks(LinuxHost *host);
// As the last walk of this generation met it.
Outcome HostReadWalked(LinuxHost *host, ThreadUse *use, u32 *served, const ThreadRow **row);

// host_histograms.cpp. Whether ports can have histograms, asked once.
bool HostTakesHistograms(LinuxHost *host);

// host_vectors.cpp. The interrupt vectors of NICs, with their names as a reader looks for them.
std::map<u32, Params> HostVectors(LinuxHost *host);
