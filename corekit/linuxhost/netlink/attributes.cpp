#include "corekit/linuxhost/netlink/attributes.h"

#include <algorithm>
#include <cstring>
#include <linux/netlink.h>

namespace {

bool Fits(u64 value, u16 width) {
    return width >= 8 || value >> (8 * width) == 0;
}

bool FillUint(const AttrField &field, std::string_view payload, char *at) {
    u64 value = 0;
    size_t width = payload.size();
    if (width != 1 && width != 2 && width != 4 && width != 8) {
        return false;
    }
    memcpy(&value, payload.data(), width);
    if (!Fits(value, field.size)) {
        return false;
    }
    memcpy(at, &value, field.size);
    return true;
}

void FillText(const AttrField &field, std::string_view payload, char *at) {
    size_t length = std::min<size_t>(strnlen(payload.data(), payload.size()), field.size - 1U);
    memset(at, 0, field.size);
    memcpy(at, payload.data(), length);
}

void FillStruct(const AttrField &field, std::string_view payload, char *at) {
    memset(at, 0, field.size);
    memcpy(at, payload.data(), std::min<size_t>(payload.size(), field.size));
}

// What the attribute told, as bits of a table of `count` rows with this one at `position`.
u32 FillOne(const AttrField &field, size_t position, size_t count, std::string_view payload, void *row) {
    char *at = static_cast<char *>(row) + field.offset;
    switch (field.form) {
    case ATTR_UINT:
        if (!FillUint(field, payload, at)) {
            return 0;
        }
        break;
    case ATTR_TEXT:
        FillText(field, payload, at);
        break;
    case ATTR_STRUCT:
        FillStruct(field, payload, at);
        break;
    case ATTR_NEST:
        return 1U << position | AttrFill(field.nest, field.nested, payload, row) << count;
    }
    return 1U << position;
}

}  // namespace

bool AttrNext(std::string_view *rest, u16 *type, std::string_view *payload) {
    nlattr header;
    if (rest->size() < sizeof header) {
        return false;
    }
    memcpy(&header, rest->data(), sizeof header);
    if (header.nla_len < sizeof header || header.nla_len > rest->size()) {
        return false;
    }
    *type = header.nla_type & NLA_TYPE_MASK;
    *payload = rest->substr(sizeof header, header.nla_len - sizeof header);
    rest->remove_prefix(std::min<size_t>(NLA_ALIGN(header.nla_len), rest->size()));
    return true;
}

u32 AttrFill(const AttrField *table, size_t count, std::string_view attributes, void *row) {
    u64 wanted = 0;  // a bit a type, several types a bit: most attributes of a message are of no use
    for (size_t i = 0; i < count; i++) {
        wanted |= u64{1} << table[i].type % 64;
    }
    u32 known = 0;
    u16 type = 0;
    std::string_view payload;
    while (AttrNext(&attributes, &type, &payload)) {
        for (size_t i = (wanted >> type % 64 & 1) != 0 ? 0 : count; i < count; i++) {
            if (table[i].type == type) {
                known |= FillOne(table[i], i, count, payload, row);
            }
        }
    }
    return known;
}
