// The static texts of the page, made from web/ and the plotting library when the program is built, each with its
// SHA-256 in hexadecimal for the page's content policy. Constants of the program.
#pragma once

#include <string_view>

namespace report {

struct Asset {
    std::string_view text, hash;
};

extern const Asset kPageSkeleton;  // HTML, with {{names}} of what is filled in
extern const Asset kPageScript, kPageStyle;
extern const Asset kPlotScript, kPlotStyle, kPlotLicence;

}  // namespace report
