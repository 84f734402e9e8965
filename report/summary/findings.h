// What is wrong on a host, found in a series of records. Takes one record at a time and keeps a tally for each rule and
// port, VM or worker that a condition was met at, so that an endless series needs no more memory than a long one.
// Owned by the caller: FindingsInit, FindingsAdd for each record in its order, FindingsRank for the list; more records
// may follow, and another FindingsRank. FindingsCleanup frees all.
#pragma once

#include "report/rows/rows.h"
#include "report/summary/rules.h"

#include <string>
#include <vector>

namespace report {

// A figure with its column's key: "rxeps", "vnic.r1full", "vcpu.ready"; or one worked out of several: kShareKey, the
// per cent lost.
struct FindingValue {
    const char *key;
    double value;
};

constexpr const char *kShareKey = "share";

struct FindingPort {
    std::string host, name, switchName, id;  // as the report has them: nothing in them is safe to print
    uint32_t place = 0;                      // in the record's list of ports, as of the last record that had it
};
constexpr uint32_t kNoPort = ~0u;

struct Finding {
    Rule rule;
    Severity severity;
    Aspect aspect;  // tells apart findings of one rule: received and sent, say
    std::string host;
    uint32_t port = kNoPort;       // in Findings::ports: where it was worst
    std::vector<uint32_t> others;  // further ports of the same VM, worker or kind, most packets lost first

    // A sentence is: name and id of the port, what, and where `of` is set " of ", ofKind, blank and of. `of` is what
    // the report calls a vcpu or worldlet, and not safe to print; all else is.
    std::string
        what;  // "loses up to 1.2 % of received packets in 41 of 360 records, 159,900 in all, together with ready 9.1"
    const char *tryThis = "";  // the advice that fits, of its rule
    const char *ofKind = "";   // "vcpu", "worldlet"
    std::string of;

    uint64_t records = 0;      // met the condition
    uint64_t recordsOf = 0;    // of so many
    double share = 0;          // per cent of the packets lost in these records; 0 where nothing was
    double lost = 0;           // packets lost in all records that met the condition
    uint64_t worstRecord = 0;  // number given to FindingsAdd
    int64_t worstTime = 0;
    std::vector<FindingValue> values;  // as of the worst record
};

// What no record could tell: silence about it isn't health.
struct NotJudged {
    std::string rules;  // "F1 F2 F3"
    std::string why;    // "no vnic figures at 12 of 14 ports of VMs: ..."
};

struct FindingsOptions {
    double linkMbps = 0;  // speed of the uplinks; 0: not known
    bool counts = false;  // the report was made with -a: rates are counts over the interval
};

struct Findings {
    std::vector<std::string> hosts;  // in order of appearance
    uint64_t records = 0;
    int64_t firstTime = 0, lastTime = 0;
    int64_t interval = 0;            // median distance of the times, else the key "interval"
    std::vector<FindingPort> ports;  // every port that was seen
    // By FindingsRank: worst first, that is by severity, packets lost, records; ahead of all a report of counts.
    std::vector<Finding> list;
    std::vector<NotJudged> notJudged;

    struct Engine;
    Engine *engine = nullptr;
};

// The sections that FindingsAdd wants of RowsRead.
constexpr uint32_t kFindingsWanted = Wanted(Section::Ports) | Wanted(Section::Vnic) | Wanted(Section::Physnic) |
                                     Wanted(Section::Txqueue) | Wanted(Section::Rxqueue) | Wanted(Section::Intr) |
                                     Wanted(Section::Vcpu) | Wanted(Section::Wdt) | Wanted(Section::Pcpu) |
                                     Wanted(Section::Hoststack) | Wanted(Section::Overhead);

void FindingsInit(Findings *findings, const FindingsOptions &options);
// chosen: a flag for each place of the list of ports, as ChoicePorts sets them; null: all.
void FindingsAdd(Findings *findings, const Rows &rows, uint64_t number, const std::vector<char> *chosen = nullptr);
void FindingsRank(Findings *findings);
void FindingsCleanup(Findings *findings);

}  // namespace report
