// One line of a description: its words, and the steps that take them out one by one. The first problem stays, and the
// steps behind it go on with harmless values, so that callers look once, at the end.
#pragma once

#include "corekit/node_source.h"
#include "interface/types.h"

#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

constexpr i64 MAX_ID = 0xffffffff;
constexpr i64 MAX_RATE = 1000000000000;  // a second
constexpr i64 MIN_I64 = std::numeric_limits<i64>::min();
constexpr i64 MAX_I64 = std::numeric_limits<i64>::max();

struct Host;

struct Word {
    std::string key;  // of key=value; empty for a plain word
    std::string text;
    bool quoted = false;
};

struct Line {
    Host *host;               // null where only faults are allowed
    std::vector<Word> words;  // what no step has taken yet
    std::string problem;      // "what: expected what"; empty while there is none
    std::string known;        // the keys that were asked for
    i64 *repeats;             // how many lines count= may still stand for; null within such lines
};

void Fail(Line *line, const std::string &problem);
void SplitWords(Line *line, const std::string &text);
// Puts i into the braces of every word: {i}, or one operation of i and a number.
void Expand(Line *line, i64 i);
// True when every word was taken and there was no problem.
bool Complete(Line *line);

std::string Quoted(const std::string &text);
// A decimal number, signed or up to 2^64-1, or a hexadecimal one behind 0x; all in 64 bits.
std::optional<u64> ParseNumber(const std::string &text);
std::optional<i64> ParseSigned(const std::string &text);
// Cuts the part up to `end` off the text, and `end` with it. False when nothing is left.
bool TakePart(std::string_view *rest, char end, std::string *part);
std::vector<std::string> SplitCommas(const std::string &text);

// The next plain word. `what` is what the line should have there.
Word TakePlain(Line *line, const char *what);
bool AtPlain(const Line &line);
// The value of key=value. A repeated key stays in the line, and is a problem at its end.
std::optional<Word> Take(Line *line, const char *key);
// Without a fallback the key must be there.
std::string TakeText(Line *line, const char *key, const char *fallback = nullptr);
i64 TakeNumber(Line *line, const char *key, std::optional<i64> fallback, i64 low, i64 high);
i64 CheckNumber(Line *line, const std::string &name, const std::string &text, i64 low, i64 high);
i64 TakeRate(Line *line, const char *key);      // per second; 0 when it is left out
i64 TakePerMille(Line *line, const char *key);  // 0 to 1000; 0 when it is left out
u32 TakeNode(Line *line);
// A number, or a quoted text; `what` is what the line should have there.
KnfParamRec ToParam(Line *line, const Word &word, const char *what);
// Plain words up to the first key=value, or a lone "=".
Params TakeKeys(Line *line);
