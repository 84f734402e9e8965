#include "report/page/encode.h"

#include "report/support/cells.h"

#include <charconv>
#include <cmath>
#include <cstdio>
#include <zlib.h>

namespace report {
namespace {

constexpr size_t kMostPlain = 15;  // bytes of a whole number that can't overflow, scaled

// Most cells are short and plain: digits, a point, up to two digits. False for any other form.
bool PlainFixed(std::string_view cell, int32_t scale, int64_t *fixed) {
    size_t at = cell[0] == '-' ? 1 : 0;
    size_t start = at;
    int64_t value = 0;
    for (; at < cell.size() && at < kMostPlain && cell[at] >= '0' && cell[at] <= '9'; at++) {
        value = value * 10 + (cell[at] - '0');
    }
    if (at == start || at == kMostPlain) {
        return false;
    }
    if (at == cell.size()) {
        *fixed = value * scale;
    } else {
        size_t decimals = cell.size() - at - 1;
        if (scale != 100 || cell[at] != '.' || decimals < 1 || decimals > 2) {
            return false;
        }
        for (size_t i = 1; i <= 2; i++) {
            char digit = i <= decimals ? cell[at + i] : '0';
            if (digit < '0' || digit > '9') {
                return false;
            }
            value = value * 10 + (digit - '0');
        }
        *fixed = value;
    }
    *fixed = start == 1 ? -*fixed : *fixed;
    return true;
}

}  // namespace

int32_t FixedOf(std::string_view cell, int32_t scale, uint64_t *tooLarge) {
    if (cell.empty()) {
        return kMissing;
    }
    int64_t fixed = 0;
    if (!PlainFixed(cell, scale, &fixed)) {
        double value = 0;
        auto [end, error] = std::from_chars(cell.data(), cell.data() + cell.size(), value);
        if (error == std::errc::result_out_of_range) {
            ++*tooLarge;
            return kMissing;
        }
        if (error != std::errc() || end != cell.data() + cell.size()) {
            return kMissing;
        }
        value = std::round(value * scale);
        fixed = std::fabs(value) <= kMostFixed ? static_cast<int64_t>(value) : INT64_MAX;
    }
    if (fixed < -kMostFixed || fixed > kMostFixed) {
        ++*tooLarge;
        return kMissing;
    }
    return static_cast<int32_t>(fixed);
}

int32_t CommonFactor(std::span<const int32_t> values, int32_t scale) {
    int32_t factor = scale;
    for (int32_t value : values) {
        while (factor > 1 && value != kMissing && value % factor != 0) {
            factor /= 10;
        }
    }
    return factor;
}

std::string PlanesOf(std::span<const int32_t> values, size_t length) {
    size_t count = values.size();
    std::string bytes(count * 4, '\0');
    for (size_t i = 0; i < count;) {
        int32_t last = 0;
        for (size_t end = i + length; i < end; i++) {
            uint32_t code = 0xffffffff;
            if (values[i] != kMissing) {
                int32_t step = values[i] - last;
                code = static_cast<uint32_t>(step) << 1 ^ static_cast<uint32_t>(step >> 31);
                last = values[i];
            }
            for (size_t plane = 0; plane < 4; plane++) {
                bytes[plane * count + i] = static_cast<char>(code >> plane * 8);
            }
        }
    }
    return bytes;
}

std::string Gzip(std::string_view bytes) {
    z_stream stream = {};
    constexpr int GZIP = 16;  // added to the size of the window: a gzip header, not one of zlib
    deflateInit2(&stream, 6, Z_DEFLATED, 15 + GZIP, 8, Z_DEFAULT_STRATEGY);
    std::string packed(deflateBound(&stream, bytes.size()), '\0');
    stream.next_in = reinterpret_cast<Bytef *>(const_cast<char *>(bytes.data()));
    stream.avail_in = static_cast<uInt>(bytes.size());
    stream.next_out = reinterpret_cast<Bytef *>(packed.data());
    stream.avail_out = static_cast<uInt>(packed.size());
    deflate(&stream, Z_FINISH);  // in one go: the bound is enough
    packed.resize(stream.total_out);
    deflateEnd(&stream);
    return packed;
}

std::string Base64(std::string_view bytes) {
    constexpr char LETTERS[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string text((bytes.size() + 2) / 3 * 4, '=');
    size_t to = 0;
    for (size_t at = 0; at < bytes.size(); at += 3) {
        size_t left = bytes.size() - at;
        uint32_t group = 0;
        for (size_t i = 0; i < 3; i++) {
            group = group << 8 | (i < left ? static_cast<uint8_t>(bytes[at + i]) : 0);
        }
        for (size_t i = 0; i < 4; i++) {
            if (i <= left) {
                text[to + i] = LETTERS[group >> (18 - 6 * i) & 63];
            }
        }
        to += 4;
    }
    return text;
}

std::string PolicyHash(std::string_view hex) {
    std::string digest;
    for (size_t i = 0; i + 1 < hex.size(); i += 2) {
        uint8_t byte = 0;
        std::from_chars(hex.data() + i, hex.data() + i + 2, byte, 16);
        digest += static_cast<char>(byte);
    }
    return "sha256-" + Base64(digest);
}

void JsonText(std::string *to, std::string_view text) {
    for (char byte : text) {
        if (byte == '"' || byte == '\\') {
            *to += '\\';
            *to += byte;
        } else if (static_cast<unsigned char>(byte) < 0x20 || byte == '<' || byte == 0x7f) {
            char escaped[7];
            snprintf(escaped, sizeof escaped, "\\u%04x", static_cast<unsigned>(byte));
            *to += escaped;
        } else {
            *to += byte;
        }
    }
}

std::string JsonString(std::string_view text) {
    std::string json = "\"";
    JsonText(&json, text);
    return json + '"';
}

std::string HtmlText(std::string_view text) {
    std::string clean, html;
    AppendClean(&clean, text);
    for (char byte : clean) {
        switch (byte) {
        case '&':
            html += "&amp;";
            break;
        case '<':
            html += "&lt;";
            break;
        case '>':
            html += "&gt;";
            break;
        case '"':
            html += "&quot;";
            break;
        default:
            html += byte;
        }
    }
    return html;
}

}  // namespace report
