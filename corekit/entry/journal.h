// The lines that tell from outside what a run asked of the library: the journal of writes, the trace of all calls, and
// the same lines kept in memory for tests. Each line leaves with one write, so that it survives a kill.
#pragma once

#include "corekit/entry/param_list.h"

#include <string>
#include <vector>

extern bool journalSilent;  // known to have no reader
bool JournalAsked(bool isSet);
// True when some reader wants a line of this call. Cheap; callers build the line only then.
inline bool JournalWanted(bool isSet) {
    return !journalSilent && JournalAsked(isSet);
}
void JournalLine(bool isSet, std::string line);

void JournalRecord(bool on);  // starts with an empty record
const std::vector<std::string> &JournalRecorded();

// "NAME [NODE] KEYS... [: INPUT...] -> 0xSTATUS [#LIST]"; no list has the number 0.
std::string CallText(const char *name, const uint32_t *node, const Params &keys, const Params *input, KnfStatus status,
                     uint32_t list);
