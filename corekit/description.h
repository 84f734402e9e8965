// The language in which hosts and faults are written, one line an entity; docs/host-description.md tells it all.
#pragma once

#include "corekit/faults.h"
#include "corekit/host.h"

#include <string>

// Fills a new host and adds the description's faults. On false `*error` holds "file:line: what: expected what", and
// host and faults are of no use any more.
bool DescriptionLoad(const std::string &text, const char *file, Host *host, std::vector<FaultRule> *faults,
                     std::string *error);

// The same for fault lines alone.
bool DescriptionFaults(const std::string &text, const char *file, std::vector<FaultRule> *faults, std::string *error);
