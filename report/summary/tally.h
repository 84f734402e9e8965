// What FindingsAdd keeps of the records and FindingsRank makes the list from. Private to these two.
#pragma once

#include "report/summary/facts.h"
#include "report/summary/findings.h"

#include <map>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

namespace report {

constexpr uint8_t kAnyLoss = kRules;  // a tally beside the rules: all loss of a port, whatever explains it

struct Share {
    uint32_t port;
    double lost;
};

// How often and how badly a condition was met at a port, VM, worker or host.
struct Tally {
    uint8_t rule = 0;
    Aspect aspect = Aspect::Whole;
    uint32_t host = 0;
    uint64_t hits = 0;
    uint64_t reached[4] = {};  // records of that severity or a higher one
    uint64_t lastRecord = ~0ull;
    Severity lastSeverity = Severity::None;
    double lost = 0, passed = 0;
    std::vector<Share> ports;

    Severity worst = Severity::None;
    double weight = 0;
    uint32_t worstPort = kNoPort;
    uint64_t worstRecord = 0;
    int64_t worstTime = 0;
    std::string of;
    std::vector<FindingValue> values;
};

struct Gap {
    uint64_t count, record;
    int64_t time;
};

struct HostState {
    uint64_t records = 0;
    bool started = false;
    int64_t time = 0, iteration = 0;
    std::map<int64_t, Gap> gaps;  // by length; each with its last record
};

struct PortState {
    uint32_t host;
    uint32_t sections = 0;  // that any record had
    bool uplink = false;
    bool stops = false;  // its transmit queues stopped once
};

// What an uplink sent, in steps of 0.5 %: how high its top is, and whether it is one.
struct Top {
    double most = 0;
    std::map<int, uint64_t> all, withStops;
    bool steady = false;  // a top, and nothing below it
};
constexpr double kTopStep = 1.005;

struct Findings::Engine {
    FindingsOptions options;
    FactReader reader;
    std::vector<HostState> hosts;
    std::unordered_map<std::string, uint32_t> hostByName;
    std::unordered_map<std::string, uint32_t> portByName;     // host, id
    std::unordered_map<std::string, uint32_t> subjectByName;  // kind, host, name
    std::vector<PortState> ports;
    std::vector<uint32_t> portByPlace;  // as of the last record; a guess that is checked
    std::unordered_map<uint64_t, Tally> tallies;
    std::unordered_map<uint32_t, Top> tops;  // by port
    std::unordered_set<uint64_t> suspectSeries;
    uint64_t records = 0;
    bool full = false;  // something was not kept

    // Of the record at hand.
    uint32_t host = 0;
    uint64_t number = 0;
    int64_t time = 0;
    double span = 0;
};

}  // namespace report
