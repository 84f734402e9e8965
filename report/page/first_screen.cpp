#include "report/page/first_screen.h"

#include "report/rows/moment.h"
#include "report/summary/sentences.h"
#include "report/summary/words.h"

#include <algorithm>
#include <cmath>

namespace report {
namespace {

constexpr size_t kMostFindings = 100, kMostPorts = 50;

std::string Count(size_t count, const char *one, const char *many) {
    return NumberText(static_cast<double>(count)) + " " + (count == 1 ? one : many);
}

// "2026-11-23 02:10 to 03:10 UTC"
std::string SpanText(const PagePlan &plan) {
    std::string from = MomentText(static_cast<int64_t>(plan.times.front()), false);
    std::string to = MomentText(static_cast<int64_t>(plan.times.back()), false);
    if (from.size() != 20 || to.size() != 20) {
        return from + " to " + to;
    }
    auto clock = [](const std::string &moment) { return moment.substr(11, 8); };
    bool sameDay = from.compare(0, 10, to, 0, 10) == 0;
    std::string text = from.substr(0, 10) + " " + clock(from);
    if (from != to) {
        text += std::string(" – ") + (sameDay ? "" : to.substr(0, 10) + " ") + clock(to);
    }
    return text + " UTC";
}

std::string FactsText(const PageSource &source, const PagePlan &plan) {
    std::string text = SpanText(plan) + " · " + Count(source.store->added, "record", "records");
    text += " of " + NumberText(plan.step / static_cast<double>(source.store->every)) + " s · ";
    return text + Count(source.store->ports.size(), "port", "ports");
}

std::string NotesText(const PageSource &source) {
    if (source.notes.empty()) {
        return "<p class=\"facts\">complete</p>";
    }
    std::string html = "<details class=\"notes\"><summary>" + Count(source.notes.size(), "note", "notes") +
                       " on what was mended or left out</summary><ul>";
    for (const std::string &note : source.notes) {
        html += "<li>" + HtmlText(note) + "</li>";
    }
    return html + "</ul></details>";
}

std::string CountsText(const Findings &findings) {
    size_t counts[4] = {};
    for (const Finding &finding : findings.list) {
        counts[static_cast<size_t>(finding.severity)]++;
    }
    if (findings.list.empty()) {
        return "none";
    }
    return Count(counts[static_cast<size_t>(Severity::Serious)], "serious", "serious") + ", " +
           Count(counts[static_cast<size_t>(Severity::Warning)], "warning", "warnings") + ", " +
           Count(counts[static_cast<size_t>(Severity::Note)], "note", "notes");
}

// The sentence as `summary` prints it, apart: sign, subject, what and rule, and the rest to unfold.
std::string FindingHtml(const Findings &findings, const Finding &finding) {
    std::string sentence = FindingText(findings, finding), subject = SubjectText(findings, finding);
    std::string sign = SeveritySign(finding.severity), name = SeverityName(finding.severity);
    sentence.erase(0, sentence.find_first_not_of(' ', sign.size()));
    std::string link = "#at=" + std::to_string(finding.worstTime);
    if (finding.port != kNoPort) {
        link = "#port=" + findings.ports[finding.port].id + "&at=" + std::to_string(finding.worstTime);
    }
    if (sentence.starts_with(subject)) {
        sentence.erase(0, subject.size());
    } else {
        subject = RuleOf(finding.rule).finding;
    }
    std::string mark = std::string(" [") + RuleOf(finding.rule).number + "]";
    size_t end = sentence.rfind(mark);
    end = end == std::string::npos ? sentence.size() : end + mark.size();
    size_t rest = std::min(sentence.size(), sentence.find_first_not_of(". ", end));
    return "<li class=\"" + name + "\"><details><summary><span class=\"sign\" title=\"" + name + "\">" + sign +
           "</span><span><a href=\"" + HtmlText(link) + "\"><b>" + HtmlText(subject) + "</b></a>" +
           HtmlText(sentence.substr(0, end)) + "</span></summary><p>" + HtmlText(sentence.substr(rest)) +
           "</p></details></li>\n";
}

std::string FindingsHtml(const Findings &findings) {
    std::string html;
    if (!findings.list.empty()) {
        html = "<ol>\n";
        for (size_t i = 0; i < std::min(findings.list.size(), kMostFindings); i++) {
            html += FindingHtml(findings, findings.list[i]);
        }
        html += "</ol>\n";
    }
    if (findings.list.size() > kMostFindings) {
        html += "<p class=\"quiet\">" + NumberText(static_cast<double>(findings.list.size() - kMostFindings)) +
                " more: lan-report summary -n 0 prints them all.</p>";
    }
    for (const NotJudged &silent : findings.notJudged) {
        html += "<p class=\"quiet\">Not judged: " + HtmlText(silent.rules) + ", " + HtmlText(silent.why) + "</p>\n";
    }
    return html;
}

// Of a port over the whole series; NAN where there is no value.
struct Sums {
    double total[kPortColumns];  // value x seconds
    double mean[kPortColumns];
    double worst[kPortColumns];
};

Sums SumsOf(const PageSource &source, const PagePlan &plan, uint32_t port) {
    Sums sums;
    for (size_t column = 0; column < kPortColumns; column++) {
        double total = 0, sum = 0, worst = NAN;
        size_t count = 0;
        for (size_t record = 0; record < plan.times.size(); record++) {
            const StoredRecord &stored = source.store->records[record];
            size_t at = port * kPortColumns + column;
            if (at >= stored.ports.size() || stored.ports[at] == kMissing) {
                continue;
            }
            int32_t scale = kPortColumnTexts[column].scale;
            double value =
                static_cast<double>((stored.portMeans.empty() ? stored.ports : stored.portMeans)[at]) / scale;
            total += value * PlanSeconds(plan, record);
            sum += value;
            count++;
            worst = std::fmax(worst, static_cast<double>(stored.ports[at]) / scale);
        }
        sums.total[column] = count > 0 ? total : NAN;
        sums.mean[column] = count > 0 ? sum / static_cast<double>(count) : NAN;
        sums.worst[column] = worst;
    }
    return sums;
}

double Share(double lost, double passed) {
    return lost + passed > 0 ? std::fmax(0, lost) / (lost + passed) * 100 : lost;
}

std::string Cell(double value) {
    return "<td>" + (std::isnan(value) ? std::string() : NumberText(std::round(value * 100) / 100)) + "</td>";
}

std::string RowHtml(const StoredPort &port, const Sums &sums) {
    std::string html = "<tr><th scope=\"row\"><a href=\"#port=" + HtmlText(port.id) + "\">" + HtmlText(port.name) +
                       "</a></th><td class=\"text\">" + HtmlText(port.id) + "</td><td class=\"text\">" +
                       HtmlText(port.switchName) + "</td>";
    html += Cell(sums.total[kRxeps] + sums.total[kTxeps]);
    html += Cell(Share(sums.total[kRxeps], sums.total[kRxpps])) + Cell(Share(sums.total[kTxeps], sums.total[kTxpps]));
    html += Cell(sums.worst[kReady]) + Cell(sums.worst[kCstp]);
    for (size_t column : {kRxpps, kTxpps, kRxmbps, kTxmbps}) {
        html += Cell(sums.mean[column]);
    }
    return html + "</tr>\n";
}

std::string TableRows(const PageSource &source, const PagePlan &plan) {
    std::vector<uint32_t> ranked = StoreRanked(*source.store);
    ranked.resize(std::min(ranked.size(), kMostPorts));
    std::string html;
    for (uint32_t port : ranked) {
        html += RowHtml(source.store->ports[port], SumsOf(source, plan, port));
    }
    return html;
}

}  // namespace

std::string FirstScreenText(const PageSource &source, const PagePlan &plan, std::string_view name) {
    if (name == "title") {
        return HtmlText(source.host + ", " + SpanText(plan));
    }
    if (name == "host") {
        return HtmlText(source.host.empty() ? "host without a name" : source.host);
    }
    if (name == "facts") {
        return HtmlText(FactsText(source, plan));
    }
    if (name == "notes") {
        return NotesText(source);
    }
    if (name == "finding counts") {
        return HtmlText(CountsText(*source.findings));
    }
    if (name == "findings") {
        return FindingsHtml(*source.findings);
    }
    if (name == "table caption") {
        size_t ports = source.store->ports.size();
        return ports == 0           ? "No port could be read"
               : ports > kMostPorts ? "The 50 worst of " + Count(ports, "port", "ports")
                                    : "All ports, the worst first";
    }
    return name == "table rows" ? TableRows(source, plan) : "";
}

}  // namespace report
