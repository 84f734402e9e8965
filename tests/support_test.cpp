#include "meter/support/elapsed.h"
#include "meter/support/log.h"
#include "meter/support/number.h"
#include "meter/support/report.h"

#include <cstdio>
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <limits>
#include <signal.h>
#include <string>
#include <sys/resource.h>
#include <thread>
#include <unistd.h>

namespace {

// A report on a pipe, whose reading end the test holds.
struct PipeReport {
    char buffer[64] = {};
    int ends[2];
    ReportBuf report;

    PipeReport() {
        EXPECT_EQ(pipe2(ends, O_NONBLOCK), 0);
        signal(SIGPIPE, SIG_IGN);
        report = {ends[1], 0, buffer, sizeof buffer, 0, 0, false};
    }
    ~PipeReport() {
        close(ends[0]);
        close(ends[1]);
    }
    std::string Take() const {
        char text[65536];
        ssize_t size = read(ends[0], text, sizeof text);
        return {text, size > 0 ? static_cast<std::size_t>(size) : 0};
    }
};

const char *statusText = nullptr;  // in place of the library's

std::string StderrOf(const auto &action) {
    testing::internal::CaptureStderr();
    action();
    return testing::internal::GetCapturedStderr();
}

TEST(Report, TextsGoOutWholeAndInOrder) {
    PipeReport pipe;
    std::string text(40, 'a');
    ReportPrintf(&pipe.report, "%s", text.c_str());
    EXPECT_EQ(pipe.Take(), "") << "flushed ahead of need";
    ReportPrintf(&pipe.report, "%s", std::string(40, 'b').c_str());
    EXPECT_EQ(pipe.Take(), text) << "a text that fits only an empty buffer flushes what precedes it";
    ReportPrintf(&pipe.report, "%s", std::string(23, 'c').c_str());
    EXPECT_EQ(pipe.report.fill, 63) << "a text that fills the buffer to its terminator is complete";
    EXPECT_EQ(ReportFlush(&pipe.report), 0U);
    EXPECT_EQ(pipe.Take(), std::string(40, 'b') + std::string(23, 'c'));
}

TEST(Report, TextLongerThanTheBufferGoesToStandardErrorAlone) {
    PipeReport pipe;
    std::string message = StderrOf([&] { ReportPrintf(&pipe.report, "x%s", std::string(63, 'y').c_str()); });
    EXPECT_EQ(message, "No Space in buffer. Resize output buffer from 64 bytes\nx" + std::string(63, 'y'));
    ReportPrintf(&pipe.report, "on it goes");
    ReportFlush(&pipe.report);
    EXPECT_EQ(pipe.Take(), "on it goes");
}

// As a pipe is that another program set so.
TEST(Report, DescriptorThatSaysTryAgainIsWaitedFor) {
    PipeReport pipe;
    std::string filling(4096, 'f');
    while (write(pipe.ends[1], filling.data(), filling.size()) > 0) {
    }
    std::thread reader([&pipe] {
        usleep(50000);
        while (pipe.Take().size() == 65536) {
        }
    });
    ReportPrintf(&pipe.report, "late");
    EXPECT_EQ(StderrOf([&pipe] { EXPECT_EQ(ReportFlush(&pipe.report), 0U); }), "");
    reader.join();
}

// A file-size limit lets a part of a write through, as a disk that fills up does.
TEST(Report, ShortWriteSendsNoByteTwice) {
    PipeReport pipe;
    char room[4096];
    pipe.report.buffer = room;
    pipe.report.capacity = sizeof room;
    std::FILE *file = std::tmpfile();
    pipe.report.outFd = fileno(file);
    signal(SIGXFSZ, SIG_IGN);
    rlimit limit = {1000, RLIM_INFINITY};
    setrlimit(RLIMIT_FSIZE, &limit);
    std::string text(1010, 't');
    ReportPrintf(&pipe.report, "%s", text.c_str());
    std::string message = StderrOf([&] {
        EXPECT_EQ(ReportFlush(&pipe.report), KNF_FAILURE);
        EXPECT_EQ(ReportFlush(&pipe.report), KNF_FAILURE);
    });
    std::string head = "Unable to write to fd " + std::to_string(pipe.report.outFd) + ". Error ";
    EXPECT_EQ(message, head + "Success\n" + head + "File too large\n");
    EXPECT_EQ(pipe.report.fill, 1010);
    ReportPrintf(&pipe.report, "ghi");
    limit.rlim_cur = RLIM_INFINITY;
    setrlimit(RLIMIT_FSIZE, &limit);
    EXPECT_EQ(ReportFlush(&pipe.report), 0U);
    char seen[4096] = {};
    EXPECT_EQ(pread(pipe.report.outFd, seen, sizeof seen, 0), 1013);
    EXPECT_EQ(seen, text + "ghi");
    std::fclose(file);
}

TEST(Report, FailedFlushAheadOfATextGivesUpForGood) {
    PipeReport pipe;
    close(pipe.ends[0]);
    ReportPrintf(&pipe.report, "%s", std::string(50, 'a').c_str());
    std::string message = StderrOf([&] {
        EXPECT_EQ(ReportFlush(&pipe.report), KNF_FAILURE);
        EXPECT_FALSE(pipe.report.gaveUp) << "a failed flush by itself changes nothing";
        for (int i = 0; i < 5; i++) {
            ReportPrintf(&pipe.report, "%s", std::string(50, 'b').c_str());
        }
        EXPECT_EQ(ReportFlush(&pipe.report), KNF_FAILURE);
    });
    std::string line = "Unable to write to fd " + std::to_string(pipe.ends[1]) + ". Error Broken pipe\n";
    EXPECT_EQ(message, line + line);
    EXPECT_TRUE(pipe.report.gaveUp);
}

TEST(Log, LevelsFilterAllButPanic) {
    auto say = [] {
        LogMsg(0, "a%d\n", 1);
        LogMsg(1, "b\n");
        LogStatus(2, KNF_FAILURE, "c\n");
    };
    std::string status = HCK_ReturnStatusToString(KNF_FAILURE);
    EXPECT_EQ(StderrOf(say), "Log0: a1\n");
    logLevel = 2;
    EXPECT_EQ(StderrOf(say), "Log0: a1\nLog1: b\nLog2 Status: " + status + ". Message: c\n");
    logLevel = -1;
    EXPECT_EQ(StderrOf(say), "");
    logLevel = 0;
    std::string text(5000, 't');
    statusText = text.c_str();
    EXPECT_EQ(StderrOf([] { LogStatus(0, KNF_FAILURE, "m\n"); }), "Log0 Status: " + text + ". Message: m\n");
    EXPECT_EXIT(Panic("gone %s", "wrong"), testing::ExitedWithCode(1), "^Panic: gone wrong$");
}

TEST(Elapsed, BorrowsMicrosecondsAndIsAlwaysAboveZero) {
    EXPECT_EQ(ElapsedSecs({1, 900000}, {2, 100000}), 0.2F);
    EXPECT_EQ(ElapsedSecs({0, 0}, {16777217, 0}), 16777216.0F) << "rounded once, to single precision";
    f32 value = 1;
    EXPECT_EQ(StderrOf([&] {
                  value = ElapsedSecs({5, 5}, {5, 5});
              }),
              "Log0: Time going backwards?: Diff is 0.000000\n");
    EXPECT_EQ(value, 0.000001F);
    EXPECT_EQ(StderrOf([&] {
                  value = ElapsedSecs({5, 0}, {4, 500000});
              }),
              "Log0: Time going backwards?: Diff is -0.500000\n");
}

TEST(Number, RulesHoldAtTheEdgesOfTheirWidths) {
    constexpr u64 TOP = std::numeric_limits<u64>::max();
    constexpr i64 LOWEST = std::numeric_limits<i64>::min();
    EXPECT_EQ(SignedRate(SignedDelta(3, 5), 2.0F), -1.0);
    EXPECT_EQ(Rate(u64{3} - u64{5}, 1.0F), 0x1p64) << "unsigned, and narrowed ahead of the division";
    EXPECT_EQ(Rate(16777217, 1.0F), 16777216.0);
    EXPECT_EQ(SignedRate(16777217, 1.0F), 16777217.0);
    EXPECT_EQ(Rate32(16777217, 1.0F), 16777217.0);
    EXPECT_EQ(Rate(5, 0.0F), 0.0);
    EXPECT_EQ(Percent(10, TOP + 1), 0.0) << "a whole that wrapped to 0";
    EXPECT_EQ(MeanSize(0x1'0000'0007, 1), 7U);
    EXPECT_EQ(MeanSize(5, 0), 0U);
    EXPECT_EQ(SignedMean(-7, 2), -3);
    EXPECT_EQ(SignedMean(LOWEST, -1), LOWEST) << "must not trap";
    EXPECT_EQ(SignedMean(5, 0), 0);
    EXPECT_EQ(WholeRate(7, 2.0F), 3U);
    EXPECT_EQ(WholeRate(7, 0.0F), 0U);
    EXPECT_EQ(WholeRate(4000000000U, 1e-10F), 0U) << "a quotient above 63 bits";
    EXPECT_EQ(WholeRate(4000000000U, 0.5F), static_cast<u32>(8000000000ULL)) << "the low 32 bits count";
    EXPECT_EQ(WholeRate(3, -1.0F), static_cast<u32>(-3));
}

}  // namespace

// Ahead of the library's.
extern "C" const char *HCK_ReturnStatusToString(KnfStatus status) {
    static const auto library = reinterpret_cast<const char *(*)(KnfStatus)>(dlsym(RTLD_NEXT, __func__));
    return statusText != nullptr ? statusText : library(status);
}
