#include "corekit/snapshot/snapshot.h"

#include "corekit/node_source.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <iterator>
#include <sys/file.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace {

constexpr char KEY_NUMBER = 'i';
constexpr char KEY_TEXT = 's';
constexpr u32 NAME_END = 6;    // bytes of a name behind its keys: a byte of 0, the kind, the node
constexpr u32 PAGE_HEAD = 12;  // bytes ahead of the name of a page's first entry
constexpr std::string_view PARTIAL = ".partial";
constexpr size_t PARTIAL_DIGITS = 8;

// Closes what it was given, -1 for nothing.
struct File {
    int fd;
    explicit File(int opened) : fd(opened) {}
    File(const File &) = delete;
    File &operator=(const File &) = delete;
    ~File() {
        if (fd >= 0) {
            close(fd);
        }
    }
};

// Passes over parameters, into `params` unless that is null, up to what is none. More than a name or a list may have
// are as bad as one that is cut.
void TakeParams(Cursor *from, Params *params) {
    for (u32 count = 1; !from->left.empty() && (from->left[0] == KEY_NUMBER || from->left[0] == KEY_TEXT); count++) {
        if (count > SNAPSHOT_PARAMS) {
            *from = {{}, false};
            return;
        }
        bool isText = from->Take(1)[0] == KEY_TEXT;
        std::string_view text = isText ? from->Text() : std::string_view();
        auto number = static_cast<int64_t>(isText ? 0 : from->Number(8));
        if (params != nullptr) {
            params->push_back({isText, number, std::string(text)});
        }
    }
}

// Whether a body of this kind follows a name, and nothing behind it.
bool IsBody(u8 kind, std::string_view body) {
    Cursor from{body};
    if (kind == ENTRY_LIST) {
        TakeParams(&from, nullptr);
    }
    return from.good && (kind == ENTRY_RECORD || (kind == ENTRY_LIST && from.left.empty()));
}

struct Entry {
    std::string_view name;
    std::string_view body;
};

Entry TakeEntry(Cursor *from) {
    std::string_view rest = from->left;
    TakeParams(from, nullptr);
    from->Take(NAME_END);
    std::string_view name = rest.substr(0, rest.size() - from->left.size());
    return {name, from->Take(from->Number(4))};
}

Entry EntryAt(const LoadedPage &page, u32 place) {
    Cursor from{page.bytes.substr(place)};
    return TakeEntry(&from);
}

// Finds the entries of a page. False unless all are well formed, their names ascend, and a large one is alone.
bool FindPlaces(LoadedPage *page) {
    bool single = page->bytes.size() > SNAPSHOT_PAGE;
    page->places.clear();
    std::string_view before;
    for (Cursor from{page->bytes}; !from.left.empty();) {
        size_t place = page->bytes.size() - from.left.size();
        auto [name, body] = TakeEntry(&from);
        if (!from.good || name <= before || (single && place > 0)) {
            return false;
        }
        Cursor end{name.substr(name.size() - NAME_END)};
        if (end.Number(1) != 0 || !IsBody(static_cast<u8>(end.Number(1)), body)) {
            return false;
        }
        page->places.push_back(static_cast<u32>(place));
        before = name;
    }
    return !page->places.empty();
}

struct PageHead {
    u64 size;                // unpacked; that of `bytes` when they are not packed
    std::string_view first;  // the name of its first entry
    std::string_view bytes;
};

PageHead TakePage(Cursor *from) {
    u64 size = from->Number(4);
    u64 packedSize = from->Number(4);
    std::string_view first = from->Take(from->Number(4));
    return {size, first, from->Take(packedSize)};
}

PageHead PageAt(const Snapshot &snapshot, u32 at) {
    Cursor from{std::string_view(snapshot.file).substr(at)};
    return TakePage(&from);
}

// Only when all of it succeeded, `at` tells the page: memory may run out on the way.
bool LoadPage(const PageHead &head, u32 at, LoadedPage *page) {
    page->at = 0;
    page->bytes = head.bytes;
    if (head.size != head.bytes.size()) {
        page->unpacked.resize(head.size);
        page->bytes = page->unpacked;
        if (!Unpack(head.bytes, &page->unpacked)) {
            return false;
        }
    }
    bool good = FindPlaces(page) && EntryAt(*page, 0).name == head.first;
    page->at = good ? at : 0;
    return good;
}

// The page in memory, where the one that was not used for longest makes room.
const LoadedPage &Loaded(Snapshot *snapshot, u32 at) {
    LoadedPage *oldest = snapshot->loaded;
    for (LoadedPage &loaded : snapshot->loaded) {
        oldest = loaded.at == at || (oldest->at != at && loaded.used < oldest->used) ? &loaded : oldest;
    }
    oldest->used = ++snapshot->lookUps;
    if (oldest->at != at) {
        LoadPage(PageAt(*snapshot, at), at, oldest);  // succeeded when the snapshot was opened
    }
    return *oldest;
}

// No name begins with another, so that as many bytes as the sought one has tell the order: an entry's need no parsing.
KnfStatus Find(void *context, EntryKind kind, u32 node, const Params &keys, std::string_view *body) {
    auto *snapshot = static_cast<Snapshot *>(context);
    std::string name = SnapshotName(kind, node, keys);
    std::string_view file = snapshot->file;
    auto behind = std::upper_bound(
        snapshot->pages.begin(), snapshot->pages.end(), std::string_view(name),
        [&](std::string_view left, u32 at) { return left < file.substr(at + PAGE_HEAD, left.size()); });
    if (behind == snapshot->pages.begin()) {
        return STATUS_NOT_FOUND;
    }
    const LoadedPage &page = Loaded(snapshot, *std::prev(behind));
    auto place = std::lower_bound(
        page.places.begin(), page.places.end(), std::string_view(name),
        [&](u32 left, std::string_view right) { return page.bytes.substr(left, right.size()) < right; });
    Cursor from{page.bytes.substr(place != page.places.end() ? *place : page.bytes.size())};
    if (from.Take(name.size()) != name) {
        return STATUS_NOT_FOUND;
    }
    *body = from.Take(from.Number(4));
    return STATUS_OK;
}

KnfStatus Get(void *context, u32 node, const Params &keys, void *record, u32 size) {
    std::string_view body;
    KnfStatus status = Find(context, ENTRY_RECORD, node, keys, &body);
    if (status == STATUS_OK && body.size() != size) {
        status = STATUS_BAD_SIZE;
    } else if (status == STATUS_OK) {
        body.copy(static_cast<char *>(record), size);
    }
    return status;
}

KnfStatus List(void *context, u32 node, const Params &keys, Params *entries) {
    Cursor body;
    KnfStatus status = Find(context, ENTRY_LIST, node, keys, &body.left);
    TakeParams(&body, entries);
    return status;
}

const char *Signature(void *context) {
    return static_cast<Snapshot *>(context)->signature.c_str();
}

// The pages behind the header. False unless each holds what it says, and all their names ascend.
bool FindPages(Cursor from, std::vector<u32> *pages) {
    LoadedPage loaded;
    std::string before;  // the last name of the page ahead
    u64 end = SNAPSHOT_HEADER + from.left.size();
    while (!from.left.empty()) {
        auto at = static_cast<u32>(end - from.left.size());
        PageHead head = TakePage(&from);
        bool fits = head.size == head.bytes.size() || (head.size > head.bytes.size() && head.size <= SNAPSHOT_PAGE);
        if (!from.good || !fits || head.first <= before || !LoadPage(head, at, &loaded)) {
            return false;
        }
        before = EntryAt(loaded, loaded.places.back()).name;
        pages->push_back(at);
    }
    return true;
}

std::string ByteOrder() {
    return std::string(reinterpret_cast<const char *>(&SNAPSHOT_BYTE_ORDER), sizeof SNAPSHOT_BYTE_ORDER);
}

// What the beginning of a file of this size tells, ahead of all other checks.
KnfStatus CheckHeader(std::string_view header, u64 size) {
    if (size > SNAPSHOT_LIMIT) {
        return STATUS_SNAPSHOT_UNREADABLE;
    }
    if (header.substr(0, SNAPSHOT_MAGIC.size()) != SNAPSHOT_MAGIC.substr(0, header.size())) {
        return STATUS_NOT_SNAPSHOT;
    }
    Cursor from{header};
    from.Take(SNAPSHOT_MAGIC.size());
    u64 version = from.Number(4);
    bool sameOrder = from.Take(4) == ByteOrder();
    if (from.good && (version != SNAPSHOT_VERSION || !sameOrder)) {
        return STATUS_SNAPSHOT_VERSION;
    }
    u64 length = from.Number(8);
    if (size < SNAPSHOT_HEADER + SNAPSHOT_CHECKSUM || size < length) {
        return STATUS_SNAPSHOT_TRUNCATED;
    }
    return size == length ? STATUS_OK : STATUS_SNAPSHOT_CORRUPT;
}

// Reads on until `bytes` has this size. False when the file ends before, or can't be read.
bool ReadUpTo(int fd, u64 size, std::string *bytes) {
    size_t done = bytes->size();
    bytes->resize(size);
    while (done < size) {
        ssize_t count = read(fd, bytes->data() + done, size - done);
        if (count == 0 || (count < 0 && errno != EINTR)) {
            return false;
        }
        done += static_cast<size_t>(std::max<ssize_t>(count, 0));
    }
    return true;
}

void AppendPage(std::string *file, const std::string &first, const std::string &bytes) {
    std::string packed = bytes.size() <= SNAPSHOT_PAGE ? Pack(bytes) : bytes;
    const std::string &kept = packed.size() < bytes.size() ? packed : bytes;
    for (size_t size : {bytes.size(), kept.size(), first.size()}) {
        AppendNumber(file, size, 4);
    }
    *file += first + kept;
}

// 0 or an errno.
int WriteSynced(int fd, std::string_view bytes) {
    while (!bytes.empty()) {
        ssize_t count = write(fd, bytes.data(), bytes.size());
        if (count < 0 && errno != EINTR) {
            return errno;
        }
        bytes.remove_prefix(static_cast<size_t>(std::max<ssize_t>(count, 0)));
    }
    int error = 0;
    do {
        error = fsync(fd) == 0 ? 0 : errno;
    } while (error == EINTR);
    return error;
}

// A new file beside `path`, locked as long as its writer lives: process numbers tell nothing to another name space of
// processes or another host. Returns -1 with errno when there is none.
int CreatePartial(const std::string &path, std::string *name) {
    for (int attempts = 0; attempts < 100; attempts++) {
        u32 number = 0;
        if (getrandom(&number, sizeof number, 0) != sizeof number) {
            return -1;
        }
        char digits[PARTIAL_DIGITS + 1];
        snprintf(digits, sizeof digits, "%08x", number);
        *name = path + "." + digits + std::string(PARTIAL);
        int fd = open(name->c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
        if (fd < 0 && errno == EEXIST) {
            continue;
        }
        // Until it is locked, SnapshotClear may take it away. Where there are no locks, that leaves all files alone.
        struct stat info = {};
        bool locked = fd < 0 || flock(fd, LOCK_EX | LOCK_NB) == 0 || errno != EWOULDBLOCK;
        if (fd < 0 || (locked && fstat(fd, &info) == 0 && info.st_nlink > 0)) {
            return fd;
        }
        close(fd);
    }
    errno = EEXIST;
    return -1;
}

std::string DirectoryOf(const std::string &path) {
    size_t slash = path.rfind('/');
    return slash == path.npos ? "." : path.substr(0, slash + 1);
}

// Whether this is what CreatePartial makes for a path of `base` and a number.
bool IsPartial(std::string_view name, std::string_view base) {
    if (!name.starts_with(base) || !name.substr(base.size()).ends_with(PARTIAL)) {
        return false;
    }
    name = name.substr(base.size(), name.size() - base.size() - PARTIAL.size());
    size_t dot = name.find_first_not_of("0123456789");
    return dot > 0 && dot < name.size() && name[dot] == '.' && name.size() - dot - 1 == PARTIAL_DIGITS &&
           name.find_first_not_of("0123456789abcdef", dot + 1) == name.npos;
}

}  // namespace

KnfStatus SnapshotOpen(const char *path, Snapshot *snapshot) {
    // Not to wait for the other end of a pipe, which is no snapshot anyway.
    File from{open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK)};
    struct stat info = {};
    if (from.fd < 0 || fstat(from.fd, &info) != 0 || !S_ISREG(info.st_mode)) {
        return STATUS_SNAPSHOT_UNREADABLE;
    }
    auto size = static_cast<u64>(info.st_size);
    std::string file;
    if (!ReadUpTo(from.fd, std::min<u64>(size, SNAPSHOT_HEADER), &file)) {
        return STATUS_SNAPSHOT_UNREADABLE;
    }
    // A large file that is something else is not read any further.
    KnfStatus status = CheckHeader(file, size);
    if (status == STATUS_OK && !ReadUpTo(from.fd, size, &file)) {
        status = STATUS_SNAPSHOT_UNREADABLE;
    }
    return status == STATUS_OK ? SnapshotParse(std::move(file), snapshot) : status;
}

KnfStatus SnapshotParse(std::string file, Snapshot *snapshot) {
    snapshot->file = std::move(file);
    std::string_view bytes = snapshot->file;
    KnfStatus status = CheckHeader(bytes, bytes.size());
    if (status != STATUS_OK) {
        return status;
    }
    Cursor sum{bytes.substr(bytes.size() - SNAPSHOT_CHECKSUM)};
    bytes.remove_suffix(SNAPSHOT_CHECKSUM);
    Cursor from{bytes.substr(SNAPSHOT_TIME)};
    snapshot->seconds = static_cast<u32>(from.Number(4));
    snapshot->nanoseconds = static_cast<u32>(from.Number(4));
    std::string_view signature = from.Take(SNAPSHOT_SIGNATURE);
    snapshot->signature = signature.substr(0, signature.find('\0'));
    bool filled = signature.back() == 0 && signature.find_first_not_of('\0', snapshot->signature.size()) == bytes.npos;
    bool intact = filled && sum.Number(SNAPSHOT_CHECKSUM) == Crc64(bytes);
    return intact && FindPages(from, &snapshot->pages) ? STATUS_OK : STATUS_SNAPSHOT_CORRUPT;
}

NodeSource SnapshotSource(Snapshot *snapshot) {
    return {snapshot, Get, List, nullptr, Signature};
}

void SnapshotEach(Snapshot *snapshot, const std::function<void(const SnapshotEntry &)> &visit) {
    for (u32 at : snapshot->pages) {
        std::vector<u32> places = Loaded(snapshot, at).places;  // a copy, as a visit may load other pages
        for (u32 place : places) {
            auto [name, body] = EntryAt(Loaded(snapshot, at), place);
            SnapshotEntry entry = {};
            entry.record = body;
            Cursor from{name};
            TakeParams(&from, &entry.keys);
            entry.kind = static_cast<EntryKind>(from.Number(2));
            entry.node = static_cast<u32>(from.Number(4));
            from.left = entry.kind == ENTRY_LIST ? body : std::string_view();
            TakeParams(&from, &entry.list);
            visit(entry);
        }
    }
}

void SnapshotAppendParam(std::string *bytes, const KnfParamRec &param) {
    *bytes += param.isText ? KEY_TEXT : KEY_NUMBER;
    if (param.isText) {
        bytes->append(param.text.c_str(), strlen(param.text.c_str()) + 1);
    } else {
        AppendNumber(bytes, static_cast<u64>(param.number), 8);
    }
}

std::string SnapshotName(EntryKind kind, u32 node, const Params &keys) {
    std::string name;
    for (const KnfParamRec &key : keys) {
        SnapshotAppendParam(&name, key);
    }
    AppendNumber(&name, kind, 2);
    AppendNumber(&name, node, 4);
    return name;
}

std::string SnapshotEncode(const SnapshotDraft &draft) {
    std::string pages;
    std::string first;
    std::string page;
    for (const auto &[name, body] : draft.entries) {
        if (!page.empty() && page.size() + name.size() + 4 + body.size() > SNAPSHOT_PAGE) {
            AppendPage(&pages, first, std::exchange(page, {}));
        }
        first = page.empty() ? name : first;
        page += name;
        AppendNumber(&page, body.size(), 4);
        page += body;
    }
    if (!page.empty()) {
        AppendPage(&pages, first, page);
    }
    std::string file(SNAPSHOT_MAGIC);
    AppendNumber(&file, SNAPSHOT_VERSION, 4);
    file += ByteOrder();
    AppendNumber(&file, SNAPSHOT_HEADER + pages.size() + SNAPSHOT_CHECKSUM, 8);
    AppendNumber(&file, draft.seconds, 4);
    AppendNumber(&file, draft.nanoseconds, 4);
    file += draft.signature.substr(0, SNAPSHOT_SIGNATURE - 1);
    file.resize(SNAPSHOT_HEADER, '\0');
    file += pages;
    AppendNumber(&file, Crc64(file), SNAPSHOT_CHECKSUM);
    return file;
}

int SnapshotStore(const std::string &path, std::string_view file) {
    if (file.size() > SNAPSHOT_LIMIT) {
        return EFBIG;
    }
    std::string beside;
    File partial{CreatePartial(path, &beside)};
    if (partial.fd < 0) {
        return errno;
    }
    int error = WriteSynced(partial.fd, file);
    if (error == 0 && rename(beside.c_str(), path.c_str()) != 0) {
        error = errno;
    }
    if (error != 0) {
        unlink(beside.c_str());
        return error;
    }
    // The rename itself lasts once the directory is on disk. One that may not be read can't be synced; the file's own
    // sync is the closest then. Whatever these say, the file is in place.
    File directory{open(DirectoryOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)};
    fsync(directory.fd >= 0 ? directory.fd : partial.fd);
    return 0;
}

void SnapshotClear(const std::string &prefix) {
    DIR *directory = opendir(DirectoryOf(prefix).c_str());
    if (directory == nullptr) {
        return;
    }
    std::string base = prefix.substr(prefix.rfind('/') + 1) + ".";
    while (const dirent *entry = readdir(directory)) {
        if (!IsPartial(entry->d_name, base)) {
            continue;
        }
        File file{openat(dirfd(directory), entry->d_name, O_WRONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC)};
        struct stat info = {};
        if (file.fd >= 0 && fstat(file.fd, &info) == 0 && S_ISREG(info.st_mode) &&
            flock(file.fd, LOCK_EX | LOCK_NB) == 0) {
            unlinkat(dirfd(directory), entry->d_name, 0);
        }
    }
    closedir(directory);
}
