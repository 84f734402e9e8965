// The language in which hosts and faults are written, one line an entity; docs/host-description.md tells it all.
#pragma once

#include "corekit/simulated/host.h"
#include "corekit/simulated/line.h"

#include <functional>
#include <string>

// Takes the words of a line out, behind its keyword, and fails the line if it can't.
using LineReader = std::function<void(Line *line)>;

// Fills a new host, and hands fault lines to their reader. On false `*error` holds "file:line: what: expected what",
// and host and faults are of no use any more.
bool DescriptionLoad(const std::string &text, const char *file, Host *host, const LineReader &fault,
                     std::string *error);

// The same for fault lines alone.
bool DescriptionFaults(const std::string &text, const char *file, const LineReader &fault, std::string *error);
