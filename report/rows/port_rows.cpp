#include "report/rows/parser.h"

#include <algorithm>

namespace report::parsing {
namespace {

// Spans of a port and of the objects in its lists, found once.
struct Layout {
    Span port = SpanOf(Section::Ports, "");
    Span vcpu = SpanOf(Section::Vcpu, "vcpu");
    Span wdt = SpanOf(Section::Wdt, "wdt");
    Span txqueue = SpanOf(Section::Txqueue, "txqueue");
    Span rxqueue = SpanOf(Section::Rxqueue, "rxqueue");
};
const Layout kLayout;

// Both kinds of queues: an object with "details", and figures of the NIC that each row repeats.
bool ReadQueues(Parser *parser, Section section, const Span &span, std::string_view what, ondemand::value value) {
    const size_t queue = ColumnOf(section, section == Section::Txqueue ? "txqueue.queue" : "rxqueue.queue");
    const size_t filters = section == Section::Txqueue ? 0 : ColumnOf(section, "rxqueue.details");
    RowsOfSection *table = Of(parser, section);
    size_t firstRow = table->size();
    std::string_view own[kMostColumns];  // figures of the NIC, not of a queue
    size_t next = span.first;
    bool seen = false;
    auto readQueue = [&](ondemand::value element) {
        std::string_view number = NumberText(parser, table->size() - firstRow);
        std::string_view *cells = NewRow(parser, section);
        cells[queue] = number;
        if (section == Section::Txqueue) {
            return ReadObject(parser, what, span, cells, element);
        }
        std::string *list = NewText(parser);
        bool fine = EachElement(parser, "rxqueue.details", element, [&](ondemand::value port) {
            std::string_view id;
            if (!NumberOf(parser, "rxqueue.details", port, &id)) {
                return false;
            }
            list->append(list->empty() ? "" : " ").append(id);
            return true;
        });
        cells[filters] = *list;
        return fine;
    };
    bool fine = EachField(parser, what, value, [&](std::string_view key, ondemand::value field) {
        if (key == "details") {
            return Once(parser, key, &seen) && EachElement(parser, "details", field, readQueue);
        }
        return ReadCell(parser, span, own, &next, key, field);
    });
    if (!fine) {
        return false;
    }
    if (table->size() == firstRow) {
        NewRow(parser, section);
    }
    for (size_t row = firstRow; row < table->size(); row++) {
        for (size_t column = 0; column < table->columns; column++) {
            if (own[column].data() != nullptr && !Put(&table->cells[row * table->columns + column], own[column])) {
                return Refuse(parser, what, " has figures of queues beside details");
            }
        }
    }
    return true;
}

// Columns of section Histograms.
enum HistogramColumn : size_t { kOfVcpu, kName, kMin, kMax, kMean, kCount, kLimit, kValue, kHistogramColumns };

// One histogram with what its object tells; limits and values of its buckets are those at hand, the longer list
// counts. A histogram without buckets has one row all the same.
void HistogramRows(Parser *parser, const std::string_view *head) {
    size_t buckets = std::max({parser->limits.size(), parser->values.size(), size_t{1}});
    for (size_t i = 0; i < buckets; i++) {
        std::string_view *cells = NewRow(parser, Section::Histograms);
        std::copy(head, head + kLimit, cells);
        cells[kLimit] = i < parser->limits.size() ? parser->limits[i] : std::string_view();
        cells[kValue] = i < parser->values.size() ? parser->values[i] : std::string_view();
    }
}

// A port's histogram has a pair a bucket, a vcpu's only the value.
bool ReadPairs(Parser *parser, ondemand::value value) {
    return EachElement(parser, "histos.values", value, [&](ondemand::value pair) {
        size_t count = 0;
        bool fine = EachElement(parser, "histos.values", pair, [&](ondemand::value number) {
            std::vector<std::string_view> *list = count++ == 0 ? &parser->limits : &parser->values;
            return count <= 2 && NumberOf(parser, "histos.values", number, &list->emplace_back());
        });
        return fine && count == 2 ? true : Refuse(parser, "histos.values", " has a bucket that is no pair");
    });
}

bool ReadHistogram(Parser *parser, ondemand::value value, bool pairs) {
    static const Span span = SpanOf(Section::Histograms, "histos");
    std::string_view head[kHistogramColumns];
    size_t next = span.first;
    bool seen = false;
    if (pairs) {
        parser->limits.clear();
    }
    parser->values.clear();
    bool fine = EachField(parser, "histos", value, [&](std::string_view key, ondemand::value field) {
        if (key == "values") {
            return Once(parser, key, &seen) &&
                   (pairs ? ReadPairs(parser, field) : NumbersOf(parser, "histos.values", field, &parser->values));
        }
        return key == "limit" || key == "value" ? Stranger(parser, key)
                                                : ReadCell(parser, span, head, &next, key, field);
    });
    if (fine) {
        HistogramRows(parser, head);
    }
    return fine;
}

// "buckets" stands ahead of the four histograms that they are for.
bool ReadVcpuHistograms(Parser *parser, ondemand::value value) {
    bool bucketsSeen = false, valuesSeen = false;
    parser->limits.clear();
    return EachField(parser, "vcpu.histos", value, [&](std::string_view key, ondemand::value field) {
        if (key == "buckets") {
            return valuesSeen ? Refuse(parser, "buckets", " stands behind its values")
                              : Once(parser, key, &bucketsSeen) && NumbersOf(parser, key, field, &parser->limits);
        }
        if (key != "values") {
            return Stranger(parser, key);
        }
        return Once(parser, key, &valuesSeen) && EachElement(parser, key, field, [&](ondemand::value histogram) {
                   return ReadHistogram(parser, histogram, false);
               });
    });
}

bool ReadVcpu(Parser *parser, ondemand::value value) {
    std::string_view spare[kMostColumns];
    std::string_view *cells = IsWanted(parser, Section::Vcpu) ? NewRow(parser, Section::Vcpu) : spare;
    RowsOfSection *histograms = Of(parser, Section::Histograms);
    size_t firstRow = histograms->size();
    size_t next = kLayout.vcpu.first;
    bool seen = false;
    bool fine = EachField(parser, "vcpu", value, [&](std::string_view key, ondemand::value field) {
        if (key != "histos") {
            return ReadCell(parser, kLayout.vcpu, cells, &next, key, field);
        }
        if (!IsWanted(parser, Section::Histograms)) {
            return true;
        }
        return Once(parser, key, &seen) && ReadVcpuHistograms(parser, field);
    });
    static const size_t id = ColumnOf(Section::Vcpu, "vcpu.id");
    for (size_t row = firstRow; row < histograms->size(); row++) {
        histograms->cells[row * histograms->columns + kOfVcpu] = cells[id];
    }
    return fine;
}

// Lists and objects of a port beside its own figures.
enum PortPart : uint8_t { kTxq, kRxq, kWdtList, kVcpuList, kHistoList, kPortParts };

bool ReadPortList(Parser *parser, PortPart part, std::string_view key, ondemand::value value) {
    switch (part) {
    case kTxq:
        return !IsWanted(parser, Section::Txqueue) || ReadQueues(parser, Section::Txqueue, kLayout.txqueue, key, value);
    case kRxq:
        return !IsWanted(parser, Section::Rxqueue) || ReadQueues(parser, Section::Rxqueue, kLayout.rxqueue, key, value);
    case kWdtList:
        return !IsWanted(parser, Section::Wdt) || EachElement(parser, key, value, [&](ondemand::value element) {
            return ReadObject(parser, "wdt", kLayout.wdt, NewRow(parser, Section::Wdt), element);
        });
    case kVcpuList:
        return (!IsWanted(parser, Section::Vcpu) && !IsWanted(parser, Section::Histograms)) ||
               EachElement(parser, key, value, [&](ondemand::value element) { return ReadVcpu(parser, element); });
    default:
        return !IsWanted(parser, Section::Histograms) || EachElement(parser, key, value, [&](ondemand::value element) {
            return ReadHistogram(parser, element, true);
        });
    }
}

// One of the objects that are spans of a section's columns. *known stays false when it is none of them.
bool ReadPortObject(Parser *parser, std::string_view key, ondemand::value value, bool *known) {
    static const struct {
        std::string_view key;
        Section section;
        Span span;
    } objects[] = {
        {"coalesce", Section::Vnic, SpanOf(Section::Vnic, "coalesce")},
        {"txwdt", Section::Vnic, SpanOf(Section::Vnic, "txwdt")},
        {"vnic", Section::Vnic, SpanOf(Section::Vnic, "vnic")},
        {"physnic", Section::Physnic, SpanOf(Section::Physnic, "physnic")},
        {"intr", Section::Intr, SpanOf(Section::Intr, "intr")},
        {"ipv4", Section::Hoststack, SpanOf(Section::Hoststack, "ipv4")},
        {"ipv6", Section::Hoststack, SpanOf(Section::Hoststack, "ipv6")},
        {"tcptx", Section::Hoststack, SpanOf(Section::Hoststack, "tcptx")},
        {"tcprx", Section::Hoststack, SpanOf(Section::Hoststack, "tcprx")},
        {"udp", Section::Hoststack, SpanOf(Section::Hoststack, "udp")},
    };
    for (const auto &object : objects) {
        if (key == object.key) {
            *known = true;
            return !IsWanted(parser, object.section) ||
                   ReadObject(parser, key, object.span, RowOfPort(parser, object.section), value);
        }
    }
    return true;
}

struct PortText {
    std::string_view name, switchName, id, uplink;
};

// name, switch, id and uplink of a port, wanted or not. *known stays false when the key is none of them.
bool ReadIdentity(Parser *parser, std::string_view key, ondemand::value &value, PortText *text, bool *known) {
    *known = true;
    if (key == "name") {
        return TextOf(parser, key, value, &text->name);
    }
    if (key == "switch") {
        return TextOf(parser, key, value, &text->switchName);
    }
    if (key == "id") {
        return NumberOf(parser, key, value, &text->id);
    }
    if (key == "uplink") {
        return TextOf(parser, key, value, &text->uplink);
    }
    *known = false;
    return true;
}

bool ReadPort(Parser *parser, ondemand::value value) {
    static const std::string_view parts[kPortParts] = {"txqueue", "rxqueue", "wdt", "vcpu", "histos"};
    static const size_t uplink = ColumnOf(Section::Ports, "uplink");
    std::string_view spare[kMostColumns];
    std::string_view *cells = IsWanted(parser, Section::Ports) ? NewRow(parser, Section::Ports) : spare;
    PortIdentity *port = &parser->rows->ports[parser->place];
    PortText text;
    bool seen[kPortParts] = {};
    bool empty = true;
    size_t next = kLayout.port.first;
    auto readField = [&](std::string_view key, ondemand::value field) {
        bool known = false;
        empty = false;
        if (!ReadIdentity(parser, key, field, &text, &known) || known) {
            return parser->wrong.empty();
        }
        for (uint8_t part = 0; part < kPortParts; part++) {
            if (key == parts[part]) {
                return Once(parser, key, &seen[part]) && ReadPortList(parser, PortPart{part}, key, field);
            }
        }
        if (!ReadPortObject(parser, key, field, &known) || known) {
            return parser->wrong.empty();
        }
        return ReadCell(parser, kLayout.port, cells, &next, key, field);
    };
    if (!EachField(parser, "ports", value, readField)) {
        return false;
    }
    cells[uplink] = text.uplink;
    port->present = !empty;
    port->name.assign(text.name);
    port->switchName.assign(text.switchName);
    port->id.assign(text.id);
    port->uplink = text.uplink == "true";
    return true;
}

}  // namespace

bool ReadPorts(Parser *parser, ondemand::value value) {
    std::vector<PortIdentity> *ports = &parser->rows->ports;
    size_t count = 0;
    bool fine = EachElement(parser, "ports", value, [&](ondemand::value element) {
        if (count == ports->size()) {
            ports->emplace_back();
        }
        parser->place = static_cast<uint32_t>(count++);
        return ReadPort(parser, element);
    });
    ports->resize(count);
    parser->place = kNoPlace;
    return fine;
}

}  // namespace report::parsing
