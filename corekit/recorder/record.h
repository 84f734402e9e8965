// The walk over a host's nodes that a snapshot is made of, through the node interface alone and without a write. What
// several lead to is read once; what can't be read is left out and counted.
#pragma once

#include "corekit/snapshot/snapshot.h"

#include <csignal>
#include <set>
#include <string>

struct Recorder {
    SnapshotDraft draft;
    u64 records = 0;
    u64 lists = 0;
    u64 failed = 0;
    const volatile std::sig_atomic_t *stop;  // once it is set, nothing more is read
    bool showProgress;                       // on standard error
    std::set<std::string> missing = {};      // names of what can't be read
};

void RecordHost(Recorder *recorder);
