// The simulated host: a store of node instances and instance lists that are found by node and keys through a hash, so
// that a look-up costs the same on every host. An instance holds no bytes: each read works its record out from the
// clock, from a table of fields that all instances of a kind share, and from the rates of the entity behind it.
#pragma once

#include "corekit/node_source.h"
#include "corekit/nodes.h"

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
    TX, TX_MAIN, TX_EXTRA, TX_BYTES, TX_BYTES_MAIN, TX_BYTES_EXTRA, RX, RX_BYTES, ERRORS, RATE, TIME,  // a second
    USED, READY, COSTOP, WAIT, IN_WORLDLETS,                                                    // per mille of the time
    TYPE, SUB_TYPE, LEADER, FLAGS, MAC, VNIC_MAC, SCHEME, PORT, TX_QUEUES, RX_QUEUES,           // plain values
    CARTEL, GROUP, VCPU_LEADER, PACKAGES, CORES, PCPUS, LLC, AFFINE_PCPU, AFFINE_VCPU, AFFINE_WORLDLET,
    SLOTS
};
// clang-format on
enum TextSlot : u8 { NAME, SWITCH_NAME, SCHEME_NAME, SCHEME_PARAMS, TEXT_SLOTS };

struct Entity {
    i64 value[SLOTS] = {};
    const std::string *text[TEXT_SLOTS] = {};  // owned by the host; null stands for an empty text
};

enum Motion : u8 {
    COUNT,    // a start value of the instance's own, then slot x factor / divisor a second
    LEVEL,    // slot x factor / divisor, always
    SOME,     // the same, but 0 while its histogram has no samples
    TOTAL,    // the sum of the COUNT fields ahead of it
    SECONDS,  // the host's clock
    NANOSECONDS,
};

struct Field {
    FieldLayout at;
    Motion motion;
    Slot slot = ONE;
    i64 factor = 1;
    i64 divisor = 1;
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
};

// Run time of something that the kernel collects only on demand; COUNT fields follow it in place of the clock.
struct Tracker {
    bool fromZero;  // counts start at 0, and again at each reset
    bool running = false;
    i64 collected = 0;  // microseconds up to `since`
    i64 since = 0;
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
    std::string signature = HOST_SIGNATURE;
    KeyMap<Instance> instances;
    KeyMap<Params> lists;
    KeyMap<std::vector<ListCourse>> courses;  // of the lists that change, ascending
    std::deque<Entity> entities;              // entities, trackers and texts never move, and live as long as the host
    std::deque<Tracker> trackers;
    std::unordered_set<std::string> texts;
    Tracker vcpuHistos{false};  // runs while the option "TrackHistos" is on

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
// Replaces an instance that is there already.
void HostAdd(Host *host, std::string key, const RecordKind *kind, const Entity *entity, Tracker *tracker = nullptr);
void HostAddNoise(Host *host, std::string key, u32 size);
NodeSource HostSource(Host *host);
