// The C entry points: argument checks, faults, counts and journal around the current source of nodes.
#include "corekit/entry/library.h"
#include "corekit/entry/control.h"
#include "corekit/entry/format.h"
#include "corekit/entry/setting.h"
#include "corekit/simulated/default_host.h"
#include "corekit/simulated/description.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iterator>
#include <utility>

namespace {

constexpr int SCRIBBLE = 0xa5;  // what a call that failed leaves in the caller's buffer: nobody may use it

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

void CheckInit(const Params &arguments) {
    const Library &library = Lib();
    if (!std::equal(arguments.begin(), arguments.end(), std::begin({1, 0, 0}),
                    [](const KnfParamRec &given, int expected) { return given.number == expected; })) {
        Misuse("HckSyscall_Init", nullptr, arguments, "expected 1 0 0");
    }
    if (library.initialised || library.replaying) {
        Misuse("HckSyscall_Init", nullptr, arguments, library.replaying ? "during a replay" : "a second time");
    }
}

void CheckUseCache(const std::string &path, uint32_t flags) {
    if (flags != 0 || Lib().replaying) {
        Misuse("KNF_UseCache", nullptr, {ParamOf(path), ParamOf(flags)},
               flags != 0 ? "expected flags 0" : "a second time without KNF_CacheCleanup");
    }
}

KnfStatus Scribbled(KnfStatus status, void *buffer, uint32_t size) {
    if (status != STATUS_OK && buffer != nullptr) {
        memset(buffer, SCRIBBLE, size);
    }
    return status;
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
    bool whole = ferror(file) == 0;  // a directory opens and can't be read
    if (!whole) {
        fprintf(stderr, "%s: %s: expected %s\n", path, strerror(errno), expected);
    }
    fclose(file);
    return whole;
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
    const char *path = Setting("COREKIT_HOST");
    if (path != nullptr) {
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
    const char *path = Setting("COREKIT_FAULTS");
    std::optional<bool> *usable = &Lib().namedFaults;
    if (!usable->has_value() && path != nullptr) {
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

int HckSyscall_Init(int mode, int flags, int reserved) {
    return Contained(-1, [&] {
        Library &library = Lib();
        if (checkMode) [[unlikely]] {
            CheckInit({ParamOf(mode), ParamOf(flags), ParamOf(reserved)});
        }
        bool connected = library.loadedByControl || LoadNamed();
        library.initialised = true;  // behind the load, which makes the library anew
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
    return Contained(KNF_FAILURE, [&] {
        if (checkMode && size != KNF_SIGNATURE_SIZE) [[unlikely]] {
            Misuse("KNF_CheckSig", nullptr, {ParamOf(size)}, "expected a size of 21");
        }
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
        KnfStatus status = CheckCall({CALL_SIGNATURE});
        if (status == STATUS_OK) {
            KnfStatus differs = strcmp(kernel, HOST_SIGNATURE) == 0 ? STATUS_OK : STATUS_BAD_SIGNATURE;
            status = source == nullptr ? STATUS_NOT_CONNECTED : differs;
        }
        return Told(status, "signature", nullptr, {});
    });
}

KnfStatus KNF_Get(uint32_t node, KnfParamList instance, void *record, uint32_t size) {
    KnfStatus got = Contained(KNF_FAILURE, [&] {
        if (checkMode) [[unlikely]] {
            CheckList("KNF_Get", &node, instance);
        }
        KnfStatus status = CheckInstance({CALL_GET, node, instance});
        const Params &keys = ParamListParams(instance);
        if (status == STATUS_OK) {
            const NodeSource *source = Lib().current;
            status = record == nullptr ? STATUS_BAD_PARAM : source->get(source->context, node, keys, record, size);
        }
        return Told(status, "get", &node, keys);
    });
    return Scribbled(got, record, size);
}

KnfStatus KNF_Set(uint32_t node, KnfParamList instance, KnfParamList input, void *result, uint32_t size) {
    KnfStatus done = Contained(KNF_FAILURE, [&] {
        if (checkMode) [[unlikely]] {
            CheckList("KNF_Set", &node, instance);
            CheckList("KNF_Set", &node, input);
        }
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
    return Scribbled(done, result, size);
}

KnfStatus KNF_GetInstanceListAlloc(uint32_t node, KnfParamList instance, KnfParamList *list) {
    return Contained(KNF_FAILURE, [&] {
        if (checkMode) [[unlikely]] {
            CheckList("KNF_GetInstanceListAlloc", &node, instance);
            CheckOverwritten(node, ParamListParams(instance), list != nullptr ? *list : nullptr);
        }
        KnfStatus status = CheckInstance({CALL_LIST, node, instance});
        const Params &keys = ParamListParams(instance);
        Params entries;
        if (status == STATUS_OK) {
            const NodeSource *source = Lib().current;
            status = list == nullptr ? STATUS_BAD_PARAM : source->list(source->context, node, keys, &entries);
        }
        KnfParamList made = status == STATUS_OK ? ParamListFrom(node, std::move(entries)) : nullptr;
        if (checkMode && made != nullptr) [[unlikely]] {
            CheckMade(made, keys);
        }
        if (made != nullptr) {
            *list = made;
        }
        return Told(status, "list", &node, keys, nullptr, made != nullptr ? made->id : 0);
    });
}

// A file that can't be used leaves nothing to read, neither the snapshot before it nor the kernel.
KnfStatus KNF_UseCache(const char *path, uint32_t flags) {
    return Contained(KNF_FAILURE, [&] {
        Library &library = Lib();
        std::string name = path != nullptr ? path : "";
        if (checkMode) [[unlikely]] {
            CheckUseCache(name, flags);
        }
        library.replaying = true;
        library.current = nullptr;
        library.snapshot = std::make_unique<Snapshot>();
        KnfStatus status = AddNamedFaults() ? CheckCall({CALL_CACHE}) : STATUS_NOT_CONNECTED;
        if (status == STATUS_OK) {
            status = SnapshotOpen(name.c_str(), library.snapshot.get());
        }
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
    return Contained(KNF_FAILURE, [] {
        Library &library = Lib();
        library.replaying = false;
        library.snapshot = nullptr;
        library.current = library.live.get != nullptr ? &library.live : nullptr;
        return Told(STATUS_OK, "cache-cleanup", nullptr, {});
    });
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
    return {calls[CALL_GET],  calls[CALL_LIST],      calls[CALL_SET],   calls[CALL_CREATE], calls[CALL_ADD],
            calls[CALL_TEXT], calls[CALL_SIGNATURE], calls[CALL_CACHE], ParamListsAlive()};
}

void CorekitResetCounts() {
    std::fill(std::begin(Lib().calls), std::end(Lib().calls), uint64_t{0});
}

void CorekitCheck(bool on) {
    CheckSwitch(on);
}

void CorekitRecord(bool on) {
    JournalRecord(on);
}

const std::vector<std::string> &CorekitRecorded() {
    return JournalRecorded();
}
