// The seam to whatever answers node operations. The library checks arguments, applies faults and keeps the journal;
// a source only looks nodes up. A further source fills one of these and is made the current one in library.cpp.
#pragma once

#include "corekit/param_list.h"

struct NodeSource {
    void *context;
    KnfStatus (*get)(void *context, uint32_t node, const Params &keys, void *record, uint32_t size);
    KnfStatus (*list)(void *context, uint32_t node, const Params &keys, Params *entries);
    // Null for a source that can't be written. The result buffer may be null, with size 0.
    KnfStatus (*set)(void *context, uint32_t node, const Params &keys, const Params &input, void *result,
                     uint32_t size);
    // The build text of the kernel that the source shows, terminated.
    const char *(*signature)(void *context);
};
