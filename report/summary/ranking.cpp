#include "report/summary/sentences.h"
#include "report/summary/tally.h"
#include "report/summary/words.h"

#include <algorithm>
#include <cmath>

namespace report {
namespace {

using Engine = Findings::Engine;

int64_t MedianGap(const HostState &host) {
    uint64_t all = 0, below = 0;
    for (const auto &[gap, seen] : host.gaps) {
        all += seen.count;
    }
    for (const auto &[gap, seen] : host.gaps) {
        below += seen.count;
        if (below * 2 >= all) {
            return gap;
        }
    }
    return 0;
}

// Whether the tally's records are enough, and the highest severity for which they are.
Severity SeverityOf(const Tally &tally, uint64_t records) {
    auto rule = static_cast<Rule>(tally.rule);
    if (rule == Rule::Suspect) {
        return tally.worst;
    }
    for (size_t i = 3; i > 0; i--) {
        bool enough = rule == Rule::UplinkFull ? static_cast<double>(tally.reached[i]) >= LimitOf(Limit::TopRecords)
                                               : HitEnough(tally.reached[i], records);
        if (enough) {
            return static_cast<Severity>(i);
        }
    }
    return Severity::None;
}

Finding FindingOf(const Findings &findings, const Tally &tally, Severity severity) {
    Finding finding;
    finding.rule = tally.rule == kAnyLoss ? Rule::Unexplained : static_cast<Rule>(tally.rule);
    finding.severity = severity;
    finding.aspect = tally.aspect;
    finding.host = findings.hosts[tally.host];
    finding.port = tally.worstPort;
    std::vector<Share> shares = tally.ports;
    std::stable_sort(shares.begin(), shares.end(),
                     [](const Share &one, const Share &other) { return one.lost > other.lost; });
    for (const Share &share : shares) {
        if (share.port != finding.port) {
            finding.others.push_back(share.port);
        }
    }
    finding.of = tally.of;
    finding.records = tally.hits;
    finding.recordsOf = findings.engine->hosts[tally.host].records;
    finding.lost = tally.lost;
    finding.share = tally.lost > 0 ? 100 * tally.lost / (tally.lost + tally.passed) : 0;
    finding.worstRecord = tally.worstRecord;
    finding.worstTime = tally.worstTime;
    finding.values = tally.values;
    return finding;
}

// How many records are near the top while queues stop, and how many lie well below.
bool IsTop(Top *top, Finding *finding) {
    uint64_t near = 0, below = 0;
    for (const auto &[step, count] : top->withStops) {
        near += std::pow(kTopStep, step) >= top->most * (100 - LimitOf(Limit::TopNear)) / 100 ? count : 0;
    }
    for (const auto &[step, count] : top->all) {
        below += std::pow(kTopStep, step + 1) <= top->most * LimitOf(Limit::TopBelow) / 100 ? count : 0;
    }
    finding->records = near;
    bool enough = static_cast<double>(near) >= LimitOf(Limit::TopRecords);
    top->steady = enough && static_cast<double>(below) < LimitOf(Limit::TopRecords);
    return enough && !top->steady;
}

void ListTallies(Findings *findings) {
    Engine *engine = findings->engine;
    for (const auto &[key, tally] : engine->tallies) {
        Severity severity = SeverityOf(tally, engine->hosts[tally.host].records);
        if (severity == Severity::None || tally.rule == kAnyLoss) {
            continue;
        }
        Finding finding = FindingOf(*findings, tally, severity);
        if (finding.rule == Rule::UplinkFull && engine->options.linkMbps <= 0 &&
            !IsTop(&engine->tops[finding.port], &finding)) {
            continue;
        }
        if (finding.rule == Rule::Suspect && finding.aspect == Aspect::Values) {
            finding.values.push_back({"series", static_cast<double>(engine->suspectSeries.size())});
        }
        findings->list.push_back(std::move(finding));
    }
}

// A port and a direction as one number.
uint64_t WayOf(uint32_t port, Aspect aspect) {
    return static_cast<uint64_t>(port) << 1 | (aspect == Aspect::Sent ? 1 : 0);
}

// Loss that is a finding, but whose records the rules share so that none has enough of them.
void ListLossBetween(Findings *findings) {
    Engine *engine = findings->engine;
    std::unordered_set<uint64_t> told;  // ports and directions
    for (const Finding &finding : findings->list) {
        bool loss = finding.lost > 0 && finding.rule != Rule::HostStack && finding.port != kNoPort;
        for (size_t i = 0; loss && i <= finding.others.size(); i++) {
            uint32_t port = i == 0 ? finding.port : finding.others[i - 1];
            told.insert(WayOf(port, finding.aspect));
            if (finding.aspect == Aspect::Whole) {
                told.insert(WayOf(port, Aspect::Sent));
            }
        }
    }
    for (const auto &[key, tally] : engine->tallies) {
        Severity severity = SeverityOf(tally, engine->hosts[tally.host].records);
        uint64_t way = WayOf(tally.worstPort, tally.aspect);
        if (tally.rule == kAnyLoss && severity != Severity::None && !told.contains(way)) {
            findings->list.push_back(FindingOf(*findings, tally, severity));
        }
    }
}

void ListGaps(Findings *findings) {
    Engine *engine = findings->engine;
    for (uint32_t i = 0; i < engine->hosts.size(); i++) {
        const HostState &host = engine->hosts[i];
        int64_t median = MedianGap(host);
        findings->interval = i == 0 && !host.gaps.empty() ? median : findings->interval;
        Finding finding;
        for (const auto &[length, gap] : host.gaps) {
            // Times are whole seconds, so that two of them may be one second too far apart.
            if (static_cast<double>(length) > static_cast<double>(median) * LimitOf(Limit::GapTimes) &&
                length >= median + 2) {
                finding.records += gap.count;
                finding.worstRecord = gap.record;
                finding.worstTime = gap.time;
                finding.values = {{"gap", static_cast<double>(length)}, {"median", static_cast<double>(median)}};
            }
        }
        if (finding.records > 0) {
            finding.rule = Rule::Measurement;
            finding.severity = Severity::Note;
            finding.aspect = Aspect::Gaps;
            finding.host = findings->hosts[i];
            finding.recordsOf = host.records;
            findings->list.push_back(std::move(finding));
        }
    }
}

bool Before(const Finding &one, const Finding &other) {
    // A report of counts makes nonsense of all that follows.
    if ((one.aspect == Aspect::Shares) != (other.aspect == Aspect::Shares)) {
        return one.aspect == Aspect::Shares;
    }
    if (one.severity != other.severity) {
        return one.severity > other.severity;
    }
    if (one.lost != other.lost) {
        return one.lost > other.lost;
    }
    if (one.records != other.records) {
        return one.records > other.records;
    }
    if (one.rule != other.rule) {
        return one.rule < other.rule;
    }
    return one.port != other.port   ? one.port < other.port
           : one.host != other.host ? one.host < other.host
           : one.of != other.of     ? one.of < other.of
                                    : one.aspect < other.aspect;
}

// How many ports of a kind there are, and how many of them had a section.
struct Coverage {
    uint64_t ports = 0, with = 0;
    std::string text(const char *kind) const {
        return NumberText(static_cast<double>(ports - with)) + " of " + NumberText(static_cast<double>(ports)) + ' ' +
               kind;
    }
};

void Judge(Findings *findings, const char *rules, std::string why) {
    findings->notJudged.push_back({rules, std::move(why)});
}

void ListNotJudged(Findings *findings) {
    Engine *engine = findings->engine;
    Coverage vnic, nic, queues, interrupts, workers, stack, vcpus;
    uint64_t steady = 0, unknown = 0;
    for (const PortState &port : engine->ports) {
        auto has = [&port](Section section) { return (port.sections & Wanted(section)) != 0 ? 1u : 0u; };
        workers.with += has(Section::Wdt);
        stack.with += has(Section::Hoststack);
        vcpus.with += has(Section::Vcpu);
        if (has(Section::Vcpu) != 0) {
            vnic.ports++;
            vnic.with += has(Section::Vnic);
        }
        if (port.uplink) {
            nic.ports++;
            nic.with += has(Section::Physnic);
            queues.with += has(Section::Txqueue);
            interrupts.with += has(Section::Intr);
            unknown += has(Section::Txqueue) != 0 && !port.stops ? 1 : 0;
        }
    }
    for (const auto &[port, top] : engine->tops) {
        steady += top.steady ? 1 : 0;
    }
    queues.ports = interrupts.ports = nic.ports;
    if (engine->ports.empty()) {
        Judge(findings, "F1 to F10, F12", "no port could be read");
        return;
    }
    if (vcpus.with == 0) {
        Judge(findings, "F1 F2 F3",
              "no port shows vcpus: none of a VM was watched, or the host tells them to others alone");
    }
    if (vnic.with < vnic.ports) {
        Judge(findings, "F1 F2 F3",
              "no vnic figures at " + vnic.text("ports of VMs") +
                  ": the letters v and i bring them for NICs of parlan2 and parlan3, on Linux nothing does");
    }
    if (workers.with == 0) {
        Judge(findings, "F4 F5", "no port shows worldlets: the letter W brings them");
    }
    if (nic.ports == 0) {
        Judge(findings, "F6 F7 F8", "no uplink was watched");
    } else if (nic.with < nic.ports) {
        Judge(findings, "F6", "no physnic figures at " + nic.text("uplinks") + ": the letters v and i bring them");
    }
    if (queues.with < queues.ports) {
        Judge(findings, "F7 F8", "no queues at " + queues.text("uplinks") + ": the letters q and v bring them");
    }
    if (interrupts.with < interrupts.ports) {
        Judge(findings, "F6, whether one queue does all",
              "no interrupts at " + interrupts.text("uplinks") + ": the letter i brings them, on Linux nothing does");
    }
    if (engine->options.linkMbps <= 0 && steady > 0) {
        Judge(findings, "F7",
              NumberText(static_cast<double>(steady)) + (steady == 1 ? " uplink sends" : " uplinks send") +
                  " evenly while queues stop: --link-mbps tells whether that is the limit");
    }
    if (engine->options.linkMbps <= 0 && unknown > 0) {
        Judge(findings, "F7",
              "no queue stop was counted at " + NumberText(static_cast<double>(unknown)) +
                  (unknown == 1 ? " uplink" : " uplinks") +
                  ", and not all drivers count them: --link-mbps does without");
    }
    if (stack.with == 0) {
        Judge(findings, "F9", "no port shows the host's IP stack: one of it must be watched, with the letter v or i");
    }
    if (findings->records < 3) {
        Judge(findings, "F11, whether records came late", "that takes three records");
    }
    if (engine->full) {
        Judge(findings, "all", "there were more ports, VMs and workers than are kept");
    }
}

}  // namespace

void FindingsRank(Findings *findings) {
    findings->list.clear();
    findings->notJudged.clear();
    ListTallies(findings);
    ListLossBetween(findings);
    ListGaps(findings);
    std::sort(findings->list.begin(), findings->list.end(), Before);
    for (Finding &finding : findings->list) {
        FindingTell(&finding, findings->engine->options);
    }
    ListNotJudged(findings);
}

}  // namespace report
