#include "corekit/linuxhost/tracking/tracking.h"

#include <dlfcn.h>
#include <string>
#include <unistd.h>

namespace {

// Folder of the file that holds this code, with the slash behind it; empty when it can't be told.
std::string OwnFolder() {
    Dl_info info = {};
    std::string file = dladdr(reinterpret_cast<void *>(TrackingOpen), &info) != 0 ? info.dli_fname : "";
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
