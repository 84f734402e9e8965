// Texts of a report, which stand in it with nothing escaped: any bytes, in any encoding. As JSON a quote, a backslash
// and control bytes come out escaped; a byte that is no part of UTF-8 comes out as the character of the same number,
// \u0080 to \u00ff: nothing is lost, names in Latin-1 read right, and there is never half a surrogate pair.
#pragma once

#include <string>
#include <string_view>

namespace report {

// Adds the inside of a JSON string. True when it is not just the bytes of `raw`.
bool TextAppendJson(std::string *json, std::string_view raw);
// Adds the same text as plain UTF-8.
void TextAppendUtf8(std::string *text, std::string_view raw);
// Adds what the inside of a valid JSON string stands for.
void TextAppendUnescaped(std::string *text, std::string_view json);

}  // namespace report
