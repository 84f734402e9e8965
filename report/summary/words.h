// Figures and names as people read them, and a terminal may show them.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace report {

// 9.1, 0.05, 32,000: at most two digits behind the point, four below 0.1, none from 1,000 on.
std::string NumberText(double value);
// A text of the report for a terminal: quoted unless it is plain, and nothing in it can steer.
std::string NameText(std::string_view name);
// Breaks a line at blanks so that it fits so many cells, with three blanks before what follows; 0 cells: as it is.
std::string FoldText(std::string_view line, size_t cells);

}  // namespace report
