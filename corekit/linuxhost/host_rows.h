// What was asked of the Linux host, as it is kept from one look at the kernel to the next: interfaces, NICs, switches,
// threads and what is counted on demand. Plain values, owned by the tables of LinuxHost. A port takes 168 bytes, 1.7 KB
// more with histograms, a NIC 200 and those of its queues.
#pragma once

#include "corekit/linuxhost/guests/guests.h"
#include "corekit/linuxhost/netlink/queues.h"
#include "corekit/linuxhost/pass.h"
#include "corekit/linuxhost/proc/thread.h"
#include "corekit/linuxhost/tracking/tracking.h"
#include "corekit/node_source.h"

#include <map>
#include <unordered_map>
#include <unordered_set>

// An interface that was asked for.
struct Port {
    u32 index = 0;
    u32 row = 0;               // where its link stood in the table when it was last looked for
    Port *readNext = nullptr;  // what was read behind it in the last pass
    Port *dumpNext = nullptr;  // and what came behind it in the last dump
    u32 birth = 0;             // of the link that its type was told of; 0: not told yet
    u32 switchIndex = 0;       // then; 0: on none
    u32 stayed = 0;            // the state of the host in which it was still there
    char switchName[NAME_SIZE] = {};
    u32 joined = 0;  // the state of the host that `type` and `tap` are of
    i64 type = 0;
    const HeldTap *tap = nullptr;  // of the host's guests; null unless a process holds it
    u32 scan = 0;                  // that `tap` is of, and the link
    u32 tapBirth = 0;
    LinkCounters counters{};
    u32 filled = 0;     // generation of the counters
    u32 reloads = 0;    // of the host's table, when they were read
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
    bool counted = false;  // by the kernel; else taken for granted
    bool chosen = false;
    QueueSource source = QUEUES_UNTOLD;
    Pass reading{};
    std::vector<QueueCounters> queues;
    std::vector<QueueCounters> told;    // by the kernel, by the last look that told of the queue
    std::vector<QueueCounters> before;  // counted until the kernel began again
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

// A thread that is read by several nodes: one look serves them all. Files of a vcpu are opened by its first read, as a
// walk over all threads may tell of it instead.
struct ThreadUse {
    u32 tid = 0;
    u32 pid = 0;
    bool vcpu = false;
    bool opened = false;
    Pass pass{};
    u32 served[4] = {};
    u32 walked = 0;  // pass of the last walk that met it; 0: none yet
    u64 born = 0;    // as that walk had it
    ThreadRow row{};
};

// One histogram of a port. The kernel's counters only grow: `since` is what they grew by from the last reset on.
struct PortHistogram {
    TrackedPort port{};
    bool running = false;
    bool blind = false;  // its packets can't be seen
    u64 readAt = 0;
    PortSamples last{};  // of the kernel
    PortSamples since{};
};

// The histograms of an interface, from its first start on. The input of a port is what it counts as sent by its client,
// its output what it counts as received.
enum HistogramSide : u8 { HISTOGRAM_INPUT, HISTOGRAM_OUTPUT, HISTOGRAM_SIDES };
struct PortHistograms {
    u32 birth = 0;  // of its link
    PortHistogram of[PORT_FAMILIES][HISTOGRAM_SIDES];
};

// The periods of a vcpu, which are four instances of one node.
struct VcpuPeriods {
    Pass pass{};
    u32 served[PERIODS + 1] = {};
    ThreadSamples samples{};
};

// An interrupt vector of a NIC. Each CPU is an instance of its node; one look serves them all.
struct Vector {
    Params names;
    u32 generation = 0;
    std::vector<u32> served;             // by CPU
    std::vector<VectorSamples> samples;  // the same
};

// Watched only to hold the programs from the question whether they can be had to their first use.
constexpr u32 NO_INTERFACE = 0;
constexpr u32 NO_THREAD = 0xffffffff;

// What the kernel counts on demand.
struct OnDemand {
    bool opened = false;                            // or tried to
    const TrackingTable *table = nullptr;           // null unless the part is there
    Tracking *tracking = nullptr;                   // as long as the table
    const char *reason = "";                        // of a part that isn't there
    u32 netns = 0;                                  // inode of our network namespace; 0: not told
    bool asked = false;                             // whether ports can have histograms
    bool histograms = false;                        // and the answer
    std::unordered_map<u32, PortHistograms> ports;  // by index; none ever leaves
    bool periods = false;                           // of vcpus are counted
    std::unordered_map<u32, VcpuPeriods> vcpus;     // by thread, those that were read since
    std::map<u32, Vector> vectors;                  // those that were listed
    Pass vectorPass{};
    bool vectorsRefused = false;
    bool walkDecided = false;
    bool walks = false;  // over all threads, in place of the files of vcpus
    Pass walk{};
    std::unordered_set<u32> movers;  // threads whose migrations between caches are counted
    bool movesRefused = false;
};
