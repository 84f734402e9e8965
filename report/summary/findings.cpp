#include "report/summary/tally.h"

#include <algorithm>
#include <cmath>

namespace report {
namespace {

using Engine = Findings::Engine;

// What a hostile or very long series may make us keep.
constexpr size_t kMostPorts = 1 << 20;
constexpr size_t kMostTallies = 1 << 20;
constexpr size_t kMostSeries = 1 << 18;
constexpr size_t kMostGaps = 1 << 12;
constexpr size_t kMostSharers = 64;  // ports of one VM, worker or kind that are named

uint64_t TallyKey(uint8_t rule, Aspect aspect, uint32_t subject) {
    return static_cast<uint64_t>(subject) << 16 | static_cast<uint64_t>(rule) << 8 | static_cast<uint64_t>(aspect);
}

constexpr Fact kReceiveLoss[] = {Fact::RxEps,      Fact::R1Full,   Fact::R2Full,   Fact::RxBufLow, Fact::OoSlots,
                                 Fact::RxOflow,    Fact::Ring2Err, Fact::MaxFrags, Fact::MapFail,  Fact::SgErr,
                                 Fact::Ring1Size,  Fact::RxPps,    Fact::Ready,    Fact::CoStop,   Fact::Used,
                                 Fact::UsedOthers, Fact::WdtUsed,  Fact::WdtReady};
constexpr Fact kSendLoss[] = {Fact::TxEps,   Fact::TxDisc,  Fact::VnicStops, Fact::TxAllocErr,
                              Fact::TxOflow, Fact::TxPps,   Fact::NicStops,  Fact::Ready,
                              Fact::Used,    Fact::WdtUsed, Fact::WdtReady};
constexpr Fact kStopFacts[] = {Fact::VnicStops, Fact::NicStops, Fact::TxPps, Fact::WdtUsed, Fact::WdtReady};
constexpr Fact kPcpuFacts[] = {Fact::WdtReady, Fact::WdtUsed, Fact::Pcpu,  Fact::PcpuUsed,
                               Fact::RxEps,    Fact::RxPps,   Fact::TxEps, Fact::TxPps};
constexpr Fact kNicFacts[] = {Fact::NicRxEps, Fact::NicRxPps, Fact::RxActive, Fact::RxQueues,
                              Fact::IntrUsed, Fact::WdtUsed,  Fact::WdtReady};
constexpr Fact kTopFacts[] = {Fact::NicTxMbps, Fact::NicTxPps, Fact::NicStops};
constexpr Fact kQueueFacts[] = {Fact::TxQueue, Fact::TxQueueShare, Fact::TxQueueAll, Fact::TxQueues};
constexpr Fact kTcpFacts[] = {Fact::TcpRexmit, Fact::TcpPps};
constexpr Fact kUdpFacts[] = {Fact::UdpRxSockEps, Fact::UdpRxPps};
constexpr Fact kSmallFacts[] = {Fact::RxPps, Fact::RxSize};

std::span<const Fact> FactsOf(uint8_t rule, Aspect aspect) {
    switch (static_cast<Rule>(rule)) {
    case Rule::PcpuFull:
        return kPcpuFacts;
    case Rule::BeforeSwitch:
        return kNicFacts;
    case Rule::UplinkFull:
        return kTopFacts;
    case Rule::QueuesUneven:
        return kQueueFacts;
    case Rule::HostStack:
        return aspect == Aspect::Tcp ? std::span<const Fact>(kTcpFacts) : kUdpFacts;
    case Rule::SmallPackets:
        return kSmallFacts;
    default:
        return aspect == Aspect::Stops  ? std::span<const Fact>(kStopFacts)
               : aspect == Aspect::Sent ? std::span<const Fact>(kSendLoss)
                                        : kReceiveLoss;
    }
}

// Counters of trouble, which say nothing while they are 0.
bool IsTrouble(Fact fact) {
    return (fact >= Fact::R1Full && fact <= Fact::TxOflow) || fact == Fact::CoStop || fact == Fact::NicStops;
}

std::string_view VcpuOf(uint8_t rule, const PortFacts &facts) {
    switch (static_cast<Rule>(rule)) {
    case Rule::OneVcpu:
        return facts.busiest;
    case Rule::WaitsForCpu:
        return facts.at(Fact::Ready) >= LimitOf(Limit::Ready) ? facts.waiting : facts.stopped;
    default:
        return {};
    }
}

uint32_t Intern(std::unordered_map<std::string, uint32_t> *names, std::string name, bool *added) {
    auto [at, isNew] = names->try_emplace(std::move(name), static_cast<uint32_t>(names->size()));
    *added = isNew;
    return at->second;
}

uint32_t SubjectOf(Engine *engine, char kind, std::string_view name) {
    bool added;
    std::string key = kind + std::to_string(engine->host) + ' ';
    return Intern(&engine->subjectByName, key.append(name), &added);
}

uint32_t HostOf(Findings *findings, const std::string &name) {
    bool added;
    uint32_t host = Intern(&findings->engine->hostByName, name, &added);
    if (added) {
        findings->hosts.push_back(name);
        findings->engine->hosts.emplace_back();
    }
    return host;
}

// The port at a place, by its id; kNoPort while nobody told who stands there.
uint32_t PortOf(Findings *findings, const Rows &rows, uint32_t place) {
    Engine *engine = findings->engine;
    const PortIdentity &identity = rows.ports[place];
    uint32_t port = engine->portByPlace[place];
    if (identity.id.empty()) {
        return kNoPort;
    }
    if (port == kNoPort || engine->ports[port].host != engine->host || findings->ports[port].id != identity.id) {
        bool added;
        if (findings->ports.size() >= kMostPorts) {
            engine->full = true;
            return kNoPort;
        }
        port = Intern(&engine->portByName, std::to_string(engine->host) + ' ' + identity.id, &added);
        if (added) {
            findings->ports.push_back({rows.host, identity.name, identity.switchName, identity.id, place});
            engine->ports.push_back({.host = engine->host});
        }
        engine->portByPlace[place] = port;
    }
    FindingPort &known = findings->ports[port];
    if (known.name != identity.name) {
        known.name = identity.name;
    }
    known.place = place;
    engine->ports[port].uplink = engine->ports[port].uplink || identity.uplink;
    return port;
}

void AddShare(Tally *tally, uint32_t port, double lost) {
    if (port == kNoPort) {
        return;
    }
    for (Share &share : tally->ports) {
        if (share.port == port) {
            share.lost += lost;
            return;
        }
    }
    if (tally->ports.size() < kMostSharers) {
        tally->ports.push_back({port, lost});
    }
}

// Counts a match once a record for its subject. Returns the tally if this is its worst record so far, and whose values
// it shall then hold; else null.
Tally *Meet(Engine *engine, uint8_t rule, const Match &match, uint32_t subject, uint32_t port) {
    uint64_t key = TallyKey(rule, match.aspect, subject);
    auto at = engine->tallies.find(key);
    if (at == engine->tallies.end()) {
        if (engine->tallies.size() >= kMostTallies) {
            engine->full = true;
            return nullptr;
        }
        at = engine->tallies.emplace(key, Tally{}).first;
        at->second.rule = rule;
        at->second.aspect = match.aspect;
        at->second.host = engine->host;
    }
    Tally *tally = &at->second;
    if (tally->lastRecord != engine->records) {
        tally->lastRecord = engine->records;
        tally->lastSeverity = Severity::None;
        tally->hits++;
    }
    for (auto i = static_cast<size_t>(tally->lastSeverity) + 1; i <= static_cast<size_t>(match.severity); i++) {
        tally->reached[i]++;
    }
    tally->lastSeverity = std::max(tally->lastSeverity, match.severity);
    tally->lost += match.lost * engine->span;
    tally->passed += std::isnan(match.passed) ? 0 : match.passed * engine->span;
    AddShare(tally, port, match.lost * engine->span);
    if (match.severity < tally->worst || (match.severity == tally->worst && !(match.weight > tally->weight))) {
        return nullptr;
    }
    tally->worst = match.severity;
    tally->weight = match.weight;
    tally->worstPort = port;
    tally->worstRecord = engine->number;
    tally->worstTime = engine->time;
    tally->values.clear();
    return tally;
}

void AddMatch(Engine *engine, uint8_t rule, const Match &match, const PortFacts &facts, uint32_t port) {
    uint32_t subject;
    std::string_view of = VcpuOf(rule, facts);
    if (!of.empty()) {
        subject = SubjectOf(engine, 'v', facts.vm);
    } else if (rule == static_cast<uint8_t>(Rule::WorkerShort) || rule == static_cast<uint8_t>(Rule::PcpuFull)) {
        subject = SubjectOf(engine, 'w', facts.worker);
        of = facts.worker;
    } else if (rule == static_cast<uint8_t>(Rule::HostStack)) {
        subject = SubjectOf(engine, 'h', "");
    } else {
        subject = SubjectOf(engine, 'p', std::to_string(port));
    }
    Tally *tally = Meet(engine, rule, match, subject, port);
    if (tally == nullptr) {
        return;
    }
    tally->of = of;
    if (match.lost > 0) {
        tally->values.push_back({kShareKey, 100 * match.lost / (match.lost + match.passed)});
    }
    for (Fact fact : FactsOf(rule, match.aspect)) {
        double value = facts.at(fact);
        if (!std::isnan(value) && (value != 0 || !IsTrouble(fact))) {
            tally->values.push_back({FactKey(fact), value});
        }
    }
}

// All loss of a port, so that what several rules share in rare records is not lost between them.
void AddAnyLoss(Engine *engine, const PortFacts &facts, uint32_t port) {
    const struct {
        Aspect aspect;
        Fact lost, passed;
    } ways[] = {{Aspect::Received, Fact::RxEps, Fact::RxPps}, {Aspect::Sent, Fact::TxEps, Fact::TxPps}};
    for (const auto &way : ways) {
        double lost = facts.at(way.lost), passed = facts.at(way.passed);
        Severity severity = LossSeverity(lost, passed);
        if (severity != Severity::None) {
            AddMatch(engine, kAnyLoss, {Rule::Unexplained, way.aspect, severity, lost, passed, lost}, facts, port);
        }
    }
}

void AddUplink(Engine *engine, const PortFacts &facts, uint32_t port) {
    double sent = facts.at(Fact::NicTxMbps);
    const auto rule = static_cast<uint8_t>(Rule::UplinkFull);
    const Match match = {Rule::UplinkFull, Aspect::Whole, Severity::Warning, 0, 0, sent};
    if (engine->options.linkMbps > 0) {
        if (RuleLinkFull(facts, engine->options.linkMbps)) {
            AddMatch(engine, rule, match, facts, port);
        }
        return;
    }
    if (!(sent > 0) || std::isnan(facts.at(Fact::NicStops))) {
        return;
    }
    Top &top = engine->tops[port];
    int step = static_cast<int>(std::floor(std::log(sent) / std::log(kTopStep)));
    top.most = std::max(top.most, sent);
    top.all[step]++;
    if (facts.at(Fact::NicStops) > 0) {
        top.withStops[step]++;
        engine->ports[port].stops = true;
        AddMatch(engine, rule, match, facts, port);
    }
}

void AddPort(Findings *findings, const Rows &rows, uint32_t place) {
    Engine *engine = findings->engine;
    uint32_t port = PortOf(findings, rows, place);
    if (!rows.ports[place].present) {
        const Match match = {Rule::Suspect, Aspect::Empty, Severity::Note, 0, 0, 0};
        Meet(engine, static_cast<uint8_t>(Rule::Suspect), match, SubjectOf(engine, 'h', ""), port);
        return;
    }
    if (port == kNoPort) {
        return;
    }
    PortFacts facts;
    FactsOfPort(&engine->reader, rows, place, &facts);
    engine->ports[port].sections |= facts.sections;
    Match matches[kMostMatches];
    size_t count = RulesOfPort(facts, matches);
    for (size_t i = 0; i < count; i++) {
        AddMatch(engine, static_cast<uint8_t>(matches[i].rule), matches[i], facts, port);
    }
    AddAnyLoss(engine, facts, port);
    AddUplink(engine, facts, port);
}

void AddSuspects(Findings *findings, const Rows &rows, const std::vector<char> *chosen) {
    Engine *engine = findings->engine;
    for (const Suspect &suspect : engine->reader.suspects) {
        uint32_t port = kNoPort;
        if (suspect.place < rows.ports.size()) {
            if (chosen != nullptr && (*chosen)[suspect.place] == 0) {
                continue;
            }
            port = PortOf(findings, rows, suspect.place);
        }
        const Match match = {Rule::Suspect,
                             suspect.share ? Aspect::Shares : Aspect::Values,
                             suspect.share ? Severity::Warning : Severity::Note,
                             0,
                             0,
                             std::fabs(suspect.value)};
        Tally *tally = Meet(engine, static_cast<uint8_t>(Rule::Suspect), match, SubjectOf(engine, 'h', ""), port);
        if (tally != nullptr) {
            tally->values.push_back({suspect.key, suspect.value});
        }
        if (!suspect.share && engine->suspectSeries.size() < kMostSeries) {
            engine->suspectSeries.insert(static_cast<uint64_t>(port) << 32 |
                                         static_cast<uint64_t>(suspect.series) << 16 | (engine->host & 0xffff));
        }
    }
}

// Any number may stand for a time; sums and differences of these can't overflow.
int64_t Bounded(int64_t value) {
    constexpr int64_t kMost = 1'000'000'000'000'000;
    return std::clamp(value, -kMost, kMost);
}

// Time, span and distances of the record at hand.
void AddTime(Findings *findings, const Rows &rows) {
    Engine *engine = findings->engine;
    engine->host = HostOf(findings, rows.host);
    HostState &host = engine->hosts[engine->host];
    int64_t time = engine->time, iteration = Bounded(rows.iteration), interval = Bounded(rows.interval);
    int64_t distance = time - host.time;
    bool follows = host.started && iteration == host.iteration + 1;
    if (host.started && distance < 0) {
        const Match match = {Rule::Suspect, Aspect::Times, Severity::Note, 0, 0, static_cast<double>(-distance)};
        Meet(engine, static_cast<uint8_t>(Rule::Suspect), match, SubjectOf(engine, 'h', ""), kNoPort);
        follows = false;
    }
    engine->span = static_cast<double>(follows ? distance : std::max<int64_t>(interval, 0));
    if (follows && (host.gaps.size() < kMostGaps || host.gaps.contains(distance))) {
        Gap &gap = host.gaps[distance];
        gap = {gap.count + 1, engine->number, engine->time};
    }
    host.started = true;
    host.time = time;
    host.iteration = iteration;
    host.records++;
    findings->interval = findings->interval == 0 ? interval : findings->interval;
    findings->firstTime = findings->records == 0 ? time : std::min(findings->firstTime, time);
    findings->lastTime = findings->records == 0 ? time : std::max(findings->lastTime, time);
    findings->records++;
}

void AddOverhead(Engine *engine, const Rows &rows) {
    double used = FactsOverhead(engine->reader, rows);
    if (used >= LimitOf(Limit::OverheadUsed)) {
        const Match match = {Rule::Measurement, Aspect::Overhead, Severity::Warning, 0, 0, used};
        Tally *tally =
            Meet(engine, static_cast<uint8_t>(Rule::Measurement), match, SubjectOf(engine, 'h', ""), kNoPort);
        if (tally != nullptr) {
            tally->values.push_back({"overhead.used", used});
        }
    }
}

}  // namespace

void FindingsInit(Findings *findings, const FindingsOptions &options) {
    *findings = Findings{};
    findings->engine = new Engine;
    findings->engine->options = options;
    FactsInit(&findings->engine->reader);
}

void FindingsAdd(Findings *findings, const Rows &rows, uint64_t number, const std::vector<char> *chosen) {
    Engine *engine = findings->engine;
    engine->number = number;
    engine->time = Bounded(rows.time);
    AddTime(findings, rows);
    FactsBegin(&engine->reader, rows, engine->span, engine->options.counts);
    engine->portByPlace.resize(std::max(engine->portByPlace.size(), rows.ports.size()), kNoPort);
    for (uint32_t place = 0; place < rows.ports.size(); place++) {
        if (chosen == nullptr || (*chosen)[place] != 0) {
            AddPort(findings, rows, place);
        }
    }
    AddSuspects(findings, rows, chosen);
    AddOverhead(engine, rows);
    engine->records++;
}

void FindingsCleanup(Findings *findings) {
    delete findings->engine;
    *findings = Findings{};
}

}  // namespace report
