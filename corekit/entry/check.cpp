#include "corekit/entry/check.h"

#include "corekit/entry/setting.h"
#include "corekit/nodes.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <functional>
#include <new>
#include <unordered_map>
#include <utility>

bool checkMode = Setting("COREKIT_CHECK") != nullptr;

namespace {

constexpr size_t GONE_KEPT = 10000;
constexpr char PATTERN = '\xa5';

// A sanitizer keeps freed addresses back by itself, and sees each use of what lies there.
#ifdef __SANITIZE_ADDRESS__
constexpr bool FREE_AT_ONCE = true;
#else
constexpr bool FREE_AT_ONCE = false;
#endif

struct GoneList {
    uintptr_t address;
    uint32_t id;
    std::string keys;
    KnfParamListRec *list;  // null when it was freed at once
};

struct Lists {
    // By the complement of the address, so that a list whose handle is lost looks lost to a leak checker as well. The
    // text is what an instance list was asked for with; other lists tell their keys themselves.
    std::unordered_map<uintptr_t, std::string> alive;
    std::deque<GoneList> gone;  // the latest last
};

// Never destroyed: calls may still come while the process ends.
Lists &Known() {
    alignas(Lists) static char place[sizeof(Lists)];
    static auto *lists = new (place) Lists;
    return *lists;
}

uintptr_t Address(const KnfParamListRec *list) {
    return ~reinterpret_cast<uintptr_t>(list);
}

const KnfParamListRec *ListAt(uintptr_t address) {
    return reinterpret_cast<const KnfParamListRec *>(~address);  // NOLINT(performance-no-int-to-ptr): hidden on purpose
}

std::string KeysText(const uint32_t *node, const Params &keys) {
    std::string text = node != nullptr ? ' ' + std::to_string(*node) : "";
    for (const KnfParamRec &key : keys) {
        text += ' ';
        ParamAppendText(&text, key);
    }
    return text;
}

// Of a list that is alive.
std::string KeysOf(const KnfParamListRec *list) {
    return list->node != 0 ? Known().alive.at(Address(list)) : KeysText(nullptr, list->params);
}

[[noreturn]] void Fatal(const char *call, const std::string &keys, const std::string &what) {
    std::string line = std::string("corekit: misuse: ") + call + keys + ": " + what + "\n";
    fputs(line.c_str(), stderr);
    abort();
}

std::string Named(uint32_t id) {
    return "list #" + std::to_string(id);
}

const GoneList *FindGone(const KnfParamListRec *list) {
    const std::deque<GoneList> &gone = Known().gone;
    auto found =
        std::find_if(gone.rbegin(), gone.rend(), [&](const GoneList &g) { return g.address == Address(list); });
    return found != gone.rend() ? &*found : nullptr;
}

// The list that holds an entry; null for an entry of none that is alive.
const KnfParamListRec *Holder(const KnfParamRec *param) {
    for (const auto &[address, keys] : Known().alive) {
        const KnfParamListRec *list = ListAt(address);
        if (!std::less<>()(param, list->params.data()) &&
            std::less<>()(param, list->params.data() + list->params.size())) {
            return list;
        }
    }
    return nullptr;
}

// More lists at the end than the program keeps on purpose, which COREKIT_LISTS_AT_EXIT tells.
struct AtExit {
    ~AtExit() {
        const char *most = checkMode ? Setting("COREKIT_LISTS_AT_EXIT") : nullptr;
        if (most == nullptr || ParamListsAlive() <= strtoull(most, nullptr, 10)) {
            return;
        }
        const KnfParamListRec *latest = nullptr;
        for (const auto &[address, keys] : Known().alive) {
            const KnfParamListRec *list = ListAt(address);
            latest = latest == nullptr || list->id > latest->id ? list : latest;
        }
        Fatal("exit", latest != nullptr ? KeysOf(latest) : "",
              std::to_string(ParamListsAlive()) + " lists are alive, expected at most " + most + "; the latest is " +
                  Named(latest != nullptr ? latest->id : 0));
    }
} atExit;

}  // namespace

void CheckSwitch(bool on) {
    Known().alive.clear();
    checkMode = on;
}

void Misuse(const char *call, const uint32_t *node, const Params &keys, const std::string &what) {
    Fatal(call, KeysText(node, keys), what);
}

void CheckMade(KnfParamListRec *list, const Params &keys) {
    try {
        Known().alive.emplace(Address(list), list->node != 0 ? KeysText(&list->node, keys) : "");
    } catch (const std::bad_alloc &) {
        ParamListDestroy(list);
        throw;
    }
}

void CheckList(const char *call, const uint32_t *node, const KnfParamListRec *list) noexcept {
    if (list == nullptr || Known().alive.contains(Address(list))) {
        return;
    }
    const GoneList *gone = FindGone(list);
    Fatal(call, KeysText(node, {}) + (gone != nullptr ? gone->keys : ""),
          gone != nullptr ? Named(gone->id) + " was destroyed" : "no list that is alive");
}

void CheckOverwritten(uint32_t node, const Params &keys, const KnfParamListRec *handle) {
    if (handle != nullptr && Known().alive.contains(Address(handle))) {
        Misuse("KNF_GetInstanceListAlloc", &node, keys,
               "overwrites the handle of " + Named(handle->id) + ", which is alive");
    }
}

void CheckIndex(const char *call, const KnfParamListRec *list, uint32_t index) noexcept {
    CheckList(call, nullptr, list);
    size_t size = ParamListParams(list).size();
    if (index >= size) {
        Fatal(call, list != nullptr ? KeysOf(list) : "",
              "entry " + std::to_string(index) + " of " + std::to_string(size) + ", " +
                  (list != nullptr ? Named(list->id) : "a null list"));
    }
}

void CheckType(const char *call, const KnfParamRec *param, bool asText) noexcept {
    if (param == nullptr || param->isText == asText) {
        return;
    }
    const KnfParamListRec *list = Holder(param);
    if (list == nullptr || NodeEntries(list->node) != (asText ? TEXTS : NUMBERS)) {
        std::string entry;
        ParamAppendText(&entry, *param);
        Fatal(call, list != nullptr ? KeysOf(list) : "",
              std::string(asText ? "the text" : "the integer") + " of " + entry + ", " +
                  (list != nullptr ? Named(list->id) : "of no list that is alive"));
    }
}

void CheckDestroy(KnfParamListRec *list) {
    CheckList("KNF_ParamListDestroy", nullptr, list);
    if (list == nullptr) {
        return;
    }
    Lists &known = Known();
    try {
        known.gone.push_back({Address(list), list->id, KeysOf(list), nullptr});
    } catch (const std::bad_alloc &) {
        known.alive.erase(Address(list));
        return ParamListDestroy(list);
    }
    known.alive.erase(Address(list));
    for (KnfParamRec &param : list->params) {
        std::fill(param.text.begin(), param.text.end(), PATTERN);
        memset(&param.number, PATTERN, sizeof param.number);
    }
    if (FREE_AT_ONCE) {
        ParamListDestroy(list);
    } else {
        ParamListRetire(list);
        known.gone.back().list = list;
    }
    if (known.gone.size() > GONE_KEPT) {
        delete known.gone.front().list;
        known.gone.pop_front();
    }
}
