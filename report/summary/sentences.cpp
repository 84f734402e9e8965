#include "report/summary/sentences.h"

#include "report/rows/moment.h"
#include "report/summary/facts.h"
#include "report/summary/words.h"

#include <cmath>
#include <cstring>

namespace report {
namespace {

double ValueOf(const Finding &finding, const char *key) {
    for (const FindingValue &value : finding.values) {
        if (strcmp(value.key, key) == 0) {
            return value.value;
        }
    }
    return std::nan("");
}

double ValueOf(const Finding &finding, Fact fact) {
    return ValueOf(finding, FactKey(fact));
}

std::string Percent(double value) {
    return NumberText(value) + " %";
}

std::string InRecords(const Finding &finding) {
    return "in " + NumberText(static_cast<double>(finding.records)) + " of " +
           NumberText(static_cast<double>(finding.recordsOf)) + (finding.recordsOf == 1 ? " record" : " records");
}

std::string Loses(const Finding &finding, const char *which) {
    return "loses " + Percent(finding.share) + " of " + which + " packets " + InRecords(finding) + ", " +
           NumberText(std::round(finding.lost)) + " in all";
}

std::string LosesEitherWay(const Finding &finding) {
    return Loses(finding, finding.aspect == Aspect::Sent ? "sent" : "received");
}

// "together with used 92", or ready where that is what the worker is short by.
std::string WithWorker(Finding *finding) {
    finding->ofKind = "worldlet";
    double used = ValueOf(*finding, Fact::WdtUsed), ready = ValueOf(*finding, Fact::WdtReady);
    bool waits = ready >= LimitOf(Limit::WorkerReady);
    return std::string(", together with ") + (waits ? "ready " : "used ") + NumberText(waits ? ready : used);
}

std::string TellVcpu(Finding *finding) {
    finding->ofKind = "vcpu";
    double ready = ValueOf(*finding, Fact::Ready);
    std::string with = finding->rule == Rule::OneVcpu   ? "used " + NumberText(ValueOf(*finding, Fact::Used))
                       : ready >= LimitOf(Limit::Ready) ? "ready " + NumberText(ready)
                                                        : "cstp " + NumberText(ValueOf(*finding, Fact::CoStop));
    return LosesEitherWay(*finding) + ", together with " + with;
}

std::string TellRing(const Finding &finding) {
    double entries = ValueOf(finding, Fact::Ring1Size);
    double time = entries / ValueOf(finding, Fact::RxPps) * 1000;
    return LosesEitherWay(finding) + ", together with a full ring of " + NumberText(entries) + ", which holds " +
           NumberText(std::round(time * 10) / 10) + " ms of packets";
}

std::string TellWorker(Finding *finding) {
    if (finding->aspect == Aspect::Stops) {
        return "has queue stops " + InRecords(*finding) + WithWorker(finding);
    }
    return LosesEitherWay(*finding) + WithWorker(finding);
}

std::string TellPcpu(Finding *finding) {
    std::string text = "has a worker that waits for pcpu " + NumberText(ValueOf(*finding, Fact::Pcpu)) + ", " +
                       Percent(ValueOf(*finding, Fact::PcpuUsed)) + " used, " + InRecords(*finding);
    if (finding->lost > 0) {
        text += ", " + NumberText(std::round(finding->lost)) + " packets lost in them";
    }
    return text + WithWorker(finding);
}

std::string TellNic(const Finding &finding) {
    std::string text = "loses " + Percent(finding.share) + " of packets at its link " + InRecords(finding) + ", " +
                       NumberText(std::round(finding.lost)) + " in all";
    if (finding.aspect == Aspect::OneQueue) {
        text += ", together with one receive queue of " + NumberText(ValueOf(finding, Fact::RxQueues)) +
                " in use and intr.used " + NumberText(ValueOf(finding, Fact::IntrUsed));
    }
    return text;
}

std::string TellUplink(const Finding &finding, const FindingsOptions &options) {
    std::string most = NumberText(ValueOf(finding, Fact::NicTxMbps)) + " Mbit/s";
    if (options.linkMbps > 0) {
        return "fills its link of " + NumberText(options.linkMbps) + " Mbit/s " + InRecords(finding) + ", with up to " +
               most;
    }
    return "sends up to " + most + " and no more: " + InRecords(finding) + " it is within " +
           Percent(LimitOf(Limit::TopNear)) + " of that, together with queue stops";
}

std::string TellQueues(const Finding &finding) {
    return "sends " + Percent(ValueOf(finding, Fact::TxQueueShare)) + " of " +
           NumberText(ValueOf(finding, Fact::TxQueueAll)) + " packets/s by queue " +
           NumberText(ValueOf(finding, Fact::TxQueue)) + " of " + NumberText(ValueOf(finding, Fact::TxQueues)) + ' ' +
           InRecords(finding);
}

std::string TellStack(const Finding &finding) {
    if (finding.aspect == Aspect::Tcp) {
        double share = 100 * ValueOf(finding, Fact::TcpRexmit) / ValueOf(finding, Fact::TcpPps);
        return "belongs to a host stack that sends up to " + NumberText(ValueOf(finding, Fact::TcpRexmit)) +
               " TCP segments/s again, " + Percent(share) + ", " + InRecords(finding);
    }
    return "belongs to a host stack that loses " + Percent(finding.share) + " of received datagrams at full sockets " +
           InRecords(finding) + ", " + NumberText(std::round(finding.lost)) + " in all";
}

std::string TellMeasurement(const Finding &finding) {
    if (finding.aspect == Aspect::Overhead) {
        return "spends up to " + Percent(ValueOf(finding, "overhead.used")) + " of a pcpu on lan-meter itself " +
               InRecords(finding);
    }
    return "has records that came late, " + InRecords(finding) + ", the latest after " +
           NumberText(ValueOf(finding, "gap")) + " s where " + NumberText(ValueOf(finding, "median")) + " s are usual";
}

std::string TellSuspect(const Finding &finding) {
    switch (finding.aspect) {
    case Aspect::Times:
        return "has records whose time lies before the one ahead, " + InRecords(finding);
    case Aspect::Empty:
        return "could not be read any more " + InRecords(finding);
    case Aspect::Shares:
        return "has shares of the time that together exceed 100 % " + InRecords(finding) +
               ", as reports of -a have, and they count as missing";
    default:
        return "has figures that can't be true " + InRecords(finding) + ", and they count as missing";
    }
}

// Whether the rule's other advice is the one that fits.
bool WantsElse(const Finding &finding) {
    switch (finding.aspect) {
    case Aspect::Shares:
    case Aspect::OneQueue:
    case Aspect::Udp:
    case Aspect::Overhead:
        return true;
    default:
        // Where workers are told, the letters were given.
        return finding.rule == Rule::Unexplained && !std::isnan(ValueOf(finding, Fact::WdtUsed));
    }
}

std::string PortText(const FindingPort &port, bool withName) {
    return withName ? NameText(port.name) + " (" + NameText(port.id) + ")" : NameText(port.id);
}

}  // namespace

void FindingTell(Finding *finding, const FindingsOptions &options) {
    const RuleText &rule = RuleOf(finding->rule);
    finding->tryThis = WantsElse(*finding) && rule.tryElse != nullptr ? rule.tryElse : rule.tryThis;
    switch (finding->rule) {
    case Rule::Suspect:
        finding->what = TellSuspect(*finding);
        break;
    case Rule::WaitsForCpu:
    case Rule::OneVcpu:
        finding->what = TellVcpu(finding);
        break;
    case Rule::RingSmall:
        finding->what = TellRing(*finding);
        break;
    case Rule::WorkerShort:
        finding->what = TellWorker(finding);
        break;
    case Rule::PcpuFull:
        finding->what = TellPcpu(finding);
        break;
    case Rule::BeforeSwitch:
        finding->what = TellNic(*finding);
        break;
    case Rule::UplinkFull:
        finding->what = TellUplink(*finding, options);
        break;
    case Rule::QueuesUneven:
        finding->what = TellQueues(*finding);
        break;
    case Rule::HostStack:
        finding->what = TellStack(*finding);
        break;
    case Rule::SmallPackets:
        finding->what = "receives up to " + NumberText(ValueOf(*finding, Fact::RxPps)) + " packets/s, of " +
                        NumberText(ValueOf(*finding, Fact::RxSize)) + " bytes, " + InRecords(*finding);
        break;
    case Rule::Measurement:
        finding->what = TellMeasurement(*finding);
        break;
    case Rule::Unexplained:
        finding->what = LosesEitherWay(*finding) + ", which no rule explains";
        break;
    }
}

std::string KeyText(const char *key) {
    if (strncmp(key, "vnic.", 5) == 0) {
        return key + 5;
    }
    return key;
}

std::string SubjectText(const Findings &findings, const Finding &finding) {
    bool manyHosts = findings.hosts.size() > 1;
    if (finding.port == kNoPort) {
        return NameText(finding.host);
    }
    const FindingPort &port = findings.ports[finding.port];
    std::string text = (manyHosts ? NameText(port.host) + ": " : "") + PortText(port, true);
    constexpr size_t kMostOthers = 4;
    for (size_t i = 0; i < finding.others.size() && i < kMostOthers; i++) {
        const FindingPort &other = findings.ports[finding.others[i]];
        text += (i == 0 ? ", also " : ", ") + PortText(other, other.name != port.name);
    }
    if (finding.others.size() > kMostOthers) {
        text += " and " + NumberText(static_cast<double>(finding.others.size() - kMostOthers)) + " more";
    }
    return text + (finding.others.empty() ? "" : ",");
}

std::string FindingText(const Findings &findings, const Finding &finding) {
    const RuleText &rule = RuleOf(finding.rule);
    std::string text =
        std::string(SeveritySign(finding.severity)) + ' ' + SubjectText(findings, finding) + ' ' + finding.what;
    if (!finding.of.empty()) {
        text += std::string(" of ") + finding.ofKind + ' ' + NameText(finding.of);
    }
    bool sameDay = findings.firstTime / 86400 == findings.lastTime / 86400;
    std::string time = MomentText(finding.worstTime, false);
    text +=
        std::string(" [") + rule.number + "]. Worst " + (sameDay && time.size() > 11 ? time.substr(11) : time) + ":";
    const char *comma = " ";
    for (const FindingValue &value : finding.values) {
        bool share = strcmp(value.key, kShareKey) == 0;
        text += comma + (share ? Percent(value.value) : KeyText(value.key) + ' ' + NumberText(value.value));
        comma = ", ";
    }
    return text + (finding.values.empty() ? " -" : "") + ". Try: " + finding.tryThis + ". Wrong if: " + rule.wrongIf +
           ".";
}

}  // namespace report
