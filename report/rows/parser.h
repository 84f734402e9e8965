// What the readers of a record's parts share, for rows.cpp and port_rows.cpp: the state of a read, and steps over
// objects, lists and values of JSON. A step returns false when the record is not of the layout; `wrong` tells why, and
// the whole read ends. Cells are views into the padded copy of the record, or into texts and numbers of the parser.
#pragma once

#include "report/rows/rows.h"

#include <deque>
#include <simdjson.h>

namespace report {

namespace ondemand = simdjson::ondemand;

// The run of a host whose records come, for the identity of ports that become {}.
struct HostPlaces {
    std::string host;
    int64_t iteration = 0;
    std::vector<PortIdentity> ports;
    uint64_t seen = 0;  // number of the record that saw it last
};

struct Rows::Parser {
    ondemand::parser json;
    std::vector<char> padded;       // the record, with the bytes behind it that the parser may read
    std::deque<std::string> texts;  // cells that stand nowhere in the record
    size_t textsUsed = 0;
    std::deque<std::string> numbers;  // "0", "1", ...: numbers of queues and pcpus; never shrunk, cells point into it
    std::vector<HostPlaces> hosts;
    std::vector<std::string_view> limits, values;  // of the histogram or list at hand
    uint64_t records = 0;
    bool strangerTold = false;

    const RecordText *record = nullptr;  // while one is read
    Rows *rows = nullptr;
    uint32_t wanted = 0;
    uint32_t place = kNoPlace;  // of the port at hand
    std::string wrong;          // what the record has against the layout; empty: nothing yet
};

namespace parsing {

using Parser = Rows::Parser;

// Columns of a section whose keys begin alike: what one object of the record fills.
struct Span {
    Section section;
    size_t first, last;  // last is behind the end
    size_t prefix;       // bytes of the keys that the object stands for, the point included
};

// The columns whose keys begin with the prefix; all of them without one.
Span SpanOf(Section section, std::string_view prefix);
size_t ColumnOf(Section section, const char *key);

bool Refuse(Parser *parser, std::string_view key, const char *what);
// A key that is none of the layout: no reason to lose the record.
bool Stranger(Parser *parser, std::string_view key);
// An object or list that may stand once in its object.
bool Once(Parser *parser, std::string_view key, bool *seen);
// Whether the cell takes a value: it does once.
bool Put(std::string_view *cell, std::string_view value);

// Values of JSON. A cell takes a number as it stands there.
bool NumberOf(Parser *parser, std::string_view key, ondemand::value &value, std::string_view *cell);
bool TextOf(Parser *parser, std::string_view key, ondemand::value &value, std::string_view *cell);
bool IntegerOf(Parser *parser, std::string_view key, ondemand::value &value, int64_t *number, bool *seen);
bool NumbersOf(Parser *parser, std::string_view what, ondemand::value value, std::vector<std::string_view> *numbers);
std::string_view KeyOf(ondemand::field &field);

RowsOfSection *Of(Parser *parser, Section section);
bool IsWanted(const Parser *parser, Section section);
std::string_view *NewRow(Parser *parser, Section section);
// The row of the port at hand, which several of its objects fill.
std::string_view *RowOfPort(Parser *parser, Section section);
// Cells that stand nowhere in the record.
std::string_view NumberText(Parser *parser, size_t number);
std::string *NewText(Parser *parser);

// Fills the cells of a span from an object, and those of deeper keys from the objects in it. *next is where the
// report's own order lets the next key be expected.
bool ReadObject(Parser *parser, std::string_view what, const Span &span, std::string_view *cells,
                ondemand::value value);
bool ReadCell(Parser *parser, const Span &span, std::string_view *cells, size_t *next, std::string_view key,
              ondemand::value &value);
// All ports of a record, with their rows and identities.
bool ReadPorts(Parser *parser, ondemand::value value);

// Calls use(key, value) for each field until it returns false. A value that it leaves alone is skipped.
template <class Use>
bool EachField(Parser *parser, std::string_view what, ondemand::value value, Use use) {
    ondemand::object object;
    if (value.get_object().get(object) != simdjson::SUCCESS) {
        return Refuse(parser, what, " is no object");
    }
    for (auto result : object) {
        ondemand::field field;
        if (std::move(result).get(field) != simdjson::SUCCESS) {
            return Refuse(parser, what, " is broken");
        }
        if (!use(KeyOf(field), field.value())) {
            return false;
        }
    }
    return true;
}

template <class Use>
bool EachElement(Parser *parser, std::string_view what, ondemand::value value, Use use) {
    ondemand::array array;
    if (value.get_array().get(array) != simdjson::SUCCESS) {
        return Refuse(parser, what, " is no list");
    }
    for (auto result : array) {
        ondemand::value element;
        if (std::move(result).get(element) != simdjson::SUCCESS) {
            return Refuse(parser, what, " is broken");
        }
        if (!use(element)) {
            return false;
        }
    }
    return true;
}

}  // namespace parsing
}  // namespace report
