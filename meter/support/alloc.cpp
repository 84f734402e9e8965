#include "meter/support/alloc.h"

#include "meter/support/log.h"

#include <cstdlib>

namespace {

void *Checked(void *memory, std::size_t size, const char *tag) {
    if (memory == nullptr) {
        Panic("Allocating %d bytes for %s failed\n", static_cast<int>(size), tag);
    }
    return memory;
}

}  // namespace

// A size of 0 asks for one byte: null stays the sign of a failure alone.
void *AllocOrPanic(std::size_t size, const char *tag) {
    return Checked(std::malloc(size == 0 ? 1 : size), size, tag);
}

void *AllocClearedOrPanic(std::size_t count, std::size_t size, const char *tag) {
    return Checked(std::calloc(count == 0 ? 1 : count, size), count * size, tag);
}
