// Parameter lists: the keys of a node instance, the input of a write, or the entries of an instance list. A list owns
// copies of its strings. Every operation is safe on a null list and on an index that is out of range.
#pragma once

#include "corekit/node_source.h"

struct KnfParamListRec {
    uint32_t kind;
    uint32_t capacity;
    uint32_t id;    // counts the lists of the process, from 1 on
    uint32_t node;  // whose instances it lists; 0 for a list that its user made
    Params params;  // reserved to capacity: entries stay where they are until they are removed
};

// Null for an unknown kind or an absurd capacity.
KnfParamListRec *ParamListCreate(uint32_t kind, uint32_t capacity);
KnfParamListRec *ParamListFrom(uint32_t node, Params params);  // an instance list
void ParamListDestroy(KnfParamListRec *list);
void ParamListRetire(KnfParamListRec *list);  // is alive no more, but not freed yet
uint64_t ParamListsAlive();
KnfStatus ParamListAdd(KnfParamListRec *list, KnfParamRec *param);  // takes its value, but only on 0
void ParamListRemoveLast(KnfParamListRec *list);
inline KnfParamRec *ParamListAt(KnfParamListRec *list, uint32_t index) {
    return list != nullptr && index < list->params.size() ? &list->params[index] : nullptr;
}

extern const Params &noParams;
inline const Params &ParamListParams(const KnfParamListRec *list) {
    return list != nullptr ? list->params : noParams;
}
