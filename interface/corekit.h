// The node interface: the operations of libcorekit.so, the hypervisor's support library, as this program uses them.
// Kernel counters are published as numbered nodes; a list of parameters (keys) names one instance of a node.
// A list belongs to whoever created it or received it from KNF_GetInstanceListAlloc, until KNF_ParamListDestroy.
// A KnfParam and the text of a string parameter belong to their list and live as long as it does.
// No call throws: what runs out of memory fails. All calls still work while the process ends, in handlers of atexit and
// in destructors. The library knows one thread.
#pragma once

#include <cstdarg>
#include <cstddef>
#include <cstdint>

#pragma GCC visibility push(default)  // of the library, which hides all else
extern "C" {

typedef uint32_t KnfStatus;  // 0 is success; any other value is a failure, told apart only by its text
typedef struct KnfParamListRec *KnfParamList;
typedef struct KnfParamRec *KnfParam;

// Connects the process to the live kernel. Called once, with 1, 0, 0, ahead of every other operation; never in replay.
int HckSyscall_Init(int mode, int flags, int reserved);

// A constant text for every value.
const char *HCK_ReturnStatusToString(KnfStatus status);

// 0 when the running kernel (or the snapshot in use) has the interface that the program was built against. Otherwise
// `kernelSig` receives the kernel's build text, which may fill all `size` bytes, and `programSig` the program's. `size`
// is always KNF_SIGNATURE_SIZE.
KnfStatus KNF_CheckSig(char *kernelSig, uint32_t size, const char **programSig);

// Reads the one instance that the list names; a null list names the only instance of its node. What a failed call
// leaves in `record` or `result` is of no use.
KnfStatus KNF_Get(uint32_t node, KnfParamList instance, void *record, uint32_t size);
KnfStatus KNF_Set(uint32_t node, KnfParamList instance, KnfParamList input, void *result, uint32_t size);

// On 0 `*list` is a new list, owned by the caller; on a failure it stays as it was. It holds no list that is alive.
KnfStatus KNF_GetInstanceListAlloc(uint32_t node, KnfParamList instance, KnfParamList *list);

// Kind 1 names an instance, kind 0 carries the input of a write. Null on failure.
KnfParamList KNF_ParamListCreate(uint32_t kind, uint32_t capacity);
KnfStatus KNF_ParamListAddInt(KnfParamList list, int64_t value);
KnfStatus KNF_ParamListAddString(KnfParamList list, const char *text);
void KNF_ParamListRemoveLastParam(KnfParamList list);
uint32_t KNF_ParamListUsedCount(KnfParamList list);
// Entries are taken for what they are: those of an instance list are all texts or all integers, as its node has it.
KnfParam KNF_ParamListGetParam(KnfParamList list, uint32_t index);
int64_t KNF_ParamGetInt(KnfParam param);
const char *KNF_ParamGetString(KnfParam param);
KnfStatus KNF_ParamListGetString(KnfParamList list, uint32_t index, const char **text);
void KNF_ParamListDestroy(KnfParamList list);

// From now on reads are served from this snapshot file; KNF_CacheCleanup releases it, and comes ahead of the next one,
// even where the file can't be used. `flags` is always 0.
KnfStatus KNF_UseCache(const char *path, uint32_t flags);
KnfStatus KNF_CacheCleanup(void);

int Str_Snprintf(char *buffer, size_t size, const char *format, ...) __attribute__((format(printf, 3, 4)));

// The length of the text when all of it fits `size` bytes with its terminator; 0 or a negative number when not.
int Str_Vsnprintf(char *buffer, size_t size, const char *format, va_list arguments)
    __attribute__((format(printf, 3, 0)));
}
#pragma GCC visibility pop

constexpr KnfStatus KNF_FAILURE = 0xbad0001;  // the one failure that the program makes by itself
constexpr uint32_t KNF_SIGNATURE_SIZE = 21;
constexpr uint32_t KNF_INPUT_LIST = 0;
constexpr uint32_t KNF_INSTANCE_LIST = 1;
