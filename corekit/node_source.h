// The seam between the library and whatever answers node operations: keys, status values, and the operations of a
// source. The library checks arguments, applies faults and keeps the journal; a source only looks nodes up, and knows
// no other. A further source fills a NodeSource; entry/library.cpp chooses it.
#pragma once

#include "interface/corekit.h"

#include <string>
#include <vector>

// A key of a node instance, an argument of a write, or an entry of an instance list.
struct KnfParamRec {
    bool isText = false;
    int64_t number = 0;
    std::string text;
};
using Params = std::vector<KnfParamRec>;

KnfParamRec ParamOf(int64_t number);
KnfParamRec ParamOf(const std::string &text);
bool ParamEqual(const KnfParamRec &left, const KnfParamRec &right);
// As it stands in journals and descriptions: a number, or a quoted string with \" \\ and \xHH.
void ParamAppendText(std::string *line, const KnfParamRec &param);

constexpr KnfStatus STATUS_OK = 0;
constexpr KnfStatus STATUS_NOT_CONNECTED = 0xbad0002;  // neither a host nor a snapshot is there to be read
constexpr KnfStatus STATUS_NOT_FOUND = 0xbad0003;      // no instance, or no list, under this node and these keys
constexpr KnfStatus STATUS_BAD_SIZE = 0xbad0004;       // the instance is there, its record has another size
constexpr KnfStatus STATUS_BAD_PARAM = 0xbad0005;      // null or unsuitable arguments, a list of the wrong kind
constexpr KnfStatus STATUS_LIST_FULL = 0xbad0006;
constexpr KnfStatus STATUS_NOT_WRITABLE = 0xbad0007;
constexpr KnfStatus STATUS_BAD_SIGNATURE = 0xbad0008;
constexpr KnfStatus STATUS_NOT_SNAPSHOT = 0xbad0009;
constexpr KnfStatus STATUS_SNAPSHOT_UNREADABLE = 0xbad000a;
constexpr KnfStatus STATUS_SNAPSHOT_VERSION = 0xbad000b;
constexpr KnfStatus STATUS_SNAPSHOT_TRUNCATED = 0xbad000c;
constexpr KnfStatus STATUS_SNAPSHOT_CORRUPT = 0xbad000d;
constexpr KnfStatus STATUS_UNTOLD = 0xbad0010;     // the kernel refuses, or lacks, what would tell
constexpr KnfStatus STATUS_SIMULATED = 0xbad000f;  // of a fault that names no status of its own

const char *StatusText(KnfStatus status);  // of every possible value

struct NodeSource {
    void *context;
    KnfStatus (*get)(void *context, uint32_t node, const Params &keys, void *record, uint32_t size);
    KnfStatus (*list)(void *context, uint32_t node, const Params &keys, Params *entries);
    // Null for a source that can't be written. The result buffer may be null, with size 0.
    KnfStatus (*set)(void *context, uint32_t node, const Params &keys, const Params &input, void *result,
                     uint32_t size);
    // The build text of the kernel that the source shows, terminated.
    const char *(*signature)(void *context);
    // Whether the input of a write may hold a text, as only operations of port histograms do: a caller whose text is
    // refused gives them up ahead of its reads. Null: always.
    bool (*takesText)(void *context) = nullptr;
};

constexpr char HOST_SIGNATURE[] = "Mar 14 2024 09:26:53";  // the build that programs are made against
