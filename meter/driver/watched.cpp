#include "meter/driver/watched.h"

#include "meter/cpu/vcpu_histo.h"
#include "meter/ports/histo.h"
#include "meter/support/log.h"
#include "meter/support/termination.h"

#include <cstdlib>

Port **port = nullptr;
i32 numPorts = 0;
i32 maxPorts = 0;

namespace {

constexpr i32 GROWTH = 16;  // entries

void Grow() {
    std::size_t size = static_cast<std::size_t>(numPorts + GROWTH) * sizeof(void *);
    void *grown = std::realloc(static_cast<void *>(port), size);
    if (grown == nullptr) {
        Panic("Unable to grow port size from %d to %d\n", maxPorts, maxPorts + GROWTH);
    }
    port = static_cast<Port **>(grown);
    maxPorts += GROWTH;
}

}  // namespace

void AppendPort(u64 portNum, const PortPrefs *prefs) {
    if (numPorts == maxPorts) {
        Grow();
    }
    port[numPorts] = PortCreate(portNum, prefs);
    if (port[numPorts] != nullptr) {
        numPorts++;
    }
    LeaveIfTerminated();
}

i32 Teardown() {
    for (i32 i = 0; i < numPorts; i++) {
        PortSetPrefs(port[i], &nullPrefs);
    }
    VcpuHistoTrack(0);
    return 0;
}
