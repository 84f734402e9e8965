// How numbers of a series get into the page: fixed point, differences in time, four byte planes, gzip, base64. Nothing
// here keeps memory; strings are the caller's.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

namespace report {

// A value times its scale. The codes stay below 2^30, so that no difference of two of them takes the code of kMissing.
constexpr int32_t kMissing = INT32_MIN;
constexpr int32_t kMostFixed = (1 << 30) - 1;

// A number of the report times 1 or 100, rounded; kMissing when the cell is absent, no number, or too large, which
// *tooLarge counts.
int32_t FixedOf(std::string_view cell, int32_t scale, uint64_t *tooLarge);

// The largest of 1, 10 and 100 that divides scale and all values: the page keeps the smaller numbers.
int32_t CommonFactor(std::span<const int32_t> values, int32_t scale);

// Bytes of series of `length` values each as four planes of zigzag differences, 0xffffffff where a value is missing.
std::string PlanesOf(std::span<const int32_t> values, size_t length);
std::string Gzip(std::string_view bytes);
std::string Base64(std::string_view bytes);
// "sha256-..." of a digest in hexadecimal, for a content policy.
std::string PolicyHash(std::string_view hex);

// Appends text as it stands in a JSON string, every "<" as \u003c, so that it may stand in a script element too.
void JsonText(std::string *to, std::string_view text);
// A JSON string with its quotes.
std::string JsonString(std::string_view text);
// As text of an HTML element or a quoted attribute; control bytes and marks of direction stand there as codes.
std::string HtmlText(std::string_view text);

}  // namespace report
