#include "driver/selection.h"

#include "driver/watched.h"
#include "support/log.h"

void SelectPorts(const Settings &settings) {
    PortPrefs cmdPrefs = 0;
    if (settings.portNum != 0) {
        AppendPort(settings.portNum, &cmdPrefs);
        if (numPorts == 0) {
            Panic("Invalid -p option");
        }
        return;
    }
    Panic("Please provide atleast one valid port/switch for monitoring\n");
}
