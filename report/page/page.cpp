#include "report/page/page.h"

#include "report/page/assets.h"
#include "report/page/first_screen.h"

#include <algorithm>
#include <numeric>

namespace report {
namespace {

void Choose(PagePlan *plan, uint32_t port, size_t most) {
    bool known = std::find(plan->detail.begin(), plan->detail.end(), port) != plan->detail.end();
    if (!known && plan->detail.size() < most) {
        plan->detail.push_back(port);
    }
}

// Uplinks, which the plots of other ports need, then ports with a finding, then the worst.
void ChooseDetail(PagePlan *plan, const PageSource &source, size_t most) {
    constexpr size_t kUplinks = 16, kWorst = 50;
    const Store &store = *source.store;
    for (uint32_t port = 0; port < store.ports.size() && plan->detail.size() < kUplinks; port++) {
        if (store.ports[port].uplink) {
            Choose(plan, port, most);
        }
    }
    for (const Finding &finding : source.findings->list) {
        if (finding.port != kNoPort) {
            auto found = store.places.find(source.findings->ports[finding.port].id);
            if (found != store.places.end()) {
                Choose(plan, found->second, most);
            }
        }
    }
    std::vector<uint32_t> ranked = StoreRanked(store);
    for (size_t i = 0; i < std::min(ranked.size(), kWorst); i++) {
        Choose(plan, ranked[i], most);
    }
}

// Gives up the next thing of the order. False: there is nothing left.
bool GiveUp(PageSource *source, PagePlan *plan, size_t bytes) {
    constexpr size_t kFewestRecords = 200, kFewestPorts = 50;
    if (std::erase_if(plan->columns, [](size_t column) { return column == kRxmbps || column == kTxmbps; }) > 0) {
        return true;
    }
    if (plan->times.size() > kFewestRecords) {
        // The first buckets have two columns for each of before.
        size_t least = source->store->every == 1 ? 4 : 2;
        size_t count = std::max(least, bytes / std::max<size_t>(plan->limit, 1) * (least / 2));
        StoreFold(source->store, std::min(count, plan->times.size()));
        PlanTimes(*source->store, plan);
        return true;
    }
    if (plan->ports.size() <= kFewestPorts) {
        return false;
    }
    plan->ports = StoreRanked(*source->store);
    plan->ports.resize(std::max(kFewestPorts, plan->ports.size() / 2));
    std::sort(plan->ports.begin(), plan->ports.end());
    return true;
}

void NoteLosses(PageSource *source, const PagePlan &plan, const Manifest &manifest) {
    const Store &store = *source->store;
    auto note = [&](std::string text) { source->notes.push_back(std::move(text)); };
    auto number = [](size_t value) { return std::to_string(value); };
    if (store.tooLarge > 0) {
        note(number(store.tooLarge) + " values are too large for any plot and are shown as missing.");
    }
    if (store.detailsLost) {
        note("Only the columns of all ports are here: the series is too long for more.");
    }
    size_t held = 0, shortened = 0;
    for (uint32_t port : plan.detail) {
        held += store.ports[port].keys.empty() ? 0 : 1;
        shortened += store.ports[port].shortened && !store.detailsLost ? 1 : 0;
    }
    if (manifest.detailed < held) {
        note("Further keys are here for " + number(manifest.detailed) + " of " + number(held) +
             " ports that should have them: there was no room for more.");
    }
    if (shortened > 0) {
        note("Further keys of " + number(shortened) + (shortened == 1 ? " port" : " ports") +
             " are missing for some records, which came before the port, or while others were worse.");
    }
    if (plan.columns.size() < kPortColumns) {
        note("rxmbps and txmbps are left out: there was no room.");
    }
    if (store.every > 1) {
        note("A point in time stands for " + number(store.every) + " records, with their maximum and mean.");
    }
    if (plan.ports.size() < store.ports.size()) {
        note("Only the worst " + number(plan.ports.size()) + " of " + number(store.ports.size()) + " ports are here.");
    }
}

std::string Policy() {
    return "default-src 'none'; script-src '" + PolicyHash(kPlotScript.hash) + "' '" + PolicyHash(kPageScript.hash) +
           "'; style-src '" + PolicyHash(kPlotStyle.hash) + "' '" + PolicyHash(kPageStyle.hash) +
           "'; base-uri 'none'; form-action 'none'";
}

const Asset *AssetOf(std::string_view name) {
    return name == "script"         ? &kPageScript
           : name == "style"        ? &kPageStyle
           : name == "plot script"  ? &kPlotScript
           : name == "plot style"   ? &kPlotStyle
           : name == "plot licence" ? &kPlotLicence
                                    : nullptr;
}

void WritePlaceholder(Output *output, const PageSource &source, const PagePlan &plan, const Manifest &manifest,
                      std::string_view name) {
    if (const Asset *asset = AssetOf(name)) {
        OutputWrite(output, asset->text);
    } else if (name == "policy") {
        OutputWrite(output, Policy());
    } else if (name == "manifest") {
        OutputWrite(output, manifest.json);
    } else if (name == "blocks") {
        for (const Block &block : manifest.blocks) {
            OutputWrite(output, "<script type=\"text/plain\" id=\"" + block.id + "\">");
            OutputWrite(output, block.text);
            OutputWrite(output, "</script>\n");
        }
    } else {
        OutputWrite(output, FirstScreenText(source, plan, name));
    }
}

void Write(Output *output, const PageSource &source, const PagePlan &plan, const Manifest &manifest) {
    std::string_view rest = kPageSkeleton.text;
    for (;;) {
        size_t open = rest.find("{{");
        if (open == std::string_view::npos) {
            break;
        }
        size_t close = rest.find("}}", open);
        OutputWrite(output, rest.substr(0, open));
        WritePlaceholder(output, source, plan, manifest, rest.substr(open + 2, close - open - 2));
        rest.remove_prefix(close + 2);
    }
    OutputWrite(output, rest);
}

}  // namespace

bool PageWrite(Output *output, const PageOptions &options, PageSource *source) {
    constexpr size_t kFirstScreen = 200 << 10;  // findings and table, at most
    size_t fixed = kPageScript.text.size() + kPlotScript.text.size() + kPageStyle.text.size() + kFirstScreen;
    PagePlan plan;
    if (StoreSort(source->store, &plan.order)) {
        source->notes.push_back("Records did not come in the order of their times, and were sorted.");
    }
    PlanTimes(*source->store, &plan);
    plan.ports.resize(source->store->ports.size());
    std::iota(plan.ports.begin(), plan.ports.end(), 0);
    plan.columns.resize(kPortColumns);
    std::iota(plan.columns.begin(), plan.columns.end(), 0);
    plan.compress = options.compress;
    plan.limit = options.limit > fixed ? options.limit - fixed : 0;
    ChooseDetail(&plan, *source, options.detail);
    Manifest manifest;
    ManifestMake(*source, plan, &manifest);
    while (manifest.bytes > plan.limit) {
        if (!GiveUp(source, &plan, manifest.bytes)) {
            return false;
        }
        ManifestMake(*source, plan, &manifest);
    }
    NoteLosses(source, plan, manifest);
    Write(output, *source, plan, manifest);
    return true;
}

}  // namespace report
