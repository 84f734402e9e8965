// A record as rows of the sections that are wanted. Owned by the caller and used again for each record, so that a
// long series allocates no more than its largest record needs. Cells are views into memory of Rows, valid until the
// next read; identities of ports are kept over records, by host.
#pragma once

#include "report/input/record_stream.h"
#include "report/rows/columns.h"

#include <string>
#include <vector>

namespace report {

struct RowsOfSection {
    std::vector<std::string_view> cells;  // rows x columns; a null data() is an absent value
    std::vector<uint32_t> places;         // the port of each row: its place in the record's list; kNoPlace: of no port
    size_t columns = 0;
    size_t size() const { return places.size(); }
    std::string_view at(size_t row, size_t column) const { return cells[row * columns + column]; }
};
constexpr uint32_t kNoPlace = ~0u;

// Who stands at a place of the ports' list. A port that is {} keeps the identity of the records before, as long as
// they are of one run: the iterations rise, and the list keeps its length.
struct PortIdentity {
    std::string name, switchName, id;  // id is empty when no record told it
    bool uplink = false;
    bool present = false;  // false: {} in this record
};

struct Rows {
    std::string host;
    int64_t time = 0;  // seconds since 1970
    int64_t interval = 0;
    int64_t iteration = 0;
    std::vector<PortIdentity> ports;
    RowsOfSection sections[kSections];
    // Places whose histograms are wanted, which are most of a record; null: all. The caller's, set before a read.
    const std::vector<bool> *histogramsOf = nullptr;

    struct Parser;
    Parser *parser = nullptr;

    const RowsOfSection &of(Section section) const { return sections[static_cast<size_t>(section)]; }
};

void RowsInit(Rows *rows);
// Reads a record into the rows of the wanted sections (bit of each Section); others are skipped, and not checked.
// False: not a record of this layout, told on standard error with its number; the rows are empty then. A key that the
// layout does not have is left out, and the first one is told.
bool RowsRead(Rows *rows, const RecordText &record, uint32_t wanted);
void RowsCleanup(Rows *rows);

constexpr uint32_t Wanted(Section section) {
    return 1u << static_cast<uint32_t>(section);
}
// A cell as a number; false when it is absent or no number.
bool CellNumber(std::string_view cell, double *value);

}  // namespace report
