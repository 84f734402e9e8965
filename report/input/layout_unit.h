// The bytes of a report's unit, and steps over what the layout has in it: words, numbers, lists. No leaves `at` where
// the layout was left, More says that the unit ends within the step. For layout.cpp alone; owns nothing.
#pragma once

#include "report/input/layout_steps.h"

#include <cstring>
#include <initializer_list>
#include <span>

namespace report::layout {

enum class Fit { Yes, No, More };

// The words of a step in pieces: each is followed by a number, or by another thing that `then` names, or by nothing.
struct Piece {
    const char *words;
    uint16_t size;
    char then;
};

std::span<const Piece> PiecesOf(Place place);
// Of the words behind a text.
uint32_t EndSize(Place place);
// What `then` stands for, as a message says it.
const char *NameOf(char then);

// The unit as far as it is there. A zero stands behind it.
struct Unit {
    const char *text;
    uint32_t size;
    bool last;
    uint32_t at;

    Fit EndOr(Fit otherwise) const { return at == size && !last ? Fit::More : otherwise; }

    Fit Words(const char *words, uint32_t length) {
        if (size - at >= length) [[likely]] {
            bool same = std::memcmp(text + at, words, length) == 0;
            at += same ? length : 0;
            return same ? Fit::Yes : Fit::No;
        }
        return std::memcmp(text + at, words, size - at) == 0 && !last ? Fit::More : Fit::No;
    }

    Fit Number();
    // As Number, for a whole one of up to 64 bits.
    Fit Whole(int64_t *value);
    Fit Mac();
    // One of a few words, none of which begins another.
    Fit OneOf(std::initializer_list<std::string_view> choices);
    Fit Then(char then);
    // [n, n], or n with blanks ahead of it.
    Fit Entry(bool pair);
    // `*from` is where the last entry begins that was not whole: reading can go on from there.
    Fit List(bool pairs, uint32_t *from);
};

}  // namespace report::layout
