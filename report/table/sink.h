// Writes rows: CSV, TSV, JSON (an object a line), or aligned for the eye. The first three write each row at once; what
// is aligned waits for the end of its block, a record, and keeps that in memory.
#pragma once

#include "report/rows/columns.h"
#include "report/support/output.h"

#include <string>
#include <vector>

namespace report {

enum class Format : uint8_t { Aligned, Csv, Tsv, Json };

struct SinkColumn {
    std::string key;
    Kind kind;
    bool loss = false;      // above 0 it stands out, where there is colour
    bool maySplit = false;  // a text that may be cut where the terminal ends
    bool isPort = false;    // a number, but a text where JSON readers round
};

struct Sink {
    Format format = Format::Csv;
    std::vector<SinkColumn> columns;
    Output *output = nullptr;
    bool terminal = false;  // nothing raw that could steer it
    bool colour = false;
    size_t width = 0;  // cells of the terminal; 0: as wide as the rows

    // Of aligned rows: the block so far, its cells clean and one behind the other.
    std::string block;
    std::vector<size_t> ends;            // of each cell in block
    std::vector<size_t> widths, headed;  // cells of each column; as the last header had them
    std::vector<bool> used;              // columns that had a value in some block: others are not shown
    std::string line;
};

// Whether and how wide the output is a terminal, and whether colour is wanted there.
void SinkLookAt(Sink *sink);
// Writes the header of CSV and TSV, rows or not.
void SinkBegin(Sink *sink);
// A cell a column; null data() is an absent value.
void SinkRow(Sink *sink, const std::string_view *cells);
// The end of a record: what waits is written, and all is flushed.
OutputState SinkEndBlock(Sink *sink);

}  // namespace report
