#include "corekit/entry/param_list.h"

#include <utility>

namespace {

constexpr uint32_t MAX_CAPACITY = 65536;
uint32_t made = 0;
uint64_t alive = 0;

KnfParamListRec *Count(KnfParamListRec *list) {
    list->id = ++made;
    alive++;
    return list;
}

}  // namespace

const Params &noParams = *new Params;  // never destroyed: calls may still come while the process ends

KnfParamListRec *ParamListCreate(uint32_t kind, uint32_t capacity) {
    if ((kind != KNF_INPUT_LIST && kind != KNF_INSTANCE_LIST) || capacity > MAX_CAPACITY) {
        return nullptr;
    }
    Params params;
    params.reserve(capacity);
    return Count(new KnfParamListRec{kind, capacity, 0, 0, std::move(params)});
}

KnfParamListRec *ParamListFrom(uint32_t node, Params params) {
    auto capacity = static_cast<uint32_t>(params.size());
    return Count(new KnfParamListRec{KNF_INSTANCE_LIST, capacity, 0, node, std::move(params)});
}

void ParamListDestroy(KnfParamListRec *list) {
    ParamListRetire(list);
    delete list;
}

void ParamListRetire(KnfParamListRec *list) {
    alive -= list != nullptr ? 1 : 0;
}

uint64_t ParamListsAlive() {
    return alive;
}

KnfStatus ParamListAdd(KnfParamListRec *list, KnfParamRec *param) {
    if (list == nullptr) {
        return KNF_FAILURE;
    }
    if (list->params.size() >= list->capacity) {
        return STATUS_LIST_FULL;
    }
    list->params.push_back(std::move(*param));
    return STATUS_OK;
}

void ParamListRemoveLast(KnfParamListRec *list) {
    if (list != nullptr && !list->params.empty()) {
        list->params.pop_back();
    }
}
