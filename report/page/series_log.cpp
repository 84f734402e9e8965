#include "report/page/series_log.h"

namespace report {
namespace {

// Of a value: the same again, so many times; missing; or a difference.
constexpr uint64_t kAgain = 0, kNone = 1, kStep = 2;

void PutNumber(std::string *to, uint64_t number) {
    for (; number >= 0x80; number >>= 7) {
        *to += static_cast<char>(number | 0x80);
    }
    *to += static_cast<char>(number);
}

uint64_t GetNumber(const std::string &from, size_t *at) {
    uint64_t number = 0;
    for (unsigned shift = 0;; shift += 7) {
        uint8_t byte = static_cast<uint8_t>(from[(*at)++]);
        number |= static_cast<uint64_t>(byte & 0x7f) << shift;
        if (byte < 0x80) {
            return number;
        }
    }
}

int32_t BaseOf(int32_t last) {
    return last == kMissing ? 0 : last;
}

void PutAgain(std::string *to, size_t *count) {
    if (*count > 0) {
        PutNumber(to, kAgain);
        PutNumber(to, *count);
        *count = 0;
    }
}

}  // namespace

void SeriesLogAdd(SeriesLog *log, size_t record, const std::vector<int32_t> &values) {
    // Strings double: thousands of them would hold half their memory unused.
    size_t needed = log->bytes.size() + 16 + values.size() * 3;
    if (needed > log->bytes.capacity()) {
        log->bytes.reserve(needed + log->bytes.size() / 8);
    }
    PutNumber(&log->bytes, record - log->next);
    PutNumber(&log->bytes, values.size());
    log->last.resize(values.size(), kMissing);
    size_t again = 0;
    for (size_t i = 0; i < values.size(); i++) {
        int32_t value = values[i];
        if (value == log->last[i]) {
            again++;
            continue;
        }
        PutAgain(&log->bytes, &again);
        if (value == kMissing) {
            PutNumber(&log->bytes, kNone);
        } else {
            int32_t step = value - BaseOf(log->last[i]);
            uint32_t code = static_cast<uint32_t>(step) << 1 ^ static_cast<uint32_t>(step >> 31);
            PutNumber(&log->bytes, uint64_t{code} + kStep);
        }
        log->last[i] = value;
    }
    PutAgain(&log->bytes, &again);
    log->next = record + 1;
}

size_t SeriesLogBytes(const SeriesLog &log) {
    return log.bytes.capacity() + log.last.capacity() * sizeof(int32_t);
}

void SeriesLogClear(SeriesLog *log) {
    std::string().swap(log->bytes);
    std::vector<int32_t>().swap(log->last);
    log->next = 0;
}

bool SeriesLogNext(SeriesLogReader *reader) {
    const std::string &bytes = *reader->bytes;
    if (reader->at == bytes.size()) {
        return false;
    }
    reader->record = reader->next + GetNumber(bytes, &reader->at);
    reader->values.resize(GetNumber(bytes, &reader->at), kMissing);
    for (size_t i = 0; i < reader->values.size();) {
        uint64_t token = GetNumber(bytes, &reader->at);
        if (token == kAgain) {
            i += GetNumber(bytes, &reader->at);
        } else if (token == kNone) {
            reader->values[i++] = kMissing;
        } else {
            uint32_t code = static_cast<uint32_t>(token - kStep);
            int32_t step = static_cast<int32_t>(code >> 1 ^ (0u - (code & 1)));
            reader->values[i] = BaseOf(reader->values[i]) + step;
            i++;
        }
    }
    reader->next = reader->record + 1;
    return true;
}

}  // namespace report
