// The choice of ports: fills the port array from the options or a configuration file, once, at start-up.
#pragma once

#include "meter/driver/options.h"
#include "meter/support/prefs.h"

// Adds the bits of a stats specification to a word. A bad letter is logged and skipped. Null does nothing.
void ParseStatsSpec(const char *spec, PortPrefs *prefs);

// The first selector of the priority list that was given decides; the others are ignored. Returns with at least one
// port, or ends the process.
void SelectPorts(const Settings &settings);
