#include "report/support/output.h"

#include "report/support/message.h"

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

namespace report {
namespace {

constexpr size_t kBuffer = 64 << 10;
constexpr int kEnding[] = {SIGINT, SIGTERM, SIGHUP};

// The file being written beside its place, for a signal that ends the program. A program has one at a time.
char unfinished[PATH_MAX];

// No signal comes between making or renaming that file and knowing of it.
struct Undisturbed {
    sigset_t before;
    Undisturbed() {
        sigset_t all;
        sigfillset(&all);
        sigprocmask(SIG_BLOCK, &all, &before);
    }
    ~Undisturbed() { sigprocmask(SIG_SETMASK, &before, nullptr); }
};

const char *NameOf(const Output *output) {
    return output->path.empty() ? "standard output" : output->path.c_str();
}

void Fail(Output *output, const char *what) {
    Tell("%s: %s: %s", NameOf(output), what, strerror(errno));
    output->state = OutputState::Failed;
}

// A pipe that another program set so says "try again" while it is full.
void WriteAll(Output *output, std::string_view rest) {
    while (output->state == OutputState::Fine && !rest.empty()) {
        ssize_t written = write(output->fd, rest.data(), rest.size());
        if (written >= 0) {
            rest.remove_prefix(static_cast<size_t>(written));
        } else if (errno == EPIPE) {
            output->state = OutputState::Closed;
        } else if (errno == EAGAIN) {
            pollfd entry = {output->fd, POLLOUT, 0};
            poll(&entry, 1, -1);
        } else if (errno != EINTR) {
            Fail(output, "write failed");
        }
    }
}

// A pipe or a device takes the text itself: nothing can be put into its place.
bool OpenDirectly(Output *output, const std::string &path) {
    struct stat status = {};
    if (stat(path.c_str(), &status) != 0 || S_ISREG(status.st_mode)) {
        return false;
    }
    output->fd = open(path.c_str(), O_WRONLY | O_CLOEXEC);
    if (output->fd < 0) {
        Fail(output, "can't open");
    }
    return true;
}

// Makes the file beside its place. -1, with errno, when it can't.
int MakeBeside(std::string *beside) {
    if (beside->size() >= sizeof unfinished) {
        errno = ENAMETOOLONG;
        return -1;
    }
    Undisturbed undisturbed;
    int fd = mkostemp(beside->data(), O_CLOEXEC);
    if (fd >= 0) {
        std::memcpy(unfinished, beside->c_str(), beside->size() + 1);
    }
    return fd;
}

void EndBySignals() {
    for (int number : kEnding) {
        struct sigaction before = {};
        if (sigaction(number, nullptr, &before) == 0 && before.sa_handler == SIG_DFL) {
            signal(number, OutputEnd);
        }
    }
}

}  // namespace

void OutputEnd(int number) {
    if (unfinished[0] != '\0') {
        unlink(unfinished);
    }
    signal(number, SIG_DFL);
    raise(number);
}

void OutputFirstSignal(void (*handler)(int)) {
    struct sigaction action = {};
    action.sa_handler = handler;
    action.sa_flags = SA_RESTART;
    for (int number : kEnding) {
        struct sigaction before = {};
        if (sigaction(number, nullptr, &before) == 0 && before.sa_handler != SIG_IGN) {
            sigaction(number, &action, nullptr);
        }
    }
}

void OutputOpen(Output *output, const std::string &path) {
    *output = Output{};
    if (path.empty() || path == "-") {
        output->fd = STDOUT_FILENO;
        return;
    }
    output->path = path;
    if (OpenDirectly(output, path)) {
        return;
    }
    if (char *whole = realpath(path.c_str(), nullptr)) {
        output->path = whole;  // not the link to it
        free(whole);
    }
    std::string beside = output->path + ".XXXXXX";
    EndBySignals();
    output->fd = MakeBeside(&beside);
    if (output->fd < 0) {
        Fail(output, "can't write beside it");
        return;
    }
    output->beside = beside;
    mode_t mask = umask(0);
    umask(mask);
    fchmod(output->fd, 0666 & ~mask);
}

bool OutputCreate(Output *output, const std::string &path) {
    *output = Output{};
    output->path = path;
    output->fd = open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_APPEND | O_CLOEXEC, 0666);
    return output->fd >= 0;
}

void OutputWrite(Output *output, std::string_view text) {
    if (output->pending.size() + text.size() >= kBuffer) {
        OutputFlush(output);
        WriteAll(output, text);
    } else if (output->state == OutputState::Fine) {
        output->pending += text;
    }
}

OutputState OutputFlush(Output *output) {
    WriteAll(output, output->pending);
    output->pending.clear();
    return output->state;
}

OutputState OutputClose(Output *output, bool keep) {
    OutputFlush(output);
    if (output->path.empty() || output->fd < 0) {
        return output->state;
    }
    keep = keep && output->state == OutputState::Fine;
    int closed = close(output->fd);
    output->fd = -1;
    if (closed != 0 && keep) {
        Fail(output, "close failed");
    }
    if (output->beside.empty()) {
        return output->state;
    }
    Undisturbed undisturbed;
    unfinished[0] = '\0';
    if (keep && output->state == OutputState::Fine && rename(output->beside.c_str(), output->path.c_str()) != 0) {
        Fail(output, "can't put it into its place");
    }
    if (!keep || output->state != OutputState::Fine) {
        unlink(output->beside.c_str());
    }
    output->beside.clear();
    return output->state;
}

}  // namespace report
