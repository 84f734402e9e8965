#include "corekit/snapshot/snapshot_pack.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <utility>
#include <vector>

namespace {

constexpr size_t MIN_COPY = 4;
constexpr size_t MAX_DISTANCE = 0xffff;
constexpr u32 SLOT_BITS = 16;
constexpr u64 MORE = 15;  // a length that goes on behind its four bits

// The slot of the next four bytes among those that were seen.
size_t SlotAt(std::string_view bytes, size_t at) {
    u32 word = 0;
    memcpy(&word, bytes.data() + at, sizeof word);
    return word * 2654435761U >> (32 - SLOT_BITS);
}

u64 TakeLength(Cursor *from, u64 length) {
    for (u64 more = length == MORE ? 255 : 0; more == 255;) {
        more = from->Number(1);
        length += more;
    }
    return length;
}

void AppendLength(std::string *packed, size_t length) {
    if (length >= MORE) {
        packed->append((length - MORE) / 255, '\xff');
        AppendNumber(packed, (length - MORE) % 255, 1);
    }
}

// Without a copy (length 0) it is the last sequence.
void AppendSequence(std::string *packed, std::string_view literals, size_t length, size_t distance) {
    size_t copied = length == 0 ? 0 : length - MIN_COPY;
    AppendNumber(packed, std::min<u64>(literals.size(), MORE) << 4 | std::min<u64>(copied, MORE), 1);
    AppendLength(packed, literals.size());
    packed->append(literals);
    if (length != 0) {
        AppendNumber(packed, distance, 2);
        AppendLength(packed, copied);
    }
}

}  // namespace

void AppendNumber(std::string *bytes, u64 value, u32 width) {
    for (u32 i = width; i > 0; i--) {
        *bytes += static_cast<char>(value >> 8 * (i - 1));
    }
}

u64 Crc64(std::string_view bytes) {
    static const auto table = [] {
        std::array<u64, 256> rows;
        for (u64 i = 0; i < rows.size(); i++) {
            rows[i] = i;
            for (int bit = 0; bit < 8; bit++) {
                rows[i] = rows[i] >> 1 ^ (rows[i] & 1 ? 0xc96c5795d7870f42 : 0);
            }
        }
        return rows;
    }();
    const u64 *rows = table.data();
    u64 sum = ~u64{0};
    for (char byte : bytes) {
        sum = rows[(sum ^ static_cast<u8>(byte)) & 255] ^ sum >> 8;
    }
    return ~sum;
}

std::string Pack(std::string_view bytes) {
    // Places are counted on from call to call, which spares clearing the slots for each page.
    static thread_local std::vector<u64> latest(size_t{1} << SLOT_BITS, 0);  // 1 behind the place that was seen last
    static thread_local u64 begin = 0;                                       // the place of the first byte
    std::string packed;
    size_t literals = 0;  // where those begin that wait to be written
    for (size_t at = 0; at + MIN_COPY <= bytes.size(); at++) {
        u64 seen = std::exchange(latest[SlotAt(bytes, at)], begin + at + 1);
        u64 distance = begin + at + 1 - seen;
        if (seen <= begin || distance > MAX_DISTANCE || at < literals) {
            continue;
        }
        size_t end = at;
        while (end < bytes.size() && bytes[end] == bytes[end - distance]) {
            end++;
        }
        if (end - at >= MIN_COPY) {
            AppendSequence(&packed, bytes.substr(literals, at - literals), end - at, distance);
            literals = end;
        }
    }
    if (literals < bytes.size()) {
        AppendSequence(&packed, bytes.substr(literals), 0, 0);
    }
    begin += bytes.size();
    return packed;
}

bool Unpack(std::string_view packed, std::string *bytes) {
    Cursor from{packed};
    size_t done = 0;
    while (!from.left.empty()) {
        u64 token = from.Number(1);
        std::string_view literals = from.Take(TakeLength(&from, token >> 4));
        if (!from.good || literals.size() > bytes->size() - done) {
            return false;
        }
        done += literals.copy(bytes->data() + done, literals.size());
        if (from.left.empty()) {
            break;
        }
        u64 distance = from.Number(2);
        u64 length = MIN_COPY + TakeLength(&from, token & MORE);
        if (!from.good || distance == 0 || distance > done || length > bytes->size() - done) {
            return false;
        }
        // A copy may reach into what it writes itself: each part makes more of it that the next can take.
        size_t source = done - distance;
        for (size_t part = 0; length > 0; length -= part, done += part) {
            part = std::min<size_t>(length, done - source);
            memcpy(bytes->data() + done, bytes->data() + source, part);
        }
    }
    return done == bytes->size();
}
