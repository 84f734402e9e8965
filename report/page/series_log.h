// Values of many series, record after record, as one string of small differences: about a byte a value that moves,
// next to nothing for values that stand still. Owned by who holds it.
#pragma once

#include "report/page/encode.h"

#include <vector>

namespace report {

struct SeriesLog {
    std::string bytes;          // a record: records left out before it, number of values, differences
    std::vector<int32_t> last;  // of each series, kMissing before its first value
    size_t next = 0;            // the record behind the last one held
};

// Holds the values of a record behind all that are held. There may be more values than before, never fewer.
void SeriesLogAdd(SeriesLog *log, size_t record, const std::vector<int32_t> &values);
// Memory that the log takes.
size_t SeriesLogBytes(const SeriesLog &log);
void SeriesLogClear(SeriesLog *log);

// Reads a log from its start.
struct SeriesLogReader {
    const std::string *bytes;
    size_t at = 0, next = 0;
    std::vector<int32_t> values;  // of the record that was read
    size_t record = 0;
};
bool SeriesLogNext(SeriesLogReader *reader);

}  // namespace report
