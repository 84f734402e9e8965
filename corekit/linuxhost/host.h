// The Linux host behind its source: what was asked of the kernel so far, joined from the rows that the rooms hand over.
// For the files of the source alone. Lists are made when they are asked for; what comes later shows in the next list,
// and what went fails.
#pragma once

#include "corekit/linuxhost/guests/guests.h"
#include "corekit/linuxhost/netlink/links.h"
#include "corekit/linuxhost/netlink/neighbours.h"
#include "corekit/linuxhost/netlink/queues.h"
#include "corekit/linuxhost/netlink/sockets.h"
#include "corekit/linuxhost/pass.h"
#include "corekit/linuxhost/proc/cpu.h"
#include "corekit/linuxhost/proc/stack.h"
#include "corekit/linuxhost/proc/thread.h"
#include "corekit/node_source.h"
#include "corekit/nodes.h"

#include <cstring>
#include <unordered_map>
#include <unordered_set>

constexpr u64 NOTICE_LOOK = 5000000;  // ns between two looks for changed interfaces

// The switch of interfaces that are on none. No interface can bear this name, and it is one word of a file.
constexpr char NO_SWITCH[] = "no/switch";

// An interface that was asked for.
struct Port {
    u32 birth = 0;        // of the link that its type was told of; 0: not told yet
    u32 switchIndex = 0;  // then; 0: on none
    char switchName[NAME_SIZE] = {};
    u32 joined = 0;  // the state of the host that `type` and `tap` are of
    i64 type = 0;
    const HeldTap *tap = nullptr;  // of the host's guests; null unless a process holds it
    u32 scan = 0;                  // that `tap` is of, and the link
    u32 tapBirth = 0;
    LinkCounters counters{};
    u32 filled = 0;     // generation of the counters
    u32 served = 0;     // as a port
    u32 servedNic = 0;  // as a NIC
};

// A NIC that was asked for, by the name it bore then.
struct Nic {
    char name[NAME_SIZE] = {};
    u32 index = 0;  // of the interface
    u32 birth = 0;
    u32 hardware = 0;  // of the NIC itself: another one for a VLAN
    Pass counting{};
    u32 countServed[2] = {};
    QueueCount count{};
    bool chosen = false;
    QueueSource source = QUEUES_UNTOLD;
    Pass reading{};
    std::vector<QueueCounters> queues;
    std::vector<u32> queueServed;
};

struct SwitchEntry {
    u32 index;  // of the bridge or lower device; 0 for interfaces on none
    char name[NAME_SIZE];
};

struct Member {
    u32 switchIndex;
    u32 index;
};

// The four records of the IP stack.
enum StackRecord : u8 { STACK_IPV4, STACK_IPV6, STACK_TCP, STACK_UDP, STACK_RECORDS };

// A thread that is read by several nodes: one look serves them all.
struct ThreadUse {
    Pass pass{};
    u32 served[4] = {};
};

struct LinuxHost {
    u64 (*now)() = nullptr;  // ns, never back; a test's own
    ProcRoot root{};

    NetlinkSocket route;
    NetlinkSocket generic;
    NetlinkSocket notices;
    LinkTable links;
    bool loaded = false;
    bool stale = false;  // notices were lost, and the table was not read anew yet
    u64 lookedAt = 0;

    u32 change = 1;           // of links, guests or addresses
    u32 linkChange = 0;       // of the table, as far as `members` goes
    std::vector<u32> lowers;  // interfaces that a macvlan or macvtap stands on, ascending
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

    std::unordered_map<u32, Port> ports;
    Pass counting{};
    bool dumped = false;  // the counters of this generation are of a dump
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
    std::unordered_map<u32, ThreadUse> uses;
    std::unordered_map<std::string, WorkerThread> workers;  // by the name of the worldlet

    bool toldNetlink = false;  // what was said once
    bool toldQueues = false;
    bool toldSockets = false;
    bool toldCpus = false;
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
// Type, tap and switch of a link. The port of a link that was asked for keeps them while nothing changes.
Port *HostJoin(LinuxHost *host, const Link &link);
u32 HostSwitchOf(const LinuxHost &host, const Link &link);
// The interface of these two keys, as long as it is on that switch; null when it went, moved, or is another one.
const Link *HostPort(LinuxHost *host, const Params &keys);

// host_counters.cpp. The running counters of an interface, of a generation that `served` was not served from before.
Outcome HostCounters(LinuxHost *host, u32 index, u32 Port::*served, const LinkCounters **counters);

// host_cpus.cpp. Null when the CPUs can't be told.
const CpuTopology *HostTopology(LinuxHost *host);
