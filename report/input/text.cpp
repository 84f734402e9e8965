#include "report/input/text.h"

#include <array>
#include <cstdint>
#include <cstdio>

namespace report {
namespace {

// Bytes that may stand in a JSON string as they are.
constexpr std::array<bool, 256> kPlain = [] {
    std::array<bool, 256> plain = {};
    for (int byte = 0x20; byte < 0x80; byte++) {
        plain[static_cast<size_t>(byte)] = byte != '"' && byte != '\\';
    }
    return plain;
}();

uint8_t At(std::string_view text, size_t at) {
    return at < text.size() ? static_cast<uint8_t>(text[at]) : 0;
}

// Bytes of the character at the front of a text: 2 to 4, or 0 when that is no character of UTF-8 beyond ASCII.
size_t CharacterSize(std::string_view text) {
    uint8_t first = At(text, 0);
    uint8_t second = At(text, 1);
    auto follows = [text](size_t at) { return (At(text, at) & 0xc0) == 0x80; };
    if (first >= 0xc2 && first <= 0xdf) {
        return follows(1) ? 2 : 0;
    }
    if (first >= 0xe0 && first <= 0xef) {
        bool right = (first != 0xe0 || second >= 0xa0) && (first != 0xed || second < 0xa0);
        return right && follows(1) && follows(2) ? 3 : 0;
    }
    if (first >= 0xf0 && first <= 0xf4) {
        bool right = (first != 0xf0 || second >= 0x90) && (first != 0xf4 || second < 0x90);
        return right && follows(1) && follows(2) && follows(3) ? 4 : 0;
    }
    return 0;
}

void AppendCharacter(std::string *text, uint32_t code) {
    auto add = [text](uint32_t byte) { *text += static_cast<char>(byte); };
    if (code < 0x80) {
        add(code);
    } else if (code < 0x800) {
        add(0xc0 | code >> 6);
        add(0x80 | (code & 0x3f));
    } else if (code < 0x10000) {
        add(0xe0 | code >> 12);
        add(0x80 | (code >> 6 & 0x3f));
        add(0x80 | (code & 0x3f));
    } else {
        add(0xf0 | code >> 18);
        add(0x80 | (code >> 12 & 0x3f));
        add(0x80 | (code >> 6 & 0x3f));
        add(0x80 | (code & 0x3f));
    }
}

void AppendEscaped(std::string *json, uint8_t byte) {
    if (byte == '"' || byte == '\\') {
        *json += '\\';
        *json += static_cast<char>(byte);
        return;
    }
    char escaped[7];
    snprintf(escaped, sizeof escaped, "\\u%04x", byte);
    *json += escaped;
}

uint32_t Hexadecimal(std::string_view digits) {
    uint32_t value = 0;
    for (char digit : digits) {
        value = value << 4 | static_cast<uint32_t>(digit <= '9' ? digit - '0' : (digit | 0x20) - 'a' + 10);
    }
    return value;
}

}  // namespace

bool TextAppendJson(std::string *json, std::string_view raw) {
    bool changed = false;
    while (!raw.empty()) {
        size_t plain = 0;
        while (plain < raw.size() && kPlain[static_cast<uint8_t>(raw[plain])]) {
            plain++;
        }
        json->append(raw, 0, plain);
        raw.remove_prefix(plain);
        if (raw.empty()) {
            break;
        }
        size_t size = CharacterSize(raw);
        if (size != 0) {
            json->append(raw, 0, size);
        } else {
            AppendEscaped(json, static_cast<uint8_t>(raw[0]));
            changed = true;
            size = 1;
        }
        raw.remove_prefix(size);
    }
    return changed;
}

void TextAppendUtf8(std::string *text, std::string_view raw) {
    while (!raw.empty()) {
        size_t size = CharacterSize(raw);
        if (size != 0) {
            text->append(raw, 0, size);
        } else {
            AppendCharacter(text, static_cast<uint8_t>(raw[0]));
            size = 1;
        }
        raw.remove_prefix(size);
    }
}

void TextAppendUnescaped(std::string *text, std::string_view json) {
    constexpr std::string_view kLetters = "bfnrt";
    constexpr std::string_view kControls = "\b\f\n\r\t";
    while (!json.empty()) {
        if (json[0] != '\\') {
            size_t size = std::min(json.find('\\'), json.size());
            text->append(json, 0, size);
            json.remove_prefix(size);
        } else if (json[1] != 'u') {
            size_t control = kLetters.find(json[1]);
            *text += control == std::string_view::npos ? json[1] : kControls[control];
            json.remove_prefix(2);
        } else {
            uint32_t code = Hexadecimal(json.substr(2, 4));
            json.remove_prefix(6);
            if (code >= 0xd800 && code < 0xdc00) {
                code = 0x10000 + ((code - 0xd800) << 10) + (Hexadecimal(json.substr(2, 4)) - 0xdc00);
                json.remove_prefix(6);
            }
            AppendCharacter(text, code);
        }
    }
}

}  // namespace report
