// Snapshots: files that hold the records and instance lists of a host as they stood at one moment, served as a source
// of nodes. docs/snapshot-format.md tells the format. A file is checked whole when it is opened, in time linear in its
// size. Memory is less than twice the file's size and room for a few unpacked pages and the list that is asked for; no
// number in a file makes the reader allocate more than that.
#pragma once

#include "corekit/node_source.h"
#include "corekit/snapshot/snapshot_pack.h"

#include <functional>
#include <map>
#include <vector>

constexpr std::string_view SNAPSHOT_MAGIC = "KNFSNAP\n";
constexpr u32 SNAPSHOT_VERSION = 1;
constexpr u32 SNAPSHOT_BYTE_ORDER = 0x01020304;  // stored as a record stores it
constexpr u32 SNAPSHOT_SIGNATURE = 64;           // bytes of the text's span
constexpr u32 SNAPSHOT_TIME = 24;                // where in the header its time begins
constexpr u32 SNAPSHOT_HEADER = 96;
constexpr u32 SNAPSHOT_CHECKSUM = 8;
constexpr u32 SNAPSHOT_PAGE = 512 * 1024;  // unpacked bytes of the largest page that is packed or has two entries
constexpr u64 SNAPSHOT_LIMIT = 1 << 30;    // bytes of the largest file
constexpr u32 SNAPSHOT_PARAMS = 1 << 18;   // keys of a name, entries of a list: in memory, each takes much more room

enum EntryKind : u8 { ENTRY_LIST = 'l', ENTRY_RECORD = 'r' };

// A part of the file that is unpacked as one. All its names lie below those of the next page.
struct LoadedPage {
    u32 at = 0;    // where it begins in the file; 0 while none is loaded
    u64 used = 0;  // the look-up that used it last
    std::string unpacked;
    std::string_view bytes;   // of `unpacked`, or of the file when the page is not packed
    std::vector<u32> places;  // where its entries begin in `bytes`; names ascend
};

// Stays where it was opened: its pages point into its bytes.
struct Snapshot {
    std::string file;
    std::string signature;
    u32 seconds = 0;  // the time in the header
    u32 nanoseconds = 0;
    std::vector<u32> pages;  // where each begins in the file
    u64 lookUps = 0;
    LoadedPage loaded[8];
};

// On 0 the snapshot can be served; any other status tells what is wrong with the file, and nothing may be served.
KnfStatus SnapshotOpen(const char *path, Snapshot *snapshot);
KnfStatus SnapshotParse(std::string file, Snapshot *snapshot);

NodeSource SnapshotSource(Snapshot *snapshot);

struct SnapshotEntry {
    EntryKind kind;
    u32 node;
    Params keys;
    Params list;
    std::string_view record;
};
// All entries in the order of their names. A visit that looks up others loses this one's record.
void SnapshotEach(Snapshot *snapshot, const std::function<void(const SnapshotEntry &)> &visit);

// What a snapshot is made of, unpacked.
struct SnapshotDraft {
    u32 seconds = 0;
    u32 nanoseconds = 0;
    std::string signature;
    std::map<std::string, std::string> entries;  // name to record, or to list
};

// Entries are found by name: the keys, then what it is, then the node. Bytewise order keeps what a port has together.
std::string SnapshotName(EntryKind kind, u32 node, const Params &keys);
void SnapshotAppendParam(std::string *bytes, const KnfParamRec &param);
std::string SnapshotEncode(const SnapshotDraft &draft);  // the whole file

// Afterwards `path` is this file, or what it was before. Returns 0 or an errno.
int SnapshotStore(const std::string &path, std::string_view file);

// Removes the partial files of PREFIX.NUMBER whose writers were killed. One that is still written stays.
void SnapshotClear(const std::string &prefix);
