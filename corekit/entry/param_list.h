// Parameter lists: the keys of a node instance, the input of a write, or the entries of an instance list. A list owns
// copies of its strings. Every operation is safe on a null list and on an index that is out of range.
#pragma once

#include "corekit/node_source.h"

struct KnfParamListRec {
    uint32_t kind;
    uint32_t capacity;
    Params params;  // reserved to capacity: entries stay where they are until they are removed
};

// Null for an unknown kind or an absurd capacity.
KnfParamListRec *ParamListCreate(uint32_t kind, uint32_t capacity);
KnfParamListRec *ParamListFrom(const Params &params);  // an instance list
KnfStatus ParamListAdd(KnfParamListRec *list, KnfParamRec param);
void ParamListRemoveLast(KnfParamListRec *list);
KnfParamRec *ParamListAt(KnfParamListRec *list, uint32_t index);
const Params &ParamListParams(const KnfParamListRec *list);  // a null list has none
