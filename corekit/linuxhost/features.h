// What this host offers to this user, told by the source itself: it is asked for what a report would ask it for, and
// what it then chose, read or was refused is the answer. One table serves the telling command and the manual. Costs
// about as much as a report, changes nothing on the host, and is no part of a report.
#pragma once

#include "corekit/linuxhost/guests/guests.h"
#include "corekit/linuxhost/netlink/queues.h"

#include <vector>

struct LinuxHost;

enum Answer : u8 { ANSWER_NO, ANSWER_YES, ANSWER_NOT_ALLOWED, ANSWER_CANT_TELL };

enum FeatureId : u32 {
    FEATURE_PROCESSES,       // other users' processes show in /proc
    FEATURE_TAP_HOLDERS,     // descriptors of other users' processes can be looked at
    FEATURE_CPU_TIMES,       // times of CPUs
    FEATURE_SCHEDSTAT,       // threads tell their times
    FEATURE_MIGRATIONS,      // migrations of threads are told, in text or by an event
    FEATURE_PERF,            // a perf event counts migrations of others' threads
    FEATURE_REMOTE_WAKEUPS,  // kernel.sched_schedstats is on
    FEATURE_CACHE_MOVES,     // one last-level cache, or migrations between them are counted
    FEATURE_LINK_COUNTERS,   // RTM_GETSTATS
    FEATURE_WIRE_PACKETS,    // of each NIC: it counts packets of the wire; so are the next ones of each NIC
    FEATURE_QUEUES,          // its queues are told
    FEATURE_QUEUE_COUNTERS,  // the packets of each queue
    FEATURE_QUEUE_ERRORS,    // and what it dropped
    FEATURE_QUEUE_STOPS,     // and how often it was stopped
    FEATURE_TCP_SOCKETS,     // sock_diag of TCP, with notices of destroyed sockets
    FEATURE_IPV6,            // counters of IPv6
    FEATURE_PORT_HISTOS,     // histograms of ports, which the kernel counts while somebody asks; so are the next ones
    FEATURE_VCPU_HISTOS,     // of vcpus
    FEATURE_INTERRUPTS,      // the time that interrupts take
    FEATURES
};

struct Feature {
    const char *name;
    const char *version;  // the mainline kernel that first has it, for people; empty for what has long been there or is
                          // no matter of version
    Answer (*ask)(LinuxHost *host);
    const char *without;  // what is served without it
    const char *cure;     // what would bring it
};

// How a figure of a NIC's queues is served.
enum Served : u8 { SERVED_NOT, SERVED_CLOSE, SERVED };

// A NIC as the source reads it.
struct NicTold {
    std::string name;
    QueueCount count;    // as a report has it
    bool counted;        // by the kernel; else taken as one of each
    QueueSource source;  // UNTOLD with one transmit queue: its counters are the NIC's own
    u32 known;           // bits of QueueKnown that all transmit queues told
    bool wire;           // it is no NIC of a virtual machine
};

struct HostTold {
    Answer answers[FEATURES];
    Guests guests;
    std::vector<NicTold> nics;
    u32 ports;      // that are not hidden
    u32 stacks;     // ports of the host's IP stack
    u32 vectors;    // interrupt vectors of NICs
    u32 worldlets;  // threads that serve a NIC, a port of the IP stack or a guest with vcpus
};

const Feature &FeatureOf(FeatureId id);
// True for what each NIC has or lacks; the answer is YES when all have it, CANT_TELL when there is none.
bool FeatureOfNics(FeatureId id);
Served NicServed(const NicTold &nic, FeatureId id);
// The host must be one that was just opened.
void FeaturesAsk(LinuxHost *host, HostTold *told);
const char *AnswerText(Answer answer);  // "yes", "no", "not allowed", "can't tell"
