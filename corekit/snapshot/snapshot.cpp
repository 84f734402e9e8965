#include "corekit/snapshot/snapshot.h"

#include "corekit/node_source.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace {

constexpr char KEY_NUMBER = 'i';
constexpr char KEY_TEXT = 's';
constexpr u32 NAME_END = 6;  // bytes of a name behind its keys: a byte of 0, the kind, the node

// Passes over parameters, into `params` unless that is null, up to what is none.
void TakeParams(Cursor *from, Params *params) {
    while (!from->left.empty() && (from->left[0] == KEY_NUMBER || from->left[0] == KEY_TEXT)) {
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

// Finds the entries of a page. False unless all are well formed and their names ascend.
bool FindPlaces(std::string_view bytes, std::vector<LoadedPage::Place> *places) {
    places->clear();
    for (Cursor from{bytes}; !from.left.empty();) {
        std::string_view rest = from.left;
        TakeParams(&from, nullptr);
        Cursor end{from.Take(NAME_END)};
        std::string_view name = rest.substr(0, rest.size() - from.left.size());
        std::string_view body = from.Take(from.Number(4));
        bool ends = end.Number(1) == 0 && IsBody(static_cast<u8>(end.Number(1)), body);
        if (!from.good || !ends || (!places->empty() && name <= places->back().first)) {
            return false;
        }
        places->push_back({name, body});
    }
    return !places->empty();
}

bool LoadPage(const SnapshotPage &page, LoadedPage *loaded) {
    std::string_view bytes = page.bytes;
    if (page.size != bytes.size()) {
        loaded->unpacked.resize(page.size);
        bytes = loaded->unpacked;
        if (!Unpack(page.bytes, &loaded->unpacked)) {
            return false;
        }
    }
    loaded->page = &page;
    return FindPlaces(bytes, &loaded->places) && loaded->places[0].first == page.first;
}

// The page in memory, where the one that was not used for longest makes room.
const LoadedPage &Loaded(Snapshot *snapshot, const SnapshotPage &page) {
    LoadedPage *oldest = snapshot->loaded;
    for (LoadedPage &loaded : snapshot->loaded) {
        oldest = loaded.page == &page || (oldest->page != &page && loaded.used < oldest->used) ? &loaded : oldest;
    }
    oldest->used = ++snapshot->lookUps;
    if (oldest->page != &page) {
        LoadPage(page, oldest);  // succeeded when the snapshot was opened
    }
    return *oldest;
}

KnfStatus Find(void *context, EntryKind kind, u32 node, const Params &keys, std::string_view *body) {
    auto *snapshot = static_cast<Snapshot *>(context);
    std::string name = SnapshotName(kind, node, keys);
    auto behind = std::upper_bound(snapshot->pages.begin(), snapshot->pages.end(), name,
                                   [](std::string_view left, const SnapshotPage &right) { return left < right.first; });
    if (behind == snapshot->pages.begin()) {
        return STATUS_NOT_FOUND;
    }
    const auto &places = Loaded(snapshot, *std::prev(behind)).places;
    auto place = std::lower_bound(places.begin(), places.end(), LoadedPage::Place(name, {}));
    bool found = place != places.end() && place->first == name;
    *body = found ? place->second : std::string_view();
    return found ? STATUS_OK : STATUS_NOT_FOUND;
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

// The pages between header and checksum. False unless each holds what it says, and all their names ascend.
bool FindPages(Cursor from, std::vector<SnapshotPage> *pages) {
    LoadedPage loaded;
    std::string before;  // the last name of the page ahead
    while (!from.left.empty()) {
        u64 size = from.Number(4);
        u64 packedSize = from.Number(4);
        std::string_view first = from.Take(from.Number(4));
        SnapshotPage page = {first, from.Take(packedSize), size};
        bool fits = size == packedSize || size <= SNAPSHOT_PAGE;
        if (!from.good || !fits || first <= before || !LoadPage(page, &loaded)) {
            return false;
        }
        before = loaded.places.back().first;
        pages->push_back(page);
    }
    return true;
}

std::string ByteOrder() {
    return std::string(reinterpret_cast<const char *>(&SNAPSHOT_BYTE_ORDER), sizeof SNAPSHOT_BYTE_ORDER);
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
    return fsync(fd) == 0 ? 0 : errno;
}

}  // namespace

KnfStatus SnapshotOpen(const char *path, Snapshot *snapshot) {
    // Not to wait for the other end of a pipe, which is no snapshot anyway.
    int fd = open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (fd < 0) {
        return STATUS_SNAPSHOT_UNREADABLE;
    }
    struct stat info = {};
    bool good = fstat(fd, &info) == 0 && S_ISREG(info.st_mode) && static_cast<u64>(info.st_size) <= SNAPSHOT_LIMIT;
    std::string file(good ? static_cast<size_t>(info.st_size) : 0, '\0');
    for (size_t done = 0; good && done < file.size();) {
        ssize_t count = read(fd, file.data() + done, file.size() - done);
        good = count > 0;
        done += static_cast<size_t>(std::max<ssize_t>(count, 0));
    }
    close(fd);
    return good ? SnapshotParse(std::move(file), snapshot) : STATUS_SNAPSHOT_UNREADABLE;
}

KnfStatus SnapshotParse(std::string file, Snapshot *snapshot) {
    snapshot->file = std::move(file);
    std::string_view bytes = snapshot->file;
    Cursor from{bytes};
    if (bytes.substr(0, SNAPSHOT_MAGIC.size()) != SNAPSHOT_MAGIC.substr(0, bytes.size())) {
        return STATUS_NOT_SNAPSHOT;
    }
    from.Take(SNAPSHOT_MAGIC.size());
    u64 version = from.Number(4);
    bool sameOrder = from.Take(4) == ByteOrder();
    if (from.good && (version != SNAPSHOT_VERSION || !sameOrder)) {
        return STATUS_SNAPSHOT_VERSION;
    }
    u64 length = from.Number(8);
    snapshot->seconds = static_cast<u32>(from.Number(4));
    snapshot->nanoseconds = static_cast<u32>(from.Number(4));
    snapshot->signature = Cursor{from.Take(SNAPSHOT_SIGNATURE)}.Text();
    if (bytes.size() < SNAPSHOT_HEADER + SNAPSHOT_CHECKSUM || bytes.size() < length) {
        return STATUS_SNAPSHOT_TRUNCATED;
    }
    Cursor sum{bytes.substr(bytes.size() - SNAPSHOT_CHECKSUM)};
    bytes.remove_suffix(SNAPSHOT_CHECKSUM);
    from.left.remove_suffix(SNAPSHOT_CHECKSUM);
    bool intact = length == snapshot->file.size() && sum.Number(8) == Crc64(bytes);
    return intact && FindPages(from, &snapshot->pages) ? STATUS_OK : STATUS_SNAPSHOT_CORRUPT;
}

NodeSource SnapshotSource(Snapshot *snapshot) {
    return {snapshot, Get, List, nullptr, Signature};
}

void SnapshotEach(Snapshot *snapshot, const std::function<void(const SnapshotEntry &)> &visit) {
    for (const SnapshotPage &page : snapshot->pages) {
        for (const auto &[name, body] : Loaded(snapshot, page).places) {
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
    std::string beside = path + "." + std::to_string(getpid()) + ".partial";
    unlink(beside.c_str());
    int fd = open(beside.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
    if (fd < 0) {
        return errno;
    }
    int error = WriteSynced(fd, file);
    close(fd);
    if (error == 0 && rename(beside.c_str(), path.c_str()) != 0) {
        error = errno;
    }
    if (error != 0) {
        unlink(beside.c_str());
        return error;
    }
    // The rename itself lasts once the directory is on disk.
    size_t slash = path.rfind('/');
    fd = open(slash == path.npos ? "." : path.substr(0, slash + 1).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    error = fd >= 0 && fsync(fd) == 0 ? 0 : errno;
    close(fd);
    return error;
}
