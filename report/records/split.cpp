#include "report/records/split.h"

#include "report/support/message.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <sys/statvfs.h>
#include <unistd.h>

namespace report {
namespace {

constexpr int64_t kHour = 3600;
constexpr unsigned kLeastFree = 5;  // per cent
constexpr int kMostNames = 1000;    // of one hour, when the clock goes back and forth

std::string NameOf(const Split &split, int number) {
    time_t time = split.hour * kHour;
    tm utc = {};
    if (gmtime_r(&time, &utc) == nullptr) {
        utc = {};
    }
    char name[96];
    char again[16] = "";
    if (number > 1) {
        snprintf(again, sizeof again, "-%d", number);
    }
    snprintf(name, sizeof name, "/lan-%04d%02d%02dT%02dZ-%d%s.ndjson", utc.tm_year + 1900, utc.tm_mon + 1, utc.tm_mday,
             utc.tm_hour, static_cast<int>(getpid()), again);
    return split.directory + name;
}

void OpenHour(Split *split) {
    for (int number = 1; number <= kMostNames; number++) {
        if (OutputCreate(&split->output, NameOf(*split, number)) || errno != EEXIST) {
            break;
        }
    }
    if (split->output.fd < 0) {
        Tell("%s: can't make it: %s", split->output.path.c_str(), strerror(errno));
        split->output.state = OutputState::Failed;
    }
    split->open = true;
}

bool HasRoom(Split *split) {
    struct statvfs disk = {};
    if (statvfs(split->directory.c_str(), &disk) != 0) {
        return true;  // what is wrong shows at the write
    }
    bool full = uint64_t{disk.f_bavail} * 100 < uint64_t{disk.f_blocks} * kLeastFree;
    if (full && !split->full) {
        Tell("%s: less than %u %% of the disk are free: records are dropped until there is room",
             split->directory.c_str(), kLeastFree);
    } else if (!full && split->full) {
        Tell("%s: there is room again: %llu records were dropped", split->directory.c_str(),
             static_cast<unsigned long long>(split->dropped));
        split->dropped = 0;
    }
    split->full = full;
    return !full;
}

}  // namespace

OutputState SplitWrite(Split *split, int64_t time, std::string_view lines) {
    int64_t hour = time / kHour - (time % kHour < 0 ? 1 : 0);
    if (!HasRoom(split)) {
        split->dropped++;
        split->lost = true;
        return OutputState::Fine;
    }
    if (split->open && hour != split->hour) {
        SplitClose(split);
    }
    if (!split->open) {
        split->hour = hour;
        OpenHour(split);
    }
    OutputWrite(&split->output, lines);
    return OutputFlush(&split->output);
}

OutputState SplitClose(Split *split) {
    if (!split->open) {
        return OutputState::Fine;
    }
    split->open = false;
    return OutputClose(&split->output);
}

}  // namespace report
