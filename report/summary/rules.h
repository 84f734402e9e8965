// The rules of findings: what each looks for, from which figures on, why, and when it may be wrong. One table for the
// conditions, `summary --rules` and the page; and the conditions of one record, which know nothing of a series.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace report {

enum class Severity : uint8_t { None, Note, Warning, Serious };
const char *SeverityName(Severity severity);  // "note", "warning", "serious"
const char *SeveritySign(Severity severity);  // ".", "!", "!!"

enum class Rule : uint8_t {
    Suspect,       // F0
    WaitsForCpu,   // F1
    OneVcpu,       // F2
    RingSmall,     // F3
    WorkerShort,   // F4
    PcpuFull,      // F5
    BeforeSwitch,  // F6
    UplinkFull,    // F7
    QueuesUneven,  // F8
    HostStack,     // F9
    SmallPackets,  // F10
    Measurement,   // F11
    Unexplained,   // F12: loss that none of them explains
};
constexpr size_t kRules = 13;

// Findings of one rule that stand apart.
enum class Aspect : uint8_t {
    Received,  // loss on the way to the port's client
    Sent,      // loss on the way from it
    Stops,     // queue stops without loss
    Values,    // F0: figures that can't be
    Shares,    // F0: shares of the time that together exceed it
    Empty,     // F0: ports that are {}
    Times,     // F0: times that went back
    OneQueue,  // F6: one receive queue does all
    Link,      // F6: any other
    Tcp,       // F9
    Udp,       // F9
    Gaps,      // F11: records that came late
    Overhead,  // F11: the collector's own cost
    Whole,     // rules with one kind of finding
};
const char *AspectName(Aspect aspect);  // "received", "one-queue", ...

struct RuleText {
    const char *number;     // "F1"
    const char *finding;    // "guest waits for CPU"
    const char *condition;  // thresholds stand in it by name: see RuleFill
    const char *reason;
    const char *wrongIf;
    const char *tryThis;
    const char *tryElse;  // for findings of another aspect; null: the same for all
};
const RuleText &RuleOf(Rule rule);

// The thresholds. The texts name them as {loss.note}; RuleFill puts the figures there.
enum class Limit : uint8_t {
    LossNote,
    LossWarning,
    LossSerious,
    LossRate,
    HitRecords,
    HitShare,
    SuspectRate,
    SuspectNarrow,
    SuspectShare,
    SuspectTime,
    Ready,
    ReadySerious,
    CoStop,
    ReadyCalm,
    VcpuUsed,
    VcpuOthers,
    VcpuCalm,
    RingTime,
    WorkerUsed,
    WorkerReady,
    StopRate,
    PcpuUsed,
    NicLossRate,
    IntrUsed,
    TopNear,
    TopRecords,
    TopBelow,
    LinkUsed,
    QueueCount,
    QueueShare,
    QueueRate,
    RexmitShare,
    RexmitRate,
    SocketRate,
    SmallRate,
    SmallSize,
    OverheadUsed,
    GapTimes,
};
double LimitOf(Limit limit);
const char *LimitName(Limit limit);
constexpr size_t kLimits = static_cast<size_t>(Limit::GapTimes) + 1;
// What holds for all rules: when loss counts, and in how many records.
std::string RulesPreamble();
std::string RuleFill(const char *text);

// A condition that one record of one port meets. FactsOfPort is what it looks at: what is absent there is NaN, and no
// comparison with it holds.
struct Match {
    Rule rule;
    Aspect aspect;
    Severity severity;
    double lost;    // packets/s
    double passed;  // packets/s beside them
    double weight;  // for the worst of records of one severity
};
constexpr size_t kMostMatches = 16;
size_t RulesOfPort(const struct PortFacts &facts, Match *matches);
// Loss of that many packets a second beside those that passed; None below the floor.
Severity LossSeverity(double lost, double passed);
// Whether a condition was met in enough of the records.
bool HitEnough(uint64_t hits, uint64_t records);
bool RulePcpuFull(double workerReady, double pcpuUsed);
// Whether an uplink sends at its link's speed, in Mbit/s.
bool RuleLinkFull(const struct PortFacts &facts, double link);

}  // namespace report
