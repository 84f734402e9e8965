#include "report/rows/rows.h"

#include "report/rows/parser.h"
#include "report/support/message.h"

#include <algorithm>
#include <charconv>
#include <cstring>

namespace report {
namespace {

using namespace parsing;

// Identities of so many ports are kept, of all hosts together; those of the host that was seen last always.
constexpr size_t kMostPlaces = 200'000;
constexpr size_t kMostHosts = 256;

bool ReadCpu(Parser *parser, ondemand::value value) {
    static const size_t pcpu = ColumnOf(Section::Pcpu, "cpu.pcpu");
    static const size_t used = ColumnOf(Section::Pcpu, "cpu.used"), wdt = ColumnOf(Section::Pcpu, "cpu.wdt");
    static const Span span = SpanOf(Section::Pcpu, "cpu.topology");
    std::string_view topology[kMostColumns];
    bool usedSeen = false, wdtSeen = false;
    parser->limits.clear();
    parser->values.clear();
    bool fine = EachField(parser, "cpu", value, [&](std::string_view key, ondemand::value field) {
        if (key == "topology") {
            return ReadObject(parser, key, span, topology, field);
        }
        if (key == "used") {
            return Once(parser, key, &usedSeen) && NumbersOf(parser, "cpu.used", field, &parser->limits);
        }
        return key == "wdt" ? Once(parser, key, &wdtSeen) && NumbersOf(parser, "cpu.wdt", field, &parser->values)
                            : Stranger(parser, key);
    });
    if (!fine) {
        return false;
    }
    size_t count = std::max(parser->limits.size(), parser->values.size());
    for (size_t i = 0; i < count; i++) {
        std::string_view *cells = NewRow(parser, Section::Pcpu);
        std::copy(topology + span.first, topology + span.last, cells + span.first);
        cells[pcpu] = i + 1 == count ? "sum" : NumberText(parser, i);
        cells[used] = i < parser->limits.size() ? parser->limits[i] : std::string_view();
        cells[wdt] = i < parser->values.size() ? parser->values[i] : std::string_view();
    }
    return true;
}

bool ReadRecord(Parser *parser, ondemand::value value) {
    static const Span tool = SpanOf(Section::Overhead, "overhead");
    Rows *rows = parser->rows;
    bool time = false, interval = false, iteration = false, cpu = false, ports = false, overhead = false;
    bool fine = EachField(parser, "the record", value, [&](std::string_view key, ondemand::value field) {
        if (key == "time") {
            return IntegerOf(parser, key, field, &rows->time, &time);
        }
        if (key == "interval") {
            return IntegerOf(parser, key, field, &rows->interval, &interval);
        }
        if (key == "iteration") {
            return IntegerOf(parser, key, field, &rows->iteration, &iteration);
        }
        if (key == "ports") {
            return Once(parser, key, &ports) && ReadPorts(parser, field);
        }
        if (key == "cpu") {
            return Once(parser, key, &cpu) && (!IsWanted(parser, Section::Pcpu) || ReadCpu(parser, field));
        }
        if (key == "overhead") {
            return Once(parser, key, &overhead) &&
                   (!IsWanted(parser, Section::Overhead) ||
                    ReadObject(parser, key, tool, NewRow(parser, Section::Overhead), field));
        }
        return key == "host" || Stranger(parser, key);
    });
    return fine && ((time && interval && iteration) || Refuse(parser, "time, interval or iteration", " is missing"));
}

HostPlaces *PlacesOf(Parser *parser, const std::string &host) {
    std::vector<HostPlaces> *hosts = &parser->hosts;
    size_t places = parser->rows->ports.size();
    for (HostPlaces &known : *hosts) {
        if (known.host == host) {
            return &known;
        }
        places += known.ports.size();
    }
    while (!hosts->empty() && (places > kMostPlaces || hosts->size() >= kMostHosts)) {
        auto oldest = std::min_element(hosts->begin(), hosts->end(),
                                       [](const HostPlaces &a, const HostPlaces &b) { return a.seen < b.seen; });
        places -= oldest->ports.size();
        hosts->erase(oldest);
    }
    hosts->emplace_back().host = host;
    return &hosts->back();
}

// Gives ports that are {} the identity that their place had, and remembers those of the others.
void KeepIdentities(Parser *parser) {
    Rows *rows = parser->rows;
    HostPlaces *known = PlacesOf(parser, rows->host);
    if (rows->iteration <= known->iteration || known->ports.size() != rows->ports.size()) {
        known->ports.assign(rows->ports.size(), PortIdentity{});
    }
    known->iteration = rows->iteration;
    known->seen = parser->records;
    for (size_t i = 0; i < rows->ports.size(); i++) {
        PortIdentity *from = rows->ports[i].present ? &rows->ports[i] : &known->ports[i];
        PortIdentity *to = rows->ports[i].present ? &known->ports[i] : &rows->ports[i];
        to->name.assign(from->name);
        to->switchName.assign(from->switchName);
        to->id.assign(from->id);
        to->uplink = from->uplink;
    }
}

void Empty(Rows *rows) {
    for (RowsOfSection &section : rows->sections) {
        section.cells.clear();
        section.places.clear();
    }
}

bool Parse(Parser *parser, std::string_view json) {
    parser->padded.resize(json.size() + simdjson::SIMDJSON_PADDING);
    memcpy(parser->padded.data(), json.data(), json.size());
    memset(parser->padded.data() + json.size(), ' ', simdjson::SIMDJSON_PADDING);
    ondemand::document document;
    ondemand::value value;
    simdjson::padded_string_view padded(parser->padded.data(), json.size(), parser->padded.size());
    if (parser->json.iterate(padded).get(document) != simdjson::SUCCESS ||
        document.get_value().get(value) != simdjson::SUCCESS) {
        return Refuse(parser, "the line", " is no JSON object");
    }
    return ReadRecord(parser, value) && (document.current_location().error() == simdjson::OUT_OF_BOUNDS ||
                                         Refuse(parser, "the line", " goes on behind the record"));
}

}  // namespace

void RowsInit(Rows *rows) {
    RowsCleanup(rows);
    rows->parser = new Parser;
    for (size_t i = 0; i < kSections; i++) {
        rows->sections[i].columns = SectionColumns(static_cast<Section>(i)).size();
    }
}

bool RowsRead(Rows *rows, const RecordText &record, uint32_t wanted) {
    Parser *parser = rows->parser;
    parser->record = &record;
    parser->rows = rows;
    parser->wanted = wanted;
    parser->place = kNoPlace;
    parser->textsUsed = 0;
    parser->records++;
    parser->wrong.clear();
    Empty(rows);
    rows->host.assign(record.host);
    if (!Parse(parser, record.json)) {
        Tell("%s: record %llu is left out: %s", record.file, static_cast<unsigned long long>(record.number),
             parser->wrong.c_str());
        Empty(rows);
        rows->ports.clear();
        return false;
    }
    KeepIdentities(parser);
    return true;
}

void RowsCleanup(Rows *rows) {
    delete rows->parser;
    *rows = Rows{};
}

bool CellNumber(std::string_view cell, double *value) {
    if (cell.empty()) {
        return false;
    }
    auto [end, error] = std::from_chars(cell.data(), cell.data() + cell.size(), *value);
    return error == std::errc() && end == cell.data() + cell.size();
}

}  // namespace report
