#include "corekit/simulated/line.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <utility>

namespace {

bool IsBlank(char c) {
    return c == ' ' || c == '\t' || c == '\r';
}

bool IsHex(char c) {
    return isxdigit(static_cast<unsigned char>(c)) != 0;
}

// Reads a quoted text with \" \\ and \xHH from the quote at `*at` on. False if it does not end.
bool ReadQuoted(Line *line, const std::string &text, size_t *at, std::string *result) {
    for ((*at)++; *at < text.size() && text[*at] != '"'; (*at)++) {
        bool escaped = text[*at] == '\\' && *at + 1 < text.size();
        *at += escaped ? 1 : 0;
        if (escaped && text[*at] == 'x') {
            std::string digits = text.substr(*at + 1, 2);
            if (digits.size() != 2 || !IsHex(digits[0]) || !IsHex(digits[1])) {
                Fail(line, "\\x" + digits + " in a text: expected two hexadecimal digits behind \\x");
                return false;
            }
            *result += static_cast<char>(strtoul(digits.c_str(), nullptr, 16));
            *at += 2;
        } else {
            *result += text[*at];
        }
    }
    return (*at)++ < text.size();
}

bool ReadWord(Line *line, const std::string &text, size_t *at, Word *word) {
    size_t equals = text.find_first_of("= \t\r\"", *at);
    if (equals != std::string::npos && equals != *at && text[equals] == '=') {
        word->key = text.substr(*at, equals - *at);
        *at = equals + 1;
    }
    if (*at < text.size() && text[*at] == '"') {
        word->quoted = true;
        return ReadQuoted(line, text, at, &word->text) && (*at == text.size() || IsBlank(text[*at]));
    }
    size_t end = std::min(text.find_first_of(" \t\r", *at), text.size());
    word->text = text.substr(*at, end - *at);
    *at = end;
    return true;
}

// The value of "i", "i/100", "i%100", "100000+i" and the like.
std::optional<i64> Evaluate(const std::string &text, i64 i) {
    auto operand = [i](const std::string &name) { return name == "i" ? std::optional<i64>(i) : ParseSigned(name); };
    size_t at = text.find_first_of("+-*/%", 1);
    std::optional<i64> left = operand(text.substr(0, at));
    if (!left || at == std::string::npos) {
        return left;
    }
    std::optional<i64> right = operand(text.substr(at + 1));
    auto within = [](i64 number, i64 limit) { return number >= -limit && number <= limit; };
    if (!right || !within(*left, MAX_ID) || !within(*right, MAX_ID / 2)) {
        return std::nullopt;
    }
    switch (text[at]) {
    case '+':
        return *left + *right;
    case '-':
        return *left - *right;
    case '*':
        return *left * *right;
    case '/':
        return *right != 0 ? std::optional<i64>(*left / *right) : std::nullopt;
    default:
        return *right != 0 ? std::optional<i64>(*left % *right) : std::nullopt;
    }
}

void ExpandText(Line *line, std::string *text, i64 i) {
    for (size_t open = 0; (open = text->find('{', open)) != std::string::npos;) {
        size_t close = text->find('}', open);
        bool closed = close != std::string::npos && close > open + 1;
        std::optional<i64> value = closed ? Evaluate(text->substr(open + 1, close - open - 1), i) : std::nullopt;
        if (!value) {
            Fail(line, "braces in " + Quoted(*text) + ": expected {i} or one operation such as {1000+i} or {i/8}");
            return;
        }
        text->replace(open, close - open + 1, std::to_string(*value));
    }
}

}  // namespace

void Fail(Line *line, const std::string &problem) {
    if (line->problem.empty()) {
        line->problem = problem;
    }
}

void SplitWords(Line *line, const std::string &text) {
    for (size_t at = 0;;) {
        at = std::min(text.find_first_not_of(" \t\r", at), text.size());
        if (at == text.size() || text[at] == '#') {
            return;
        }
        Word word;
        if (!ReadWord(line, text, &at, &word)) {
            Fail(line, "open text: expected a closing quote with a blank behind it");
            return;
        }
        line->words.push_back(std::move(word));
    }
}

void Expand(Line *line, i64 i) {
    for (Word &word : line->words) {
        ExpandText(line, &word.text, i);
    }
}

bool Complete(Line *line) {
    if (!line->words.empty()) {
        const Word &word = line->words[0];
        std::string keys = line->known.empty() ? "the end of the line" : line->known;
        Fail(line, word.key.empty() ? "word " + Quoted(word.text) + " too many: expected " + keys
                                    : "key " + word.key + "= unknown or repeated: expected one each of " + keys);
    }
    return line->problem.empty();
}

std::string Quoted(const std::string &text) {
    std::string result;
    ParamAppendText(&result, ParamOf(text));
    return result;
}

std::optional<u64> ParseNumber(const std::string &text) {
    bool negative = text[0] == '-';
    const char *digits = text.c_str() + (negative ? 1 : 0);
    bool isHex = digits[0] == '0' && digits[1] == 'x' && isxdigit(static_cast<unsigned char>(digits[2])) != 0;
    if (isdigit(static_cast<unsigned char>(*digits)) == 0) {
        return std::nullopt;
    }
    char *end = nullptr;
    errno = 0;
    u64 value = strtoull(digits, &end, isHex ? 16 : 10);
    if (errno != 0 || *end != 0 || (negative && value > static_cast<u64>(MAX_I64) + 1)) {
        return std::nullopt;
    }
    return negative ? 0 - value : value;
}

std::optional<i64> ParseSigned(const std::string &text) {
    std::optional<u64> value = ParseNumber(text);
    if (!value || (text[0] != '-' && *value > static_cast<u64>(MAX_I64))) {
        return std::nullopt;
    }
    return static_cast<i64>(*value);
}

bool TakePart(std::string_view *rest, char end, std::string *part) {
    size_t length = std::min(rest->find(end), rest->size());
    part->assign(rest->substr(0, length));
    bool any = !rest->empty();
    rest->remove_prefix(std::min(length + 1, rest->size()));
    return any;
}

std::vector<std::string> SplitCommas(const std::string &text) {
    std::vector<std::string> parts;
    std::string_view rest = text;
    for (std::string part; TakePart(&rest, ',', &part);) {
        parts.push_back(part);
    }
    return parts;
}

bool AtPlain(const Line &line) {
    return !line.words.empty() && line.words[0].key.empty();
}

Word TakePlain(Line *line, const char *what) {
    if (!AtPlain(*line)) {
        Fail(line, std::string("too few words: expected ") + what);
        return {};
    }
    Word word = std::move(line->words[0]);
    line->words.erase(line->words.begin());
    return word;
}

std::optional<Word> Take(Line *line, const char *key) {
    line->known += (line->known.empty() ? "" : ", ") + std::string(key);
    auto found = std::find_if(line->words.begin(), line->words.end(), [&](const Word &w) { return w.key == key; });
    if (found == line->words.end()) {
        return std::nullopt;
    }
    Word word = std::move(*found);
    line->words.erase(found);
    return word;
}

std::string TakeText(Line *line, const char *key, const char *fallback) {
    std::optional<Word> word = Take(line, key);
    if (word) {
        return word->text;
    }
    if (fallback == nullptr) {
        Fail(line, std::string("no ") + key + "=: expected " + key + "=<text>");
    }
    return fallback != nullptr ? fallback : "";
}

i64 TakeNumber(Line *line, const char *key, std::optional<i64> fallback, i64 low, i64 high) {
    std::optional<Word> word = Take(line, key);
    if (word) {
        return CheckNumber(line, std::string(key) + "=", word->text, low, high);
    }
    if (!fallback) {
        Fail(line, std::string("no ") + key + "=: expected " + key + "=<number>");
    }
    return fallback.value_or(low);
}

i64 CheckNumber(Line *line, const std::string &name, const std::string &text, i64 low, i64 high) {
    std::optional<i64> value = ParseSigned(text);
    if (!value || *value < low || *value > high) {
        Fail(line, name + " " + Quoted(text) + ": expected a number from " + std::to_string(low) + " to " +
                       std::to_string(high));
        return low;
    }
    return *value;
}

i64 TakeRate(Line *line, const char *key) {
    return TakeNumber(line, key, 0, -MAX_RATE, MAX_RATE);
}

i64 TakePerMille(Line *line, const char *key) {
    return TakeNumber(line, key, 0, 0, 1000);
}

u32 TakeNode(Line *line) {
    return static_cast<u32>(CheckNumber(line, "node", TakePlain(line, "a node number").text, 0, MAX_ID));
}

KnfParamRec ToParam(Line *line, const Word &word, const char *what) {
    if (word.quoted) {
        return ParamOf(word.text);
    }
    std::optional<u64> number = ParseNumber(word.text);
    if (!number) {
        Fail(line, what + (" " + word.text) + ": expected an integer or a \"quoted string\"");
    }
    return ParamOf(static_cast<int64_t>(number.value_or(0)));
}

Params TakeKeys(Line *line) {
    Params keys;
    while (AtPlain(*line) && (line->words[0].quoted || line->words[0].text != "=")) {
        keys.push_back(ToParam(line, TakePlain(line, "a key"), "key"));
    }
    return keys;
}
