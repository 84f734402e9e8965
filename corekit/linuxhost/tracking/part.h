// The part that is loaded at run time, from within: a reader's groups, and what it watches in each.
#pragma once

#include "corekit/linuxhost/tracking/load.h"
#include "corekit/linuxhost/tracking/tracking.h"

#include <deque>
#include <linux/bpf.h>
#include <map>
#include <string>
#include <unordered_set>
#include <vector>

struct Group {
    bool loaded = false;
    Loaded programs{};
    Shared *shared = nullptr;  // with its programs
    std::vector<u32> uses;     // of each bit of its filter
    int links[LOADED_PROGRAMS] = {-1, -1, -1, -1, -1, -1};
    bool asked = false;
    Outcome answer{};    // when it was asked
    std::string reason;  // of that answer
};

// A direction of a port, in its slot of the maps.
struct WatchedPort {
    u32 slot;
    PortCounts bases[PORT_FAMILIES];  // what stood there when the family was last started
};
struct PortBefore {
    bool operator()(const TrackedPort &left, const TrackedPort &right) const;
};

struct Tracking {
    Group groups[TRACKING_GROUPS];
    std::string reason;
    std::vector<u32> cpus;     // that the kernel may ever have, in the order in which a map has their values
    std::vector<char> buffer;  // for a value of each of them

    std::map<TrackedPort, WatchedPort, PortBefore> ports;
    PortSlot *slots = nullptr;  // shared with the kernel while packets are counted
    std::deque<u32> freeSlots;  // the one that rested longest comes first
    std::unordered_set<u32> runs;
    std::unordered_set<u32> moves;
    std::unordered_set<u32> vectors;
    std::vector<u32> caches;  // by CPU
    std::vector<TaskSamples> tasks;
};

// group.cpp: the system call, with what it returned or a negative errno; then what stands on it.
int Bpf(bpf_cmd command, bpf_attr *attributes);
int MapUpdate(int map, const void *key, const void *value, u64 flags);
int MapLookup(int map, const void *key, void *value);
void MapDelete(int map, const void *key);
// A value of `size` bytes of each CPU, all of them in tracking->buffer.
int MapLookupCpus(Tracking *tracking, int map, const void *key, size_t size);
// Tells why, and returns the outcome.
Outcome Fail(Tracking *tracking, Outcome outcome, const std::string &reason);
// Of what the kernel refused while it was asked for.
Outcome FailWith(Tracking *tracking, int error, const char *what);
Outcome GroupAsk(Tracking *tracking, TrackingGroup group);
// Loads a group and attaches it unless that was done. After a failure it is not loaded.
Outcome GroupNeed(Tracking *tracking, TrackingGroup group);
void GroupClose(Tracking *tracking, TrackingGroup group);

// As a number enters what a group may watch, and as it leaves.
void FilterAdmit(Tracking *tracking, TrackingGroup group, u32 number, bool enter);
// Memory of a map; null with errno when it can't be had.
void *MapShare(int map, size_t size);

// ports.cpp
Outcome PortStart(Tracking *tracking, const TrackedPort *port, PortFamily family);
Outcome PortRead(Tracking *tracking, const TrackedPort *port, PortFamily family, PortSamples *samples);
void PortStop(Tracking *tracking, const TrackedPort *port, PortFamily family);
void PortsClose(Tracking *tracking);

// threads.cpp
Outcome RunWatch(Tracking *tracking, u32 tid);
Outcome RunRead(Tracking *tracking, u32 tid, ThreadSamples *samples);
void RunUnwatch(Tracking *tracking, u32 tid);
Outcome MovesCaches(Tracking *tracking, const u32 *cacheOfCpu, u32 cpus);
Outcome MovesWatch(Tracking *tracking, u32 tid);
Outcome MovesRead(Tracking *tracking, u32 tid, u64 *moves);
void MovesUnwatch(Tracking *tracking, u32 tid);

// tasks.cpp
Outcome TasksRead(Tracking *tracking, u32 pid, const TaskSamples **rows, u32 *count);
void TasksEnd(Tracking *tracking);

// vectors.cpp
Outcome VectorWatch(Tracking *tracking, u32 irq);
Outcome VectorRead(Tracking *tracking, u32 irq, u32 cpus, VectorSamples *samples);
void VectorUnwatch(Tracking *tracking, u32 irq);
