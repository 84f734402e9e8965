// Failures on demand: rules that make calls of the library fail, or meet a signal, each with its own count of the calls
// that it matched. The library asks once a call; without rules that costs nothing.
#pragma once

#include "corekit/entry/param_list.h"

#include <vector>

struct Line;

enum CallKind : uint8_t {
    CALL_GET,
    CALL_LIST,
    CALL_SET,  // these three have a node
    CALL_CREATE,
    CALL_ADD,
    CALL_TEXT,
    CALL_SIGNATURE,
    CALL_CACHE,
    CALL_KINDS
};

struct FaultRule {
    uint32_t calls = 0;  // bit 1 << CallKind
    bool hasNode = false;
    uint32_t node = 0;
    Params keys;        // compared with a call's leading keys; empty matches every instance
    Params added;       // empty, or the one value whose adding fails
    uint64_t nth = 0;   // 0, or the only matching call that fails
    uint64_t from = 1;  // the first matching call that fails
    KnfStatus status = 0;
    int signal = 0;      // raised instead of a failure, when not 0
    uint32_t delay = 0;  // milliseconds that the call takes instead; it fails when a signal cuts it short
    uint64_t seen = 0;
};

struct FaultCall {
    CallKind kind;
    uint32_t node = 0;
    const KnfParamListRec *keys = nullptr;
    const KnfParamRec *added = nullptr;
};

// Counts the call in every rule that matches it. Returns the status of the first one that fails it, or 0.
KnfStatus FaultsCheck(std::vector<FaultRule> *rules, const FaultCall &call);

// Adds the rule that a line of a description tells, its keyword taken already.
void FaultsTake(Line *line, std::vector<FaultRule> *rules);
