#include "corekit/linuxhost/tracking/tracking.h"

#include <dlfcn.h>
#include <link.h>
#include <string>
#include <unistd.h>

namespace {

// The file that this process runs; empty when it can't be told.
std::string Program() {
    char path[4096];
    ssize_t length = readlink("/proc/self/exe", path, sizeof path);
    return length > 0 && length < static_cast<ssize_t>(sizeof path) ? std::string(path, static_cast<size_t>(length))
                                                                    : "";
}

// Folder of the file that holds this code, with the slash behind it; empty when it can't be told. The loader has no
// name for the program itself, and that which it was called by may be anything.
std::string OwnFolder() {
    Dl_info info = {};
    void *found = nullptr;
    if (dladdr1(reinterpret_cast<void *>(TrackingOpen), &info, &found, RTLD_DL_LINKMAP) == 0) {
        return "";
    }
    const char *library = static_cast<const link_map *>(found)->l_name;
    std::string file = *library != 0 ? library : Program();
    return file.substr(0, file.rfind('/') + 1);  // of a bare name nothing
}

// Beside the library, or as seen from a command. Only under whole names: the loader looks for a bare one where the
// environment says.
void *OpenFile(std::string *reason) {
    std::string own = OwnFolder();
    for (const char *folder : {"", LIBRARY_FOLDER}) {
        std::string file = own + folder + TRACKING_FILE;
        if (own.empty() || access(file.c_str(), F_OK) != 0) {
            continue;
        }
        void *handle = dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL);
        const char *error = handle == nullptr ? dlerror() : nullptr;
        *reason = error != nullptr ? error : file;
        return handle;
    }
    *reason = std::string(TRACKING_FILE) + " is not installed";
    return nullptr;
}

const TrackingTable *Open(std::string *reason) {
    void *handle = OpenFile(reason);
    const void *symbol = handle != nullptr ? dlsym(handle, TRACKING_SYMBOL) : nullptr;
    const auto *table = static_cast<const TrackingTable *>(symbol);
    if (table != nullptr && table->version != TRACKING_VERSION) {
        *reason += " is of another version";
        return nullptr;
    }
    if (handle != nullptr && table == nullptr) {
        *reason += " is no tracking part";
    }
    return table;
}

}  // namespace

const TrackingTable *TrackingOpen(const char **reason) {
    static std::string text;
    static const TrackingTable *const table = Open(&text);
    *reason = table != nullptr ? "" : text.c_str();
    return table;
}
