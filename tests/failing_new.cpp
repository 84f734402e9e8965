#include "tests/failing_new.h"

#include <cstddef>

int failingNew;

static bool Fails() {
    return failingNew > 0 && --failingNew == 0;
}

// The library brings an operator new of its own, which asks malloc; a sanitizer's library shares the test's.
#ifdef __SANITIZE_ADDRESS__
#include <dlfcn.h>
#include <new>

void *operator new(std::size_t size) {
    static auto *next = reinterpret_cast<void *(*)(std::size_t)>(dlsym(RTLD_NEXT, "_Znwm"));
    return Fails() ? throw std::bad_alloc() : next(size);
}
#else
extern "C" void *__libc_malloc(std::size_t size);

extern "C" void *malloc(std::size_t size) {
    return Fails() ? nullptr : __libc_malloc(size);
}
#endif
