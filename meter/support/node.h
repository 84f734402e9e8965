// Reading nodes: the one typed read, and guards for what a read needs for a while. A list of a module is a stack of
// keys: the fixed ones stay in it, a varying one is added ahead of a read and removed behind it.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"

#include <type_traits>

// Reads one instance into its record, whose type fixes the size. Texts of a record end at the latest with the last
// byte of their span: a record with texts says so in a member EndTexts, which runs behind each good read.
template <typename Record>
KnfStatus NodeGet(u32 node, KnfParamList instance, Record *record) {
    static_assert(std::is_trivially_copyable_v<Record>);
    KnfStatus status = KNF_Get(node, instance, record, sizeof(Record));
    if constexpr (requires { record->EndTexts(); }) {
        if (status == 0) {
            record->EndTexts();
        }
    }
    return status;
}

// The same for a record that is read again and again and outlives a failure: it changes only with a good read, whatever
// a failed one left behind.
template <typename Record>
KnfStatus NodeUpdate(u32 node, KnfParamList instance, Record *record) {
    Record fresh;
    KnfStatus status = NodeGet(node, instance, &fresh);
    if (status == 0) {
        *record = fresh;
    }
    return status;
}

// Ends the text in a span of a record by its last byte, whatever that held.
template <std::size_t Size>
void EndText(char (&span)[Size]) {
    span[Size - 1] = '\0';
}

// A key in a list for the life of the guard. A key that could not be added is not removed. A list that could not be
// made takes none.
struct VaryingKey {
    KnfParamList list;
    KnfStatus status;  // of the addition

    VaryingKey(KnfParamList keys, i64 value)
        : list(keys), status(keys != nullptr ? KNF_ParamListAddInt(keys, value) : KNF_FAILURE) {}
    VaryingKey(KnfParamList keys, const char *text)
        : list(keys), status(keys != nullptr ? KNF_ParamListAddString(keys, text) : KNF_FAILURE) {}
    VaryingKey(const VaryingKey &) = delete;
    VaryingKey &operator=(const VaryingKey &) = delete;
    ~VaryingKey() {
        if (status == 0) {
            KNF_ParamListRemoveLastParam(list);
        }
    }
};

// A list that ends with its scope.
struct LocalList {
    KnfParamList list;

    explicit LocalList(KnfParamList owned = nullptr) : list(owned) {}
    LocalList(const LocalList &) = delete;
    LocalList &operator=(const LocalList &) = delete;
    ~LocalList() {
        if (list != nullptr) {
            KNF_ParamListDestroy(list);
        }
    }
};

// Destroys a list that a module keeps and forgets it, so that later steps see that it is gone.
inline void DropList(KnfParamList *list) {
    if (*list != nullptr) {
        KNF_ParamListDestroy(*list);
        *list = nullptr;
    }
}
