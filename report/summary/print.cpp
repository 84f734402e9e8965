#include "report/summary/print.h"

#include "report/rows/moment.h"
#include "report/summary/sentences.h"
#include "report/summary/words.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdio>

namespace report {
namespace {

std::string Count(uint64_t count, const char *one, const char *many) {
    std::string text = NumberText(static_cast<double>(count));
    return text.append(" ").append(count == 1 ? one : many);
}

struct Tallied {
    uint64_t serious = 0, warnings = 0, notes = 0;
};

Tallied CountFindings(const Findings &findings) {
    Tallied count;
    for (const Finding &finding : findings.list) {
        (finding.severity == Severity::Serious   ? count.serious
         : finding.severity == Severity::Warning ? count.warnings
                                                 : count.notes)++;
    }
    return count;
}

std::string HostsText(const Findings &findings) {
    std::string text = findings.hosts.size() > 1 ? Count(findings.hosts.size(), "host", "hosts") + ": " : "";
    constexpr size_t kMostHosts = 8;
    for (size_t i = 0; i < std::min(findings.hosts.size(), kMostHosts); i++) {
        text += (i == 0 ? "" : ", ") + NameText(findings.hosts[i]);
    }
    return text + (findings.hosts.size() > kMostHosts ? ", ..." : "");
}

// 2026-11-23 02:10:00 to 03:10:00 UTC
std::string SpanText(const Findings &findings) {
    std::string from = MomentText(findings.firstTime, false), to = MomentText(findings.lastTime, false);
    if (from.size() != 20 || to.size() != 20) {
        return from + " to " + to;
    }
    from[10] = to[10] = ' ';
    from.pop_back();
    to.pop_back();
    bool sameDay = from.compare(0, 10, to, 0, 10) == 0;
    return from + (from == to ? "" : " to " + to.substr(sameDay ? 11 : 0)) + " UTC";
}

std::string HeadText(const Findings &findings, const StreamTally &tally) {
    std::string text = HostsText(findings) + " | " + SpanText(findings) + " | " +
                       Count(findings.records, "record", "records") + " of " + std::to_string(findings.interval) +
                       " s | " + Count(findings.ports.size(), "port", "ports");
    if (tally.mended > 0 || tally.cut > 0) {
        text +=
            " | " + Count(tally.mended, "name", "names") + " mended, " + Count(tally.cut, "record", "records") + " cut";
    }
    return text + '\n';
}

// --- JSON: texts, and numbers as short as they can be read back.

void AddText(std::string *json, std::string_view text) {
    *json += '"';
    for (char byte : text) {
        auto code = static_cast<unsigned char>(byte);
        if (byte == '"' || byte == '\\') {
            *json += '\\';
            *json += byte;
        } else if (code < 0x20 || code == 0x7f) {
            char escaped[8];
            snprintf(escaped, sizeof escaped, "\\u%04x", code);
            *json += escaped;
        } else {
            *json += byte;
        }
    }
    *json += '"';
}

void AddKey(std::string *json, std::string_view key) {
    if (json->back() != '{') {
        *json += ", ";
    }
    AddText(json, key);
    *json += ": ";
}

void AddNumber(std::string *json, std::string_view key, double value) {
    AddKey(json, key);
    char text[32];
    auto end = std::to_chars(text, text + sizeof text, std::isfinite(value) ? value : 0).ptr;
    json->append(text, end);
}

void AddWhole(std::string *json, std::string_view key, int64_t value) {
    AddKey(json, key);
    *json += std::to_string(value);
}

void AddString(std::string *json, std::string_view key, std::string_view text) {
    AddKey(json, key);
    AddText(json, text);
}

void AddPort(std::string *json, const FindingPort &port) {
    *json += '{';
    AddString(json, "name", port.name);
    AddString(json, "switch", port.switchName);
    AddString(json, "id", port.id);
    *json += '}';
}

std::string FindingJson(const Findings &findings, const Finding &finding) {
    const RuleText &rule = RuleOf(finding.rule);
    std::string json = "{";
    AddString(&json, "rule", rule.number);
    AddString(&json, "finding", rule.finding);
    AddString(&json, "severity", SeverityName(finding.severity));
    AddString(&json, "aspect", AspectName(finding.aspect));
    AddString(&json, "host", finding.host);
    if (finding.port != kNoPort) {
        AddKey(&json, "port");
        AddPort(&json, findings.ports[finding.port]);
    }
    AddKey(&json, "others");
    json += '[';
    for (size_t i = 0; i < finding.others.size(); i++) {
        json += i == 0 ? "" : ", ";
        AddPort(&json, findings.ports[finding.others[i]]);
    }
    json += ']';
    if (!finding.of.empty()) {
        AddString(&json, finding.ofKind, finding.of);
    }
    AddString(&json, "what", finding.what);
    AddWhole(&json, "records", static_cast<int64_t>(finding.records));
    AddWhole(&json, "records_of", static_cast<int64_t>(finding.recordsOf));
    AddNumber(&json, "share", finding.share);
    AddNumber(&json, "lost", finding.lost);
    AddKey(&json, "worst");
    json += '{';
    AddWhole(&json, "record", static_cast<int64_t>(finding.worstRecord));
    AddWhole(&json, "time", finding.worstTime);
    AddKey(&json, "values");
    json += '{';
    for (const FindingValue &value : finding.values) {
        AddNumber(&json, value.key, value.value);
    }
    json += "}}";
    AddString(&json, "try", finding.tryThis);
    AddString(&json, "wrong_if", rule.wrongIf);
    return json + '}';
}

void AddHead(std::string *json, const Findings &findings, const StreamTally &tally) {
    Tallied count = CountFindings(findings);
    AddKey(json, "hosts");
    *json += '[';
    for (size_t i = 0; i < findings.hosts.size(); i++) {
        *json += i == 0 ? "" : ", ";
        AddText(json, findings.hosts[i]);
    }
    *json += ']';
    AddWhole(json, "from", findings.firstTime);
    AddWhole(json, "to", findings.lastTime);
    AddWhole(json, "records", static_cast<int64_t>(findings.records));
    AddWhole(json, "interval", findings.interval);
    AddWhole(json, "ports", static_cast<int64_t>(findings.ports.size()));
    AddWhole(json, "mended", static_cast<int64_t>(tally.mended));
    AddWhole(json, "cut", static_cast<int64_t>(tally.cut));
    AddWhole(json, "serious", static_cast<int64_t>(count.serious));
    AddWhole(json, "warnings", static_cast<int64_t>(count.warnings));
    AddWhole(json, "notes", static_cast<int64_t>(count.notes));
}

size_t Shown(const Findings &findings, size_t most) {
    return most == 0 ? findings.list.size() : std::min(most, findings.list.size());
}

}  // namespace

void PrintFindings(Output *output, const Findings &findings, const StreamTally &tally, size_t most, size_t cells) {
    if (findings.records == 0) {
        OutputWrite(output, "No record: nothing was judged.\n");
        return;
    }
    OutputWrite(output, HeadText(findings, tally));
    Tallied count = CountFindings(findings);
    if (findings.list.empty()) {
        OutputWrite(output,
                    RuleFill("Nothing found. No port lost {loss.rate} packet/s and {loss.note} % of its packets in "
                             "{hit.records} records or {hit.share} % of them, and no other rule held.\n"));
    } else {
        OutputWrite(output, Count(count.serious, "serious", "serious") + ", " +
                                Count(count.warnings, "warning", "warnings") + ", " +
                                Count(count.notes, "note", "notes") + '\n');
    }
    size_t shown = Shown(findings, most);
    for (size_t i = 0; i < shown; i++) {
        OutputWrite(output, FoldText(FindingText(findings, findings.list[i]), cells) + '\n');
    }
    if (shown < findings.list.size()) {
        OutputWrite(output,
                    "and " + Count(findings.list.size() - shown, "finding", "findings") + " more: -n 0 shows all\n");
    }
    for (const NotJudged &missing : findings.notJudged) {
        OutputWrite(output, FoldText("? Not judged, " + missing.rules + ": " + missing.why + ".", cells) + '\n');
    }
}

void PrintFindingsJson(Output *output, const Findings &findings, const StreamTally &tally, size_t most) {
    std::string json = "{\"head\": {";
    AddHead(&json, findings, tally);
    OutputWrite(output, json + "},\n\"findings\": [");
    size_t shown = Shown(findings, most);
    for (size_t i = 0; i < shown; i++) {
        OutputWrite(output, (i == 0 ? "\n" : ",\n") + FindingJson(findings, findings.list[i]));
    }
    OutputWrite(output, "],\n\"not_judged\": [");
    for (size_t i = 0; i < findings.notJudged.size(); i++) {
        json = i == 0 ? "\n{" : ",\n{";
        AddString(&json, "rules", findings.notJudged[i].rules);
        AddString(&json, "why", findings.notJudged[i].why);
        OutputWrite(output, json + '}');
    }
    OutputWrite(output, "]}\n");
}

void PrintRules(Output *output) {
    OutputWrite(output, RulesPreamble() + "\n");
    for (size_t i = 0; i < kRules; i++) {
        const RuleText &rule = RuleOf(static_cast<Rule>(i));
        std::string text = "\n";
        text.append(rule.number).append("  ").append(rule.finding);
        text.append("\n  when      ").append(RuleFill(rule.condition));
        text.append("\n  reason    ").append(RuleFill(rule.reason));
        text.append("\n  try       ").append(rule.tryThis);
        if (rule.tryElse != nullptr) {
            text.append("\n  or        ").append(rule.tryElse);
        }
        text.append("\n  wrong if  ").append(rule.wrongIf).append("\n");
        OutputWrite(output, text);
    }
}

void PrintRulesJson(Output *output) {
    std::string json = "{";
    AddString(&json, "loss", RulesPreamble());
    AddKey(&json, "limits");
    json += '{';
    for (size_t i = 0; i < kLimits; i++) {
        AddNumber(&json, LimitName(static_cast<Limit>(i)), LimitOf(static_cast<Limit>(i)));
    }
    json += "},\n\"rules\": [";
    for (size_t i = 0; i < kRules; i++) {
        const RuleText &rule = RuleOf(static_cast<Rule>(i));
        json += i == 0 ? "\n{" : ",\n{";
        AddString(&json, "number", rule.number);
        AddString(&json, "finding", rule.finding);
        AddString(&json, "condition", RuleFill(rule.condition));
        AddString(&json, "reason", RuleFill(rule.reason));
        AddString(&json, "wrong_if", rule.wrongIf);
        AddString(&json, "try", rule.tryThis);
        if (rule.tryElse != nullptr) {
            AddString(&json, "try_else", rule.tryElse);
        }
        json += '}';
    }
    OutputWrite(output, json + "]}\n");
}

}  // namespace report
