#include "report/summary/rules.h"

#include "report/summary/facts.h"
#include "report/summary/words.h"

#include <cmath>
#include <cstring>

namespace report {
namespace {

struct LimitRow {
    Limit limit;
    const char *name;
    double value;
};
constexpr LimitRow kLimitTable[kLimits] = {
    {Limit::LossNote, "loss.note", 0.01},                  // % of the packets
    {Limit::LossWarning, "loss.warning", 0.1},             //
    {Limit::LossSerious, "loss.serious", 1},               //
    {Limit::LossRate, "loss.rate", 1},                     // packets/s
    {Limit::HitRecords, "hit.records", 3},                 //
    {Limit::HitShare, "hit.share", 5},                     // % of the records
    {Limit::SuspectRate, "suspect.rate", 1e12},            // by second
    {Limit::SuspectNarrow, "suspect.count", 2147483648.},  // of a 32-bit counter, over the interval
    {Limit::SuspectShare, "suspect.share", 100},           // %
    {Limit::SuspectTime, "suspect.time", 105},             // % of the time
    {Limit::Ready, "vcpu.ready", 5},                       // % of the time, and so all below with "used" and "ready"
    {Limit::ReadySerious, "vcpu.ready.serious", 10},       //
    {Limit::CoStop, "vcpu.cstp", 3},                       //
    {Limit::ReadyCalm, "vcpu.ready.calm", 2},              //
    {Limit::VcpuUsed, "vcpu.used", 85},                    //
    {Limit::VcpuOthers, "vcpu.others", 50},                // % of the busiest
    {Limit::VcpuCalm, "vcpu.used.calm", 70},               //
    {Limit::RingTime, "ring.time", 20},                    // ms
    {Limit::WorkerUsed, "wdt.used", 80},                   //
    {Limit::WorkerReady, "wdt.ready", 5},                  //
    {Limit::StopRate, "stop.rate", 1},                     // by second
    {Limit::PcpuUsed, "pcpu.used", 90},                    //
    {Limit::NicLossRate, "nic.rate", 1},                   // errors/s
    {Limit::IntrUsed, "intr.used", 70},                    //
    {Limit::TopNear, "top.near", 3},                       // % below the maximum
    {Limit::TopRecords, "top.records", 5},                 //
    {Limit::TopBelow, "top.below", 90},                    // % of the maximum
    {Limit::LinkUsed, "link.used", 90},                    // % of the link's speed
    {Limit::QueueCount, "queue.count", 4},                 //
    {Limit::QueueShare, "queue.share", 80},                // %
    {Limit::QueueRate, "queue.rate", 100000},              // packets/s
    {Limit::RexmitShare, "rexmit.share", 1},               // %
    {Limit::RexmitRate, "rexmit.rate", 10},                // segments/s
    {Limit::SocketRate, "socket.rate", 1},                 // datagrams/s
    {Limit::SmallRate, "small.rate", 200000},              // packets/s
    {Limit::SmallSize, "small.size", 128},                 // bytes
    {Limit::OverheadUsed, "overhead.used", 10},            //
    {Limit::GapTimes, "gap.times", 1.5},                   // the median
};

constexpr const char *kPreamble =
    "Loss is rxeps / (rxpps + rxeps) of a record, and likewise what is sent. It counts from {loss.rate} packet/s on: a "
    "note from {loss.note} %, a warning from {loss.warning} %, serious from {loss.serious} %, where one TCP connection "
    "with segments of 1,460 bytes and a round trip of 1 ms can't pass some 1,400, 450 and 140 Mbit/s. A finding needs "
    "{hit.records} records, or {hit.share} % of them, that meet its condition, and takes the highest severity that so "
    "many reach. A figure that is absent or suspect meets no condition.";

struct RuleRow {
    Rule rule;
    RuleText text;
};
constexpr RuleRow kRuleTable[kRules] = {
    {Rule::Suspect,
     {"F0", "suspect figures",
      "Any record: a rate above {suspect.rate} or below 0, a rate of a 32-bit counter above {suspect.count} / interval, "
      "a share of packets above {suspect.share} %, shares of the time that together exceed {suspect.time} % (vcpu used + "
      "ready + cstp, worldlet used + ready + wait), a port that is {}, a time before the one ahead of it. A note; a "
      "warning for shares of the time. Such a figure counts as missing, not as loss.",
      "A counter went back, a port or VM went away, or the report was made with -a: its counts look like rates.",
      "a NIC was started anew; -a was meant: --counts", "look for restarts and moves of VMs at that time",
      "--counts, if the report was made with -a"}},
    {Rule::WaitsForCpu,
     {"F1", "guest waits for CPU",
      "Received loss, and r1full, r2full, rxbuflow or ooslots above 0, while a vcpu has ready from {vcpu.ready} % "
      "(serious from {vcpu.ready.serious}) or cstp from {vcpu.cstp} %.",
      "A ring of 512 at 32,000 packets/s is full in 16 ms; 5 % of 10 s are 25 waits of 20 ms.",
      "another vcpu takes the interrupts; several queues share rxpps", "fewer busy vcpus on the host, or a larger ring",
      nullptr}},
    {Rule::OneVcpu,
     {"F2", "one vcpu does all",
      "As F1, but every ready below {vcpu.ready.calm} %, one vcpu used from {vcpu.used} %, and the others on average "
      "below {vcpu.others} % of that (or there are none).",
      "Receive work runs on one vcpu.", "a program of a single thread is what keeps it busy",
      "more receive queues in the guest, and their interrupts on several vcpus", nullptr}},
    {Rule::RingSmall,
     {"F3", "ring too small",
      "Received loss, and r1full above 0, while every ready is below {vcpu.ready.calm} %, every used below "
      "{vcpu.used.calm} %, and ring1sz / rxpps below {ring.time} ms.",
      "Bursts fill the ring before a guest that has time for it comes to empty it.",
      "the guest stalls for less than the interval: repeat with -i 1 and the letters h and V",
      "a larger receive ring in the guest", nullptr}},
    {Rule::WorkerShort,
     {"F4", "worker short of CPU",
      "A worldlet of the port has used from {wdt.used} % or ready from {wdt.ready} %, with loss, either way or at the "
      "uplink's NIC, or with qstop from {stop.rate}/s (a note).",
      "With random arrivals 4 jobs are there on average at 80 %, 9 at 90 %.", "the worker polls: it always shows 100",
      "less traffic on the ports that the worker serves, more workers for them, or a pcpu of its own", nullptr}},
    {Rule::PcpuFull,
     {"F5", "pcpu full",
      "A worldlet of the port has ready from {wdt.ready} % and is bound to a pcpu with used from {pcpu.used} %. A "
      "warning; serious with serious loss in the same record.",
      "Nobody else may run it.", "cpu.topology.core is 2 or more: a core is full earlier than its pcpus show",
      "take other work off that pcpu, or bind the worker to another", nullptr}},
    {Rule::BeforeSwitch,
     {"F6", "lost before the switch",
      "physnic.rxeps from {nic.rate}/s, a note at least. With rxqueue.active 1 of several and intr.used from "
      "{intr.used} %: one queue; else the link.",
      "It is counted at the link, not by the switch.", "the key holds eight kinds of error, and some are harmless",
      "look at cable, optics and the other end", "more receive queues, or filters that spread over them"}},
    {Rule::UplinkFull,
     {"F7", "uplink full",
      "Queue stops (txqueue) in {top.records} records with physnic.txmbps within {top.near} % of its maximum, while at "
      "least as many records stay below {top.below} % of it. With --link-mbps instead: {link.used} % of the link's speed "
      "in {top.records} records, 20 bytes a packet added. A warning.",
      "A flat top is a limit.", "the report knows no speed of links: --link-mbps tells it",
      "a faster or further uplink, or fewer VMs on this one", nullptr}},
    {Rule::QueuesUneven,
     {"F8", "queues uneven",
      "One of {queue.count} or more transmit queues sends {queue.share} % of {queue.rate} packets/s or more. A note.",
      "One pcpu serves one queue.", "it is one big flow; pps is 0 in a record where its counter wraps",
      "other filters or hashing for the uplink's queues", nullptr}},
    {Rule::HostStack,
     {"F9", "host stack loses",
      "tcptx.rexmit from {rexmit.share} % of tcptx.pps and {rexmit.rate}/s (a warning); udp.rxsockeps above "
      "{socket.rate}/s (a note, a warning from {loss.serious} %).",
      "Loss beyond the switch, or a program that reads too slowly.",
      "the counters are those of the whole stack, and the far end may be who loses", "look at the path to the far end",
      "look at the program that reads, and at the size of its socket's buffer"}},
    {Rule::SmallPackets,
     {"F10", "small packets", "rxpps from {small.rate} with rxsize to {small.size} bytes. A note.",
      "Work is by packet, not by byte.", "it is normal for DNS and telephony",
      "nothing, unless there is loss: then batch in the sender, or spread over several ports", nullptr}},
    {Rule::Measurement,
     {"F11", "measurement",
      "overhead.used from {overhead.used} % (a warning); any distance of times above {gap.times} x their median and by "
      "2 s or more (a note).",
      "The tool itself, or what held it up.", "the host was busy", "look at what kept the host busy then",
      "fewer ports or letters, or a longer interval"}},
    {Rule::Unexplained,
     {"F12", "loss that no rule explains", "Loss in records where none of F1 to F6 holds at the port.",
      "Loss is a finding whether or not its cause is known.", "a shaper or a filter drops on purpose",
      "the letters -t vqiW, which tell more", "-i 1 with the letters h and V, which tell of shorter times"}},
};

// Rows are found by their numbers.
constexpr bool InOrder() {
    for (size_t i = 0; i < kLimits; i++) {
        if (static_cast<size_t>(kLimitTable[i].limit) != i) {
            return false;
        }
    }
    for (size_t i = 0; i < kRules; i++) {
        if (static_cast<size_t>(kRuleTable[i].rule) != i) {
            return false;
        }
    }
    return true;
}
static_assert(InOrder());

bool Above0(const PortFacts &facts, std::initializer_list<Fact> list) {
    for (Fact fact : list) {
        if (facts.at(fact) > 0) {
            return true;
        }
    }
    return false;
}

// Why a guest did not take what came, by its vcpus and its ring.
Rule GuestRule(const PortFacts &facts, Severity *severity) {
    double ready = facts.at(Fact::Ready), used = facts.at(Fact::Used), others = facts.at(Fact::UsedOthers);
    if (!Above0(facts, {Fact::R1Full, Fact::R2Full, Fact::RxBufLow, Fact::OoSlots})) {
        return Rule::Unexplained;
    }
    if (ready >= LimitOf(Limit::Ready) || facts.at(Fact::CoStop) >= LimitOf(Limit::CoStop)) {
        *severity = ready >= LimitOf(Limit::ReadySerious) ? Severity::Serious : *severity;
        return Rule::WaitsForCpu;
    }
    if (!(ready < LimitOf(Limit::ReadyCalm))) {
        return Rule::Unexplained;
    }
    if (used >= LimitOf(Limit::VcpuUsed) && (std::isnan(others) || others < used * LimitOf(Limit::VcpuOthers) / 100)) {
        return Rule::OneVcpu;
    }
    double time = facts.at(Fact::Ring1Size) / facts.at(Fact::RxPps) * 1000;
    if (facts.at(Fact::R1Full) > 0 && used < LimitOf(Limit::VcpuCalm) && time < LimitOf(Limit::RingTime)) {
        return Rule::RingSmall;
    }
    return Rule::Unexplained;
}

struct Loss {
    double lost, passed;
    Severity severity;
};

Loss LossOf(const PortFacts &facts, Fact lost, Fact passed) {
    return {facts.at(lost), facts.at(passed), LossSeverity(facts.at(lost), facts.at(passed))};
}

struct MatchList {
    Match *matches;
    size_t count;
};

void Add(MatchList *list, Rule rule, Aspect aspect, const Loss &loss) {
    list->matches[list->count++] = {rule, aspect, loss.severity, loss.lost, loss.passed, loss.lost};
}

void AddWeight(MatchList *list, Rule rule, Aspect aspect, Severity severity, double weight) {
    list->matches[list->count++] = {rule, aspect, severity, 0, 0, weight};
}

Severity Worse(Severity one, Severity other) {
    return one > other ? one : other;
}

// Packets lost, either way. What a port of an uplink loses where its NIC does is the same loss.
void MatchLoss(const PortFacts &facts, MatchList *list) {
    Loss in = LossOf(facts, Fact::RxEps, Fact::RxPps), out = LossOf(facts, Fact::TxEps, Fact::TxPps);
    Loss nic = LossOf(facts, Fact::NicRxEps, Fact::NicRxPps);
    bool inExplained = false, outExplained = false;
    if (nic.lost >= LimitOf(Limit::NicLossRate)) {
        nic.severity = Worse(nic.severity, Severity::Note);
        bool oneQueue = facts.at(Fact::RxActive) == 1 && facts.at(Fact::RxQueues) > 1 &&
                        facts.at(Fact::IntrUsed) >= LimitOf(Limit::IntrUsed);
        Add(list, Rule::BeforeSwitch, oneQueue ? Aspect::OneQueue : Aspect::Link, nic);
        inExplained = true;
    }
    if (in.severity != Severity::None) {
        Loss told = in;
        Rule rule = GuestRule(facts, &told.severity);
        if (rule != Rule::Unexplained) {
            Add(list, rule, Aspect::Received, told);
            inExplained = true;
        }
    }
    bool anyIn = in.severity != Severity::None, anyOut = out.severity != Severity::None;
    if (RulePcpuFull(facts.at(Fact::WdtReady), facts.at(Fact::PcpuUsed))) {
        Severity loss = Worse(in.severity, out.severity);
        double lost = (anyIn ? in.lost : 0) + (anyOut ? out.lost : 0);
        Add(list, Rule::PcpuFull, Aspect::Whole, {lost, in.passed + out.passed, Worse(loss, Severity::Warning)});
        list->matches[list->count - 1].weight = facts.at(Fact::WdtReady);
        inExplained = outExplained = true;
    } else if (facts.at(Fact::WdtUsed) >= LimitOf(Limit::WorkerUsed) ||
               facts.at(Fact::WdtReady) >= LimitOf(Limit::WorkerReady)) {
        if (anyIn || nic.severity != Severity::None) {
            Add(list, Rule::WorkerShort, Aspect::Received, anyIn ? in : nic);
            inExplained = true;
        }
        if (anyOut) {
            Add(list, Rule::WorkerShort, Aspect::Sent, out);
            outExplained = true;
        }
        double stops = std::fmax(facts.at(Fact::VnicStops), facts.at(Fact::NicStops));
        if (!anyOut && stops >= LimitOf(Limit::StopRate)) {
            AddWeight(list, Rule::WorkerShort, Aspect::Stops, Severity::Note, stops);
        }
    }
    if (anyIn && !inExplained) {
        Add(list, Rule::Unexplained, Aspect::Received, in);
    }
    if (anyOut && !outExplained) {
        Add(list, Rule::Unexplained, Aspect::Sent, out);
    }
}

void MatchOthers(const PortFacts &facts, MatchList *list) {
    if (facts.at(Fact::TxQueues) >= LimitOf(Limit::QueueCount) &&
        facts.at(Fact::TxQueueShare) >= LimitOf(Limit::QueueShare) &&
        facts.at(Fact::TxQueueAll) >= LimitOf(Limit::QueueRate)) {
        AddWeight(list, Rule::QueuesUneven, Aspect::Whole, Severity::Note, facts.at(Fact::TxQueueAll));
    }
    double again = facts.at(Fact::TcpRexmit);
    if (again >= LimitOf(Limit::RexmitRate) && again >= facts.at(Fact::TcpPps) * LimitOf(Limit::RexmitShare) / 100) {
        AddWeight(list, Rule::HostStack, Aspect::Tcp, Severity::Warning, again);
    }
    double socket = facts.at(Fact::UdpRxSockEps), datagrams = facts.at(Fact::UdpRxPps);
    if (socket > LimitOf(Limit::SocketRate)) {
        bool much = LossSeverity(socket, datagrams) == Severity::Serious;
        Add(list, Rule::HostStack, Aspect::Udp, {socket, datagrams, much ? Severity::Warning : Severity::Note});
    }
    if (facts.at(Fact::RxPps) >= LimitOf(Limit::SmallRate) && facts.at(Fact::RxSize) <= LimitOf(Limit::SmallSize)) {
        AddWeight(list, Rule::SmallPackets, Aspect::Whole, Severity::Note, facts.at(Fact::RxPps));
    }
}

constexpr const char *kSeverityNames[] = {"none", "note", "warning", "serious"};
constexpr const char *kSeveritySigns[] = {"", ".", "!", "!!"};
constexpr const char *kAspectNames[] = {"received",  "sent", "stops", "values", "shares", "empty",    "times",
                                        "one-queue", "link", "tcp",   "udp",    "gaps",   "overhead", "whole"};

}  // namespace

const char *SeverityName(Severity severity) {
    return kSeverityNames[static_cast<size_t>(severity)];
}

const char *SeveritySign(Severity severity) {
    return kSeveritySigns[static_cast<size_t>(severity)];
}

const char *AspectName(Aspect aspect) {
    return kAspectNames[static_cast<size_t>(aspect)];
}

const RuleText &RuleOf(Rule rule) {
    return kRuleTable[static_cast<size_t>(rule)].text;
}

double LimitOf(Limit limit) {
    return kLimitTable[static_cast<size_t>(limit)].value;
}

const char *LimitName(Limit limit) {
    return kLimitTable[static_cast<size_t>(limit)].name;
}

std::string RuleFill(const char *text) {
    std::string filled;
    while (const char *open = strchr(text, '{')) {
        filled.append(text, open);
        text = open;
        for (const LimitRow &row : kLimitTable) {
            size_t length = strlen(row.name);
            if (strncmp(open + 1, row.name, length) == 0 && open[1 + length] == '}') {
                filled += row.limit == Limit::SuspectNarrow ? "2^31"
                          : row.limit == Limit::SuspectRate ? "1e12"
                                                            : NumberText(row.value);
                text = open + length + 2;
                break;
            }
        }
        if (text == open) {
            filled += *text++;
        }
    }
    return filled + text;
}

std::string RulesPreamble() {
    return RuleFill(kPreamble);
}

Severity LossSeverity(double lost, double passed) {
    double share = 100 * lost / (lost + passed);
    if (!(lost >= LimitOf(Limit::LossRate)) || !(share >= LimitOf(Limit::LossNote))) {
        return Severity::None;
    }
    return share >= LimitOf(Limit::LossSerious)   ? Severity::Serious
           : share >= LimitOf(Limit::LossWarning) ? Severity::Warning
                                                  : Severity::Note;
}

bool HitEnough(uint64_t hits, uint64_t records) {
    double enough =
        std::fmin(LimitOf(Limit::HitRecords), static_cast<double>(records) * LimitOf(Limit::HitShare) / 100);
    return hits > 0 && static_cast<double>(hits) >= enough;
}

bool RulePcpuFull(double workerReady, double pcpuUsed) {
    return workerReady >= LimitOf(Limit::WorkerReady) && pcpuUsed >= LimitOf(Limit::PcpuUsed);
}

bool RuleLinkFull(const PortFacts &facts, double link) {
    // A frame takes 20 bytes of the wire beside its own: preamble, and the gap behind it.
    double wire = facts.at(Fact::NicTxMbps) + facts.at(Fact::NicTxPps) * 20 * 8 / 1e6;
    return wire >= link * LimitOf(Limit::LinkUsed) / 100;
}

size_t RulesOfPort(const PortFacts &facts, Match *matches) {
    MatchList list = {matches, 0};
    MatchLoss(facts, &list);
    MatchOthers(facts, &list);
    return list.count;
}

}  // namespace report
