#include "tests/run_meter.h"

#include "corekit/entry/control.h"

#include <csignal>
#include <cstdlib>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <sys/wait.h>
#include <unistd.h>

namespace {

// What the program inherits is the same everywhere: nohup, for one, ignores SIGHUP.
const bool signalsAsUsual = [] {
    for (int signal : {SIGINT, SIGTERM, SIGHUP, SIGPIPE, SIGXFSZ}) {
        std::signal(signal, SIG_DFL);
    }
    sigset_t none;
    sigemptyset(&none);
    return sigprocmask(SIG_SETMASK, &none, nullptr) == 0;
}();

// All tests run in check mode, and so do the programs that they start.
const bool checked = [] {
    CorekitCheck(true);
    return setenv("COREKIT_CHECK", "1", 1) == 0;
}();

// A directory of its own, with links to the binaries and the data, whose own paths may hold blanks.
const std::string &Directory() {
    static const std::string directory = [] {
        char name[] = "/tmp/meter-test-XXXXXX";
        EXPECT_NE(mkdtemp(name), nullptr);
        std::string path = std::string(name) + "/";
        EXPECT_EQ(symlink(BUILD_DIRECTORY, (path + "build").c_str()), 0);
        EXPECT_EQ(symlink(DATA_DIRECTORY, (path + "data").c_str()), 0);
        return path;
    }();
    static const struct Cleaner {
        std::string path = directory;
        ~Cleaner() { (void)std::system(("rm -rf " + path).c_str()); }
    } cleaner;
    return directory;
}

}  // namespace

nlohmann::json MeterRun::Document() const {
    nlohmann::json document = nlohmann::json::parse(out, nullptr, false);
    EXPECT_FALSE(document.is_discarded()) << "not JSON: " << out << err;
    return document;
}

nlohmann::json MeterRun::Port(unsigned long long number, std::size_t iteration) const {
    nlohmann::json document = Document();
    for (const auto &port : document.at("stats").at(iteration).at("ports")) {
        if (port.value("id", 0ULL) == number) {
            return port;
        }
    }
    return {};
}

MeterRun RunMeter(const std::string &host, const std::string &arguments, const RunOptions &options) {
    return RunScript(host, "$METER >out 2>err " + arguments, options);
}

MeterRun RunScript(const std::string &host, const std::string &script, const RunOptions &options) {
    for (const char *left : {"out", "err", "trace", "journal"}) {
        unlink((Directory() + left).c_str());
    }
    std::string build = Directory() + "build/";
    std::string meter = "env COREKIT_TRACE=trace COREKIT_JOURNAL=journal " + options.environment;
    if (!host.empty()) {
        WriteRunFile("host.txt", host);
    }
    meter += host.empty() ? " COREKIT_HOST=demo" : " COREKIT_HOST=host.txt";
    if (!options.realClock) {
        meter += " ASAN_OPTIONS=verify_asan_link_order=0 LD_PRELOAD=" + build + "libfixed_clock.so";
    }
    WriteRunFile("script", "METER='" + meter + " " + build + "lan-meter'\n" + script + "\n");
    int status = std::system(("cd " + Directory() + " && sh ./script").c_str());
    int code = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    EXPECT_EQ(Count(RunFile("err"), "corekit: misuse: "), 0U) << RunFile("err");
    return {code, RunFile("out"), RunFile("err"), RunFile("trace"), RunFile("journal")};
}

std::string RunFile(const std::string &name) {
    std::ifstream file(Directory() + name, std::ios::binary);
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
}

void WriteRunFile(const std::string &name, const std::string &text) {
    std::ofstream(Directory() + name, std::ios::binary) << text;
}

std::size_t Count(const std::string &text, const std::string &part) {
    std::size_t count = 0;
    for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + part.size())) {
        count++;
    }
    return count;
}

std::string Steps(const std::string &record, const std::string &counters) {
    std::istringstream words(counters);
    std::ostringstream out;
    for (unsigned long long at, size, from, by; words >> at >> size >> from >> by;) {
        from += by != 0 && size == 8 ? 1ULL << 53 : 0;
        unsigned long long most = ~0ULL >> (64 - 8 * size);  // where a counter wraps
        out << "field " << record << " at=" << at << " width=" << size << " start=" << from
            << " then=4:" << ((from + by) & most) << "\n";
    }
    return out.str();
}
