// The C entry points of parameter lists.
#include "corekit/entry/library.h"

namespace {

uint32_t NumberOf(const KnfParamListRec *list) {
    return list != nullptr ? list->id : 0;
}

// The line of a call that has at most one value, built only when it is wanted.
KnfStatus ToldOf(KnfStatus status, const char *name, const KnfParamListRec *list, const KnfParamRec *value) {
    if (JournalWanted(false)) [[unlikely]] {
        Contained(status, [&] {
            return Told(status, name, nullptr, value != nullptr ? Params{*value} : Params(), nullptr, NumberOf(list));
        });
    }
    return status;
}

KnfStatus AddParam(const char *call, KnfParamList list, KnfParamRec param) {
    if (checkMode) [[unlikely]] {
        CheckList(call, nullptr, list);
    }
    KnfStatus status = CheckCall({CALL_ADD, 0, nullptr, &param});
    const NodeSource *source = Lib().current;
    bool written = param.isText && list != nullptr && list->kind == KNF_INPUT_LIST;
    if (status == STATUS_OK && written && source != nullptr && source->takesText != nullptr &&
        !source->takesText(source->context)) {
        status = STATUS_NOT_WRITABLE;
    }
    if (status == STATUS_OK) {
        status = ParamListAdd(list, &param);
    }
    const Params &held = ParamListParams(list);
    return ToldOf(status, "add", list, status == STATUS_OK && !held.empty() ? &held.back() : &param);
}

KnfStatus EntryText(KnfParamList list, uint32_t index, const char **text) {
    const KnfParamRec *param = ParamListAt(list, index);
    if (param == nullptr || !param->isText || text == nullptr) {
        return STATUS_BAD_PARAM;
    }
    *text = param->text.c_str();
    return STATUS_OK;
}

KnfStatus WatchedEntryText(KnfParamList list, uint32_t index, const char **text) {
    if (checkMode) {
        CheckIndex("KNF_ParamListGetString", list, index);
        CheckType("KNF_ParamListGetString", ParamListAt(list, index), true);
    }
    KnfStatus status = CheckCall({CALL_TEXT});
    const KnfParamRec told = ParamOf(index);
    return ToldOf(status == STATUS_OK ? EntryText(list, index, text) : status, "text", list, &told);
}

}  // namespace

extern "C" {

KnfParamList KNF_ParamListCreate(uint32_t kind, uint32_t capacity) {
    return Contained(KnfParamList{nullptr}, [&] {
        KnfStatus status = CheckCall({CALL_CREATE});
        KnfParamList list = status == STATUS_OK ? ParamListCreate(kind, capacity) : nullptr;
        if (status == STATUS_OK && list == nullptr) {
            status = STATUS_BAD_PARAM;
        }
        if (checkMode && list != nullptr) [[unlikely]] {
            CheckMade(list, {});
        }
        if (JournalWanted(false)) {
            Contained(status, [&] {
                return Told(status, "create", nullptr, {ParamOf(kind), ParamOf(capacity)}, nullptr, NumberOf(list));
            });
        }
        return list;
    });
}

KnfStatus KNF_ParamListAddInt(KnfParamList list, int64_t value) {
    return Contained(KNF_FAILURE, [&] { return AddParam("KNF_ParamListAddInt", list, ParamOf(value)); });
}

KnfStatus KNF_ParamListAddString(KnfParamList list, const char *text) {
    return Contained(KNF_FAILURE, [&] {
        return text == nullptr ? ToldOf(STATUS_BAD_PARAM, "add", list, nullptr)
                               : AddParam("KNF_ParamListAddString", list, ParamOf(std::string(text)));
    });
}

void KNF_ParamListRemoveLastParam(KnfParamList list) {
    if (checkMode) [[unlikely]] {
        CheckList("KNF_ParamListRemoveLastParam", nullptr, list);
    }
    const Params &params = ParamListParams(list);
    ToldOf(STATUS_OK, "remove", list, params.empty() ? nullptr : &params.back());
    ParamListRemoveLast(list);
}

uint32_t KNF_ParamListUsedCount(KnfParamList list) {
    if (checkMode) [[unlikely]] {
        CheckList("KNF_ParamListUsedCount", nullptr, list);
    }
    return static_cast<uint32_t>(ParamListParams(list).size());
}

KnfParam KNF_ParamListGetParam(KnfParamList list, uint32_t index) {
    if (checkMode) [[unlikely]] {
        CheckIndex("KNF_ParamListGetParam", list, index);
    }
    KnfParam param = ParamListAt(list, index);
    if (param == nullptr) {
        KnfParamRec told = ParamOf(index);
        ToldOf(STATUS_BAD_PARAM, "beyond", list, &told);
    }
    return param;
}

int64_t KNF_ParamGetInt(KnfParam param) {
    if (checkMode) [[unlikely]] {
        CheckType("KNF_ParamGetInt", param, false);
    }
    return param != nullptr ? param->number : 0;
}

const char *KNF_ParamGetString(KnfParam param) {
    if (checkMode) [[unlikely]] {
        CheckType("KNF_ParamGetString", param, true);
    }
    return param != nullptr ? param->text.c_str() : "";
}

// A search asks for every name of a host, once for each port: what is rare stays out of its way.
KnfStatus KNF_ParamListGetString(KnfParamList list, uint32_t index, const char **text) {
    Library &library = Lib();
    if (checkMode || !library.faults.empty() || JournalWanted(false)) [[unlikely]] {
        return Contained(KNF_FAILURE, [&] { return WatchedEntryText(list, index, text); });
    }
    library.calls[CALL_TEXT]++;
    return EntryText(list, index, text);
}

void KNF_ParamListDestroy(KnfParamList list) {
    if (checkMode) [[unlikely]] {
        CheckList("KNF_ParamListDestroy", nullptr, list);
    }
    Told(STATUS_OK, list != nullptr ? "destroy" : "destroy-null", nullptr, ParamListParams(list), nullptr,
         NumberOf(list));
    if (checkMode) [[unlikely]] {
        Contained(STATUS_BAD_PARAM, [&] { return CheckDestroy(list), STATUS_OK; });
    } else {
        ParamListDestroy(list);
    }
}
}
