// Check mode: a program that misuses the interface ends with SIGABRT behind one line on standard error, which names the
// call, its node and keys, and what is wrong, so that no test can miss it. COREKIT_CHECK=1 switches it on. Without it
// each call costs one look at a flag, and nothing else here runs.
#pragma once

#include "corekit/entry/param_list.h"

extern bool checkMode;

// While no list is alive: lists that were made under the other mode are not known.
void CheckSwitch(bool on);

// "corekit: misuse: CALL [NODE] KEYS...: WHAT"
[[noreturn]] void Misuse(const char *call, const uint32_t *node, const Params &keys, const std::string &what);

// A new list, and for an instance list the keys that it was asked for with. Without memory for that the list goes.
void CheckMade(KnfParamListRec *list, const Params &keys);
// These return when all is well, and ask for memory only when it is not, so that nothing is ever thrown.
// That the list is null or alive. `node` may be null.
void CheckList(const char *call, const uint32_t *node, const KnfParamListRec *list) noexcept;
// That a handle which is about to be overwritten is no list's that is alive.
void CheckOverwritten(uint32_t node, const Params &keys, const KnfParamListRec *handle);
// That it is alive and has an entry of this index.
void CheckIndex(const char *call, const KnfParamListRec *list, uint32_t index) noexcept;
// That an entry is taken for what it is. Entries of an instance list are what its node lists: where a host lists
// anything else, the caller has no way to know.
void CheckType(const char *call, const KnfParamRec *param, bool asText) noexcept;
// Takes the list over. Its texts are overwritten, and its address is not given out again for a while.
void CheckDestroy(KnfParamListRec *list);
