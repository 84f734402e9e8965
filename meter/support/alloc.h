// Memory that is there or ends the run. A tag names an allocation in the message of its failure. All of it is freed
// with `free`; most of it lives until the process ends.
#pragma once

#include "interface/types.h"

#include <new>
#include <type_traits>

// Never null; not cleared.
void *AllocOrPanic(std::size_t size, const char *tag);

// Never null; cleared. The pages of a large array cost nothing until they are used.
void *AllocClearedOrPanic(std::size_t count, std::size_t size, const char *tag);

// A record, or an array of `count` of them, with its members' defaults and zero for the rest.
template <typename Record>
Record *AllocRecord(const char *tag) {
    static_assert(std::is_trivially_destructible_v<Record>);
    return new (AllocOrPanic(sizeof(Record), tag)) Record{};
}

template <typename Record>
Record *AllocArray(std::size_t count, const char *tag) {
    static_assert(std::is_trivially_copyable_v<Record> && std::is_trivially_default_constructible_v<Record>);
    return static_cast<Record *>(AllocClearedOrPanic(count, sizeof(Record), tag));
}
