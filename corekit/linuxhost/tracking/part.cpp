#include "corekit/linuxhost/tracking/part.h"

#include <new>

namespace {

Tracking *Open() {
    return new (std::nothrow) Tracking;
}

void Close(Tracking *tracking) {
    PortsClose(tracking);
    for (u32 group = 0; group < TRACKING_GROUPS; group++) {
        GroupClose(tracking, static_cast<TrackingGroup>(group));
    }
    delete tracking;
}

const char *Reason(const Tracking *tracking) {
    return tracking->reason.c_str();
}

}  // namespace

extern "C" __attribute__((visibility("default"))) const TrackingTable corekitTracking;
const TrackingTable corekitTracking = {TRACKING_VERSION, Open,        Close,        Reason,        GroupAsk,
                                       PortStart,        PortRead,    PortStop,     RunWatch,      RunRead,
                                       RunUnwatch,       VectorWatch, VectorRead,   VectorUnwatch, MovesCaches,
                                       MovesWatch,       MovesRead,   MovesUnwatch, TasksRead,     TasksEnd};
