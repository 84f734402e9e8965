// The simulated host: a store of node instances and instance lists that are found by node and keys through a hash, so
// that a look-up costs the same on every host. An instance holds no bytes: each read works its record out from the
// clock, from a table of fields that all instances of a kind share, and from the rates of the entity behind it. Figures
// that belong together come from one count: bytes are packets times a size, shares are cut from a total and add up to
// it.
#pragma once

#include "corekit/node_source.h"
#include "corekit/nodes.h"
#include "corekit/simulated/load.h"
#include "corekit/simulated/plan.h"

#include <deque>
#include <map>
#include <memory>
#include <string_view>
#include <unordered_map>
#include <unordered_set>

// The numbers of an entity that its fields refer to.
// clang-format off
enum Slot : u8 {
    ONE,
    TX, RX, TX_ERRORS, RX_ERRORS, RATE, TIME,                                                   // a second
    USED, READY, COSTOP, WAIT, IN_WORLDLETS,                 // microseconds a second; of worldlets, nanoseconds
    SIZE, TSO_SIZE, LRO_SIZE,                                                                   // bytes a packet
    SHARE, SHARE_OF, SHARE_FROM, HAS_ERRORS,                                                    // of a queue
    TYPE, SUB_TYPE, LEADER, FLAGS, MAC, VNIC_MAC, SCHEME, PORT, TX_QUEUES, RX_QUEUES,           // plain values
    CARTEL, GROUP, VCPU_LEADER, VCPUS, PACKAGES, CORES, PCPUS, LLC, AFFINE_PCPU, AFFINE_VCPU, AFFINE_WORLDLET,
    WORLDLET_ID,
    SLOTS
};
// clang-format on
enum TextSlot : u8 { NAME, DEVICE, SWITCH_NAME, SCHEME_NAME, SCHEME_PARAMS, TEXT_SLOTS };

struct Entity {
    i64 value[SLOTS] = {};
    const std::string *text[TEXT_SLOTS] = {};  // owned by the host; null stands for an empty text
    LoadCurve *load = nullptr;                 // null: constant
    Entity *more = nullptr;                    // its rates, under a load of their own, add to these
    u32 phase = 0;                             // how far its counts are from their next whole number
};

enum Motion : u8 {
    COUNT,     // of what the slot counts, the share that the field says, times another slot
    QUEUED,    // the share that the entity says
    LEVEL,     // slot x factor / divisor, always
    SOME,      // the same, but 0 while its histogram has no samples
    TOTAL,     // the sum of the COUNT fields ahead of it
    LIFETIME,  // microseconds since the host was started
    SECONDS,   // the host's clock
    NANOSECONDS,
};

// The share of a COUNT is `factor` of each `divisor`, those behind the first `from`. Shares that cover 0 to divisor
// without overlap add up to the whole at every moment, and none of them ever steps back.
struct Field {
    FieldLayout at;
    Motion motion;
    Slot slot = ONE;
    i64 factor = 1;
    i64 divisor = 1;
    i64 from = 0;
    Slot times = ONE;
};

struct TextField {
    FieldLayout at;  // the text is cut to its width
    TextSlot slot;
};

// Whatever no field covers is filled with noise that moves with the clock, so that a reader of a reserved span shows.
struct RecordKind {
    u32 node;
    std::vector<Field> fields;
    std::vector<TextField> texts;
    u64 grain = 1;  // of its slot's units, how many are one count
};

// Something that the kernel collects only on demand: COUNT fields tell what was collected in place of all there was.
struct Tracker {
    bool ofPort;  // collects counts, from 0 on, and again at each reset; otherwise microseconds
    bool running = false;
    i64 collected = 0;  // up to `since`
    i64 since = 0;      // count of the port, or microseconds of the host's lifetime
};

// One explicit piece of a record: fixed bytes, or a value with a course of its own. Later ones go over earlier ones.
struct Patch {
    struct Course {
        i64 from;  // microseconds since the host was loaded
        u64 start;
        i64 rate;
    };
    u32 offset;
    u32 width;
    std::vector<Course> courses;  // ascending; empty for fixed bytes
    std::string bytes;
};

struct Instance {
    const RecordKind *kind;  // null for a record of noise and patches alone
    const Entity *entity;
    Tracker *tracker;
    u32 size;
    u32 seed;
    std::unique_ptr<std::vector<Patch>> patches;
};

// What an instance list becomes.
struct ListCourse {
    i64 from;  // microseconds since the host was loaded
    Params entries;
};

struct KeyHash {
    using is_transparent = void;
    size_t operator()(std::string_view key) const { return std::hash<std::string_view>()(key); }
};
template <typename Value>
using KeyMap = std::unordered_map<std::string, Value, KeyHash, std::equal_to<>>;

struct Host {
    i64 loadedAt = 0;  // microseconds of the clock
    i64 age = 0;       // microseconds that the host had been up by then
    std::string signature = HOST_SIGNATURE;
    KeyMap<Instance> instances;
    KeyMap<Params> lists;
    KeyMap<std::vector<ListCourse>> courses;  // of the lists that change, ascending
    std::deque<Entity> entities;              // entities, trackers and texts never move, and live as long as the host
    std::deque<Tracker> trackers;
    std::unordered_set<std::string> texts;
    std::map<std::pair<LoadKind, u64>, LoadCurve> loads;
    LoadCurve *load = nullptr;                              // of what names none
    Tracker vcpuHistos{false, false, 3671LL * 1000000, 0};  // runs while the option "TrackHistos" is on
    Plan plan;

    // Who the lines of a description refer to.
    std::map<i64, Entity *> pcpus;
    std::unordered_map<std::string, const Entity *> vms;
    Entity *self = nullptr;
    Entity *stack = nullptr;
    Entity *trackOption = nullptr;
};

i64 HostClock();  // microseconds; the one place that reads the time

// Node and keys as the text that instances and lists are stored under.
std::string HostKey(u32 node, const Params &keys);
std::string HostKey(u32 node);
std::string HostKey(u32 node, i64 key);
std::string HostKey(u32 node, const std::string &key);
std::string HostKey(u32 node, const std::string &key, i64 second);

const std::string *HostText(Host *host, const std::string &text);
// Null for a constant load.
LoadCurve *HostLoad(Host *host, LoadKind kind, u64 seed);
// Replaces an instance that is there already.
void HostAdd(Host *host, std::string key, const RecordKind *kind, const Entity *entity, Tracker *tracker = nullptr);
void HostAddNoise(Host *host, std::string key, u32 size);
NodeSource HostSource(Host *host);
