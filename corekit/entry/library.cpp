// The C entry points: argument checks, faults, counts and journal around the current source of nodes.
#include "corekit/entry/control.h"
#include "corekit/entry/faults.h"
#include "corekit/entry/format.h"
#include "corekit/entry/journal.h"
#include "corekit/linuxhost/source.h"
#include "corekit/node_source.h"
#include "corekit/simulated/default_host.h"
#include "corekit/simulated/description.h"
#include "corekit/simulated/host.h"
#include "corekit/snapshot/snapshot.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <memory>
#include <new>
#include <optional>
#include <utility>

namespace {

struct LinuxHostCloser {
    void operator()(LinuxHost *host) const { LinuxHostClose(host); }
};

struct Library {
    std::unique_ptr<Host> host;  // at most one of these two
    std::unique_ptr<LinuxHost, LinuxHostCloser> machine;
    NodeSource live = {};                // of it; its functions are null while nothing is connected
    std::unique_ptr<Snapshot> snapshot;  // the one in use
    NodeSource cache = {};
    const NodeSource *current = nullptr;  // what reads are served from; null while nothing is connected
    bool loadedByControl = false;
    std::vector<FaultRule> faults;
    std::optional<bool> namedFaults;  // whether COREKIT_FAULTS could be used, once it was looked at
    uint64_t calls[CALL_KINDS] = {};
};

constexpr int SCRIBBLE = 0xa5;  // what a refused read leaves in the record: nobody may use it

// Never destroyed: calls may still come while the process ends.
Library &Lib() {
    static auto *library = new Library;
    return *library;
}

KnfStatus CheckCall(const FaultCall &call) {
    Library &library = Lib();
    library.calls[call.kind]++;
    return library.faults.empty() ? STATUS_OK : FaultsCheck(&library.faults, call);
}

KnfStatus CheckInstance(const FaultCall &call) {
    KnfStatus status = CheckCall(call);
    if (status == STATUS_OK && call.keys != nullptr && call.keys->kind != KNF_INSTANCE_LIST) {
        status = STATUS_BAD_PARAM;
    }
    if (status == STATUS_OK && Lib().current == nullptr) {
        status = STATUS_NOT_CONNECTED;
    }
    return status;
}

KnfStatus Told(KnfStatus status, const char *name, const uint32_t *node, const Params &keys,
               const Params *input = nullptr) {
    if (JournalWanted(input != nullptr)) {
        JournalLine(input != nullptr, CallText(name, node, keys, input, status));
    }
    return status;
}

// No exception leaves the library: memory that is exhausted is a failed call.
template <typename Result, typename Body>
Result Contained(Result failed, Body body) {
    try {
        return body();
    } catch (const std::bad_alloc &) {
        return failed;
    }
}

KnfStatus AddParam(KnfParamList list, KnfParamRec param) {
    KnfStatus status = CheckCall({CALL_ADD, 0, nullptr, &param});
    const NodeSource *source = Lib().current;
    if (status == STATUS_OK && source != nullptr && source->withoutHistograms && param.isText && list != nullptr &&
        list->kind == KNF_INPUT_LIST) {
        status = STATUS_NOT_WRITABLE;
    }
    Params told;
    if (JournalWanted(false)) {
        told = {param};
    }
    if (status == STATUS_OK) {
        status = ParamListAdd(list, std::move(param));
    }
    if (!told.empty()) {
        Told(status, "add", nullptr, told);
    }
    return status;
}

// Null past the end, where a caller that counts right never looks.
KnfParamRec *Entry(KnfParamList list, uint32_t index) {
    KnfParamRec *param = ParamListAt(list, index);
    if (param == nullptr) {
        Contained(STATUS_BAD_PARAM, [&] { return Told(STATUS_BAD_PARAM, "beyond", nullptr, {ParamOf(index)}); });
    }
    return param;
}

bool Load(const std::string &text, const char *file, std::string *error) {
    Library &library = Lib();
    CorekitUnload();
    auto host = std::make_unique<Host>();
    auto fault = [&library](Line *line) { FaultsTake(line, &library.faults); };
    if (!DescriptionLoad(text, file, host.get(), fault, error)) {
        library.faults.clear();
        return false;
    }
    library.host = std::move(host);
    library.live = HostSource(library.host.get());
    library.current = &library.live;
    return true;
}

void LoadMachine() {
    Library &library = Lib();
    CorekitUnload();
    library.machine.reset(LinuxHostOpen());
    library.live = LinuxHostSource(library.machine.get());
    library.current = &library.live;
}

// A file that opens and can't be read, as a directory, is an empty one.
bool ReadNamed(const char *path, const char *expected, std::string *text) {
    FILE *file = fopen(path, "re");
    if (file == nullptr) {
        fprintf(stderr, "%s: %s: expected %s\n", path, strerror(errno), expected);
        return false;
    }
    char piece[4096];
    text->clear();
    for (size_t length; (length = fread(piece, 1, sizeof piece, file)) > 0;) {
        text->append(piece, length);
    }
    fclose(file);
    return true;
}

bool LoadDescribed(const char *path) {
    std::string text = DefaultHostText();
    if (strcmp(path, "demo") != 0 && !ReadNamed(path, "a readable host description", &text)) {
        return false;
    }
    std::string error;
    bool loaded = Load(text, path, &error);
    if (!loaded) {
        fprintf(stderr, "%s\n", error.c_str());
    }
    return loaded;
}

// This machine, unless COREKIT_HOST names another host.
bool LoadNamed() {
    const char *path = getenv("COREKIT_HOST");
    if (path != nullptr && *path != 0) {
        return LoadDescribed(path);
    }
    LoadMachine();
    return true;
}

bool AddFaults(const std::string &lines, const char *file, std::string *error) {
    std::vector<FaultRule> added;
    bool valid = DescriptionFaults(
        lines, file, [&added](Line *line) { FaultsTake(line, &added); }, error);
    if (valid) {
        Lib().faults.insert(Lib().faults.end(), added.begin(), added.end());
    }
    return valid;
}

// Faults of a file, for whatever source connects. One that can't be used connects none, so that no test passes for want
// of its faults.
bool AddNamedFaults() {
    const char *path = getenv("COREKIT_FAULTS");
    std::optional<bool> *usable = &Lib().namedFaults;
    if (!usable->has_value() && path != nullptr && *path != 0) {
        std::string text;
        std::string error;
        *usable = ReadNamed(path, "a readable file of faults", &text) && AddFaults(text, path, &error);
        if (!error.empty()) {
            fprintf(stderr, "%s\n", error.c_str());
        }
    }
    return usable->value_or(true);
}

}  // namespace

extern "C" {

int HckSyscall_Init(int, int, int) {
    return Contained(-1, [&] {
        Library &library = Lib();
        bool connected = library.loadedByControl || LoadNamed();
        if (connected && !AddNamedFaults()) {
            connected = false;
            library.live = {};
            library.current = nullptr;
        }
        Told(connected ? STATUS_OK : STATUS_NOT_CONNECTED, "init", nullptr, {});
        return connected ? 0 : -1;
    });
}

const char *HCK_ReturnStatusToString(KnfStatus status) {
    return StatusText(status);
}

KnfStatus KNF_CheckSig(char *kernelSig, uint32_t size, const char **programSig) {
    const NodeSource *source = Lib().current;
    const char *kernel = source != nullptr ? source->signature(source->context) : "";
    if (kernelSig != nullptr && size > 0) {
        size_t length = strlen(kernel);
        memset(kernelSig, 0, size);
        memcpy(kernelSig, kernel, length < size ? length : size);
    }
    if (programSig != nullptr) {
        *programSig = HOST_SIGNATURE;
    }
    KnfStatus differs = strcmp(kernel, HOST_SIGNATURE) == 0 ? STATUS_OK : STATUS_BAD_SIGNATURE;
    return Told(source == nullptr ? STATUS_NOT_CONNECTED : differs, "signature", nullptr, {});
}

KnfStatus KNF_Get(uint32_t node, KnfParamList instance, void *record, uint32_t size) {
    return Contained(KNF_FAILURE, [&] {
        KnfStatus status = CheckInstance({CALL_GET, node, instance});
        const Params &keys = ParamListParams(instance);
        if (status == STATUS_OK) {
            const NodeSource *source = Lib().current;
            status = record == nullptr ? STATUS_BAD_PARAM : source->get(source->context, node, keys, record, size);
        } else if (record != nullptr) {
            memset(record, SCRIBBLE, size);
        }
        return Told(status, "get", &node, keys);
    });
}

KnfStatus KNF_Set(uint32_t node, KnfParamList instance, KnfParamList input, void *result, uint32_t size) {
    return Contained(KNF_FAILURE, [&] {
        KnfStatus status = CheckInstance({CALL_SET, node, instance});
        const Params &keys = ParamListParams(instance);
        const Params &arguments = ParamListParams(input);
        if (status == STATUS_OK && input != nullptr && input->kind != KNF_INPUT_LIST) {
            status = STATUS_BAD_PARAM;
        }
        if (status == STATUS_OK) {
            const NodeSource *source = Lib().current;
            status = source->set == nullptr ? STATUS_NOT_WRITABLE
                                            : source->set(source->context, node, keys, arguments, result, size);
        }
        return Told(status, "set", &node, keys, &arguments);
    });
}

KnfStatus KNF_GetInstanceListAlloc(uint32_t node, KnfParamList instance, KnfParamList *list) {
    return Contained(KNF_FAILURE, [&] {
        KnfStatus status = CheckInstance({CALL_LIST, node, instance});
        const Params &keys = ParamListParams(instance);
        Params entries;
        if (status == STATUS_OK) {
            const NodeSource *source = Lib().current;
            status = list == nullptr ? STATUS_BAD_PARAM : source->list(source->context, node, keys, &entries);
        }
        if (status == STATUS_OK) {
            *list = ParamListFrom(entries);
        }
        return Told(status, "list", &node, keys);
    });
}

KnfParamList KNF_ParamListCreate(uint32_t kind, uint32_t capacity) {
    return Contained(KnfParamList{nullptr}, [&] {
        KnfStatus status = CheckCall({CALL_CREATE});
        KnfParamList list = status == STATUS_OK ? ParamListCreate(kind, capacity) : nullptr;
        if (status == STATUS_OK && list == nullptr) {
            status = STATUS_BAD_PARAM;
        }
        if (JournalWanted(false)) {
            Told(status, "create", nullptr, {ParamOf(kind), ParamOf(capacity)});
        }
        return list;
    });
}

KnfStatus KNF_ParamListAddInt(KnfParamList list, int64_t value) {
    return Contained(KNF_FAILURE, [&] { return AddParam(list, ParamOf(value)); });
}

KnfStatus KNF_ParamListAddString(KnfParamList list, const char *text) {
    return Contained(KNF_FAILURE, [&] {
        return text == nullptr ? Told(STATUS_BAD_PARAM, "add", nullptr, {})
                               : AddParam(list, ParamOf(std::string(text)));
    });
}

void KNF_ParamListRemoveLastParam(KnfParamList list) {
    if (JournalWanted(false)) {
        const Params &params = ParamListParams(list);
        Told(STATUS_OK, "remove", nullptr, params.empty() ? params : Params{params.back()});
    }
    ParamListRemoveLast(list);
}

uint32_t KNF_ParamListUsedCount(KnfParamList list) {
    return static_cast<uint32_t>(ParamListParams(list).size());
}

KnfParam KNF_ParamListGetParam(KnfParamList list, uint32_t index) {
    return Entry(list, index);
}

int64_t KNF_ParamGetInt(KnfParam param) {
    return param != nullptr ? param->number : 0;
}

const char *KNF_ParamGetString(KnfParam param) {
    return param != nullptr ? param->text.c_str() : "";
}

KnfStatus KNF_ParamListGetString(KnfParamList list, uint32_t index, const char **text) {
    const KnfParamRec *param = Entry(list, index);
    if (param == nullptr || !param->isText || text == nullptr) {
        return STATUS_BAD_PARAM;
    }
    *text = param->text.c_str();
    return STATUS_OK;
}

void KNF_ParamListDestroy(KnfParamList list) {
    Told(STATUS_OK, list != nullptr ? "destroy" : "destroy-null", nullptr, ParamListParams(list));
    delete list;
}

// A file that can't be used leaves nothing to read, neither the snapshot before it nor the kernel.
KnfStatus KNF_UseCache(const char *path, uint32_t) {
    return Contained(KNF_FAILURE, [&] {
        Library &library = Lib();
        std::string name = path != nullptr ? path : "";
        library.current = nullptr;
        library.snapshot = std::make_unique<Snapshot>();
        KnfStatus status = AddNamedFaults() ? SnapshotOpen(name.c_str(), library.snapshot.get()) : STATUS_NOT_CONNECTED;
        if (status == STATUS_OK) {
            library.cache = SnapshotSource(library.snapshot.get());
            library.current = &library.cache;
        } else {
            library.snapshot = nullptr;
        }
        return Told(status, "cache", nullptr, {ParamOf(name)});
    });
}

// Reads go to the kernel again, if the process is connected to it.
KnfStatus KNF_CacheCleanup(void) {
    Library &library = Lib();
    library.snapshot = nullptr;
    library.current = library.live.get != nullptr ? &library.live : nullptr;
    return Told(STATUS_OK, "cache-cleanup", nullptr, {});
}

int Str_Vsnprintf(char *buffer, size_t size, const char *format, va_list arguments) {
    int length = FormatText(buffer, size, format, arguments);  // NOLINT(clang-analyzer-valist.Uninitialized): callers'
    return length >= 0 && static_cast<size_t>(length) < size ? length : -1;
}

int Str_Snprintf(char *buffer, size_t size, const char *format, ...) {
    va_list arguments;
    va_start(arguments, format);
    int length = Str_Vsnprintf(buffer, size, format, arguments);
    va_end(arguments);
    return length;
}
}

bool CorekitLoad(const std::string &description, std::string *error, const char *file) {
    std::string problem;
    bool loaded = Load(description, file, &problem);
    Lib().loadedByControl = loaded;
    if (error != nullptr) {
        *error = problem;
    }
    return loaded;
}

void CorekitUnload() {
    Lib() = Library();
}

bool CorekitFault(const std::string &lines, std::string *error) {
    std::string problem;
    bool valid = AddFaults(lines, "fault", &problem);
    if (error != nullptr) {
        *error = problem;
    }
    return valid;
}

CorekitCounts CorekitCallCounts() {
    const uint64_t *calls = Lib().calls;
    return {calls[CALL_GET], calls[CALL_LIST], calls[CALL_SET], calls[CALL_CREATE], calls[CALL_ADD]};
}

void CorekitResetCounts() {
    std::fill(std::begin(Lib().calls), std::end(Lib().calls), uint64_t{0});
}

void CorekitRecord(bool on) {
    JournalRecord(on);
}

const std::vector<std::string> &CorekitRecorded() {
    return JournalRecorded();
}
