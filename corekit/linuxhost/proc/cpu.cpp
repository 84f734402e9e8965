#include "corekit/linuxhost/proc/cpu.h"

#include <algorithm>
#include <ctime>
#include <set>
#include <unistd.h>

namespace {

constexpr u32 STAT_LIMIT = 16 << 20;  // its line of interrupts grows with the CPUs
constexpr u32 SYS_LIMIT = 65536;
constexpr u32 CACHES = 16;
constexpr u64 MICROSECONDS = 1000000;
const std::string CPU_DIRECTORY = "devices/system/cpu/";

// Calls `each` with the numbers of a list such as "0-3,8,10-11". False when it is none, does not ascend, or has a
// number beyond the most.
template <typename Each>
bool EachOfList(std::string_view text, Each each) {
    u64 least = 0;
    while (!text.empty() && text.front() != '\n') {
        u64 first = 0;
        if (!ProcTakeNumber(&text, &first)) {
            return false;
        }
        u64 last = first;
        if (!text.empty() && text.front() == '-') {
            text.remove_prefix(1);
            if (!ProcTakeNumber(&text, &last)) {
                return false;
            }
        }
        if (first < least || last < first || last >= MAX_CPUS) {
            return false;
        }
        least = last + 1;
        for (u64 cpu = first; cpu <= last; cpu++) {
            each(static_cast<u32>(cpu));
        }
        if (!text.empty() && text.front() == ',') {
            text.remove_prefix(1);
        }
    }
    return true;
}

struct Reader {
    const ProcRoot &root;
    ProcBuffer buffer{};

    bool Text(const std::string &path, std::string_view *text) {
        return root.sys >= 0 && ProcReadOnce(root.sys, CPU_DIRECTORY + path, SYS_LIMIT, &buffer, text) == FINE;
    }
    bool Number(const std::string &path, u64 *number) {
        std::string_view text;
        return Text(path, &text) && ProcTakeNumber(&text, number);
    }
};

// The list of CPUs behind the cache of the highest level that is not for instructions alone.
bool LastCache(Reader *reader, const std::string &cpu, std::string *list) {
    u64 highest = 0;
    std::string last;
    for (u32 index = 0; index < CACHES; index++) {
        std::string cache = cpu + "/cache/index" + std::to_string(index) + "/";
        u64 level = 0;
        if (!reader->Number(cache + "level", &level)) {
            break;
        }
        if (level > highest) {
            highest = level;
            last = cache;
        }
    }
    std::string_view text;
    bool told = highest > 0 && reader->Text(last + "shared_cpu_list", &text);
    *list = text;
    return told;
}

// Of all CPUs that tell; those that are off do not. A CPU that says nothing of its place counts as a core of its own.
void ReadTopology(Reader *reader, CpuTopology *topology) {
    std::set<u64> packages;
    std::set<std::string> cores;
    topology->lastCache.assign(topology->cpus, NO_CPU);
    for (u32 cpu = 0; cpu < topology->cpus; cpu++) {
        std::string name = "cpu" + std::to_string(cpu);
        u64 package = 0;
        std::string_view siblings;
        if (reader->Number(name + "/topology/physical_package_id", &package)) {
            packages.insert(package);
        }
        if (reader->Text(name + "/topology/thread_siblings_list", &siblings)) {
            cores.emplace(siblings);
        }
        std::string sharers;
        if (topology->lastCache[cpu] == NO_CPU && LastCache(reader, name, &sharers)) {
            u32 count = 0;
            EachOfList(sharers, [&](u32 other) {
                count++;
                if (other < topology->cpus && topology->lastCache[other] == NO_CPU) {
                    topology->lastCache[other] = cpu;
                }
            });
            topology->lastCaches++;
            topology->lastCacheSharers = topology->lastCacheSharers == 0 ? count : topology->lastCacheSharers;
        }
    }
    topology->packages = std::max(1U, static_cast<u32>(packages.size()));
    topology->cores = cores.empty() ? topology->cpus : static_cast<u32>(cores.size());
}

// Those that are there, on or off: on many hosts the possible ones are far more than can ever be plugged in.
u32 CountFromSys(Reader *reader) {
    for (const char *file : {"present", "possible"}) {
        std::string_view text;
        u32 count = 0;
        if (reader->Text(file, &text) && EachOfList(text, [&](u32 cpu) { count = std::max(count, cpu + 1); })) {
            return count;
        }
    }
    return 0;
}

// The CPU of a line of /proc/stat and its times; false for all other lines.
bool ParseLine(std::string_view line, u64 *cpu, u64 (&times)[8]) {
    if (line.substr(0, 3) != "cpu" || line.size() < 4 || line[3] == ' ') {
        return false;
    }
    line.remove_prefix(3);
    if (!ProcTakeNumber(&line, cpu)) {
        return false;
    }
    size_t taken = 0;
    std::fill(std::begin(times), std::end(times), u64{0});
    while (taken < 8 && ProcTakeNumber(&line, &times[taken])) {
        taken++;
    }
    return taken >= 4;
}

u32 CountFromStat(Cpus *cpus) {
    std::string_view text;
    u32 count = 0;
    if (ProcRead(&cpus->stat, &cpus->buffer, &text) == FINE) {
        while (!text.empty()) {
            u64 cpu = 0;
            u64 times[8];
            if (ParseLine(ProcTakeLine(&text), &cpu, times) && cpu < MAX_CPUS) {
                count = std::max(count, static_cast<u32>(cpu) + 1);
            }
        }
    }
    return count;
}

u64 Now() {
    timespec now = {};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<u64>(now.tv_sec) * MICROSECONDS + static_cast<u64>(now.tv_nsec) / 1000;
}

void TakeTimes(Cpus *cpus, u32 cpu, const u64 (&times)[8], u64 now) {
    CpuRow *row = &cpus->rows[cpu];
    u64 busy = times[0] + times[1] + times[2] + times[5] + times[6] + times[7];
    u64 elapsed = (busy + times[3] + times[4]) * cpus->tick;
    bool returned = !row->on && cpus->moment != 0;
    if (returned) {
        cpus->gap[cpu] = row->elapsed + (now - cpus->moment) - elapsed;
    }
    elapsed += cpus->gap[cpu];
    row->busy = busy * cpus->tick;
    row->interrupts = (times[5] + times[6]) * cpus->tick;
    // Idle time may step back by a little when a CPU wakes.
    bool back = cpus->moment != 0 && static_cast<i64>(elapsed - row->elapsed) < 0;
    row->elapsed = back ? row->elapsed : elapsed;
}

}  // namespace

Outcome CpusOpen(Cpus *cpus, const ProcRoot &root) {
    long ticks = sysconf(_SC_CLK_TCK);
    cpus->tick = MICROSECONDS / static_cast<u64>(ticks > 0 ? ticks : 100);
    Reader reader = {root};
    u32 timed = ProcOpen(&cpus->stat, root.proc, "stat", STAT_LIMIT) == FINE ? CountFromStat(cpus) : 0;
    cpus->topology.cpus = std::max({CountFromSys(&reader), timed, 1U});
    ReadTopology(&reader, &cpus->topology);
    cpus->rows.resize(cpus->topology.cpus);
    cpus->gap.resize(cpus->topology.cpus);
    return FINE;
}

Outcome CpusRead(Cpus *cpus, u64 generation) {
    if (cpus->generation == generation && cpus->moment != 0) {
        return FINE;
    }
    std::string_view text;
    Outcome outcome = ProcRead(&cpus->stat, &cpus->buffer, &text);
    if (outcome != FINE) {
        return outcome;
    }
    u64 now = Now();
    std::vector<bool> seen(cpus->rows.size());
    while (!text.empty()) {
        u64 cpu = 0;
        u64 times[8];
        std::string_view line = ProcTakeLine(&text);
        if (line.substr(0, 3) != "cpu") {
            break;  // all lines of CPUs come first
        }
        if (ParseLine(line, &cpu, times) && cpu < cpus->rows.size() && !seen[cpu]) {
            TakeTimes(cpus, static_cast<u32>(cpu), times, now);
            seen[cpu] = true;
        }
    }
    for (size_t cpu = 0; cpu < seen.size(); cpu++) {
        CpuRow *row = &cpus->rows[cpu];
        row->on = seen[cpu];
        if (!row->on) {
            row->elapsed = cpus->moment == 0 ? now : row->elapsed + (now - cpus->moment);
        }
    }
    cpus->moment = now;
    cpus->generation = generation;
    return FINE;
}

void CpusClose(Cpus *cpus) {
    ProcClose(&cpus->stat);
    *cpus = Cpus();
}

u32 CpuListOnly(std::string_view list) {
    u32 count = 0;
    u32 only = NO_CPU;
    bool valid = EachOfList(list, [&](u32 cpu) {
        count++;
        only = cpu;
    });
    return valid && count == 1 ? only : NO_CPU;
}
