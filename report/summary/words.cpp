#include "report/summary/words.h"

#include "report/support/cells.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdio>
#include <cstring>

namespace report {

std::string NumberText(double value) {
    if (!(std::fabs(value) < 1e15)) {
        char digits[64];
        snprintf(digits, sizeof digits, "%.3g", value);
        return digits;
    }
    bool whole = std::fabs(value) >= 1000;
    char digits[64];
    snprintf(digits, sizeof digits, "%.*f",
             whole                     ? 0
             : std::fabs(value) >= 10  ? 1
             : std::fabs(value) >= 0.1 ? 2
                                       : 4,
             value);
    std::string text = digits;
    if (!whole && text.find('.') != std::string::npos) {
        text.erase(text.find_last_not_of('0') + 1);
        if (text.back() == '.') {
            text.pop_back();
        }
    }
    for (size_t at = text.size(); whole && at > 3 + (value < 0 ? 1u : 0u);) {
        at -= 3;
        text.insert(at, 1, ',');
    }
    return text;
}

std::string NameText(std::string_view name) {
    std::string text;
    bool plain = !name.empty();
    for (size_t length; !name.empty(); name.remove_prefix(length)) {
        bool valid;
        NextCharacter(name, &length, &valid);
        auto byte = static_cast<unsigned char>(name[0]);
        if (byte == '"' || byte == '\\') {
            text += '\\';
            text += name[0];
            plain = false;
            continue;
        }
        size_t before = text.size();
        AppendClean(&text, name.substr(0, length));
        bool clean = text.size() == before + length;
        plain =
            plain && clean && (byte >= 0x80 || isalnum(byte) != 0 || (byte != 0 && strchr("-_.:@/+", byte) != nullptr));
    }
    return plain ? text : '"' + text + '"';
}

std::string FoldText(std::string_view line, size_t cells) {
    constexpr size_t kIndent = 3;
    std::string text;
    size_t used = 0;
    while (!line.empty()) {
        size_t blank = std::min(line.find(' ', 1), line.size());
        std::string_view word = line.substr(0, blank);
        size_t size = CellsOf(word);
        if (cells > 0 && used > kIndent && used + size > cells) {
            word.remove_prefix(word[0] == ' ' ? 1 : 0);
            text.append("\n").append(kIndent, ' ');
            used = kIndent;
        }
        text += word;
        used += size;
        line.remove_prefix(blank);
    }
    return text;
}

}  // namespace report
