#include "report/input/layout_unit.h"

#include <algorithm>
#include <array>
#include <vector>

namespace report::layout {
namespace {

struct AllPieces {
    std::vector<Piece> list;
    std::array<uint16_t, kPlaces + 1> begin = {};
};

AllPieces CutWords() {
    AllPieces all;
    for (size_t i = 0; i < kPlaces; i++) {
        all.begin[i] = static_cast<uint16_t>(all.list.size());
        const char *words = kSteps[i].words;
        do {
            size_t size = std::strcspn(words, "#@?*");
            all.list.push_back({words, static_cast<uint16_t>(size), words[size]});
            words += size + (words[size] != '\0' ? 1 : 0);
        } while (*words != '\0');
    }
    all.begin[kPlaces] = static_cast<uint16_t>(all.list.size());
    return all;
}

constexpr long kNumberBound = 400;  // digits of the largest double, and more
constexpr uint32_t kBlanks = 16;    // ahead of a padded number

bool IsDigit(char byte) {
    return byte >= '0' && byte <= '9';
}

}  // namespace

std::span<const Piece> PiecesOf(Place place) {
    static const AllPieces all = CutWords();
    return {all.list.data() + all.begin[place], all.list.data() + all.begin[place + 1]};
}

uint32_t EndSize(Place place) {
    return PiecesOf(place).front().size;
}

const char *NameOf(char then) {
    switch (then) {
    case '#':
        return "a number";
    case '@':
        return "a MAC address";
    case '?':
        return "true or false";
    default:
        return "vcpu, wdt or pcpu";
    }
}

Fit Unit::Number() {
    const char *next = text + at;
    next += *next == '-' ? 1 : 0;
    const char *digits = next;
    while (IsDigit(*next)) {
        next++;
    }
    bool right = next > digits && (next == digits + 1 || *digits != '0');
    if (right && *next == '.') {
        digits = ++next;
        while (IsDigit(*next)) {
            next++;
        }
        right = next > digits;
    }
    right = right && next - (text + at) <= kNumberBound;
    if (next == text + size && next - (text + at) <= kNumberBound && !last) {
        return Fit::More;
    }
    at = right ? static_cast<uint32_t>(next - text) : at;
    return right ? Fit::Yes : Fit::No;
}

Fit Unit::Whole(int64_t *value) {
    uint32_t begin = at;
    Fit fit = Number();
    if (fit != Fit::Yes) {
        return fit;
    }
    bool negative = text[begin] == '-';
    uint64_t sum = 0;
    for (uint32_t i = begin + (negative ? 1 : 0); i < at; i++) {
        sum = sum * 10 + static_cast<uint64_t>(text[i] - '0');
    }
    *value = static_cast<int64_t>(negative ? 0 - sum : sum);
    return std::memchr(text + begin, '.', at - begin) == nullptr ? Fit::Yes : Fit::No;
}

Fit Unit::Mac() {
    constexpr uint32_t kSize = 17;
    for (uint32_t i = 0; i < std::min(kSize, size - at); i++) {
        char byte = text[at + i];
        if (i % 3 == 2 ? byte != ':' : !IsDigit(byte) && (byte < 'a' || byte > 'f')) {
            return Fit::No;
        }
    }
    if (size - at < kSize) {
        return last ? Fit::No : Fit::More;
    }
    at += kSize;
    return Fit::Yes;
}

Fit Unit::OneOf(std::initializer_list<std::string_view> choices) {
    for (std::string_view word : choices) {
        Fit fit = Words(word.data(), static_cast<uint32_t>(word.size()));
        if (fit != Fit::No) {
            return fit;
        }
    }
    return Fit::No;
}

Fit Unit::Then(char then) {
    switch (then) {
    case '#':
        return Number();
    case '@':
        return Mac();
    case '?':
        return OneOf({"true", "false"});
    case '*':
        return OneOf({"pcpu", "vcpu", "wdt"});
    default:
        return Fit::Yes;
    }
}

Fit Unit::Entry(bool pair) {
    if (!pair) {
        for (uint32_t blanks = 0; text[at] == ' ' && blanks < kBlanks; blanks++) {
            at++;
        }
        return at == size ? EndOr(Fit::No) : Number();
    }
    Fit fit = Words("[", 1);
    fit = fit == Fit::Yes ? Number() : fit;
    fit = fit == Fit::Yes ? Words(", ", 2) : fit;
    fit = fit == Fit::Yes ? Number() : fit;
    return fit == Fit::Yes ? Words("]", 1) : fit;
}

Fit Unit::List(bool pairs, uint32_t *from) {
    for (;;) {
        *from = at;
        Fit fit = Entry(pairs);
        if (fit != Fit::Yes) {
            return fit;
        }
        fit = Words(", ", 2);
        if (fit != Fit::Yes) {
            return fit == Fit::No ? Fit::Yes : fit;
        }
    }
}

}  // namespace report::layout
