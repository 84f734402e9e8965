#include "report/summary/facts.h"

#include "report/summary/rules.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>

namespace report {
namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr size_t kMostSuspects = 1 << 16;  // of one record

struct FactSource {
    Fact fact;
    Section section;
    bool single;  // the figure of the port's first row; the others are worked out of several cells
    const char *key;
};
constexpr FactSource kSources[kFacts] = {
    {Fact::RxPps, Section::Ports, true, "rxpps"},
    {Fact::RxEps, Section::Ports, true, "rxeps"},
    {Fact::RxSize, Section::Ports, true, "rxsize"},
    {Fact::TxPps, Section::Ports, true, "txpps"},
    {Fact::TxEps, Section::Ports, true, "txeps"},
    {Fact::Ring1Size, Section::Vnic, true, "vnic.ring1sz"},
    {Fact::R1Full, Section::Vnic, true, "vnic.r1full"},
    {Fact::R2Full, Section::Vnic, true, "vnic.r2full"},
    {Fact::RxBufLow, Section::Vnic, true, "vnic.rxbuflow"},
    {Fact::OoSlots, Section::Vnic, true, "vnic.ooslots"},
    {Fact::RxOflow, Section::Vnic, true, "vnic.rxoflow"},
    {Fact::Ring2Err, Section::Vnic, true, "vnic.ring2err"},
    {Fact::MaxFrags, Section::Vnic, true, "vnic.maxfrags"},
    {Fact::MapFail, Section::Vnic, true, "vnic.mapfail"},
    {Fact::SgErr, Section::Vnic, true, "vnic.sgerr"},
    {Fact::VnicStops, Section::Vnic, true, "vnic.qstop"},
    {Fact::TxDisc, Section::Vnic, true, "vnic.txdisc"},
    {Fact::TxAllocErr, Section::Vnic, true, "vnic.txallocerr"},
    {Fact::TxOflow, Section::Vnic, true, "vnic.txoflow"},
    {Fact::Ready, Section::Vcpu, false, "vcpu.ready"},
    {Fact::CoStop, Section::Vcpu, false, "vcpu.cstp"},
    {Fact::Used, Section::Vcpu, false, "vcpu.used"},
    {Fact::UsedOthers, Section::Vcpu, false, "vcpu.used.others"},
    {Fact::WdtUsed, Section::Wdt, false, "wdt.used"},
    {Fact::WdtReady, Section::Wdt, false, "wdt.ready"},
    {Fact::Pcpu, Section::Pcpu, false, "cpu.pcpu"},
    {Fact::PcpuUsed, Section::Pcpu, false, "cpu.used"},
    {Fact::NicRxPps, Section::Physnic, true, "physnic.rxpps"},
    {Fact::NicRxEps, Section::Physnic, true, "physnic.rxeps"},
    {Fact::NicTxPps, Section::Physnic, true, "physnic.txpps"},
    {Fact::NicTxMbps, Section::Physnic, true, "physnic.txmbps"},
    {Fact::NicStops, Section::Txqueue, false, "txqueue.qstops"},
    {Fact::TxQueues, Section::Txqueue, false, "txqueue.count"},
    {Fact::TxQueueAll, Section::Txqueue, false, "txqueue.pps"},
    {Fact::TxQueue, Section::Txqueue, false, "txqueue.queue"},
    {Fact::TxQueueShare, Section::Txqueue, false, "txqueue.pps.share"},
    {Fact::RxQueues, Section::Rxqueue, true, "rxqueue.count"},
    {Fact::RxActive, Section::Rxqueue, true, "rxqueue.active"},
    {Fact::IntrUsed, Section::Intr, true, "intr.used"},
    {Fact::TcpPps, Section::Hoststack, true, "tcptx.pps"},
    {Fact::TcpRexmit, Section::Hoststack, true, "tcptx.rexmit"},
    {Fact::UdpRxPps, Section::Hoststack, true, "udp.rxpps"},
    {Fact::UdpRxSockEps, Section::Hoststack, true, "udp.rxsockeps"},
};

constexpr bool InOrder() {
    for (size_t i = 0; i < kFacts; i++) {
        if (static_cast<size_t>(kSources[i].fact) != i) {
            return false;
        }
    }
    return true;
}
static_assert(InOrder());

// How a figure of a column is known to be impossible.
enum CheckKind : uint8_t {
    kUnchecked,
    kRate,      // by second; a 64-bit counter that went back gives some 1e19
    kRate32,    // by second, of a 32-bit counter
    kPackets,   // a share of packets
    kTime,      // a share of the time of a port's part
    kHostTime,  // a share of the time that is never a count
};

constexpr const char *kNarrow[] = {"vnic.txcalls", "vnic.intr",     "vnic.qstop",      "vnic.txeps",
                                   "vnic.txoflow", "vnic.rxbuflow", "vnic.txallocerr", "vnic.txtsosplit",
                                   "vnic.r1full",  "vnic.r2full",   "vnic.sgerr"};

bool StartsWith(const char *text, const char *start) {
    return strncmp(text, start, strlen(start)) == 0;
}

CheckKind KindOf(Section section, const Column &column) {
    // Lifetime counts over one interval: no difference, and so nothing that could go back.
    if (section == Section::Histograms || column.kind != Kind::Number || StartsWith(column.key, "coalesce.") ||
        StartsWith(column.key, "txwdt.")) {
        return kUnchecked;
    }
    for (const char *key : kNarrow) {
        if (section == Section::Vnic && strcmp(column.key, key) == 0) {
            return kRate32;
        }
    }
    size_t length = strlen(column.key);
    if (length > 3 && strcmp(column.key + length - 3, "pct") == 0) {
        return kPackets;
    }
    if (strstr(column.unit, "/s") != nullptr) {
        return kRate;
    }
    if (column.unit[0] == '%') {
        return section == Section::Pcpu || section == Section::Overhead ? kHostTime : kTime;
    }
    return kUnchecked;
}

// The figure as the rules read it, and whether it can't be true.
double Judge(const FactReader &reader, uint8_t kind, double value, bool *suspect) {
    double most = LimitOf(Limit::SuspectRate);
    switch (kind) {
    case kUnchecked:
        return value;
    case kRate32:
        value /= reader.divisor;
        most = LimitOf(Limit::SuspectNarrow) / reader.span;
        break;
    case kPackets:
        most = LimitOf(Limit::SuspectShare);
        break;
    case kRate:
    case kTime:
        value /= reader.divisor;
        break;
    default:
        break;
    }
    *suspect = value < 0 || value > most;
    return value;
}

size_t Index(Section section) {
    return static_cast<size_t>(section);
}

double Read(const FactReader &reader, const Rows &rows, Section section, uint32_t row, int column) {
    double value;
    size_t at = static_cast<size_t>(column);
    if (column < 0 || !CellNumber(rows.sections[Index(section)].at(row, at), &value)) {
        return kNaN;
    }
    bool suspect = false;
    value = Judge(reader, reader.kinds[Index(section)][at], value, &suspect);
    return suspect ? kNaN : value;
}

std::string_view ReadText(const Rows &rows, Section section, uint32_t row, int column) {
    return column < 0 ? std::string_view() : rows.sections[Index(section)].at(row, static_cast<size_t>(column));
}

int ColumnOf(const FactReader &reader, Fact fact) {
    return reader.columns[static_cast<size_t>(fact)];
}

void AddSuspect(FactReader *reader, const Suspect &suspect) {
    if (reader->suspects.size() < kMostSuspects) {
        reader->suspects.push_back(suspect);
    }
}

// Whether a cell may be large, for all that it is short: 1.8e19, 1.8e+19, 2e+100. The collector writes no such numbers.
bool HasExponent(std::string_view cell) {
    for (size_t back = 3; back <= 5 && back < cell.size(); back++) {
        if ((cell[cell.size() - back] | 0x20) == 'e') {
            return true;
        }
    }
    return false;
}

void FindSuspects(FactReader *reader, const Rows &rows, Section section) {
    const RowsOfSection &table = rows.sections[Index(section)];
    for (uint32_t row = 0; row < table.size(); row++) {
        for (const FactReader::Check &check : reader->checks[Index(section)]) {
            std::string_view cell = table.at(row, check.column);
            double value;
            if (cell.empty() || (cell.size() < check.length && cell[0] != '-' && !HasExponent(cell)) ||
                !CellNumber(cell, &value)) {
                continue;
            }
            bool suspect = false;
            value = Judge(*reader, check.kind, value, &suspect);
            if (suspect) {
                auto series = static_cast<uint16_t>(Index(section) << 8 | check.column);
                AddSuspect(reader,
                           {table.places[row], series, false, SectionColumns(section)[check.column].key, value});
            }
        }
    }
}

void IndexRows(FactReader *reader, const Rows &rows, Section section) {
    std::vector<uint32_t> &first = reader->first[Index(section)];
    const std::vector<uint32_t> &places = rows.sections[Index(section)].places;
    first.assign(rows.ports.size(), ~0u);
    for (uint32_t row = static_cast<uint32_t>(places.size()); row-- > 0;) {
        if (places[row] < first.size()) {
            first[places[row]] = row;
        }
    }
}

// One past the last row of the port in a section.
uint32_t EndOf(const Rows &rows, Section section, uint32_t row, uint32_t place) {
    const std::vector<uint32_t> &places = rows.sections[Index(section)].places;
    while (row < places.size() && places[row] == place) {
        row++;
    }
    return row;
}

void ReadPcpus(FactReader *reader, const Rows &rows) {
    const RowsOfSection &table = rows.sections[Index(Section::Pcpu)];
    reader->pcpuUsed.clear();
    for (uint32_t row = 0; row < table.size(); row++) {
        double number;
        if (CellNumber(ReadText(rows, Section::Pcpu, row, ColumnOf(*reader, Fact::Pcpu)), &number) &&
            number == static_cast<double>(reader->pcpuUsed.size())) {
            reader->pcpuUsed.push_back(Read(*reader, rows, Section::Pcpu, row, ColumnOf(*reader, Fact::PcpuUsed)));
        }
    }
}

// Ids are compared as numbers, which need not fit any.
bool LowerId(std::string_view one, std::string_view other) {
    return one.size() != other.size() ? one.size() < other.size() : one < other;
}

bool TooMuchTime(FactReader *reader, uint32_t place, Section section, const char *key, double sum) {
    if (!(sum > LimitOf(Limit::SuspectTime))) {
        return false;
    }
    AddSuspect(reader, {place, static_cast<uint16_t>(Index(section) << 8 | 0xff), true, key, sum});
    return true;
}

double &Set(PortFacts *facts, Fact fact) {
    return facts->values[static_cast<size_t>(fact)];
}

// Takes the larger figure and whose it is.
void Most(double value, std::string_view whose, double *most, std::string_view *of) {
    if (value > *most || (std::isnan(*most) && !std::isnan(value))) {
        *most = value;
        *of = whose;
    }
}

void ReadVcpus(FactReader *reader, const Rows &rows, uint32_t place, uint32_t row, PortFacts *facts) {
    uint32_t end = EndOf(rows, Section::Vcpu, row, place);
    double sum = 0;
    unsigned known = 0;
    for (; row < end; row++) {
        std::string_view id = ReadText(rows, Section::Vcpu, row, reader->vcpuId);
        if (facts->vm.empty() || LowerId(id, facts->vm)) {
            facts->vm = id;
        }
        double used = Read(*reader, rows, Section::Vcpu, row, ColumnOf(*reader, Fact::Used));
        double ready = Read(*reader, rows, Section::Vcpu, row, ColumnOf(*reader, Fact::Ready));
        double stopped = Read(*reader, rows, Section::Vcpu, row, ColumnOf(*reader, Fact::CoStop));
        if (TooMuchTime(reader, place, Section::Vcpu, "vcpu.used + ready + cstp", used + ready + stopped)) {
            continue;
        }
        Most(ready, id, &Set(facts, Fact::Ready), &facts->waiting);
        Most(stopped, id, &Set(facts, Fact::CoStop), &facts->stopped);
        Most(used, id, &Set(facts, Fact::Used), &facts->busiest);
        if (!std::isnan(used)) {
            sum += used;
            known++;
        }
    }
    if (known > 1) {
        Set(facts, Fact::UsedOthers) = (sum - facts->at(Fact::Used)) / (known - 1);
    }
}

void ReadWorkers(FactReader *reader, const Rows &rows, uint32_t place, uint32_t row, PortFacts *facts) {
    uint32_t end = EndOf(rows, Section::Wdt, row, place);
    double shortest = -1;
    for (; row < end; row++) {
        double used = Read(*reader, rows, Section::Wdt, row, ColumnOf(*reader, Fact::WdtUsed));
        double ready = Read(*reader, rows, Section::Wdt, row, ColumnOf(*reader, Fact::WdtReady));
        double wait = Read(*reader, rows, Section::Wdt, row, reader->wait);
        if (TooMuchTime(reader, place, Section::Wdt, "wdt.used + ready + wait", used + ready + wait)) {
            continue;
        }
        double number;
        int pcpu = -1;
        if (ReadText(rows, Section::Wdt, row, reader->afftype) == "pcpu" &&
            CellNumber(ReadText(rows, Section::Wdt, row, reader->affval), &number) && number >= 0 &&
            number < static_cast<double>(reader->pcpuUsed.size())) {
            pcpu = static_cast<int>(number);
        }
        double pcpuUsed = pcpu < 0 ? kNaN : reader->pcpuUsed[static_cast<size_t>(pcpu)];
        double shortness =
            std::fmax(std::fmax(used / LimitOf(Limit::WorkerUsed), ready / LimitOf(Limit::WorkerReady)), 0);
        if (RulePcpuFull(ready, pcpuUsed)) {
            shortness += 1000;  // says more than any worker that is merely busy
        }
        if (shortness > shortest) {
            shortest = shortness;
            Set(facts, Fact::WdtUsed) = used;
            Set(facts, Fact::WdtReady) = ready;
            Set(facts, Fact::PcpuUsed) = pcpuUsed;
            facts->worker = ReadText(rows, Section::Wdt, row, reader->worker);
            Set(facts, Fact::Pcpu) = pcpu < 0 ? kNaN : pcpu;
        }
    }
}

void ReadTransmitQueues(const FactReader &reader, const Rows &rows, uint32_t place, uint32_t row, PortFacts *facts) {
    uint32_t end = EndOf(rows, Section::Txqueue, row, place);
    double queues = 0, all = 0, most = -1, stops = kNaN;
    for (; row < end; row++) {
        double packets = Read(reader, rows, Section::Txqueue, row, ColumnOf(reader, Fact::TxQueueAll));
        double stopped = Read(reader, rows, Section::Txqueue, row, ColumnOf(reader, Fact::NicStops));
        double number;
        if (!std::isnan(stopped)) {
            stops = std::isnan(stops) ? stopped : stops + stopped;
        }
        if (std::isnan(packets) ||
            !CellNumber(ReadText(rows, Section::Txqueue, row, ColumnOf(reader, Fact::TxQueue)), &number)) {
            continue;
        }
        queues++;
        all += packets;
        if (packets > most) {
            most = packets;
            Set(facts, Fact::TxQueue) = number;
        }
    }
    Set(facts, Fact::NicStops) = stops;
    if (queues > 0) {
        Set(facts, Fact::TxQueues) = queues;
        Set(facts, Fact::TxQueueAll) = all;
        Set(facts, Fact::TxQueueShare) = all > 0 ? 100 * most / all : 0;
    }
}

}  // namespace

const char *FactKey(Fact fact) {
    return kSources[static_cast<size_t>(fact)].key;
}

void FactsInit(FactReader *reader) {
    for (const FactSource &source : kSources) {
        reader->columns[static_cast<size_t>(source.fact)] = ColumnFind(source.section, source.key);
    }
    reader->vcpuId = ColumnFind(Section::Vcpu, "vcpu.id");
    reader->afftype = ColumnFind(Section::Wdt, "wdt.afftype");
    reader->affval = ColumnFind(Section::Wdt, "wdt.affval");
    reader->worker = ColumnFind(Section::Wdt, "wdt.name");
    reader->wait = ColumnFind(Section::Wdt, "wdt.wait");
    reader->vnicType = ColumnFind(Section::Vnic, "vnic.type");
    for (size_t i = 0; i < kSections; i++) {
        auto section = static_cast<Section>(i);
        uint16_t number = 0;
        for (const Column &column : SectionColumns(section)) {
            CheckKind kind = KindOf(section, column);
            reader->kinds[i].push_back(kind);
            if (kind != kUnchecked) {
                auto length = static_cast<uint8_t>(kind == kPackets ? 3 : kind == kRate32 ? 0 : 13);
                reader->checks[i].push_back({number, kind, length});
            }
            number++;
        }
    }
}

void FactsBegin(FactReader *reader, const Rows &rows, double span, bool counts) {
    reader->span = std::max(span, 1.0);
    reader->divisor = counts ? reader->span : 1;
    reader->suspects.clear();
    double narrow = LimitOf(Limit::SuspectNarrow) / reader->span * reader->divisor;
    double wide = LimitOf(Limit::SuspectRate) * reader->divisor;
    for (size_t i = 0; i < kSections; i++) {
        for (FactReader::Check &check : reader->checks[i]) {
            if (check.kind == kRate32) {
                check.length = static_cast<uint8_t>(std::max(1.0, std::floor(std::log10(narrow)) + 1));
            } else if (check.kind != kPackets) {
                check.length = static_cast<uint8_t>(std::floor(std::log10(wide)) + 1);
            }
        }
        FindSuspects(reader, rows, static_cast<Section>(i));
        IndexRows(reader, rows, static_cast<Section>(i));
    }
    ReadPcpus(reader, rows);
}

void FactsOfPort(FactReader *reader, const Rows &rows, uint32_t place, PortFacts *facts) {
    *facts = PortFacts{};
    std::fill(std::begin(facts->values), std::end(facts->values), kNaN);
    uint32_t first[kSections];
    for (size_t i = 0; i < kSections; i++) {
        first[i] = reader->first[i][place];
        facts->sections |= first[i] == ~0u ? 0 : 1u << i;
    }
    for (const FactSource &source : kSources) {
        uint32_t row = first[Index(source.section)];
        if (source.single && row != ~0u) {
            Set(facts, source.fact) = Read(*reader, rows, source.section, row, ColumnOf(*reader, source.fact));
        }
    }
    if (uint32_t row = first[Index(Section::Vnic)];
        row != ~0u && ReadText(rows, Section::Vnic, row, reader->vnicType) == "parlan2") {
        Set(facts, Fact::VnicStops) /= reader->span / reader->divisor;  // this model's is a count at any rate
    }
    if (uint32_t row = first[Index(Section::Vcpu)]; row != ~0u) {
        ReadVcpus(reader, rows, place, row, facts);
    }
    if (uint32_t row = first[Index(Section::Wdt)]; row != ~0u) {
        ReadWorkers(reader, rows, place, row, facts);
    }
    if (uint32_t row = first[Index(Section::Txqueue)]; row != ~0u) {
        ReadTransmitQueues(*reader, rows, place, row, facts);
    }
}

double FactsOverhead(const FactReader &reader, const Rows &rows) {
    const RowsOfSection &table = rows.sections[Index(Section::Overhead)];
    return table.size() == 0 ? kNaN
                             : Read(reader, rows, Section::Overhead, 0, ColumnFind(Section::Overhead, "overhead.used"));
}

}  // namespace report
