// What the page shows before any script ran, and without: head, findings, and the worst ports as a table.
#pragma once

#include "report/page/manifest.h"

#include <string_view>

namespace report {

// The HTML of a placeholder of the skeleton: "title", "host", "facts", "notes", "finding counts", "findings", "table
// caption", "table rows".
std::string FirstScreenText(const PageSource &source, const PagePlan &plan, std::string_view name);

}  // namespace report
