#include "report/page/manifest.h"

#include <algorithm>
#include <cstdio>

namespace report {
namespace {

struct Writer {
    const Store *store;
    const PagePlan *plan;
    Manifest *manifest;
    std::string json;
};

std::string Seconds(double time) {
    char text[40];
    int length = snprintf(text, sizeof text, "%.6f", time);
    while (text[length - 1] == '0') {
        length--;
    }
    length -= text[length - 1] == '.' ? 1 : 0;
    return {text, static_cast<size_t>(length)};
}

std::string BlockText(const Writer &writer, const std::vector<int32_t> &values) {
    std::string planes = PlanesOf(values, writer.plan->times.size());
    return Base64(writer.plan->compress ? Gzip(planes) : planes);
}

size_t AddBlock(Writer *writer, const std::string &id, const std::vector<int32_t> &values) {
    Block *block = &writer->manifest->blocks.emplace_back(Block{id, BlockText(*writer, values)});
    return block->text.size() + block->id.size() + 50;
}

void Reduce(std::vector<int32_t> *values, int32_t *scale) {
    int32_t factor = CommonFactor(*values, *scale);
    if (factor > 1) {
        for (int32_t &value : *values) {
            value = value == kMissing ? value : value / factor;
        }
        *scale /= factor;
    }
}

std::string Numbered(char letter, size_t number) {
    return std::string(1, letter).append(std::to_string(number));
}

std::string CodeText(int32_t code) {
    return code == kMissing ? "null" : std::to_string(code);
}

// "fixed": rows with one value over all records, neighbours of one value together; the others stay in *values.
std::string TakeFixed(std::vector<int32_t> *values, size_t length) {
    std::string json = "\"fixed\":[";
    size_t rows = values->size() / length, kept = 0, run = 0;
    for (size_t row = 0; row < rows; row++) {
        const int32_t *series = &(*values)[row * length];
        if (std::any_of(series, series + length, [&](int32_t value) { return value != series[0]; })) {
            std::copy(series, series + length, &(*values)[kept++ * length]);
            run = 0;
            continue;
        }
        bool last = row + 1 == rows;
        const int32_t *next = series + length;
        run++;
        if (!last && std::all_of(next, next + length, [&](int32_t value) { return value == series[0]; })) {
            continue;
        }
        json += json.back() == '[' ? "[" : ",[";
        json += std::to_string(row + 1 - run) + "," + std::to_string(run) + "," + CodeText(series[0]) + "]";
        run = 0;
    }
    values->resize(kept * length);
    return json + "]";
}

// A column of many rows: {"key", "unit", "scale", "fixed", "block"}.
void AddColumn(Writer *writer, const std::string &key, const char *unit, int32_t scale, const std::string &id,
               std::vector<int32_t> values) {
    Reduce(&values, &scale);
    std::string *json = &writer->json;
    *json += json->back() == '[' ? "{" : ",\n{";
    *json += "\"key\":" + JsonString(key) + ",\"unit\":" + JsonString(unit) + ",\"scale\":" + std::to_string(scale) +
             "," + TakeFixed(&values, writer->plan->times.size());
    if (!values.empty()) {
        *json += ",\"block\":\"" + id + "\"";
        AddBlock(writer, id, values);
    }
    *json += "}";
}

// Cells of one column, row after row, each over all records.
std::vector<int32_t> Rows(const Writer &writer, std::vector<int32_t> StoredRecord::*cells, size_t columns,
                          size_t column, const std::vector<uint32_t> &rows) {
    size_t length = writer.plan->times.size();
    std::vector<int32_t> values(rows.size() * length, kMissing);
    for (size_t record = 0; record < length; record++) {
        const std::vector<int32_t> &from = writer.store->records[record].*cells;
        for (size_t row = 0; row < rows.size(); row++) {
            size_t at = rows[row] * columns + column;
            if (at < from.size()) {
                values[row * length + record] = from[at];
            }
        }
    }
    return values;
}

void AddPortColumns(Writer *writer) {
    writer->json += "\"columns\":[";
    for (size_t column : writer->plan->columns) {
        const PortColumnText &text = kPortColumnTexts[column];
        std::string id = Numbered('c', column);
        AddColumn(writer, text.key, text.unit, text.scale, id,
                  Rows(*writer, &StoredRecord::ports, kPortColumns, column, writer->plan->ports));
        if (writer->store->every > 1) {
            AddColumn(writer, std::string(text.key) + "~mean", text.unit, text.scale, id + "m",
                      Rows(*writer, &StoredRecord::portMeans, kPortColumns, column, writer->plan->ports));
        }
    }
    writer->json += "],\n";
}

void AddPcpus(Writer *writer) {
    size_t most = 0;
    for (const StoredRecord &record : writer->store->records) {
        most = std::max(most, record.pcpus.size() / kPcpuColumns);
    }
    std::vector<uint32_t> rows(most);
    for (uint32_t row = 0; row < most; row++) {
        rows[row] = row;
    }
    writer->json += "\"pcpus\":{\"count\":" + std::to_string(most) + ",\"columns\":[";
    const char *keys[kPcpuColumns] = {"cpu.used", "cpu.wdt"};
    for (size_t column = 0; most > 0 && column < kPcpuColumns; column++) {
        AddColumn(writer, keys[column], "%", 100, Numbered('u', column),
                  Rows(*writer, &StoredRecord::pcpus, kPcpuColumns, column, rows));
    }
    writer->json += "]},\n";
}

template <class Text>
void AddList(std::string *json, const char *key, size_t count, Text text) {
    json->append("\"").append(key).append("\":[");
    for (size_t i = 0; i < count; i++) {
        *json += i == 0 ? "" : ",";
        *json += text(i);
    }
    *json += "]";
}

void AddPorts(Writer *writer) {
    const std::vector<uint32_t> &ports = writer->plan->ports;
    std::vector<std::string> switches;
    std::unordered_map<std::string, size_t> places;
    std::vector<size_t> of;
    for (uint32_t port : ports) {
        const std::string &name = writer->store->ports[port].switchName;
        auto [found, isNew] = places.try_emplace(name, switches.size());
        if (isNew) {
            switches.push_back(name);
        }
        of.push_back(found->second);
    }
    auto port = [&](size_t i) -> const StoredPort & { return writer->store->ports[ports[i]]; };
    std::string *json = &writer->json;
    *json += "\"ports\":{";
    AddList(json, "name", ports.size(), [&](size_t i) { return JsonString(port(i).name); });
    *json += ",\n";
    AddList(json, "id", ports.size(), [&](size_t i) { return JsonString(port(i).id); });
    *json += ",\n";
    AddList(json, "mac", ports.size(), [&](size_t i) { return JsonString(port(i).mac); });
    *json += ",\n";
    AddList(json, "switch", ports.size(), [&](size_t i) { return std::to_string(of[i]); });
    *json += ",\n";
    AddList(json, "uplink", ports.size(), [&](size_t i) { return std::string(port(i).uplink ? "1" : "0"); });
    *json += ",\n";
    AddList(json, "switches", switches.size(), [&](size_t i) { return JsonString(switches[i]); });
    *json += "},\n";
}

size_t PlaceOf(const PagePlan &plan, uint32_t port) {
    auto found = std::lower_bound(plan.ports.begin(), plan.ports.end(), port);
    return found == plan.ports.end() || *found != port ? SIZE_MAX : static_cast<size_t>(found - plan.ports.begin());
}

std::string PortPlace(const Writer &writer, const std::string &id) {
    auto found = writer.store->places.find(id);
    size_t place = found == writer.store->places.end() ? SIZE_MAX : PlaceOf(*writer.plan, found->second);
    return place == SIZE_MAX ? "null" : std::to_string(place);
}

void AddFindings(Writer *writer, const Findings &findings) {
    constexpr size_t kMost = 200;
    AddList(&writer->json, "findings", std::min(findings.list.size(), kMost), [&](size_t i) {
        const Finding &finding = findings.list[i];
        std::string port = finding.port == kNoPort ? "null" : PortPlace(*writer, findings.ports[finding.port].id);
        return std::string("{\"rule\":").append(JsonString(RuleOf(finding.rule).number)) +
               ",\"severity\":" + JsonString(SeverityName(finding.severity)) + ",\"port\":" + port +
               ",\"time\":" + std::to_string(finding.worstTime) + ",\"text\":" + JsonString(finding.what) + "}";
    });
    writer->json += ",\n";
}

// The keys of a port: those that move go into a block, the others stand with their value.
void AddSeries(Writer *writer, const StoredPort &port, const std::string &id) {
    size_t length = writer->plan->times.size();
    std::vector<int32_t> all = StoreSeries(*writer->store, port.details, writer->plan->order), moving;
    std::string columns, fixed;
    for (size_t i = 0; i < port.keys.size() && i * length < all.size(); i++) {
        std::vector<int32_t> series(&all[i * length], &all[i * length] + length);
        int32_t scale = DetailScale(port.keys[i]);
        Reduce(&series, &scale);
        std::string entry = JsonString(DetailName(port.keys[i]));
        entry.insert(0, 1, '[').append(",").append(std::to_string(scale));
        if (std::any_of(series.begin(), series.end(), [&](int32_t value) { return value != series[0]; })) {
            columns.append(columns.empty() ? "" : ",").append(entry).append("]");
            moving.insert(moving.end(), series.begin(), series.end());
        } else if (series[0] != kMissing) {
            fixed.append(fixed.empty() ? "" : ",").append(entry).append(",").append(CodeText(series[0])).append("]");
        }
    }
    writer->json += "\"columns\":[" + columns + "],\"fixed\":[" + fixed + "]";
    if (!moving.empty()) {
        writer->json += ",\"block\":\"d" + id + "\"";
        AddBlock(writer, "d" + id, moving);
    }
}

void AddHistograms(Writer *writer, const StoredPort &port, const std::string &id) {
    if (port.histograms.last.empty()) {
        return;
    }
    writer->json += ",\"histograms\":{\"block\":\"h" + id + "\",";
    AddList(&writer->json, "kinds", port.kinds.size(), [&](size_t i) {
        const HistogramKind &kind = port.kinds[i];
        std::string json = "{\"name\":";
        json.append(JsonString(kind.name)).append(",\"scale\":").append(std::to_string(kind.scale)).append(",");
        AddList(&json, "limits", kind.limits.size(),
                [&](size_t bucket) { return kind.limits[bucket].empty() ? "null" : kind.limits[bucket]; });
        return json + "}";
    });
    writer->json += "}";
    AddBlock(writer, "h" + id, StoreSeries(*writer->store, port.histograms, writer->plan->order));
}

void AddTexts(std::string *json, const std::string &texts) {
    *json += ",\"texts\":{";
    for (size_t at = 0; at < texts.size();) {
        size_t key = texts.find('\0', at), value = texts.find('\0', key + 1);
        json->append(at == 0 ? "" : ",").append(JsonString(texts.substr(at, key - at))).append(":");
        json->append(JsonString(texts.substr(key + 1, value - key - 1)));
        at = value + 1;
    }
    *json += "}";
}

// Closely shown ports, until the page is full. A port that doesn't fit ends the list, so that it has no holes.
void AddDetails(Writer *writer) {
    writer->json += "\"details\":{";
    size_t bytes = writer->json.size() + 2;
    for (const Block &block : writer->manifest->blocks) {
        bytes += block.text.size() + 60;
    }
    for (uint32_t number : writer->plan->detail) {
        const StoredPort &port = writer->store->ports[number];
        size_t place = PlaceOf(*writer->plan, number);
        if (port.keys.empty() || place == SIZE_MAX) {
            continue;
        }
        size_t blocks = writer->manifest->blocks.size(), json = writer->json.size();
        std::string id = std::to_string(place);
        writer->json.append(writer->json.back() == '{' ? "\"" : ",\n\"").append(id).append("\":{");
        AddSeries(writer, port, id);
        AddTexts(&writer->json, port.texts);
        AddHistograms(writer, port, id);
        writer->json += "}";
        size_t more = writer->json.size() - json;
        for (size_t i = blocks; i < writer->manifest->blocks.size(); i++) {
            more += writer->manifest->blocks[i].text.size() + 60;
        }
        if (bytes + more > writer->plan->limit) {
            writer->json.resize(json);
            writer->manifest->blocks.resize(blocks);
            break;
        }
        bytes += more;
        writer->manifest->detailed++;
    }
    writer->json += "}";
}

}  // namespace

double PlanSeconds(const PagePlan &plan, size_t record) {
    double distance = record == 0 ? plan.step : plan.times[record] - plan.times[record - 1];
    return distance <= 1.5 * plan.step ? distance : plan.step;
}

void PlanTimes(const Store &store, PagePlan *plan) {
    const std::vector<StoredRecord> &records = store.records;
    plan->times.clear();
    for (size_t first = 0, end; first < records.size(); first = end) {
        for (end = first; end < records.size() && records[end].time == records[first].time; end++) {
        }
        for (size_t i = first; i < end; i++) {
            double part = static_cast<double>(i - first) / static_cast<double>(end - first);
            plan->times.push_back(static_cast<double>(records[first].time) + part);
        }
    }
    std::vector<double> steps;
    for (size_t i = 1; i < plan->times.size(); i++) {
        steps.push_back(plan->times[i] - plan->times[i - 1]);
    }
    plan->step = store.interval > 0 ? static_cast<double>(store.interval) : 1;
    if (!steps.empty()) {
        std::nth_element(steps.begin(), steps.begin() + static_cast<ptrdiff_t>(steps.size() / 2), steps.end());
        plan->step = steps[steps.size() / 2];
    }
}

void ManifestMake(const PageSource &source, const PagePlan &plan, Manifest *manifest) {
    *manifest = Manifest{};
    Writer writer{source.store, &plan, manifest, "{\"format\":1,\"program\":\"lan-report " LAN_REPORT_VERSION "\",\n"};
    std::string *json = &writer.json;
    *json += "\"host\":" + JsonString(source.host) + ",\"every\":" + std::to_string(source.store->every) +
             ",\"interval\":" + std::to_string(source.store->interval) +
             ",\"compressed\":" + (plan.compress ? "true" : "false") + ",\n";
    AddList(json, "times", plan.times.size(), [&](size_t i) { return Seconds(plan.times[i]); });
    *json += ",\n";
    AddPorts(&writer);
    std::vector<uint32_t> ranked = StoreRanked(*source.store);
    AddList(json, "worst", std::min<size_t>(ranked.size(), 1),
            [&](size_t i) { return std::to_string(PlaceOf(plan, ranked[i])); });
    *json += ",\n";
    AddFindings(&writer, *source.findings);
    AddPcpus(&writer);
    AddPortColumns(&writer);
    AddDetails(&writer);
    *json += "}";
    manifest->json.swap(*json);
    manifest->bytes = manifest->json.size();
    for (const Block &block : manifest->blocks) {
        manifest->bytes += block.text.size() + 60;
    }
}

}  // namespace report
