#include "tests/run_meter.h"

#include <gtest/gtest.h>
#include <vector>

namespace {

std::string Uplink(const std::string &nic, int port = 9) {
    return "uplink switch=sw0 port=" + std::to_string(port) + " nic=" + nic + "\n";
}

const std::string HEAD = "host name=h1 pcpus=2 packages=1 cores=2 llc=7\nswitch sw0\n";

// Two vectors of the NIC, the second with a number of more than 32 bits, around one of another NIC.
const std::string HOST = HEAD + Uplink("nic1") +
                         "vector 64 names=nic1-tx\nvector 65 names=nic10 rate=999999 time=999999\n"
                         "vector 4294967364 names=rx,nic1\n";

// A vector's two counters on one pcpu: each starts from a number of its own and steps once, at second 4.
std::string Steps(const std::string &keys, unsigned long long count, unsigned long long used) {
    std::string field = "field 840 " + keys;
    return field + " at=0 width=8 start=18446744073709551000 then=4:" + std::to_string(count - 616) + "\n" + field +
           " at=8 width=8 start=5 then=4:" + std::to_string(used + 5) + "\n";
}

TEST(Intr, FigureLeavesOutAVectorOrAPcpuOrTakesAnothers) {
    std::string host = HOST + Steps("64 0", 3, 1200) + Steps("64 1", 50, 20000) + Steps("4294967364 0", 700, 300000) +
                       Steps("4294967364 1", 9000, 4000000);
    MeterRun run = RunMeter(host, "-p 9 -t i -i 4 -n 2");
    EXPECT_EQ(Count(run.out, " },\n  \"intr\": {\"count\": 2438, \"used\": 108.03}}],"), 1U);
    EXPECT_EQ(Count(run.out, " },\n  \"intr\": {\"count\": 0, \"used\": 0.00}}],"), 1U) << "not turned over";
    EXPECT_EQ(Count(run.trace, "get 840 "), 3U * 2 * 2) << "passes, vectors, pcpus";
    host = HOST + Steps("64 0", 16777217, (1ULL << 63) + (1ULL << 38)) + Steps("64 1", 0, 0) +
           Steps("4294967364 0", 0, 0) + Steps("4294967364 1", 0, 0);
    nlohmann::json absolute = RunMeter(host, "-a -p 9 -t i -i 4").Port(9)["intr"];
    EXPECT_EQ(absolute["count"], 16777216) << "not narrowed";
    EXPECT_EQ(absolute["used"], 922337203685477.625) << "2^63 / 10000: unsigned, and narrowed";
}

// A NIC and the names on the one vector.
TEST(Intr, VectorOfAnotherNicIsTakenOrAnOwnOneMissed) {
    const std::string x(58, 'x');
    const std::vector<std::string> missed = {"nic1 nic10",       "nic1 nic1,0dev",       "nic1 nic10,nic1",
                                             "nic1 NIC1",        "nic1 " + x + "x,nic1", "nic1 " + x + "xxxxx,nic1",
                                             "inic1 nic1,timer", "snic1 nic1",           "s "};
    const std::vector<std::string> taken = {"nic1 nic1",      "nic1 timer,nic1",    "nic1 nic1-0",
                                            "nic1 xnic1-rx9", "nic1 " + x + "nic1", "nic1 " + x + ",nic1,0",
                                            "inic1 nic1",     "snic1 nic1,timer",   "i "};
    for (const auto *rows : {&missed, &taken}) {
        for (const std::string &row : *rows) {
            std::string nic = row.substr(0, row.find(' '));
            std::string vector = "vector 64 names=" + row.substr(nic.size() + 1) + "\n";
            MeterRun run = RunMeter(HEAD + Uplink(nic) + vector, "-d 1 -p 9 -t i -i 1");
            std::string message = rows == &taken ? "Log1: 1 intr vector found for " : "Log1: No interrupts found for ";
            EXPECT_TRUE(run.err.ends_with("\n" + message + nic + " mask\n")) << row;
            EXPECT_EQ(run.Port(9).contains("intr"), rows == &taken) << row;
        }
    }
}

// What goes wrong, what each NIC is told, and how often nodes 639 and 641 are asked.
TEST(Intr, ListingIsBuiltAgainAfterItFailedOrServed) {
    std::string two = HEAD + Uplink("nic1") + Uplink("nic2", 10) + "vector 64 names=nic1\nvector 65 names=nic2,nic1\n";
    std::string trace = RunMeter(two, "-S sw0 -t i -i 1").trace;
    std::string keys = std::to_string(Count(trace.substr(0, trace.find("add 64 ")), "create "));
    const std::string nic1 = "Log1: Port 9 Switch sw0 Client:nic1 Type: 4 SubType: 0\n";
    const std::string nic2 = "Log1: Port 10 Switch sw0 Client:nic2 Type: 4 SubType: 0\n";
    const std::string none = "Log1: No interrupts found for ";
    const std::tuple<std::string, std::string, std::string, std::size_t, std::size_t> rows[] = {
        {"", "Log1: 2 intr vector found for nic1 mask\n", "Log1: 1 intr vector found for nic2 mask\n", 1, 2},
        {"fault list 639 nth=1", SIMULATED + "Unable to build interrupt list\n", "", 1, 0},
        {"fault add key=65 nth=1", SIMULATED + "Unable to add param for interrupt 65\n", "", 1, 1},
        {"fault create nth=" + keys, "Log0 Status: Failure. Message: Unable to add param for interrupt 64\n", "", 1, 0},
        {"fault list 641 65 nth=1", SIMULATED + "Unable to get names for interrupt 65\n", "", 1, 2},
        {"list 639 =", none + "nic1 mask\n", none + "nic2 mask\n", 2, 0}};
    for (const auto &[line, first, second, lists, names] : rows) {
        MeterRun run = RunMeter(two + line + "\n", "-d 1 -S sw0 -t i -i 1");
        EXPECT_EQ(run.err, nic1 + first + nic2 + second) << line;
        EXPECT_EQ(Count(run.trace, "list 639 "), lists) << line;
        EXPECT_EQ(Count(run.trace, "list 641 "), names) << line;
        EXPECT_EQ(run.Port(10).contains("intr"), line.empty()) << line;
        EXPECT_TRUE(run.Port(9).contains("physnic") && run.Port(10).contains("physnic")) << line;
    }
}

// In the pass of the second record. Calls ahead of it, which the count of the fault has to pass over, come from a run
// without one.
TEST(Intr, ReadThatFailsCostsTheNicOrIsTriedAgain) {
    std::string trace = RunMeter(HOST, "-p 9 -t i -i 1 -n 3").trace;
    std::size_t second = 0;
    for (int i = 0; i < 6; i++) {
        second = trace.find("get 840 64 ", second + 1);
    }
    auto nth = [&](const char *call) { return " nth=" + std::to_string(Count(trace.substr(0, second), call)); };
    const std::pair<std::string, std::string> rows[] = {
        {"create" + nth("create "), "Log0: Unable to allocate mem for Interrupt argList\n"},
        {"add key=64" + nth("add 64 "), SIMULATED + "Unable to add param: intr 64 for stats\n"},
        {"add key=1" + nth("add 1 "), SIMULATED + "Unable to add param: CPU 1 for intr stats\n"},
        {"get 840 64 1 nth=3", SIMULATED + "Unable to read stats Intr:64 CPU 1\n"}};
    for (const auto &[fault, message] : rows) {
        MeterRun run = RunMeter(HOST + "fault " + fault + "\n", "-p 9 -t i -i 1 -n 3");
        EXPECT_EQ(run.err, message) << fault;
        EXPECT_TRUE(run.Port(9, 0).contains("intr")) << fault;
        EXPECT_FALSE(run.Port(9, 1).contains("intr") || run.Port(9, 2).contains("intr")) << fault;
        EXPECT_TRUE(run.Port(9, 1).contains("physnic") && run.Port(9, 2).contains("physnic")) << fault;
        EXPECT_LE(Count(run.trace, "get 840 "), 2U * 4 + 3) << fault << " is followed by reads";
    }
}

}  // namespace
