#include "corekit/entry/param_list.h"

#include <utility>

namespace {

constexpr uint32_t MAX_CAPACITY = 65536;

}  // namespace

KnfParamListRec *ParamListCreate(uint32_t kind, uint32_t capacity) {
    if ((kind != KNF_INPUT_LIST && kind != KNF_INSTANCE_LIST) || capacity > MAX_CAPACITY) {
        return nullptr;
    }
    auto *list = new KnfParamListRec{kind, capacity, {}};
    list->params.reserve(capacity);
    return list;
}

KnfParamListRec *ParamListFrom(const Params &params) {
    return new KnfParamListRec{KNF_INSTANCE_LIST, static_cast<uint32_t>(params.size()), params};
}

KnfStatus ParamListAdd(KnfParamListRec *list, KnfParamRec param) {
    if (list == nullptr) {
        return KNF_FAILURE;
    }
    if (list->params.size() >= list->capacity) {
        return STATUS_LIST_FULL;
    }
    list->params.push_back(std::move(param));
    return STATUS_OK;
}

void ParamListRemoveLast(KnfParamListRec *list) {
    if (list != nullptr && !list->params.empty()) {
        list->params.pop_back();
    }
}

KnfParamRec *ParamListAt(KnfParamListRec *list, uint32_t index) {
    return list != nullptr && index < list->params.size() ? &list->params[index] : nullptr;
}

const Params &ParamListParams(const KnfParamListRec *list) {
    static const Params none;
    return list != nullptr ? list->params : none;
}
