#include "report/page/store.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <numeric>
#include <span>
#include <tuple>

namespace report {

const PortColumnText kPortColumnTexts[kPortColumns] = {
    {"rxpps", "packets/s", 1},  {"txpps", "packets/s", 1},  {"rxmbps", "Mbit/s", 100}, {"txmbps", "Mbit/s", 100},
    {"rxeps", "errors/s", 100}, {"txeps", "errors/s", 100}, {"ready", "%", 100},       {"cstp", "%", 100},
};

namespace {

// Places of the columns that are looked at by name.
struct Places {
    size_t mac, uplink, ports[kReady];
    size_t vcpuId, vcpuReady, vcpuCstp, wdtName, wdtAfftype, wdtAffval, pcpuUsed, pcpuWdt, vnicType, vnicStops;
};

size_t At(Section section, const char *key) {
    return static_cast<size_t>(ColumnFind(section, key));
}

const Places &ThePlaces() {
    static const Places places = [] {
        Places found = {};
        found.mac = At(Section::Ports, "mac");
        for (size_t column = 0; column < kReady; column++) {
            found.ports[column] = At(Section::Ports, kPortColumnTexts[column].key);
        }
        found.vcpuId = At(Section::Vcpu, "vcpu.id");
        found.vcpuReady = At(Section::Vcpu, "vcpu.ready");
        found.vcpuCstp = At(Section::Vcpu, "vcpu.cstp");
        found.wdtName = At(Section::Wdt, "wdt.name");
        found.wdtAfftype = At(Section::Wdt, "wdt.afftype");
        found.wdtAffval = At(Section::Wdt, "wdt.affval");
        found.vnicType = At(Section::Vnic, "vnic.type");
        found.vnicStops = At(Section::Vnic, "vnic.qstop");
        found.pcpuUsed = At(Section::Pcpu, "cpu.used");
        found.pcpuWdt = At(Section::Pcpu, "cpu.wdt");
        return found;
    }();
    return places;
}

// What becomes of a column in the details of a port.
enum class Use : uint8_t { Leave, Series, FirstRow, Text };

// Lifetime counts over one interval say nothing of a record, and numbers of things are no figures.
Use UseOf(Section section, const Column &column) {
    std::string_view key = column.key;
    if (column.kind != Kind::Number) {
        bool told = key == "vnic.type" || key == "coalesce.scheme" || key == "physnic.devname" || key == "vcpu.id" ||
                    key == "wdt.name";
        return told ? Use::Text : Use::Leave;
    }
    if (key.starts_with("txwdt.") || key.starts_with("coalesce.rx.intr") || key == "wdt.affval" ||
        key.ends_with(".queue")) {
        return Use::Leave;
    }
    if (section == Section::Rxqueue || key == "txqueue.count" || key == "txqueue.active") {
        return Use::FirstRow;
    }
    for (size_t i = 0; section == Section::Ports && i < kReady; i++) {
        if (key == kPortColumnTexts[i].key) {
            return Use::Leave;
        }
    }
    return Use::Series;
}

bool IsList(Section section) {
    return section == Section::Vcpu || section == Section::Wdt || section == Section::Txqueue;
}

constexpr Section kDetailSections[] = {Section::Ports,   Section::Vnic,    Section::Physnic,
                                       Section::Txqueue, Section::Rxqueue, Section::Intr,
                                       Section::Vcpu,    Section::Wdt,     Section::Hoststack};
constexpr size_t kMostKeys = 600;  // of a port: so many vcpus, worldlets and queues are looked at

struct DetailColumn {
    uint8_t column;
    Use use;
    int32_t scale;
    const char *key;
    bool rate;  // by second, or a part of the time
};

bool IsRate(const Column &column) {
    std::string_view unit = column.unit;
    return unit.ends_with("/s") || unit.starts_with("1/s") || unit.starts_with("% of ");
}

// From the record before to this one; over a gap, or without one before, as long as it should be.
double SecondsOf(const Store &store, const Rows &rows) {
    double distance = static_cast<double>(rows.time) - static_cast<double>(store.lastTime);
    double interval = static_cast<double>(rows.interval);
    return store.added > 0 && distance > 0 && distance < 2 * interval ? distance : interval;
}

// What counted over the seconds of a record, by second.
int32_t ByTime(const Store &store, int32_t fixed) {
    return store.seconds > 1 && fixed != kMissing
               ? static_cast<int32_t>(std::lround(static_cast<double>(fixed) / store.seconds))
               : fixed;
}

// The columns of a section that details take.
const std::vector<DetailColumn> &DetailColumns(Section section) {
    static const auto all = [] {
        std::vector<std::vector<DetailColumn>> columns(kSections);
        for (size_t i = 0; i < kSections; i++) {
            Section each = static_cast<Section>(i);
            std::span<const Column> known = SectionColumns(each);
            for (size_t at = 0; at < known.size(); at++) {
                auto column = static_cast<uint8_t>(at);
                Use use = UseOf(each, known[column]);
                if (use != Use::Leave) {
                    columns[i].push_back(
                        {column, use, DetailScale({each, column, 0}), known[column].key, IsRate(known[column])});
                }
            }
        }
        return columns;
    }();
    return all[static_cast<size_t>(section)];
}

// "vcpu.ready" of element 1: "vcpu.1.ready".
std::string ElementName(Section section, std::string_view key, size_t element) {
    std::string name(key);
    if (IsList(section) && key != "txqueue.count" && key != "txqueue.active") {
        name.insert(name.find('.') + 1, std::to_string(element) + ".");
    }
    return name;
}

void AddText(std::string *texts, std::string_view key, std::string_view value) {
    texts->append(key).append(1, '\0');
    for (char byte : value) {
        *texts += byte == '\0' ? ' ' : byte;
    }
    *texts += '\0';
}

// One pass over the rows of a record, in which each section's rows stand in the order of the ports.
struct Cursor {
    const Rows &rows;
    size_t at[kSections] = {};

    // Rows of a place: [first, end). Places are asked for in ascending order.
    std::pair<size_t, size_t> Of(Section section, uint32_t place) {
        const RowsOfSection &table = rows.of(section);
        size_t *row = &at[static_cast<size_t>(section)];
        while (*row < table.size() && table.places[*row] < place) {
            ++*row;
        }
        size_t first = *row;
        while (*row < table.size() && table.places[*row] == place) {
            ++*row;
        }
        return {first, *row};
    }
};

struct Details {
    std::vector<DetailKey> keys;
    std::vector<int32_t> values;
    std::string texts;
};

// All further figures of the port at a place, in the order of the report.
void Collect(Store *store, Cursor *cursor, uint32_t place, Details *details) {
    const Places &places = ThePlaces();
    details->keys.clear();
    details->values.clear();
    details->texts.clear();
    for (Section section : kDetailSections) {
        auto [first, end] = cursor->Of(section, place);
        const RowsOfSection &table = cursor->rows.of(section);
        for (size_t row = first; row < end; row++) {
            size_t element = row - first;
            for (const DetailColumn &column : DetailColumns(section)) {
                std::string_view cell = table.at(row, column.column);
                if (cell.data() == nullptr || (column.use == Use::FirstRow && element > 0)) {
                    continue;
                }
                if (column.use == Use::Text) {
                    AddText(&details->texts, ElementName(section, column.key, element), cell);
                } else if (details->keys.size() < kMostKeys) {
                    details->keys.push_back({section, column.column, static_cast<uint16_t>(element)});
                    int32_t value = FixedOf(cell, column.scale, &store->tooLarge);
                    bool parlan2 = section == Section::Vnic && table.at(row, places.vnicType) == "parlan2";
                    bool rate = column.rate && !(parlan2 && column.column == places.vnicStops);
                    details->values.push_back(rate ? ByTime(*store, value) : value);
                }
            }
            if (section == Section::Wdt && table.at(row, places.wdtAffval).data() != nullptr) {
                AddText(&details->texts, "wdt." + std::to_string(element) + ".bound",
                        std::string(table.at(row, places.wdtAfftype)) + " " +
                            std::string(table.at(row, places.wdtAffval)));
            }
        }
    }
}

// Keeps the details of a port. Keys that it did not have before go behind those that it has.
void Keep(Store *store, StoredPort *port, Details *details) {
    size_t held = SeriesLogBytes(port->details);
    if (details->keys != port->keys) {
        std::vector<int32_t> values(port->keys.size(), kMissing);
        for (size_t i = 0; i < details->keys.size(); i++) {
            auto found = std::find(port->keys.begin(), port->keys.end(), details->keys[i]);
            if (found != port->keys.end()) {
                values[static_cast<size_t>(found - port->keys.begin())] = details->values[i];
            } else {
                port->keys.push_back(details->keys[i]);
                values.push_back(details->values[i]);
            }
        }
        details->values.swap(values);
    }
    SeriesLogAdd(&port->details, store->records.size() - 1, details->values);
    store->detailBytes += SeriesLogBytes(port->details) - held;
}

// The rows of a port's histograms. Other limits than before are rare enough to start afresh.
void KeepHistograms(Store *store, StoredPort *port, const RowsOfSection &table, size_t first, size_t end) {
    enum : size_t { OF_VCPU, NAME, MIN, MAX, MEAN, COUNT, LIMIT, VALUE };
    std::vector<HistogramKind> kinds;
    std::vector<int32_t> values;
    uint64_t ignored = 0;
    int vcpu = -1;
    std::string_view vcpuId, name;
    for (size_t row = first; row < end; row++) {
        std::string_view id = table.at(row, OF_VCPU);
        if (row == first || table.at(row, NAME) != name || id != vcpuId) {
            vcpu += id.data() != nullptr && id != vcpuId ? 1 : 0;
            vcpuId = id;
            name = table.at(row, NAME);
            std::string full =
                id.data() == nullptr ? std::string(name) : "vcpu." + std::to_string(vcpu) + "." + std::string(name);
            kinds.push_back({full, id.data() == nullptr ? 100 : 1, {}});
            values.push_back(FixedOf(table.at(row, COUNT), 1, &ignored));
            values.push_back(FixedOf(table.at(row, MEAN), 1, &ignored));
        }
        kinds.back().limits.emplace_back(table.at(row, LIMIT));
        values.push_back(FixedOf(table.at(row, VALUE), kinds.back().scale, &ignored));
    }
    size_t held = SeriesLogBytes(port->histograms);
    if (kinds != port->kinds) {
        SeriesLogClear(&port->histograms);
        port->kinds = std::move(kinds);
    }
    if (!values.empty()) {
        SeriesLogAdd(&port->histograms, store->records.size() - 1, values);
    }
    store->detailBytes += SeriesLogBytes(port->histograms) - held;
}

uint32_t PortOf(Store *store, const PortIdentity &identity) {
    if (identity.id.empty()) {
        return kNoPlace;
    }
    auto [found, isNew] = store->places.try_emplace(identity.id, static_cast<uint32_t>(store->ports.size()));
    if (isNew) {
        StoredPort *port = &store->ports.emplace_back();
        port->id = identity.id;
        port->detailed = store->every == 1;
        port->shortened = store->records.size() > 1;
    }
    return found->second;
}

void Identify(Store *store, const Rows &rows) {
    store->portOfPlace.resize(rows.ports.size(), kNoPlace);
    for (size_t place = 0; place < rows.ports.size(); place++) {
        uint32_t *port = &store->portOfPlace[place];
        if (*port == kNoPlace || store->ports[*port].id != rows.ports[place].id) {
            *port = PortOf(store, rows.ports[place]);
        }
        if (*port != kNoPlace && rows.ports[place].present) {
            StoredPort *stored = &store->ports[*port];
            stored->name = rows.ports[place].name;
            stored->switchName = rows.ports[place].switchName;
            stored->uplink = rows.ports[place].uplink;
        }
    }
}

double Positive(int32_t value, int32_t scale) {
    return value < 0 ? 0 : static_cast<double>(value) / scale;
}

// The eight columns of a port, and its place among the remarkable ones.
void AddPort(Store *store, Cursor *vcpus, const Rows &rows, uint32_t place, int32_t *cells) {
    const Places &places = ThePlaces();
    const RowsOfSection &table = rows.of(Section::Ports);
    StoredPort *port = &store->ports[store->portOfPlace[place]];
    for (size_t column = 0; column < kReady; column++) {
        int32_t scale = kPortColumnTexts[column].scale;
        cells[column] = ByTime(*store, FixedOf(table.at(place, places.ports[column]), scale, &store->tooLarge));
    }
    std::string_view mac = table.at(place, places.mac);
    if (port->mac != mac) {
        port->mac = mac;
    }
    auto [first, end] = vcpus->Of(Section::Vcpu, place);
    for (size_t row = first; row < end; row++) {
        const RowsOfSection &list = rows.of(Section::Vcpu);
        auto read = [&](size_t column) { return ByTime(*store, FixedOf(list.at(row, column), 100, &store->tooLarge)); };
        cells[kReady] = std::max(cells[kReady], read(places.vcpuReady));
        cells[kCstp] = std::max(cells[kCstp], read(places.vcpuCstp));
    }
    double seconds = rows.interval > 0 ? static_cast<double>(rows.interval) : 1;
    port->lost += (Positive(cells[kRxeps], 100) + Positive(cells[kTxeps], 100)) * seconds;
    port->packets += (Positive(cells[kRxpps], 1) + Positive(cells[kTxpps], 1)) * seconds;
    port->ready = std::max(port->ready, cells[kReady]);
}

void AddPcpus(Store *store, const Rows &rows, std::vector<int32_t> *pcpus) {
    const RowsOfSection &table = rows.of(Section::Pcpu);
    for (size_t row = 0; row + 1 < table.size(); row++) {  // the last one is the sum
        pcpus->push_back(FixedOf(table.at(row, ThePlaces().pcpuUsed), 100, &store->tooLarge));
        pcpus->push_back(FixedOf(table.at(row, ThePlaces().pcpuWdt), 100, &store->tooLarge));
    }
}

// Gives up the further figures of the least remarkable half of the ports that have some, until the rest fits.
void GiveUpDetails(Store *store) {
    std::vector<uint32_t> ranked = StoreRanked(*store);
    while (store->detailBytes > store->options.detailBytes) {
        std::erase_if(ranked, [&](uint32_t port) { return store->ports[port].details.bytes.empty(); });
        if (ranked.empty()) {
            break;
        }
        for (size_t i = ranked.size() / 2; i < ranked.size(); i++) {
            StoredPort *port = &store->ports[ranked[i]];
            store->detailBytes -= SeriesLogBytes(port->details) + SeriesLogBytes(port->histograms);
            SeriesLogClear(&port->details);
            SeriesLogClear(&port->histograms);
            std::vector<DetailKey>().swap(port->keys);
            port->detailed = false;
            port->shortened = true;
        }
    }
}

// Whose histograms the next record shall tell, and whose details begin anew: those that are remarkable by now, while
// there is room or others to give way.
void ChooseNext(Store *store) {
    std::vector<uint32_t> ranked = StoreRanked(*store);
    size_t remarkable = std::min(ranked.size(), store->options.details);
    bool room = store->every == 1 && (store->detailBytes < store->options.detailBytes / 2 ||
                                      std::any_of(ranked.begin() + static_cast<ptrdiff_t>(remarkable), ranked.end(),
                                                  [&](uint32_t port) { return store->ports[port].detailed; }));
    std::vector<bool> chosen(store->ports.size());
    for (size_t i = 0; i < remarkable; i++) {
        chosen[ranked[i]] = store->every == 1;
        store->ports[ranked[i]].detailed |= room;
    }
    store->histogramPlaces.assign(store->portOfPlace.size(), false);
    for (size_t place = 0; place < store->portOfPlace.size(); place++) {
        uint32_t port = store->portOfPlace[place];
        store->histogramPlaces[place] = port != kNoPlace && chosen[port];
    }
}

// A stored record that becomes part of another one, and how many records of the report it stands for.
struct Part {
    const StoredRecord *record;
    size_t weight;
};
using Cells = std::vector<int32_t> StoredRecord::*;

void FoldCells(StoredRecord *to, std::span<const Part> parts, Cells cells, Cells means) {
    size_t size = 0;
    for (const Part &part : parts) {
        size = std::max(size, (part.record->*cells).size());
    }
    (to->*cells).assign(size, kMissing);
    (to->*means).assign(size, kMissing);
    for (size_t cell = 0; cell < size; cell++) {
        int64_t sum = 0, weight = 0;
        int32_t *most = &(to->*cells)[cell];
        for (const Part &part : parts) {
            const std::vector<int32_t> &own = part.record->*cells, &mean = part.record->*means;
            if (cell < own.size() && own[cell] != kMissing) {
                *most = std::max(*most, own[cell]);
                sum += static_cast<int64_t>(part.weight) * (mean.empty() ? own : mean)[cell];
                weight += static_cast<int64_t>(part.weight);
            }
        }
        if (weight > 0) {
            (to->*means)[cell] = static_cast<int32_t>((sum + (sum < 0 ? -weight : weight) / 2) / weight);
        }
    }
}

StoredRecord FoldRecords(std::span<const Part> parts) {
    StoredRecord folded;
    folded.time = parts.back().record->time;
    FoldCells(&folded, parts, &StoredRecord::ports, &StoredRecord::portMeans);
    FoldCells(&folded, parts, &StoredRecord::pcpus, &StoredRecord::pcpuMeans);
    return folded;
}

// Begins the sums of a bucket that stands for so many records.
void BeginSums(CellSums *sums, const std::vector<int32_t> &means, size_t records) {
    sums->sums.assign(means.size(), 0);
    sums->counts.assign(means.size(), 0);
    for (size_t cell = 0; cell < means.size(); cell++) {
        if (means[cell] != kMissing) {
            sums->sums[cell] = static_cast<int64_t>(records) * means[cell];
            sums->counts[cell] = static_cast<uint32_t>(records);
        }
    }
}

void AddSums(CellSums *sums, const std::vector<int32_t> &values, std::vector<int32_t> *most,
             std::vector<int32_t> *means) {
    size_t size = std::max(values.size(), most->size());
    sums->sums.resize(size, 0);
    sums->counts.resize(size, 0);
    most->resize(size, kMissing);
    means->resize(size, kMissing);
    for (size_t cell = 0; cell < values.size(); cell++) {
        if (values[cell] != kMissing) {
            (*most)[cell] = std::max((*most)[cell], values[cell]);
            sums->sums[cell] += values[cell];
            sums->counts[cell]++;
            (*means)[cell] = static_cast<int32_t>(sums->sums[cell] / sums->counts[cell]);
        }
    }
}

void BeginBucket(Store *store) {
    StoredRecord *bucket = &store->records.back();
    BeginSums(&store->portSums, bucket->portMeans, store->inBucket);
    BeginSums(&store->pcpuSums, bucket->pcpuMeans, store->inBucket);
}

// A record stands for itself, or joins the bucket that is being filled.
void AddRecord(Store *store, StoredRecord &&record) {
    if (store->every == 1) {
        store->records.push_back(std::move(record));
        store->inBucket = 1;
    } else if (store->inBucket == store->every) {
        record.portMeans = record.ports;
        record.pcpuMeans = record.pcpus;
        store->records.push_back(std::move(record));
        store->inBucket = 1;
        BeginBucket(store);
    } else {
        StoredRecord *bucket = &store->records.back();
        bucket->time = record.time;
        AddSums(&store->portSums, record.ports, &bucket->ports, &bucket->portMeans);
        AddSums(&store->pcpuSums, record.pcpus, &bucket->pcpus, &bucket->pcpuMeans);
        store->inBucket++;
    }
}

}  // namespace

std::string DetailName(DetailKey key) {
    return ElementName(key.section, SectionColumns(key.section)[key.column].key, key.element);
}

int32_t DetailScale(DetailKey key) {
    std::string_view unit = SectionColumns(key.section)[key.column].unit;
    for (const char *whole : {"", "packets/s", "bytes", "entries", "queues", "filters"}) {
        if (unit == whole) {
            return 1;
        }
    }
    return 100;
}

std::vector<uint32_t> StoreRanked(const Store &store) {
    std::vector<uint32_t> ranked(store.ports.size());
    std::iota(ranked.begin(), ranked.end(), 0);
    std::stable_sort(ranked.begin(), ranked.end(), [&](uint32_t left, uint32_t right) {
        const StoredPort &a = store.ports[left], &b = store.ports[right];
        return std::tie(a.lost, a.ready, a.packets) > std::tie(b.lost, b.ready, b.packets);
    });
    return ranked;
}

void StoreAdd(Store *store, const Rows &rows) {
    StoredRecord record;
    record.time = rows.time;
    store->backward += store->added > 0 && rows.time < store->records.back().time ? 1 : 0;
    store->seconds = store->options.counts ? SecondsOf(*store, rows) : 1;
    store->lastTime = rows.time;
    store->interval = rows.interval;
    store->added++;
    Identify(store, rows);
    record.ports.assign(store->ports.size() * kPortColumns, kMissing);
    Cursor vcpus{rows};
    for (uint32_t place = 0; place < rows.ports.size(); place++) {
        uint32_t port = store->portOfPlace[place];
        if (port != kNoPlace && rows.ports[place].present) {
            AddPort(store, &vcpus, rows, place, &record.ports[port * kPortColumns]);
        }
    }
    AddPcpus(store, rows, &record.pcpus);
    AddRecord(store, std::move(record));
    if (store->every == 1) {
        Cursor cursor{rows};
        Details details;
        for (uint32_t place = 0; place < rows.ports.size(); place++) {
            uint32_t number = store->portOfPlace[place];
            StoredPort *port = number == kNoPlace ? nullptr : &store->ports[number];
            if (port == nullptr || !port->detailed || !rows.ports[place].present ||
                port->details.next == store->records.size()) {  // it stood at another place already
                continue;
            }
            Collect(store, &cursor, place, &details);
            Keep(store, port, &details);
            if (port->texts != details.texts) {
                port->texts = details.texts;
            }
            auto [first, end] = cursor.Of(Section::Histograms, place);
            if (first < end) {
                KeepHistograms(store, port, rows.of(Section::Histograms), first, end);
            }
        }
        if (store->detailBytes > store->options.detailBytes) {
            GiveUpDetails(store);
        }
    }
    if (store->records.size() * store->ports.size() * kPortColumns * (store->every > 1 ? 2 : 1) >
        store->options.cells) {
        StoreFold(store, store->every == 1 ? 4 : 2);
    }
    ChooseNext(store);
}

void StoreFold(Store *store, size_t count) {
    std::vector<StoredRecord> folded;
    size_t held = (store->records.size() - 1) * store->every + store->inBucket;
    for (size_t at = 0; at < store->records.size(); at += count) {
        std::vector<Part> parts;
        for (size_t i = at; i < std::min(at + count, store->records.size()); i++) {
            bool last = i + 1 == store->records.size();
            parts.push_back({&store->records[i], last ? store->inBucket : store->every});
        }
        folded.push_back(FoldRecords(parts));
        for (size_t i = at; i < at + parts.size(); i++) {
            store->records[i] = StoredRecord();  // memory: both forms of a long series would not fit
        }
    }
    store->records.swap(folded);
    store->every *= count;
    store->inBucket = held - (store->records.size() - 1) * store->every;
    BeginBucket(store);
    for (StoredPort &port : store->ports) {
        SeriesLogClear(&port.details);
        SeriesLogClear(&port.histograms);
        port.keys.clear();
        port.kinds.clear();
        port.detailed = false;
    }
    store->detailBytes = 0;
    store->detailsLost = true;
}

bool StoreSort(Store *store, std::vector<uint32_t> *order) {
    std::vector<uint32_t> sorted(store->records.size());
    std::iota(sorted.begin(), sorted.end(), 0);
    std::stable_sort(sorted.begin(), sorted.end(),
                     [&](uint32_t a, uint32_t b) { return store->records[a].time < store->records[b].time; });
    order->resize(sorted.size());
    std::vector<StoredRecord> records(sorted.size());
    for (uint32_t place = 0; place < sorted.size(); place++) {
        (*order)[sorted[place]] = place;
        records[place] = std::move(store->records[sorted[place]]);
    }
    store->records.swap(records);
    return !std::is_sorted(sorted.begin(), sorted.end());
}

std::vector<int32_t> StoreSeries(const Store &store, const SeriesLog &log, const std::vector<uint32_t> &order) {
    size_t length = store.records.size();
    std::vector<int32_t> series(log.last.size() * length, kMissing);
    SeriesLogReader reader{&log.bytes, 0, 0, {}, 0};
    while (SeriesLogNext(&reader)) {
        for (size_t i = 0; i < reader.values.size(); i++) {
            series[i * length + order[reader.record]] = reader.values[i];
        }
    }
    return series;
}

}  // namespace report
