#include "corekit/linuxhost/tracking/part.h"

#include <algorithm>
#include <cstring>
#include <fcntl.h>
#include <linux/capability.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

constexpr ino_t FIRST_PID_NAMESPACE = 0xeffffffc;

struct GroupProgram {
    const char *name;
    int (*load)(Loaded *loaded);
    bool attaches;  // to tracepoints
    bool threads;   // knows threads by their number
    int sharedMap = -1;
    const __u64 *limits[2] = {};
};
constexpr GroupProgram PROGRAMS[] = {{"packets", LoadPackets, true, false, 2, {SIZE_LIMITS, INTERVAL_LIMITS}},
                                     {"periods of threads", LoadRuns, true, true, 1, {PERIOD_LIMITS}},
                                     {"interrupts", LoadVectors, true, false},
                                     {"moves between caches", LoadMoves, true, true},
                                     {"figures of threads", LoadTasks, false, true}};
static_assert(sizeof PROGRAMS / sizeof *PROGRAMS == TRACKING_GROUPS);

void Close(int *descriptor) {
    if (*descriptor >= 0) {
        close(*descriptor);
    }
    *descriptor = -1;
}

int Attach(int program) {
    bpf_attr attributes = {};
    attributes.raw_tracepoint.prog_fd = static_cast<u32>(program);
    return Bpf(BPF_RAW_TRACEPOINT_OPEN, &attributes);
}

bool Capable() {
    __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
    __user_cap_data_struct sets[2] = {};
    auto has = [&sets](u32 right) { return (sets[right / 32].effective >> right % 32 & 1) != 0; };
    return syscall(SYS_capget, &header, sets) != 0 || has(CAP_SYS_ADMIN) || (has(CAP_BPF) && has(CAP_PERFMON));
}

// "0-3,8": ascending; false for anything else.
bool ParseCpus(const char *text, std::vector<u32> *cpus) {
    u32 next = 0;
    while (true) {
        char *end = nullptr;
        unsigned long first = strtoul(text, &end, 10);
        unsigned long last = *end == '-' ? strtoul(end + 1, &end, 10) : first;
        if (end == text || first < next || last < first || last >= CPUS_MOST) {
            return false;
        }
        for (; first <= last; first++) {
            cpus->push_back(static_cast<u32>(first));
        }
        next = static_cast<u32>(last) + 1;
        if (*end != ',') {
            return *end == '\n' || *end == 0;
        }
        text = end + 1;
    }
}

// The kernel writes a value for each of them, wherever the list of its callers ends.
Outcome FindCpus(Tracking *tracking) {
    if (!tracking->cpus.empty()) {
        return FINE;
    }
    char text[4096] = {};
    int file = open("/sys/devices/system/cpu/possible", O_RDONLY | O_CLOEXEC);
    ssize_t length = file >= 0 ? read(file, text, sizeof text - 1) : -1;
    Close(&file);
    if (length <= 0 || !ParseCpus(text, &tracking->cpus)) {
        tracking->cpus.clear();
        return Fail(tracking, UNSUPPORTED, "/sys/devices/system/cpu/possible can't be read");
    }
    return FINE;
}

// What would only show as an error number otherwise.
Outcome Check(Tracking *tracking, const GroupProgram &program) {
    struct stat status = {};
    if (program.threads && (stat("/proc/self/ns/pid", &status) != 0 || status.st_ino != FIRST_PID_NAMESPACE)) {
        return Fail(tracking, UNSUPPORTED, "threads have other numbers in the kernel than in this PID namespace");
    }
    return FindCpus(tracking);
}

Outcome Load(Tracking *tracking, TrackingGroup group) {
    const GroupProgram &program = PROGRAMS[group];
    Outcome outcome = Check(tracking, program);
    if (outcome != FINE) {
        return outcome;
    }
    int error = program.load(&tracking->groups[group].programs);
    if (error == 0) {
        tracking->groups[group].loaded = true;
        return FINE;
    }
    bool typeless = error != -EPERM && Capable() && access("/sys/kernel/btf/vmlinux", F_OK) != 0;
    return typeless ? Fail(tracking, UNSUPPORTED, "the kernel has no type data in /sys/kernel/btf/vmlinux")
                    : FailWith(tracking, error, program.name);
}

Outcome Share(Tracking *tracking, TrackingGroup id) {
    const GroupProgram &program = PROGRAMS[id];
    Group *group = &tracking->groups[id];
    if (program.sharedMap < 0) {
        return FINE;
    }
    group->shared = static_cast<Shared *>(MapShare(group->programs.maps[program.sharedMap], sizeof(Shared)));
    if (group->shared == nullptr) {
        return FailWith(tracking, -errno, program.name);
    }
    for (u32 i = 0; i < 2 && program.limits[i] != nullptr; i++) {
        std::copy(program.limits[i], program.limits[i] + LIMITS, group->shared->limits[i]);
    }
    group->uses.assign(FILTER_BITS, 0);
    return FINE;
}

Outcome AttachAll(Tracking *tracking, TrackingGroup id) {
    Group *group = &tracking->groups[id];
    for (u32 i = 0; i < LOADED_PROGRAMS && group->programs.programs[i] >= 0; i++) {
        group->links[i] = Attach(group->programs.programs[i]);
        if (group->links[i] < 0) {
            return FailWith(tracking, group->links[i], PROGRAMS[id].name);
        }
    }
    return FINE;
}

}  // namespace

int Bpf(bpf_cmd command, bpf_attr *attributes) {
    long result = syscall(SYS_bpf, command, attributes, sizeof *attributes);
    return result >= 0 ? static_cast<int>(result) : -errno;
}

int MapUpdate(int map, const void *key, const void *value, u64 flags) {
    bpf_attr attributes = {};
    attributes.map_fd = static_cast<u32>(map);
    attributes.key = reinterpret_cast<u64>(key);
    attributes.value = reinterpret_cast<u64>(value);
    attributes.flags = flags;
    return Bpf(BPF_MAP_UPDATE_ELEM, &attributes);
}

int MapLookup(int map, const void *key, void *value) {
    bpf_attr attributes = {};
    attributes.map_fd = static_cast<u32>(map);
    attributes.key = reinterpret_cast<u64>(key);
    attributes.value = reinterpret_cast<u64>(value);
    return Bpf(BPF_MAP_LOOKUP_ELEM, &attributes);
}

void MapDelete(int map, const void *key) {
    bpf_attr attributes = {};
    attributes.map_fd = static_cast<u32>(map);
    attributes.key = reinterpret_cast<u64>(key);
    Bpf(BPF_MAP_DELETE_ELEM, &attributes);
}

int MapLookupCpus(Tracking *tracking, int map, const void *key, size_t size) {
    tracking->buffer.resize(size * tracking->cpus.size());
    return MapLookup(map, key, tracking->buffer.data());
}

void *MapShare(int map, size_t size) {
    void *memory = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, map, 0);
    return memory != MAP_FAILED ? memory : nullptr;
}

void FilterAdmit(Tracking *tracking, TrackingGroup id, u32 number, bool enter) {
    Group *group = &tracking->groups[id];
    u32 bit = number % FILTER_BITS;
    u32 uses = group->uses[bit] += enter ? 1 : ~0U;  // several numbers may share one
    __u64 *word = &group->shared->filter[bit / 64];
    __u64 mask = 1ULL << bit % 64;
    __atomic_store_n(word, uses != 0 ? *word | mask : *word & ~mask, __ATOMIC_RELEASE);
}

Outcome Fail(Tracking *tracking, Outcome outcome, const std::string &reason) {
    tracking->reason = reason;
    return outcome;
}

Outcome FailWith(Tracking *tracking, int error, const char *what) {
    if (error == -EPERM || !Capable()) {  // of the two rights, the kernel names only one so
        return Fail(tracking, REFUSED, "needs CAP_BPF and CAP_PERFMON outside of user namespaces");
    }
    if (error == -ENOSYS) {
        return Fail(tracking, UNSUPPORTED, "the kernel has no BPF");
    }
    bool later = error == -ENOMEM || error == -EMFILE || error == -ENFILE || error == -EAGAIN || error == -EINTR;
    return Fail(tracking, later ? BROKEN : UNSUPPORTED,
                std::string("the kernel refuses to count ") + what + ": " + strerror(-error));
}

Outcome GroupNeed(Tracking *tracking, TrackingGroup id) {
    if (tracking->groups[id].loaded) {
        return FINE;
    }
    Outcome outcome = Load(tracking, id);
    if (outcome == FINE) {
        outcome = Share(tracking, id);
    }
    if (outcome == FINE && PROGRAMS[id].attaches) {
        outcome = AttachAll(tracking, id);
    }
    if (outcome != FINE) {
        GroupClose(tracking, id);
    }
    return outcome;
}

void GroupClose(Tracking *tracking, TrackingGroup id) {
    Group *group = &tracking->groups[id];
    if (group->shared != nullptr) {
        munmap(group->shared, sizeof(Shared));
        group->shared = nullptr;
    }
    for (int &link : group->links) {
        Close(&link);
    }
    for (u32 i = 0; group->loaded && i < LOADED_PROGRAMS; i++) {
        Close(&group->programs.programs[i]);
    }
    for (u32 i = 0; group->loaded && i < LOADED_MAPS; i++) {
        Close(&group->programs.maps[i]);
    }
    group->loaded = false;
}

Outcome GroupAsk(Tracking *tracking, TrackingGroup id) {
    Group *group = &tracking->groups[id];
    if (group->loaded) {
        return FINE;
    }
    if (!group->asked) {
        group->asked = true;
        group->answer = Load(tracking, id);
        group->reason = group->answer != FINE ? tracking->reason : "";
        GroupClose(tracking, id);
    }
    return Fail(tracking, group->answer, group->reason);
}
