#include "report/input/json_line.h"

#include <simdjson.h>

namespace report {
namespace {

constexpr int kMaxDepth = 60;  // a record has 7 levels

// At `at`, or past the line, where all bytes are 0.
struct Scan {
    std::string_view line;
    size_t at = 0;
    const char *expected = nullptr;  // not null: the line is wrong here

    char Byte() const { return at < line.size() ? line[at] : '\0'; }
    bool Take(char byte) {
        bool there = Byte() == byte;
        at += there ? 1 : 0;
        return there;
    }
    void Fail(const char *what) { expected = what; }
    void Blank() {
        while (Byte() == ' ' || Byte() == '\t' || Byte() == '\r') {
            at++;
        }
    }
};

bool IsDigit(char byte) {
    return byte >= '0' && byte <= '9';
}

bool IsHexadecimal(char byte) {
    return IsDigit(byte) || ((byte | 0x20) >= 'a' && (byte | 0x20) <= 'f');
}

bool TakeDigits(Scan *scan) {
    size_t begin = scan->at;
    while (IsDigit(scan->Byte())) {
        scan->at++;
    }
    return scan->at > begin;
}

void TakeNumber(Scan *scan) {
    scan->Take('-');
    bool right = scan->Take('0') || TakeDigits(scan);
    if (right && scan->Take('.')) {
        right = TakeDigits(scan);
    }
    if (right && (scan->Byte() | 0x20) == 'e') {
        scan->at++;
        if (!scan->Take('+')) {
            scan->Take('-');
        }
        right = TakeDigits(scan);
    }
    if (!right) {
        scan->Fail("a value");
    }
}

// Four digits behind \u; -1 when they are not there.
int TakeCode(Scan *scan) {
    int code = 0;
    for (int i = 0; i < 4; i++) {
        char byte = scan->Byte();
        if (!IsHexadecimal(byte)) {
            return -1;
        }
        code = code * 16 + (IsDigit(byte) ? byte - '0' : (byte | 0x20) - 'a' + 10);
        scan->at++;
    }
    return code;
}

// Behind a backslash. Half a surrogate pair stands for no character.
bool TakeEscape(Scan *scan) {
    constexpr std::string_view kSingle = "\"\\/bfnrt";
    if (scan->Byte() != '\0' && kSingle.find(scan->Byte()) != std::string_view::npos) {
        scan->at++;
        return true;
    }
    int code = scan->Take('u') ? TakeCode(scan) : -1;
    if (code < 0xd800 || code > 0xdfff) {
        return code >= 0;
    }
    if (code > 0xdbff || !scan->Take('\\') || !scan->Take('u')) {
        return false;
    }
    int low = TakeCode(scan);
    return low >= 0xdc00 && low <= 0xdfff;
}

void TakeString(Scan *scan) {
    if (!scan->Take('"')) {
        return scan->Fail("a string");
    }
    for (;;) {
        auto byte = static_cast<unsigned char>(scan->Byte());
        if (byte < 0x20) {
            return scan->Fail("the end of a string");
        }
        scan->at++;
        if (byte == '"') {
            return;
        }
        if (byte == '\\' && !TakeEscape(scan)) {
            return scan->Fail("an escaped character");
        }
    }
}

void TakeScalar(Scan *scan) {
    if (scan->Byte() == '"') {
        return TakeString(scan);
    }
    for (std::string_view word : {"true", "false", "null"}) {
        if (scan->line.substr(scan->at).starts_with(word)) {
            scan->at += word.size();
            return;
        }
    }
    TakeNumber(scan);
}

void TakeKey(Scan *scan) {
    scan->Blank();
    TakeString(scan);
    scan->Blank();
    if (scan->expected == nullptr && !scan->Take(':')) {
        scan->Fail("a colon");
    }
}

// One value with all that is in it.
void TakeValue(Scan *scan) {
    uint64_t objects = 0;  // bit of each open level: an object, else an array
    int depth = 0;
    do {
        scan->Blank();
        bool opens = scan->Byte() == '{' || scan->Byte() == '[';
        if (opens) {
            bool object = scan->Byte() == '{';
            scan->at++;
            if (++depth > kMaxDepth) {
                return scan->Fail("fewer levels");
            }
            objects = objects << 1 | (object ? 1 : 0);
            scan->Blank();
            if (scan->Byte() != (object ? '}' : ']')) {
                if (object) {
                    TakeKey(scan);
                }
                continue;
            }
        } else {
            TakeScalar(scan);
        }
        // Behind a value: close what ends here, or go on to the next.
        while (scan->expected == nullptr && depth > 0) {
            bool object = (objects & 1) != 0;
            scan->Blank();
            if (scan->Take(object ? '}' : ']')) {
                depth--;
                objects >>= 1;
                continue;
            }
            if (!scan->Take(',')) {
                return scan->Fail("a comma or the end of a list");
            }
            if (object) {
                TakeKey(scan);
            }
            break;
        }
    } while (depth > 0 && scan->expected == nullptr);
}

}  // namespace

long JsonLineCheck(std::string_view line, const char **expected) {
    Scan scan{line};
    if (line.starts_with(kLineHead)) {
        scan.at = kLineHead.size();
        scan.Blank();
        TakeString(&scan);  // the host's name
    } else {
        scan.Fail("{\"host\":");
    }
    if (scan.expected == nullptr) {
        scan.at = 0;
        TakeValue(&scan);
        scan.Blank();
    }
    if (scan.expected == nullptr && scan.at != line.size()) {
        scan.Fail("the end of the line");
    }
    if (scan.expected == nullptr && !simdjson::validate_utf8(line.data(), line.size())) {
        scan.at = 0;
        scan.Fail("UTF-8");
    }
    *expected = scan.expected;
    return scan.expected == nullptr ? -1 : static_cast<long>(scan.at);
}

bool JsonIsNumber(std::string_view text) {
    Scan scan{text};
    TakeNumber(&scan);
    return scan.expected == nullptr && scan.at == text.size();
}

std::string_view JsonLineHost(std::string_view line) {
    size_t begin = line.find('"', kLineHead.size()) + 1;
    size_t end = begin;
    while (line[end] != '"') {
        end += line[end] == '\\' ? 2 : 1;
    }
    return line.substr(begin, end - begin);
}

}  // namespace report
