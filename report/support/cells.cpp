#include "report/support/cells.h"

#include <algorithm>
#include <cstdio>
#include <iterator>

namespace report {
namespace {

struct Range {
    uint32_t first, last;
};

// Marks that stand on the character before them, and what has no width at all.
constexpr Range kNarrowest[] = {
    {0x0300, 0x036f}, {0x0483, 0x0489},   {0x0591, 0x05bd},   {0x05bf, 0x05bf}, {0x05c1, 0x05c2}, {0x05c4, 0x05c5},
    {0x0610, 0x061a}, {0x064b, 0x065f},   {0x0670, 0x0670},   {0x06d6, 0x06dc}, {0x06df, 0x06e4}, {0x0730, 0x074a},
    {0x0900, 0x0902}, {0x093a, 0x093a},   {0x093c, 0x093c},   {0x0941, 0x0948}, {0x094d, 0x094d}, {0x0e31, 0x0e31},
    {0x0e34, 0x0e3a}, {0x0e47, 0x0e4e},   {0x1160, 0x11ff},   {0x1ab0, 0x1aff}, {0x1dc0, 0x1dff}, {0x200b, 0x200d},
    {0x2060, 0x2064}, {0x20d0, 0x20f0},   {0x302a, 0x302d},   {0x3099, 0x309a}, {0xfe00, 0xfe0f}, {0xfe20, 0xfe2f},
    {0xfeff, 0xfeff}, {0x1f3fb, 0x1f3ff}, {0xe0100, 0xe01ef},
};

constexpr Range kWide[] = {
    {0x1100, 0x115f},   {0x231a, 0x231b},   {0x23e9, 0x23ec},   {0x2e80, 0x303e},   {0x3041, 0x33ff},
    {0x3400, 0x4dbf},   {0x4e00, 0x9fff},   {0xa000, 0xa4cf},   {0xa960, 0xa97c},   {0xac00, 0xd7a3},
    {0xf900, 0xfaff},   {0xfe30, 0xfe6f},   {0xff00, 0xff60},   {0xffe0, 0xffe6},   {0x16fe0, 0x18aff},
    {0x1b000, 0x1b2ff}, {0x1f004, 0x1f004}, {0x1f0cf, 0x1f0cf}, {0x1f18e, 0x1f19a}, {0x1f200, 0x1f265},
    {0x1f300, 0x1f64f}, {0x1f680, 0x1f6ff}, {0x1f7e0, 0x1f7eb}, {0x1f900, 0x1f9ff}, {0x1fa70, 0x1faff},
    {0x20000, 0x3fffd},
};

template <size_t N>
bool IsIn(const Range (&ranges)[N], uint32_t character) {
    const Range *range = std::lower_bound(std::begin(ranges), std::end(ranges), character,
                                          [](const Range &a, uint32_t c) { return a.last < c; });
    return range != std::end(ranges) && character >= range->first;
}

size_t CellsOfCharacter(uint32_t character) {
    if (character < 0x300) {
        return 1;
    }
    return IsIn(kNarrowest, character) ? 0 : IsIn(kWide, character) ? 2 : 1;
}

}  // namespace

uint32_t NextCharacter(std::string_view text, size_t *length, bool *valid) {
    auto byte = [&](size_t i) { return static_cast<uint8_t>(text[i]); };
    uint32_t first = byte(0);
    *length = 1;
    *valid = first < 0x80;
    if (*valid) {
        return first;
    }
    size_t count = first >= 0xf0 ? 4 : first >= 0xe0 ? 3 : 2;
    if (first < 0xc2 || first > 0xf4 || text.size() < count) {
        return first;
    }
    uint32_t character = first & (0x7fu >> count);
    for (size_t i = 1; i < count; i++) {
        if ((byte(i) & 0xc0) != 0x80) {
            return first;
        }
        character = character << 6 | (byte(i) & 0x3f);
    }
    constexpr uint32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};
    if (character < kLeast[count] || character > 0x10ffff || (character >= 0xd800 && character <= 0xdfff)) {
        return first;
    }
    *length = count;
    *valid = true;
    return character;
}

bool IsControl(uint32_t character) {
    return character < 0x20 || (character >= 0x7f && character < 0xa0) || character == 0x061c ||
           (character >= 0x200e && character <= 0x200f) || (character >= 0x2028 && character <= 0x202e) ||
           (character >= 0x2066 && character <= 0x2069);
}

void AppendClean(std::string *out, std::string_view text) {
    while (!text.empty()) {
        size_t length;
        bool valid;
        uint32_t character = NextCharacter(text, &length, &valid);
        if (valid && !IsControl(character)) {
            out->append(text.substr(0, length));
        } else {
            char escaped[16];
            snprintf(escaped, sizeof escaped, character < 0x80 || !valid ? "\\x%02x" : "\\u{%04x}", character);
            out->append(escaped);
        }
        text.remove_prefix(length);
    }
}

size_t CellsOf(std::string_view text) {
    size_t cells = 0;
    while (!text.empty()) {
        size_t length;
        bool valid;
        cells += CellsOfCharacter(NextCharacter(text, &length, &valid));
        text.remove_prefix(length);
    }
    return cells;
}

std::string_view CutToCells(std::string_view text, size_t cells) {
    size_t used = 0, end = 0;
    while (end < text.size()) {
        size_t length;
        bool valid;
        used += CellsOfCharacter(NextCharacter(text.substr(end), &length, &valid));
        if (used > cells) {
            break;
        }
        end += length;
    }
    return text.substr(0, end);
}

}  // namespace report
