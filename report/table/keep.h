// Rows kept until the end of the input, to be written in order. Without a limit all rows are kept, some 130 bytes and
// the text of its cells each; with one, only so many of the first.
#pragma once

#include "report/table/sink.h"

#include <deque>
#include <string>
#include <vector>

namespace report {

struct SortKey {
    size_t cell;  // among the cells that KeepRow is given
    Kind kind;
    bool descending;
};
constexpr size_t kMostSortKeys = 3;

struct KeptRow {
    std::string cells;  // each with its length ahead of it, then texts to sort by
    uint64_t number;    // rows that are alike keep the order of the input
    struct {
        double number;
        uint32_t start, length;  // in cells, of a text
        bool absent;
    } keys[kMostSortKeys];
};

struct Keep {
    std::vector<SortKey> keys;
    size_t limit = 0;          // 0: none
    std::deque<KeptRow> rows;  // with a limit a heap: the row that goes first when a better one comes is in front
    uint64_t number = 0;
};

// Takes a row of so many cells; the keys may be cells behind those that are written in the end.
void KeepRow(Keep *keep, const std::string_view *cells, size_t count);
// Writes the rows, absent values of a key last in either direction.
void KeepWrite(Keep *keep, size_t count, Sink *sink);

}  // namespace report
