// Failures of the C library on demand, for a build of the program whose calls the linker turns this way. In the
// environment LIBC_FAULT is "NAME N" with a name from below: the Nth such call of the program fails. "short" and
// "interrupted" are further ways for write to fail. With LIBC_COUNTS all calls are counted there at the end.
#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <sys/types.h>

extern "C" {
void *__real_malloc(size_t size);
void *__real_calloc(size_t count, size_t size);
void *__real_realloc(void *memory, size_t size);
ssize_t __real_write(int fd, const void *buffer, size_t size);
int __real_open64(const char *path, int flags, ...);
int __real_sigaction(int signal, const struct sigaction *action, struct sigaction *before);
int __real_timer_create(clockid_t clock, sigevent *event, timer_t *timer);
}

namespace {

enum Call { MALLOC, CALLOC, REALLOC, WRITE, OPEN, SIGACTION, TIMER, CALLS };
constexpr const char *NAMES[CALLS] = {"malloc", "calloc", "realloc", "write", "open", "sigaction", "timer_create"};

struct Plan {
    char name[32] = "";
    long nth = 0;
    long seen[CALLS] = {};

    Plan() {
        const char *text = std::getenv("LIBC_FAULT");
        if (text != nullptr && std::sscanf(text, "%31s %ld", name, &nth) != 2) {
            std::abort();
        }
    }
    ~Plan() {
        std::FILE *file = std::getenv("LIBC_COUNTS") == nullptr ? nullptr : std::fopen(std::getenv("LIBC_COUNTS"), "w");
        for (int call = 0; file != nullptr && call < CALLS; call++) {
            std::fprintf(file, "%s %ld\n", NAMES[call], seen[call]);
        }
        if (file != nullptr) {
            std::fclose(file);
        }
    }
};
Plan plan;

// Whether this call is the one that fails, under its own name or another.
bool Fails(const char *name, long count) {
    return count == plan.nth && std::strcmp(plan.name, name) == 0;
}

}  // namespace

extern "C" {

void *__wrap_malloc(size_t size) {
    return Fails("malloc", ++plan.seen[MALLOC]) ? nullptr : __real_malloc(size);
}

void *__wrap_calloc(size_t count, size_t size) {
    return Fails("calloc", ++plan.seen[CALLOC]) ? nullptr : __real_calloc(count, size);
}

void *__wrap_realloc(void *memory, size_t size) {
    return Fails("realloc", ++plan.seen[REALLOC]) ? nullptr : __real_realloc(memory, size);
}

ssize_t __wrap_write(int fd, const void *buffer, size_t size) {
    long count = ++plan.seen[WRITE];
    if (Fails("short", count)) {
        return __real_write(fd, buffer, size / 2);
    }
    errno = Fails("interrupted", count) ? EINTR : ENOSPC;
    return errno == EINTR || Fails("write", count) ? -1 : __real_write(fd, buffer, size);
}

int __wrap_open64(const char *path, int flags, ...) {
    errno = EMFILE;
    return Fails("open", ++plan.seen[OPEN]) ? -1 : __real_open64(path, flags, 0644);
}

int __wrap_sigaction(int signal, const struct sigaction *action, struct sigaction *before) {
    return Fails("sigaction", ++plan.seen[SIGACTION]) ? -1 : __real_sigaction(signal, action, before);
}

int __wrap_timer_create(clockid_t clock, sigevent *event, timer_t *timer) {
    return Fails("timer_create", ++plan.seen[TIMER]) ? -1 : __real_timer_create(clock, event, timer);
}
}
