// Interrupt vectors as /sys has them: which a device has, and who hangs on each. Read when asked, nothing is kept:
// about 10 us a vector.
#pragma once

#include "corekit/linuxhost/file.h"

// The vectors of a device, ascending; empty when it has none, or they can't be told. A virtio device has those of the
// device that it is part of. One without message signals has the one of its line, which others may share.
std::vector<u32> VectorsOf(const ProcRoot &root, const std::string &bus, const std::string &device);
// What drivers call their handlers of a vector; empty when nobody takes it.
std::vector<std::string> VectorActions(const ProcRoot &root, u32 vector);
