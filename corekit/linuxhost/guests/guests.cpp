#include "corekit/linuxhost/guests/guests.h"

#include "corekit/linuxhost/guests/command_line.h"

#include <algorithm>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <linux/if_tun.h>
#include <map>
#include <memory>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/sysmacros.h>
#include <unistd.h>

namespace {

constexpr u32 LIMIT = 65536;
constexpr u64 KERNEL_THREAD = 0x200000;  // of the flags in a stat file
constexpr std::string_view TUN = "/dev/net/tun";
constexpr std::string_view MACVTAP = "/dev/tap";

// A process in the scan, and what it holds by the numbers of its descriptors.
struct Process {
    const ProcRoot &root;
    u32 pid;
    std::string directory;  // "PID/"
    std::map<u32, HeldTap> held{};
};

// How much a process that holds a tap looks like the guest behind it.
enum Claim : u8 { CLAIM_HOLDS, CLAIM_NAMED, CLAIM_VCPUS };

struct ClaimedTap {
    HeldTap tap;
    Claim claim;
};

struct Scan {
    const ProcRoot &root;
    Guests *guests;
    ProcBuffer buffer{};
    bool ownNetTold = false;
    struct stat ownNet {};
    std::map<u32, std::vector<WorkerThread>> vhost{};  // kernel threads, by the PID in their name
    std::map<std::pair<u32, std::string>, ClaimedTap> taps{};

    std::string_view Text(const std::string &path, u32 limit = LIMIT) {
        std::string_view text;
        ProcReadOnce(root.proc, path, limit, &buffer, &text);
        return text;
    }
};

// The numbers among the names of a directory, ascending; the kernel lists them that way, so that a limit leaves out the
// highest. An errno, or 0.
int Numbers(int parent, const std::string &path, std::vector<u32> *numbers, size_t limit = SIZE_MAX) {
    int descriptor = openat(parent, path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    DIR *directory = descriptor >= 0 ? fdopendir(descriptor) : nullptr;
    if (directory == nullptr) {
        int error = errno;
        if (descriptor >= 0) {
            close(descriptor);
        }
        return error;
    }
    while (const dirent *entry = numbers->size() < limit ? readdir(directory) : nullptr) {
        u64 number = 0;
        if (ProcNumber(entry->d_name, &number) && number <= 0xffffffff) {
            numbers->push_back(static_cast<u32>(number));
        }
    }
    closedir(directory);
    std::sort(numbers->begin(), numbers->end());
    return 0;
}

// A name that its owner chose: without the end of line that the file adds.
std::string NameOf(std::string_view comm) {
    if (!comm.empty() && comm.back() == '\n') {
        comm.remove_suffix(1);
    }
    return std::string(comm);
}

bool StartsWith(std::string_view text, std::string_view start) {
    return text.substr(0, start.size()) == start;
}

bool IsKernelThread(std::string_view stat) {
    size_t end = stat.rfind(')');
    std::string_view rest = end == std::string_view::npos ? std::string_view() : stat.substr(end + 1);
    for (int field = 3; field < 9; field++) {
        ProcTakeWord(&rest);
    }
    u64 flags = 0;
    return ProcTakeNumber(&rest, &flags) && (flags & KERNEL_THREAD) != 0;
}

// Only the flags of the kernel make it one: any process may bear such a name.
void TakeKernelThread(Scan *scan, u32 pid) {
    std::string directory = std::to_string(pid) + "/";
    std::string name = NameOf(scan->Text(directory + "comm"));
    bool vhost = StartsWith(name, "vhost-");
    if (!(vhost || StartsWith(name, "napi/") || StartsWith(name, "irq/")) ||
        !IsKernelThread(scan->Text(directory + "stat"))) {
        return;
    }
    u64 owner = 0;
    if (!vhost) {
        scan->guests->nics.push_back({pid, pid, name});
    } else if (ProcNumber(std::string_view(name).substr(6), &owner) && owner <= 0xffffffff) {
        scan->vhost[static_cast<u32>(owner)].push_back({pid, pid, name});
    }
}

// Whether it is a device of the driver that /proc/devices names: a path may have been mounted over.
bool IsMacvtap(Scan *scan, const struct stat &device) {
    std::string_view text = scan->Text("devices");
    while (S_ISCHR(device.st_mode) && !text.empty()) {
        std::string_view line = ProcTakeLine(&text);
        u64 number = 0;
        if (ProcNumber(ProcTakeWord(&line), &number) && number == major(device.st_rdev) &&
            ProcTakeWord(&line) == "macvtap") {
            return true;
        }
    }
    return false;
}

// The interface of a descriptor that leads to a tap; false for any other.
bool TapOf(Scan *scan, const Process &process, u32 descriptor, HeldTap *tap) {
    char link[64];
    std::string number = std::to_string(descriptor);
    std::string path = process.directory + "fd/" + number;
    ssize_t length = readlinkat(scan->root.proc, path.c_str(), link, sizeof link);
    std::string_view target(link, length > 0 ? static_cast<size_t>(length) : 0);
    *tap = {};
    if (target == TUN) {
        std::string_view name;
        if (!ProcFindKey(scan->Text(process.directory + "fdinfo/" + number), "iff", &name) || name.empty() ||
            name.size() >= sizeof tap->name) {
            return false;  // a tap that is not set up yet has no name
        }
        memcpy(tap->name, name.data(), name.size());
        return true;
    }
    u64 index = 0;
    struct stat device = {};
    if (!StartsWith(target, MACVTAP) || !ProcNumber(target.substr(MACVTAP.size()), &index) || index > 0xffffffff ||
        (fstatat(scan->root.proc, path.c_str(), &device, 0) == 0 && !IsMacvtap(scan, device))) {
        return false;
    }
    tap->index = static_cast<u32>(index);
    return index != 0;
}

// Names and indices of interfaces mean something in their own namespace alone.
bool InOurNet(const Scan &scan, const Process &process) {
    struct stat net = {};
    return !scan.ownNetTold || (fstatat(scan.root.proc, (process.directory + "ns/net").c_str(), &net, 0) == 0 &&
                                net.st_ino == scan.ownNet.st_ino && net.st_dev == scan.ownNet.st_dev);
}

// The namespace of a tap, which its holder may not share: a copy of its descriptor tells, to who may trace the process
// and administer that namespace. False when it does not.
bool NetOfTap(u32 pid, u32 descriptor, struct stat *net) {
    auto process = static_cast<int>(syscall(SYS_pidfd_open, pid, 0));
    auto copy = process >= 0 ? static_cast<int>(syscall(SYS_pidfd_getfd, process, descriptor, 0)) : -1;
    int space = copy >= 0 ? ioctl(copy, TUNGETDEVNETNS) : -1;
    bool told = space >= 0 && fstat(space, net) == 0;
    for (int opened : {process, copy, space}) {
        if (opened >= 0) {
            close(opened);
        }
    }
    return told;
}

bool IsOurTap(const Scan &scan, const Process &process, u32 descriptor) {
    struct stat net = {};
    return scan.ownNetTold && NetOfTap(process.pid, descriptor, &net)
               ? net.st_ino == scan.ownNet.st_ino && net.st_dev == scan.ownNet.st_dev
               : InOurNet(scan, process);
}

// The number in "CPU n/KVM".
bool VcpuNumber(std::string_view name, u64 *number) {
    if (!StartsWith(name, "CPU ")) {
        return false;
    }
    name.remove_prefix(4);
    size_t slash = name.find('/');
    return slash != std::string_view::npos && (name.substr(slash) == "/KVM" || name.substr(slash) == "/TCG") &&
           ProcNumber(name.substr(0, slash), number) && *number < MAX_VCPUS;
}

void ReadThreads(Scan *scan, const Process &process, Guest *guest) {
    std::vector<u32> threads;
    std::map<u64, u32> vcpus;
    Numbers(scan->root.proc, process.directory + "task", &threads);
    for (u32 thread : threads) {
        std::string name = NameOf(scan->Text(process.directory + "task/" + std::to_string(thread) + "/comm"));
        u64 number = 0;
        if (VcpuNumber(name, &number)) {
            vcpus.emplace(number, thread);
        } else if (StartsWith(name, "vhost-")) {
            guest->vhost.push_back({process.pid, thread, name});
        }
    }
    for (const auto &[number, thread] : vcpus) {
        guest->vcpus.push_back(thread);
    }
}

void TakeMac(const CommandNic &nic, HeldTap *tap) {
    memcpy(tap->mac, nic.mac, sizeof tap->mac);
    tap->macTold = true;
}

// By the interface or the descriptor that the command line names; or there is but one on both sides.
void ReadMacs(const std::vector<CommandNic> &nics, Process *process) {
    for (const CommandNic &nic : nics) {
        for (u32 descriptor : nic.descriptors) {
            auto found = process->held.find(descriptor);
            if (found != process->held.end()) {
                TakeMac(nic, &found->second);
            }
        }
        for (auto &[descriptor, tap] : process->held) {
            if (!nic.interface.empty() && nic.interface == tap.name) {
                TakeMac(nic, &tap);
            }
        }
    }
    bool unnamed = nics.size() == 1 && nics[0].interface.empty() && nics[0].descriptors.empty();
    if (unnamed && process->held.size() == 1) {
        TakeMac(nics[0], &process->held.begin()->second);
    }
}

// A tap with several queues is held by as many descriptors, and a process that hands a guest its tap may hold it too:
// who looks most like a guest uses it. Of two that look alike neither is believed, unless both say the same.
void TakeTap(Scan *scan, const HeldTap &tap, Claim claim) {
    const std::vector<Guest> &guests = scan->guests->guests;
    auto [place, added] = scan->taps.try_emplace({tap.index, tap.name}, ClaimedTap{tap, claim});
    ClaimedTap *known = &place->second;
    u32 holder = known->tap.guest;
    if (added || claim < known->claim) {
        return;
    }
    if (claim > known->claim || (holder == tap.guest && !known->tap.macTold)) {
        *known = {tap, claim};
    } else if (holder != tap.guest && claim != CLAIM_HOLDS) {
        bool alike = claim == CLAIM_NAMED && holder != NO_GUEST && !guests[holder].name.empty() &&
                     guests[holder].name == guests[tap.guest].name;
        if (!alike) {
            known->tap.guest = NO_GUEST;
            known->tap.macTold = false;
            memset(known->tap.mac, 0, sizeof known->tap.mac);
        }
    }
}

void TakeGuest(Scan *scan, Process *process) {
    Guests *guests = scan->guests;
    if (guests->guests.size() >= MAX_GUESTS) {
        return;
    }
    std::string_view command = scan->Text(process->directory + "cmdline", MAX_COMMAND);
    Guest guest = {process->pid, CommandGuestName(command), {}, {}};
    ReadMacs(CommandNics(command), process);
    ReadThreads(scan, *process, &guest);
    guests->guests.push_back(guest);
    for (auto &[descriptor, tap] : process->held) {
        tap.guest = static_cast<u32>(guests->guests.size() - 1);
        TakeTap(scan, tap,
                !guest.vcpus.empty()                 ? CLAIM_VCPUS
                : !guest.name.empty() || tap.macTold ? CLAIM_NAMED
                                                     : CLAIM_HOLDS);
    }
}

void ScanProcess(Scan *scan, u32 pid) {
    Process process = {scan->root, pid, std::to_string(pid) + "/"};
    std::vector<u32> descriptors;
    int error = Numbers(scan->root.proc, process.directory + "fd", &descriptors, MAX_DESCRIPTORS + 1);
    if (descriptors.empty()) {
        TakeKernelThread(scan, pid);
    }
    scan->guests->refused += error == EACCES || error == EPERM ? 1 : 0;
    if (descriptors.size() > MAX_DESCRIPTORS) {
        descriptors.pop_back();
        scan->guests->crowded = scan->guests->crowded == 0 ? pid : scan->guests->crowded;
    }
    bool foreign = false;
    for (u32 descriptor : descriptors) {
        HeldTap tap;
        if (process.held.size() >= MAX_HELD || !TapOf(scan, process, descriptor, &tap)) {
            continue;
        }
        if (IsOurTap(*scan, process, descriptor)) {
            process.held.emplace(descriptor, tap);
        } else {
            foreign = true;
        }
    }
    if (!process.held.empty()) {
        TakeGuest(scan, &process);
    }
    scan->guests->foreign += foreign && process.held.empty() ? 1 : 0;
}

}  // namespace

Outcome GuestsScan(const ProcRoot &root, Guests *guests) {
    *guests = Guests();
    Scan scan = {root, guests};
    std::vector<u32> pids;
    if (int error = Numbers(root.proc, ".", &pids)) {
        return ErrnoOutcome(error);
    }
    scan.ownNetTold = fstatat(root.proc, "thread-self/ns/net", &scan.ownNet, 0) == 0;
    std::string_view text;
    guests->hidden = ProcReadOnce(root.proc, "1/comm", LIMIT, &scan.buffer, &text) != FINE;
    for (u32 pid : pids) {
        guests->processes++;
        ScanProcess(&scan, pid);
    }
    for (Guest &guest : guests->guests) {
        std::vector<WorkerThread> &threads = scan.vhost[guest.pid];
        guest.vhost.insert(guest.vhost.end(), threads.begin(), threads.end());
    }
    for (const auto &[name, claimed] : scan.taps) {
        guests->taps.push_back(claimed.tap);
    }
    return FINE;
}

const HeldTap *GuestsFind(const Guests &guests, const char *name, u32 index) {
    struct Key {
        u32 index;
        const char *name;
    };
    for (const Key &key : {Key{0, name}, Key{index, ""}}) {
        auto before = [](const HeldTap &tap, const Key &one) {
            return tap.index != one.index ? tap.index < one.index : strcmp(tap.name, one.name) < 0;
        };
        auto found = std::lower_bound(guests.taps.begin(), guests.taps.end(), key, before);
        if (found != guests.taps.end() && found->index == key.index && strcmp(found->name, key.name) == 0) {
            return &*found;
        }
    }
    return nullptr;
}
