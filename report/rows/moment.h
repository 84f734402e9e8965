// Moments of records as people write and read them: ISO 8601, in UTC unless local time is asked for.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace report {

// "2026-11-23T02:10:00Z"; local: "2026-11-23T03:10:00+01:00". A year that no calendar has: the plain seconds.
std::string MomentText(int64_t time, bool local);

// One end of a span of time.
struct Moment {
    enum class Kind : uint8_t {
        None,   // there is no such end
        Once,   // seconds since 1970
        Daily,  // seconds since midnight UTC, on each day
    };
    Kind kind = Kind::None;
    int64_t seconds = 0;
};

// Reads seconds since 1970, ISO 8601 ("2026-11-23", "2026-11-23T02:10", "... 02:10:00+01:00") or a time of day
// ("02:10"). What is left out counts whole: as the end of a span, "02:10" is 02:10:59. False: it is none of these.
bool MomentRead(std::string_view text, bool end, Moment *moment);
// Both ends count. Of two times of day the later one may come first: the span then crosses midnight.
bool MomentWithin(int64_t time, const Moment &from, const Moment &to);

}  // namespace report
