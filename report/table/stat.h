// One figure for a span of time: the maximum, mean, 95th percentile or last value of each column, for each element
// (port, queue, vcpu, worldlet, bucket). Absent values don't count. Memory grows with elements x columns, some 80 bytes
// each; for the percentile also with the records, 8 bytes a value.
#pragma once

#include "report/rows/columns.h"

#include <string>
#include <unordered_map>
#include <vector>

namespace report {

enum class StatKind : uint8_t { Max, Mean, P95, Last };

struct StatValue {
    std::string text;  // last value, or the largest one, as the report wrote it
    bool present = false;
    uint32_t decimals = 0;  // most that a value had
    double number = 0;      // largest, or the sum
    uint64_t count = 0;
    std::vector<double> values;
};

struct StatElement {
    uint64_t lastRecord = 0;
    uint64_t records = 0;  // in which it had a value
    uint32_t alike = 0;    // further ones with its key in that record
    std::vector<StatValue> values;
};

struct Stat {
    StatKind kind = StatKind::Max;
    std::vector<bool> isFigure;  // of each column
    std::unordered_map<std::string, size_t> places;
    std::vector<StatElement> elements;  // in the order in which they came
};

// The kind of a word: "max", "mean", "p95", "last"; false when it is none.
bool StatFind(std::string_view word, StatKind *kind);
// What tells the elements of a port apart: keys of columns; empty where a port has one row.
std::vector<const char *> StatKeys(Section section);
// Whether a column is something to take a maximum or mean of; others show their last value.
bool StatIsFigure(Section section, const Column &column);
// Takes a row of the record with that number, from 1. The key tells elements apart; those that are alike in one record,
// as worldlets of the same name, are told apart by their order.
void StatRow(Stat *stat, std::string *key, uint64_t record, bool hasValue, const std::string_view *cells);
// The figure of a value; valid until the next call with the same scratch. Absent when there was none.
std::string_view StatFigure(Stat *stat, StatElement *element, size_t column, std::string *scratch);

}  // namespace report
