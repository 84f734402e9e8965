// Times of all CPUs, those that are off too, from one read of /proc/stat a generation, and their topology from /sys,
// read once. Costs about 3 us a CPU and generation. Times have the kernel's grain, 10 ms on nearly every build.
#pragma once

#include "corekit/linuxhost/file.h"

struct CpuTopology {
    u32 cpus;      // that are there, on or off: numbers run from 0 to this - 1; at least 1
    u32 packages;  // at least 1, so are the cores; of the CPUs that are on, as the kernel tells no others
    u32 cores;
    u32 lastCacheSharers;  // CPUs that share the last-level cache of the first CPU; 0 when the kernel does not tell
    u32 lastCaches;        // in all; 0 when the kernel does not tell
    std::vector<u32> lastCache;  // for each CPU the lowest one that shares its last-level cache; NO_CPU when untold
};

constexpr u32 NO_CPU = 0xffffffff;
constexpr u32 MAX_CPUS = 65536;

// Microseconds. A CPU that is off stands still in all but elapsed, and comes back without a step.
struct CpuRow {
    u64 busy;        // user, nice, system, irq, softirq, steal; guests are in user
    u64 interrupts;  // irq and softirq; sampled by the tick unless the kernel was built to measure them
    u64 elapsed;     // busy, idle and waiting for input
    bool on;         // at the last read
};

struct Cpus {
    CpuTopology topology{};
    std::vector<CpuRow> rows;  // as many as topology.cpus
    u64 generation = 0;        // of the rows; 0 before the first read
    u64 moment = 0;            // CLOCK_MONOTONIC of the last read, us
    u64 tick = 0;              // microseconds of a unit of /proc/stat
    std::vector<u64> gap;      // for each CPU what elapsed was while it was off
    ProcFile stat{};
    ProcBuffer buffer;
};

// Reads the topology. What /sys does not tell is taken as one CPU a core and one package, and what neither it nor
// /proc/stat tells as one CPU. Without /proc/stat the rows fail.
Outcome CpusOpen(Cpus *cpus, const ProcRoot &root);
// Reads all rows, unless they are of this generation (not 0) already.
Outcome CpusRead(Cpus *cpus, u64 generation);
void CpusClose(Cpus *cpus);

// The only CPU of a list as the kernel writes it, "0-3,8"; NO_CPU when there is none, or several.
u32 CpuListOnly(std::string_view list);
