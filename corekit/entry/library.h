// What the library holds, and the steps that its entry points share: library.cpp has those of nodes and snapshots,
// lists.cpp those of parameter lists.
#pragma once

#include "corekit/entry/check.h"
#include "corekit/entry/faults.h"
#include "corekit/entry/journal.h"
#include "corekit/linuxhost/source.h"
#include "corekit/node_source.h"
#include "corekit/simulated/host.h"
#include "corekit/snapshot/snapshot.h"

#include <exception>
#include <memory>
#include <new>
#include <optional>

struct LinuxHostCloser {
    void operator()(LinuxHost *host) const { LinuxHostClose(host); }
};

struct Library {
    std::unique_ptr<Host> host;  // at most one of these two
    std::unique_ptr<LinuxHost, LinuxHostCloser> machine;
    NodeSource live = {};                // of it; its functions are null while nothing is connected
    std::unique_ptr<Snapshot> snapshot;  // the one in use
    NodeSource cache = {};
    const NodeSource *current = nullptr;  // what reads are served from; null while nothing is connected
    bool loadedByControl = false;
    bool initialised = false;  // HckSyscall_Init was called
    bool replaying = false;    // KNF_UseCache was, and no clean-up since
    std::vector<FaultRule> faults;
    std::optional<bool> namedFaults;  // whether COREKIT_FAULTS could be used, once it was looked at
    uint64_t calls[CALL_KINDS] = {};
};

// Never destroyed: calls may still come while the process ends. Takes no memory, which may be exhausted.
inline Library &Lib() {
    alignas(Library) static char place[sizeof(Library)];
    static auto *library = new (place) Library;
    return *library;
}

// Counts the call. 0, or the status of a fault that meets it.
inline KnfStatus CheckCall(const FaultCall &call) {
    Library &library = Lib();
    library.calls[call.kind]++;
    return library.faults.empty() ? STATUS_OK : FaultsCheck(&library.faults, call);
}

// No exception leaves the library: memory that is exhausted, for one, is a failed call.
template <typename Result, typename Body>
Result Contained(Result failed, Body body) {
    try {
        return body();
    } catch (const std::exception &) {
        return failed;
    }
}

// The call's line for whoever wants one, which changes nothing for the caller even where there is no memory for it.
// `list` is the number of the list that the call made or changed.
inline KnfStatus Told(KnfStatus status, const char *name, const uint32_t *node, const Params &keys,
                      const Params *input = nullptr, uint32_t list = 0) {
    if (JournalWanted(input != nullptr)) [[unlikely]] {
        Contained(status, [&] {
            JournalLine(input != nullptr, CallText(name, node, keys, input, status, list));
            return status;
        });
    }
    return status;
}
