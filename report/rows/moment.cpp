#include "report/rows/moment.h"

#include <charconv>
#include <cstdio>
#include <ctime>

namespace report {
namespace {

constexpr int64_t kDay = 86'400;

// Digits of a fixed count, at the head of the text; taken away from it.
bool TakeNumber(std::string_view *text, size_t digits, int64_t least, int64_t most, int64_t *number) {
    if (text->size() < digits) {
        return false;
    }
    *number = 0;
    auto [end, error] = std::from_chars(text->data(), text->data() + digits, *number);
    if (error != std::errc() || end != text->data() + digits || *number < least || *number > most) {
        return false;
    }
    text->remove_prefix(digits);
    return true;
}

bool Take(std::string_view *text, char c) {
    if (!text->starts_with(c)) {
        return false;
    }
    text->remove_prefix(1);
    return true;
}

// Days since 1970 of a date of the Gregorian calendar; false for the 30th of February.
bool TakeDate(std::string_view *text, int64_t *days) {
    int64_t year, month, day;
    if (!TakeNumber(text, 4, 1, 9999, &year) || !Take(text, '-') || !TakeNumber(text, 2, 1, 12, &month) ||
        !Take(text, '-') || !TakeNumber(text, 2, 1, 31, &day)) {
        return false;
    }
    tm date{};
    date.tm_year = static_cast<int>(year - 1900);
    date.tm_mon = static_cast<int>(month - 1);
    date.tm_mday = static_cast<int>(day);
    *days = timegm(&date) / kDay;
    return date.tm_mday == day;
}

// HH:MM, HH:MM:SS or HH:MM:SS.sss, with what follows as distance from UTC. *whole is how long what was not told takes.
bool TakeTime(std::string_view *text, int64_t *seconds, int64_t *whole) {
    int64_t hour, minute, second = 0;
    if (!TakeNumber(text, 2, 0, 24, &hour) || !Take(text, ':') || !TakeNumber(text, 2, 0, 59, &minute)) {
        return false;
    }
    *whole = 60;
    if (Take(text, ':')) {
        *whole = 1;
        if (!TakeNumber(text, 2, 0, 60, &second)) {
            return false;
        }
        if (Take(text, '.')) {
            size_t digits = text->find_first_not_of("0123456789");
            text->remove_prefix(digits == std::string_view::npos ? text->size() : digits);
        }
    }
    *seconds = hour * 3600 + minute * 60 + second;
    return *seconds <= kDay;
}

bool TakeZone(std::string_view *text, int64_t *distance) {
    *distance = 0;
    if (text->empty() || *text == "Z") {
        *text = {};
        return true;
    }
    int64_t sign = text->front() == '-' ? -1 : 1, hours, minutes = 0;
    if ((!Take(text, '+') && !Take(text, '-')) || !TakeNumber(text, 2, 0, 14, &hours)) {
        return false;
    }
    Take(text, ':');
    if (!text->empty() && !TakeNumber(text, 2, 0, 59, &minutes)) {
        return false;
    }
    *distance = sign * (hours * 3600 + minutes * 60);
    return text->empty();
}

bool ReadSeconds(std::string_view text, Moment *moment) {
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), moment->seconds);
    moment->kind = Moment::Kind::Once;
    return error == std::errc() && end == text.data() + text.size();
}

int64_t OfDay(int64_t time) {
    return (time % kDay + kDay) % kDay;
}

}  // namespace

std::string MomentText(int64_t time, bool local) {
    time_t clock = time;
    tm parts{};
    char text[64];
    // Years of four digits: others are no dates that anybody recorded, and ISO 8601 wants them agreed on.
    constexpr int64_t kFirst = -62'135'596'800, kLast = 253'402'300'799;
    if (time < kFirst || time > kLast || (local ? localtime_r(&clock, &parts) : gmtime_r(&clock, &parts)) == nullptr) {
        return std::to_string(time);
    }
    int length = snprintf(text, sizeof text, "%04d-%02d-%02dT%02d:%02d:%02d", parts.tm_year + 1900, parts.tm_mon + 1,
                          parts.tm_mday, parts.tm_hour, parts.tm_min, parts.tm_sec);
    if (local) {
        long distance = parts.tm_gmtoff / 60;
        snprintf(text + length, sizeof text - static_cast<size_t>(length), "%c%02ld:%02ld", distance < 0 ? '-' : '+',
                 labs(distance) / 60, labs(distance) % 60);
    } else {
        snprintf(text + length, sizeof text - static_cast<size_t>(length), "Z");
    }
    return text;
}

bool MomentRead(std::string_view text, bool end, Moment *moment) {
    if (ReadSeconds(text.starts_with('@') ? text.substr(1) : text, moment)) {
        return true;
    }
    int64_t days = 0, seconds = 0, whole = kDay, distance;
    bool dated = text.size() > 4 && text[4] == '-';
    if (dated && !TakeDate(&text, &days)) {
        return false;
    }
    if (!dated || Take(&text, 'T') || Take(&text, ' ')) {
        if (!TakeTime(&text, &seconds, &whole)) {
            return false;
        }
    }
    if (!TakeZone(&text, &distance)) {
        return false;
    }
    moment->kind = dated ? Moment::Kind::Once : Moment::Kind::Daily;
    moment->seconds = days * kDay + seconds - distance + (end ? whole - 1 : 0);
    if (!dated) {
        moment->seconds = OfDay(moment->seconds);
    }
    return true;
}

bool MomentWithin(int64_t time, const Moment &from, const Moment &to) {
    auto ofKind = [time](const Moment &moment) { return moment.kind == Moment::Kind::Daily ? OfDay(time) : time; };
    bool begun = from.kind == Moment::Kind::None || ofKind(from) >= from.seconds;
    bool open = to.kind == Moment::Kind::None || ofKind(to) <= to.seconds;
    bool overnight = from.kind == Moment::Kind::Daily && to.kind == Moment::Kind::Daily && from.seconds > to.seconds;
    return overnight ? begun || open : begun && open;
}

}  // namespace report
