// What /sys says of interfaces beside netlink. It may be that of another network namespace: a process that changes its
// namespace alone keeps the /sys that was mounted before, where the same names stand for other interfaces.
#include "corekit/linuxhost/host.h"

#include <algorithm>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <net/if_arp.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace {

constexpr u32 LIMIT = 4096;

struct Entry {
    char name[NAME_SIZE];
    u64 number;
};

// Each interface as its name and the number of its inode, ascending by names. About 0.5 us each.
std::vector<Entry> ReadEntries(const ProcRoot &root) {
    std::vector<Entry> entries;
    int descriptor = openat(root.sys, "class/net", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    DIR *directory = descriptor >= 0 ? fdopendir(descriptor) : nullptr;
    if (directory == nullptr && descriptor >= 0) {
        close(descriptor);
    }
    while (const dirent *entry = directory != nullptr ? readdir(directory) : nullptr) {
        if (size_t length = strlen(entry->d_name); length < NAME_SIZE) {
            entries.push_back({{}, entry->d_ino});
            memcpy(entries.back().name, entry->d_name, length);
        }
    }
    if (directory != nullptr) {
        closedir(directory);
    }
    std::sort(entries.begin(), entries.end(),
              [](const Entry &left, const Entry &right) { return strcmp(left.name, right.name) < 0; });
    return entries;
}

std::string PathOf(const Link &link) {
    return std::string("class/net/") + link.name;
}

u64 MarkOf(const ProcRoot &root, const Link &link) {
    struct stat entry = {};
    return fstatat(root.sys, PathOf(link).c_str(), &entry, AT_SYMLINK_NOFOLLOW) == 0 ? entry.st_ino : 0;
}

std::string Line(const ProcRoot &root, const std::string &path) {
    ProcBuffer buffer;
    std::string_view text;
    ProcReadOnce(root.sys, path, LIMIT, &buffer, &text);
    return std::string(ProcTakeLine(&text));
}

bool SameInSys(const ProcRoot &root, const Link &link) {
    char mac[18];
    const u8 *byte = link.mac;
    snprintf(mac, sizeof mac, "%02x:%02x:%02x:%02x:%02x:%02x", byte[0], byte[1], byte[2], byte[3], byte[4], byte[5]);
    return Line(root, PathOf(link) + "/ifindex") == std::to_string(link.index) &&
           Line(root, PathOf(link) + "/address") == mac;
}

// One interface that has index, name and address in both is proof enough: addresses are random, or of a card.
bool IsOurs(LinuxHost *host) {
    const u8 none[6] = {};
    const std::vector<Link> &rows = host->links.rows;
    auto known = std::find_if(rows.rbegin(), rows.rend(), [&none](const Link &link) {
        return !link.gone && memcmp(link.mac, none, sizeof none) != 0;
    });
    host->sysIsOurs = host->sysIsOurs || (known != rows.rend() && SameInSys(host->root, *known));
    return host->sysIsOurs;
}

// The number of the interface that has this link's name; 0 when none has.
u64 NumberOf(const std::vector<Entry> &entries, const Link &link) {
    auto entry = std::lower_bound(entries.begin(), entries.end(), link.name,
                                  [](const Entry &one, const char *name) { return strcmp(one.name, name) < 0; });
    return !link.gone && entry != entries.end() && strcmp(entry->name, link.name) == 0 ? entry->number : 0;
}

// The interface that was marked is there no more, under whatever name.
bool Another(const LinuxHost &host, const std::vector<Entry> &entries, const Link &link, u64 number) {
    return number != 0 && link.mark != 0 && number != link.mark &&
           std::none_of(entries.begin(), entries.end(), [&](const Entry &one) { return one.number == link.mark; }) &&
           MarkOf(host.root, link) == number;
}

// The last part of the path that a symbolic link leads to; empty when there is none, or it does not fit.
template <size_t Size>
void CopyTarget(const ProcRoot &root, const std::string &path, char (&text)[Size]) {
    char target[256];
    ssize_t length = readlinkat(root.sys, path.c_str(), target, sizeof target);
    std::string_view whole(
        target, length > 0 && length < static_cast<ssize_t>(sizeof target) ? static_cast<size_t>(length) : 0);
    std::string_view last = whole.substr(whole.rfind('/') + 1);
    if (last.size() < Size) {
        memcpy(text, last.data(), last.size());
        text[last.size()] = 0;
    }
}

}  // namespace

void HostMark(LinuxHost *host) {
    if (!IsOurs(host)) {
        return;
    }
    std::vector<Entry> entries = ReadEntries(host->root);
    for (Link &link : host->links.rows) {
        u64 number = NumberOf(entries, link);
        if (Another(*host, entries, link, number)) {
            LinksRenew(&host->links, &link);
        }
        link.mark = link.mark == 0 ? number : link.mark;
    }
}

void HostMarkOne(LinuxHost *host, Link *link) {
    if (host->sysIsOurs && link->mark == 0) {
        link->mark = MarkOf(host->root, *link);
    }
}

void HostFindParents(LinuxHost *host) {
    for (Link &link : host->links.rows) {
        bool card = !link.gone && link.kind == KIND_NONE && link.device[0] == 0 && link.type == ARPHRD_ETHER;
        if (card && SameInSys(host->root, link)) {
            CopyTarget(host->root, PathOf(link) + "/device", link.device);
            CopyTarget(host->root, PathOf(link) + "/device/subsystem", link.bus);
        }
    }
}
