// Lines that `lan-report records` made: a JSON object whose first key is "host". Checked byte by byte, so that what is
// handed on is JSON whatever came in; costs no memory, whatever the line's size.
#pragma once

#include <string_view>

namespace report {

constexpr std::string_view kLineHead = "{\"host\":";

// Where the line stops being such an object, and what was expected there instead; -1 for one that is whole.
long JsonLineCheck(std::string_view line, const char **expected);
// A number of JSON, and nothing around it.
bool JsonIsNumber(std::string_view text);
// The inside of the host's string, of a line that is whole.
std::string_view JsonLineHost(std::string_view line);

}  // namespace report
