// The kernel of this machine as a source of nodes. Nothing is asked of it before the first read that needs it; then it
// owns up to four sockets and two descriptors a watched thread. About 400 bytes an interface that was asked for.
#pragma once

#include "corekit/node_source.h"

struct LinuxHost;

LinuxHost *LinuxHostOpen();
void LinuxHostClose(LinuxHost *host);
NodeSource LinuxHostSource(LinuxHost *host);
