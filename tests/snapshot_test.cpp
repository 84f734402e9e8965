// The format of snapshots and their reader.
#include "corekit/entry/control.h"
#include "corekit/entry/param_list.h"
#include "corekit/node_source.h"
#include "corekit/snapshot/snapshot.h"
#include "tests/failing_new.h"

#include <fstream>
#include <gtest/gtest.h>
#include <memory>
#include <sys/resource.h>
#include <unistd.h>

namespace {

using List = std::unique_ptr<KnfParamListRec, void (*)(KnfParamList)>;

List KeysOf(const Params &keys) {
    List list(KNF_ParamListCreate(KNF_INSTANCE_LIST, 2), KNF_ParamListDestroy);
    for (const KnfParamRec &key : keys) {
        key.isText ? KNF_ParamListAddString(list.get(), key.text.c_str()) : KNF_ParamListAddInt(list.get(), key.number);
    }
    return list;
}

KnfStatus Use(const std::string &file, u64 padding = 0) {
    KNF_CacheCleanup();
    std::string path = testing::TempDir() + "snapshot-" + std::to_string(getpid());
    std::ofstream(path, std::ios::binary) << file;
    EXPECT_EQ(truncate(path.c_str(), static_cast<off_t>(file.size() + padding)), 0);
    KnfStatus status = KNF_UseCache(path.c_str(), 0);
    unlink(path.c_str());
    return status;
}

KnfStatus Parse(const std::string &file) {
    return SnapshotParse(file, std::make_unique<Snapshot>().get());
}

KnfStatus Get(uint32_t node, const Params &keys, std::string *record) {
    return KNF_Get(node, KeysOf(keys).get(), record->data(), static_cast<uint32_t>(record->size()));
}

const Params PORT = {ParamOf("s"), ParamOf(int64_t{5})};

SnapshotDraft SmallDraft() {
    SnapshotDraft draft = {100, 900000000, "Mar 14 2024 09:26:53", {}};
    SnapshotAppendParam(&draft.entries[SnapshotName(ENTRY_LIST, 245, {})], ParamOf("s"));
    draft.entries[SnapshotName(ENTRY_RECORD, 269, PORT)] = std::string(90, 'x') + "0123456789";
    draft.entries[SnapshotName(ENTRY_RECORD, 270, PORT)] = std::string(64, 'y');
    return draft;
}

// The file with this change, and with length and checksum made right.
std::string Repaired(std::string file, size_t at, const std::string &bytes) {
    file.replace(at, bytes.size(), bytes);
    file.resize(file.size() - SNAPSHOT_CHECKSUM);
    std::string length;
    AppendNumber(&length, file.size() + SNAPSHOT_CHECKSUM, 8);
    file.replace(16, 8, length);
    AppendNumber(&file, Crc64(file), SNAPSHOT_CHECKSUM);
    return file;
}

}  // namespace

TEST(Snapshot, EveryChangeOfAByteAndEveryCutIsNoticed) {
    const std::string file = SnapshotEncode(SmallDraft());
    ASSERT_EQ(Parse(file), STATUS_OK);
    for (size_t at = 0; at < file.size(); at++) {
        EXPECT_EQ(Parse(file.substr(0, at)), STATUS_SNAPSHOT_TRUNCATED) << at;
        std::string changed = file;
        for (int step = 1; step < 256; step++) {
            changed[at]++;
            ASSERT_NE(Parse(changed), STATUS_OK) << at << " + " << step;
        }
    }
    EXPECT_EQ(Parse(file + '\0'), STATUS_SNAPSHOT_CORRUPT);
}

TEST(Snapshot, BadFilesAreToldApartAndNothingIsServed) {
    const std::string good = SnapshotEncode(SmallDraft());
    std::string flipped = good;
    flipped[SNAPSHOT_HEADER + 30] ^= 4;
    const std::tuple<std::string, const char *, u64> rows[] = {
        {"no snapshot", "Not a snapshot file", SNAPSHOT_LIMIT / 2},
        {good, "Snapshot file is corrupted", SNAPSHOT_LIMIT / 2},
        {"", "Snapshot file is truncated", 0},
        {good.substr(0, good.size() - 1), "Snapshot file is truncated", 0},
        {flipped, "Snapshot file is corrupted", 0},
        {Repaired(good, 8, {0, 0, 0, 2}), "Snapshot of another format version or byte order", 0},
        {Repaired(good, 12, {1, 2, 3, 4}), "Snapshot of another format version or byte order", 0},
        {"/nowhere/file", "Snapshot file can't be read", 0},
        {"/tmp", "Snapshot file can't be read", 0},
    };
    CorekitUnload();
    for (const auto &[file, text, padding] : rows) {
        std::string record(100, '\0');
        EXPECT_EQ(Use(good), STATUS_OK);
        EXPECT_EQ(Get(269, PORT, &record), STATUS_OK);
        KNF_CacheCleanup();
        KnfStatus status = file[0] == '/' ? KNF_UseCache(file.c_str(), 0) : Use(file, padding);
        EXPECT_STREQ(HCK_ReturnStatusToString(status), text);
        const char *ours = nullptr;
        char signature[21] = {};
        for (int cleaned = 0; cleaned < 2; cleaned++, KNF_CacheCleanup()) {
            EXPECT_NE(Get(269, PORT, &record), STATUS_OK) << text;
            EXPECT_NE(KNF_CheckSig(signature, sizeof signature, &ours), STATUS_OK) << text;
            EXPECT_STREQ(signature, "");
        }
    }
    rusage usage = {};
    getrusage(RUSAGE_SELF, &usage);
    EXPECT_LT(usage.ru_maxrss, 400 << 10) << "KiB: what the header tells was looked for behind it";
}

TEST(Snapshot, WhatTheFormatForbidsIsCorrupt) {
    // A list of that many empty texts, alone in its page but for what stands ahead of it when packed, and behind it.
    auto listed = [](size_t texts, const std::string &ahead = "", const std::string &behind = "") {
        SnapshotDraft draft;
        std::string sizes, &list = draft.entries[SnapshotName(ENTRY_LIST, 245, {})];
        while (list.size() < 2 * texts) {
            SnapshotAppendParam(&list, ParamOf(""));
        }
        AppendNumber(&sizes, 10 + list.size() + behind.size(), 4);
        AppendNumber(&sizes, 10 + list.size() + behind.size() + ahead.size(), 4);
        std::string file = SnapshotEncode(draft);
        file.insert(file.size() - SNAPSHOT_CHECKSUM, behind);
        return Repaired(file.insert(SNAPSHOT_HEADER + 18, ahead), SNAPSHOT_HEADER, sizes);
    };
    EXPECT_EQ(Parse(listed(SNAPSHOT_PARAMS)), STATUS_OK);
    const std::pair<std::string, const char *> rows[] = {
        {listed(SNAPSHOT_PARAMS + 1), "a list that is too long"},
        {listed(SNAPSHOT_PARAMS, "", SnapshotName(ENTRY_RECORD, 246, {}) + std::string(4, 0)), "a large page of two"},
        {listed(2, "\xe0"), "a packed page (one of 14 literals) that is larger than it is unpacked"},
        {Repaired(listed(2), 95, "x"), "a signature without an end"},
        {Repaired(listed(2), 80, "x"), "bytes behind a signature's end"},
    };
    for (const auto &[file, what] : rows) {
        EXPECT_EQ(Parse(file), STATUS_SNAPSHOT_CORRUPT) << what;
    }
}

TEST(Snapshot, EveryInstanceIsFoundAmongManyPages) {
    SnapshotDraft draft;
    for (int64_t port = -1; port < 20000; port += 2) {
        std::string record(700, static_cast<char>(port / 7));
        AppendNumber(&record, static_cast<u64>(port), 8);
        draft.entries[SnapshotName(ENTRY_RECORD, 269, {ParamOf(port)})] = record;
    }
    std::string ports;  // larger than a page
    for (int64_t port = 0; port < 100000; port++) {
        SnapshotAppendParam(&ports, ParamOf(port));
    }
    draft.entries[SnapshotName(ENTRY_LIST, 269, {ParamOf(int64_t{10001})})] = ports;
    ASSERT_EQ(Use(SnapshotEncode(draft)), STATUS_OK);
    for (int64_t i = 0; i < 10000; i += 3) {
        int64_t port = i * 7919 % 10000 * 2 - 1;
        std::string record(708, '\0');
        List key = KeysOf({ParamOf(port)});
        failingNew = static_cast<int>(i % 16);
        KNF_Get(269, key.get(), record.data(), 708);
        failingNew = 0;
        ASSERT_EQ(Get(269, {ParamOf(port)}, &record), STATUS_OK) << port << ", for which memory was short before";
        ASSERT_EQ(record, draft.entries[SnapshotName(ENTRY_RECORD, 269, {ParamOf(port)})]);
    }
    KnfParamList list = nullptr;
    ASSERT_EQ(KNF_GetInstanceListAlloc(269, KeysOf({ParamOf(int64_t{10001})}).get(), &list), STATUS_OK);
    KNF_CacheCleanup();
    EXPECT_EQ(KNF_ParamListUsedCount(list), 100000U) << "lists outlive their snapshot";
    EXPECT_EQ(KNF_ParamGetInt(KNF_ParamListGetParam(list, 99999)), 99999);
    KNF_ParamListDestroy(list);
    ASSERT_EQ(Use(SnapshotEncode(SmallDraft())), STATUS_OK);
    std::string record(100, '\0');
    EXPECT_EQ(Get(268, PORT, &record), STATUS_NOT_FOUND);
    EXPECT_EQ(Get(270, PORT, &record), STATUS_BAD_SIZE);
    EXPECT_EQ(KNF_Set(269, nullptr, nullptr, nullptr, 0), STATUS_NOT_WRITABLE);
}

TEST(Snapshot, LiteralsAndCopiesOfEveryLengthSurvivePacking) {
    for (size_t length = 0; length < 600; length++) {
        std::string bytes = std::string(length, 'x') + std::to_string(length * 7919);
        std::string unpacked(bytes.size(), '\0');
        EXPECT_TRUE(Unpack(Pack(bytes), &unpacked));
        EXPECT_EQ(unpacked, bytes);
    }
    EXPECT_EQ(Crc64("123456789"), 0x995dc9bbdf1939fa);  // the published check value
}
