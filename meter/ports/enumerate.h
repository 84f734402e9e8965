// Which switches the host has, and which ports each switch has. A list belongs to the caller, who destroys it.
#pragma once

#include "interface/corekit.h"
#include "meter/support/report.h"

// Switch names, or null, logged.
KnfParamList GetSwitchList();

// Port numbers of a switch, or null, logged.
KnfParamList GetSwitchPorts(const char *switchName);

// Writes a table of all ports that may be watched; nothing at all if there is none. The caller flushes.
void ListPorts(ReportBuf *report);
