// What happens to every watched port: created once at start-up, read on each pass, printed once an iteration. A pass
// costs one node read for its status and one for its client counters, plus what the companions add. A port that can't
// be read is disabled for good and shows as an empty object.
#pragma once

#include "meter/ports/port_record.h"
#include "meter/support/report.h"

// What a port of each kind gets when nobody asks for anything else; -t and -N may change the first three at start-up.
extern PortPrefs physnicPrefs;
extern PortPrefs vnicPrefs;
extern PortPrefs hostNicPrefs;
extern PortPrefs nullPrefs;

// Fills in the identity of a port. 0, the status of a failed call, or KNF_FAILURE for a management or internal port,
// which nobody may watch. Logs its failures.
KnfStatus GetPortsInfo(u64 portNum, PortInfo *info);

// A new port, or null. Null `prefs` means the default of the port's type.
Port *PortCreate(u64 portNum, const PortPrefs *prefs);

// Samples the port into the older side of each sample pair if `first`, else into the newer. 0, or the status that
// disabled the port.
KnfStatus PortRead(Port *port, bool first);

// Writes the inside of the port's object, without braces, and turns the sample pairs over. Always 0.
KnfStatus PortPrint(Port *port, ReportBuf *report);

// Six octets to 17 characters and a terminator.
void MacToText(const u8 *mac, char *text);
