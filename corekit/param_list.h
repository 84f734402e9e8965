// Parameter lists: the keys of a node instance, the input of a write, or the entries of an instance list. A list owns
// copies of its strings. Every operation is safe on a null list and on an index that is out of range.
#pragma once

#include "corekit/exported.h"

#include <string>
#include <vector>

struct KnfParamRec {
    bool isText = false;
    int64_t number = 0;
    std::string text;
};

struct KnfParamListRec {
    uint32_t kind;
    uint32_t capacity;
    std::vector<KnfParamRec> params;  // reserved to capacity: entries stay where they are until they are removed
};

using Params = std::vector<KnfParamRec>;

KnfParamRec ParamOf(int64_t number);
KnfParamRec ParamOf(const std::string &text);
bool ParamEqual(const KnfParamRec &left, const KnfParamRec &right);
// As it stands in journals and descriptions: a number, or a quoted string with \" \\ and \xHH.
void ParamAppendText(std::string *line, const KnfParamRec &param);

// Null for an unknown kind or an absurd capacity.
KnfParamListRec *ParamListCreate(uint32_t kind, uint32_t capacity);
KnfParamListRec *ParamListFrom(const Params &params);  // an instance list
KnfStatus ParamListAdd(KnfParamListRec *list, KnfParamRec param);
void ParamListRemoveLast(KnfParamListRec *list);
KnfParamRec *ParamListAt(KnfParamListRec *list, uint32_t index);
const Params &ParamListParams(const KnfParamListRec *list);  // a null list has none
