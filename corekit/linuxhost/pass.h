// What is a pass, for a library that sees only reads. What the kernel tells in one go is a generation, and a read is
// served from it while it is young and this instance was not served from it before: so a caller that samples many
// instances one by one costs one look at the kernel, and one that samples again always gets a new one.
#pragma once

#include "interface/types.h"

constexpr u64 PASS_AGE = 20000000;  // ns that a generation may be served once the kernel has told it
constexpr u64 PASS_FLOOR =
    1000000;  // ns that it is served even to who had it: each instance listed twice is no two passes

struct Pass {
    u32 generation = 0;  // 0: none yet
    u32 reads = 0;       // served from it
    u32 expected = 0;    // reads of the ones before; a pass may take several, of which the last serves only few
    u64 startedAt = 0;   // ns; a look that takes long is no older for it, or each read would need one of its own
};

// One more read, by an instance that was `*served` before. True when it begins a generation: the caller then asks the
// kernel. `*served` is the generation that serves it.
inline bool PassJoin(Pass *pass, u32 *served, u64 now) {
    u64 age = now - pass->startedAt;
    bool fresh = pass->generation != 0 && age < PASS_AGE && (*served != pass->generation || age < PASS_FLOOR);
    if (!fresh) {
        pass->expected = pass->reads > pass->expected / 2 ? pass->reads : pass->expected / 2;
        pass->generation++;
        pass->generation += pass->generation == 0 ? 1 : 0;
        pass->startedAt = now;
        pass->reads = 0;
    }
    *served = pass->generation;
    pass->reads++;
    return !fresh;
}
