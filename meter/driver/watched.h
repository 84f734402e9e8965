// The ports that the run watches, in the order of selection, and the end of a run: what was switched on in the kernel
// is switched off here.
#pragma once

#include "meter/ports/port.h"

extern Port **port;  // numPorts live entries of maxPorts
extern i32 numPorts;
extern i32 maxPorts;

// Creates a port behind the last one. A port that can't be watched takes no place. Ends the process after a
// termination signal.
void AppendPort(u64 portNum, const PortPrefs *prefs);

// Switches off all that the run's ports started in the kernel. Frees nothing. Always 0.
i32 Teardown();
