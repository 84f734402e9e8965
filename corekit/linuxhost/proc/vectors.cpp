#include "corekit/linuxhost/proc/vectors.h"

#include <algorithm>
#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

namespace {

constexpr u32 LIMIT = 65536;

bool Plain(const std::string &name) {
    return !name.empty() && name.find('/') == std::string::npos && name != "." && name != "..";
}

bool IsVector(u64 number) {
    return number != 0 && number <= INT32_MAX;
}

// The numbers that a directory has as names.
std::vector<u32> Numbers(const ProcRoot &root, const std::string &path) {
    std::vector<u32> numbers;
    int descriptor = openat(root.sys, path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    DIR *directory = descriptor >= 0 ? fdopendir(descriptor) : nullptr;
    if (directory == nullptr && descriptor >= 0) {
        close(descriptor);
    }
    while (const dirent *entry = directory != nullptr ? readdir(directory) : nullptr) {
        u64 number = 0;
        if (ProcNumber(entry->d_name, &number) && IsVector(number)) {
            numbers.push_back(static_cast<u32>(number));
        }
    }
    if (directory != nullptr) {
        closedir(directory);
    }
    std::sort(numbers.begin(), numbers.end());
    return numbers;
}

// The line of a device that has no messages, or doesn't use them: 0 stands for none.
std::vector<u32> Line(const ProcRoot &root, const std::string &path) {
    ProcBuffer buffer;
    std::string_view text;
    u64 number = 0;
    bool told = ProcReadOnce(root.sys, path, LIMIT, &buffer, &text) == FINE && ProcTakeNumber(&text, &number);
    return told && IsVector(number) ? std::vector<u32>{static_cast<u32>(number)} : std::vector<u32>();
}

}  // namespace

std::vector<u32> VectorsOf(const ProcRoot &root, const std::string &bus, const std::string &device) {
    if (root.sys < 0 || !Plain(bus) || !Plain(device)) {
        return {};
    }
    std::string place = "bus/" + bus + "/devices/" + device + (bus == "virtio" ? "/../" : "/");
    std::vector<u32> vectors = Numbers(root, place + "msi_irqs");
    return vectors.empty() ? Line(root, place + "irq") : vectors;
}

std::vector<std::string> VectorActions(const ProcRoot &root, u32 vector) {
    ProcBuffer buffer;
    std::string_view text;
    std::vector<std::string> actions;
    if (root.sys >= 0) {
        ProcReadOnce(root.sys, "kernel/irq/" + std::to_string(vector) + "/actions", LIMIT, &buffer, &text);
    }
    std::string_view line = ProcTakeLine(&text);
    while (!line.empty()) {
        size_t end = std::min(line.find(','), line.size());
        if (end != 0) {
            actions.emplace_back(line.substr(0, end));
        }
        line.remove_prefix(std::min(end + 1, line.size()));
    }
    return actions;
}
