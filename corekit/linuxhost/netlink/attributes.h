// Attributes of a kernel message, filled into a plain row by one function from a table: it checks every length, takes
// integers of any width, ends texts, and skips what the table does not name, as the kernel may be newer than we are.
#pragma once

#include "interface/types.h"

#include <cstddef>
#include <string_view>

enum AttrForm : u8 {
    ATTR_UINT,    // of 1, 2, 4 or 8 bytes on either side; one that does not fit the field is not taken
    ATTR_TEXT,    // cut to the field, which always ends with a 0
    ATTR_STRUCT,  // the shorter length is copied; the rest of the field is zeros
    ATTR_NEST,    // not copied; the row is filled from the table of the nest
};

struct AttrField {
    u16 type;
    AttrForm form;
    u16 offset;
    u16 size;
    const AttrField *nest = nullptr;  // with `nested` rows, whose bits in `known` follow those of this table
    u16 nested = 0;
};

// Fills the row and returns which fields were told: bit n for row n of the table. A nest that was told has its own
// bit, and its rows the bits from the end of the outer table on. Later attributes of a type go over earlier ones.
u32 AttrFill(const AttrField *table, size_t count, std::string_view attributes, void *row);

template <size_t Count>
u32 AttrFill(const AttrField (&table)[Count], std::string_view attributes, void *row) {
    static_assert(Count <= 32);
    return AttrFill(table, Count, attributes, row);
}

// NOLINTNEXTLINE(cppcoreguidelines-macro-usage): a member's place can't be had in another way
#define ATTR_AT(Row, field) static_cast<u16>(offsetof(Row, field)), static_cast<u16>(sizeof(Row::field))

// Walks attributes: cuts the first one off `*rest` and gives its type, without the flags in it. False at the end, and
// at a length that does not fit.
bool AttrNext(std::string_view *rest, u16 *type, std::string_view *payload);
