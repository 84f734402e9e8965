// Files of an unattended run: one for each hour of the records' time in UTC, lan-20261123T02Z-PID.ndjson in a directory
// that exists. A file is made once and never opened again; each record is in it whole before the next one is read.
// While less than 5 % of the disk is free, records are dropped, which is told when it begins and when it ends.
#pragma once

#include "report/support/output.h"

#include <cstdint>
#include <string>
#include <string_view>

namespace report {

struct Split {
    std::string directory;
    Output output;
    bool open = false;
    int64_t hour = 0;  // of the open file
    bool full = false;
    uint64_t dropped = 0;
    bool lost = false;  // some record was dropped
};

// Writes the lines of a record. Not Fine: nothing more can be written.
OutputState SplitWrite(Split *split, int64_t time, std::string_view lines);
OutputState SplitClose(Split *split);

}  // namespace report
