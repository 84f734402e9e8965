// Feeds files to the reader of snapshots: as they are, and with length and checksum made right, so that what lies
// behind these is reached. Whatever opens must be served as it stands and can be written and read again.
#include "corekit/snapshot/snapshot.h"

#include <cstdlib>
#include <memory>

namespace {

void Require(bool condition) {
    if (!condition) {
        abort();
    }
}

void Serve(std::string file) {
    auto snapshot = std::make_unique<Snapshot>();
    if (SnapshotParse(std::move(file), snapshot.get()) != 0) {
        return;
    }
    SnapshotDraft draft;
    std::vector<SnapshotEntry> entries;
    SnapshotEach(snapshot.get(), [&](const SnapshotEntry &entry) {
        std::string &body = draft.entries[SnapshotName(entry.kind, entry.node, entry.keys)];
        body = entry.record;
        entries.push_back(entry);
        entries.back().record = body;
    });
    NodeSource source = SnapshotSource(snapshot.get());
    for (size_t i = 0; i < entries.size(); i += 1 + entries.size() / 100) {
        const SnapshotEntry &entry = entries[i];
        std::string record(entry.record.size(), '\0');
        Params list;
        if (entry.kind == ENTRY_RECORD) {
            auto size = static_cast<u32>(record.size());
            Require(source.get(source.context, entry.node, entry.keys, record.data(), size) == 0);
            Require(record == entry.record);
        } else {
            Require(source.list(source.context, entry.node, entry.keys, &list) == 0);
            Require(list.size() == entry.list.size());
        }
    }
    auto again = std::make_unique<Snapshot>();
    Require(SnapshotParse(SnapshotEncode(draft), again.get()) == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    std::string file(reinterpret_cast<const char *>(data), size);
    Serve(file);
    std::string packed = Pack(file);
    std::string unpacked(size, '\0');
    Require(Unpack(packed, &unpacked) && unpacked == file);
    if (size >= SNAPSHOT_HEADER + SNAPSHOT_CHECKSUM) {
        std::string length;
        AppendNumber(&length, size, 8);
        file.replace(16, 8, length);
        file.resize(size - SNAPSHOT_CHECKSUM);
        AppendNumber(&file, Crc64(file), SNAPSHOT_CHECKSUM);
        Serve(file);
    }
    return 0;
}
