// Who is behind the virtual NICs: the processes that hold a tap or macvtap, their guest's name and vcpu threads, and
// the threads that move packets. One scan of /proc, at start and only when asked: about 35 us a process and 10 us a
// tap. Plain values, nothing is kept open. What a process says of itself is a claim: names of threads and guests are
// believed of a process that holds a tap, names of kernel threads of kernel threads.
#pragma once

#include "corekit/linuxhost/file.h"

struct WorkerThread {
    u32 pid;  // the same as tid for a kernel thread
    u32 tid;
    std::string name;  // as the kernel has it, any byte but 0: "vhost-1201", "napi/eth0-8193", "irq/31-eth0-rx-0"
};

struct Guest {
    u32 pid;
    std::string name;                 // of -name; empty when it has none
    std::vector<u32> vcpus;           // thread ids in the order of the vcpus; empty when they can't be told
    std::vector<WorkerThread> vhost;  // threads that serve its taps, in this process or in the kernel
};

// A virtual NIC that a process holds.
struct HeldTap {
    char name[16];  // interface; empty for a macvtap
    u32 index;      // interface index of a macvtap; 0 for a tap
    u32 guest;      // place in `guests`; NO_GUEST when several look like its guest
    bool macTold;   // by the command line; else mac is zeros
    u8 mac[6];      // of the guest's side
};

struct Guests {
    std::vector<Guest> guests;       // ascending PIDs
    std::vector<HeldTap> taps;       // once each, by indices, then names
    std::vector<WorkerThread> nics;  // kernel threads "napi/..." and "irq/..."
    u32 processes;                   // seen
    u32 refused;                     // of them, whose descriptors are not for this user
    u32 foreign;                     // of them, that hold taps of other network namespaces alone
    u32 crowded;                     // PID of the first one with more than MAX_DESCRIPTORS; 0: none has
    bool hidden;                     // other users' processes are hidden (hidepid)
};

constexpr u32 NO_GUEST = 0xffffffff;
constexpr u32 MAX_GUESTS = 65536;
constexpr u32 MAX_DESCRIPTORS = 16384;  // looked at in a process, the lowest ones, which takes it up to 20 ms
constexpr u32 MAX_VCPUS = 4096;         // of a guest; what claims more has none
constexpr u32 MAX_HELD = 4096;          // descriptors of taps that are looked at in a process
constexpr u32 MAX_COMMAND = 1 << 20;    // bytes of a command line; a longer one tells nothing

// FINE also when some processes could not be looked at. Fails when there is no list of processes.
Outcome GuestsScan(const ProcRoot &root, Guests *guests);

// The tap of an interface, by its name or, for a macvtap, its index; null when nobody is known to hold it.
const HeldTap *GuestsFind(const Guests &guests, const char *name, u32 index);
