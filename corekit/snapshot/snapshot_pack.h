// Packing and checking of a snapshot's bytes. Packed bytes alternate between literals and copies of what was unpacked
// before them; one packed byte stands for at most 255 unpacked ones.
#pragma once

#include "interface/types.h"

#include <algorithm>
#include <string>
#include <string_view>

// Reads bytes from front to back. What goes past the end gives 0 or nothing, drops the rest and clears `good`.
struct Cursor {
    std::string_view left;
    bool good = true;

    std::string_view Take(u64 count) {
        good = good && count <= left.size();
        std::string_view taken = good ? left.substr(0, count) : std::string_view();
        left = good ? left.substr(count) : std::string_view();
        return taken;
    }
    u64 Number(u32 width) {  // big-endian
        u64 value = 0;
        for (char byte : Take(width)) {
            value = value << 8 | static_cast<u8>(byte);
        }
        return value;
    }
    std::string_view Text() {  // up to a byte of 0, which is passed over
        std::string_view text = Take(std::min(left.find('\0'), left.size()));
        Take(1);
        return text;
    }
};

void AppendNumber(std::string *bytes, u64 value, u32 width);  // big-endian

u64 Crc64(std::string_view bytes);  // CRC-64/XZ

std::string Pack(std::string_view bytes);
// False unless the packed bytes unpack to exactly as many bytes as `bytes` has.
bool Unpack(std::string_view packed, std::string *bytes);
