// Goes over the members of JSON that is known to be valid, as RecordStream hands it out. All parts are views into it,
// as they stand there, so that the bytes of numbers stay what they are.
#pragma once

#include <string_view>

namespace report {

struct JsonPart {
    std::string_view key;  // with its quotes; empty in an array
    std::string_view value;
};

// The next member of an object, or the next value of an array. `*at` is 0 ahead of the first. False behind the last.
bool JsonNext(std::string_view container, size_t *at, JsonPart *part);
// The value of a member; empty when there is none. The key stands there with nothing escaped.
std::string_view JsonMember(std::string_view object, std::string_view key);

}  // namespace report
