// Control of the stand-in from inside a process, for tests and tools: hosts and faults from text, counts of calls and
// their record. A host loaded here stays connected, and HckSyscall_Init then loads none over it.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#define COREKIT_EXPORTED __attribute__((visibility("default")))

struct CorekitCounts {
    uint64_t get = 0;
    uint64_t list = 0;  // KNF_GetInstanceListAlloc
    uint64_t set = 0;
    uint64_t create = 0;
    uint64_t add = 0;
    uint64_t text = 0;  // KNF_ParamListGetString
    uint64_t signature = 0;
    uint64_t cache = 0;  // KNF_UseCache
    uint64_t alive = 0;  // lists that were made and not destroyed; no reset changes it
};

// Replaces the host, all faults and all counts by those of a description. On false `*error` (may be null) holds
// "file:line: what, expected what", and neither host nor fault is left.
COREKIT_EXPORTED bool CorekitLoad(const std::string &description, std::string *error, const char *file = "text");

// As before any call: no source is connected, no fault is set, all counts are 0.
COREKIT_EXPORTED void CorekitUnload();

// Adds fault lines to those of the description; each counts the calls from now on. On false nothing was added.
COREKIT_EXPORTED bool CorekitFault(const std::string &lines, std::string *error = nullptr);

COREKIT_EXPORTED CorekitCounts CorekitCallCounts();
COREKIT_EXPORTED void CorekitResetCounts();

// Check mode, as COREKIT_CHECK has it. Switch it while no list is alive.
COREKIT_EXPORTED void CorekitCheck(bool on);

// While on, every call is kept as the text of its trace line. Switching on or off clears the record.
COREKIT_EXPORTED void CorekitRecord(bool on);
COREKIT_EXPORTED const std::vector<std::string> &CorekitRecorded();
