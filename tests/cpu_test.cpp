#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

// One VM with two vcpus behind port 7, and a port without any.
const std::string HOST = R"(
host name=h1 pcpus=3 packages=2 cores=2 llc=7
switch sw0
vm vm1 leader=500 vcpus=2
vnic switch=sw0 port=7 vm=vm1 model=3
plain switch=sw0 port=8 type=2 client=other
list 753 502 = 4294967296 77
record 770 4294967296 size=120
record 772 4294967296 size=64
record 793 4294967296 size=8
record 795 4294967296 "L3" size=8
record 770 77 size=120
record 772 77 size=64
record 793 77 size=8
record 795 77 "L3" size=8
)";
const std::string VCPU = "4294967296";
const std::string STILL = Steps("770 77", "32 8 5 0  48 8 6 0  64 8 7 0") + Steps("772 77", "36 4 9 0") +
                          Steps("793 77", "0 8 9 0") + Steps("795 77 \"L3\"", "0 8 9 0");

std::string Between(const std::string &text, const std::string &from, const std::string &to) {
    std::size_t begin = text.find(from);
    return begin == std::string::npos ? "" : text.substr(begin, text.find(to, begin) + to.size() - begin);
}

TEST(Pcpu, LoadsAreSignedSharesOfEachPcpusOwnTimeAndSumUp) {
    std::string counters = Steps("797 0", "0 8 900 250  16 8 7 125  48 8 9 1000") +
                           "field 797 1 at=0 width=8 start=900 then=4:400\n" + Steps("797 1", "16 8 4 1  48 8 2 3000") +
                           Steps("797 2", "0 8 1 77  16 8 3 78  48 8 5 0");
    MeterRun run = RunMeter(HOST + counters, "-p 8 -i 4");
    EXPECT_EQ(Between(run.out, ",\n\"cpu\"", "] }"),
              ",\n\"cpu\": { \"topology\": { \"core\": 1, \"llc\": 7, \"package\": 1},\n"
              "\"used\": [ 25.00, -16.67,   0.00,    8.33],\n\"wdt\": [ 12.50,   0.03,   0.00,   12.53] }");
}

TEST(Pcpu, NoProgressOfTheFirstShowsNoneAndStillTurnsTheSamplesOver) {
    std::string counters = "field 797 0 at=48 width=8 start=1000 then=4:1000 then=8:1400\n"
                           "field 797 0 at=0 width=8 start=0 then=4:40 then=8:140\n";
    MeterRun run = RunMeter(HOST + counters, "-p 8 -i 4 -n 2");
    EXPECT_EQ(Count(run.out, "\"package\": 1},\n\"used\":[0.00 ], \"wdt\": [0.00 ] },\n\"ports\""), 1U);
    EXPECT_EQ(run.Document()["stats"][1]["cpu"]["used"][0], 25.0) << "against the pass just before";
}

TEST(Pcpu, FailedReadEndsThePassAloneAndTheNextBeginsAnew) {
    MeterRun run = RunMeter(HOST + "fault get 797 1 nth=2\nfault add key=2 nth=3\n", "-p 8 -i 1 -n 3");
    EXPECT_EQ(run.status, 0);
    EXPECT_EQ(run.err, "Log0: Unable to read pcpu 1 stats: Simulated failureSchedStatsPcpuStats: "
                       "KNF_ParamListAddInt()\n");
    EXPECT_EQ(Count(run.trace, "get 797 0 "), 4U);
    EXPECT_EQ(Count(run.trace, "get 797 2 "), 2U);
    EXPECT_EQ(run.Document()["stats"].size(), 3U);
}

TEST(Pcpu, SetUpThatFailsSaysWhyAndEndsTheRun) {
    const std::string end = "Log0: SchedStatsCpuGlobalInfoInit failed\n";
    const std::pair<std::string, std::string> rows[] = {
        {"fault create nth=1", "Log0: Error on KNF_ParamListCreate()\n"},
        {"fault get 603", ""},
        {"fault add nth=1", "Log0: Unable to add to knfparam list to read cpu 0 info:Simulated failure\n"},
        {"fault get 605 0", "Log0: Unable to read cpu 0 info:Simulated failure\n"},
        {"field 603 at=8 width=4 start=0", "Log0: Unusable cpu topology: 0 packages 2 cores 3 pcpus\n"},
        {"field 603 at=12 width=4 start=0", "Log0: Unusable cpu topology: 2 packages 0 cores 3 pcpus\n"},
        {"field 603 at=16 width=4 start=0", "Log0: Unusable cpu topology: 2 packages 2 cores 0 pcpus\n"},
        {"fault get 519", SIMULATED + "Unable to read hostName"},
    };
    for (const auto &[fault, message] : rows) {
        MeterRun run = RunMeter(HOST + fault + "\n", "-p 8 -i 1");
        EXPECT_EQ(run.err, message + end) << fault;
        EXPECT_EQ(run.status, 1) << fault;
    }
}

TEST(Pcpu, HostNameEndsWithItsSpanAndMayBeMissing) {
    MeterRun cut = RunMeter(HOST + "fill 519 \"Misc\" \"HostName\" at=544 size=1028 byte=0x68\n", "-p 8 -i 1");
    EXPECT_EQ(cut.Document()["sysinfo"]["hostname"], std::string(1027, 'h'));
    for (const char *fault :
         {"fault create nth=2", "fault create nth=3", "fault create nth=4", "fault add key=\"Cpu\""}) {
        MeterRun run = RunMeter(HOST + fault + "\n", "-p 7 -t V -i 1");
        EXPECT_EQ(run.err, "Log0: Will not be able to track vcpu histograms due to paramlist errs") << fault;
        EXPECT_EQ(run.Document()["sysinfo"]["hostname"], *(fault + 6) == 'c' ? "" : "h1") << fault;
        EXPECT_EQ(run.journal, "") << fault;
        EXPECT_EQ(run.Port(7)["vcpu"].size(), 2U) << fault;
    }
}

TEST(Vcpu, PercentagesAreSignedAndCountsAreNot) {
    std::string counters = Steps("770 " + VCPU, "32 8 100 1000000  48 8 200 200000  0 8 3 777") + "field 770 " + VCPU +
                           " at=64 width=8 start=500000 then=4:100000\n" + Steps("772 " + VCPU, "36 4 70 67108868") +
                           Steps("793 " + VCPU, "0 8 11 67108868") + Steps("795 " + VCPU + " \"L3\"", "0 8 12 80") +
                           STILL + "field 795 77 \"L3\" at=0 width=8 start=8 then=4:7\n";
    MeterRun run = RunMeter(HOST + counters, "-p 7 -t v -i 4 -n 2");
    nlohmann::json second = run.Port(7, 1)["vcpu"][0];
    for (const auto &[key, figure] : second.items()) {
        EXPECT_TRUE(key == "id" || figure == 0) << key << " is not turned over";
    }
    const std::string idle = "\"id\": 77, \"used\": 0.00, \"ready\": 0.00, \"cstp\": 0.00, \"actnot\": 0.00, "
                             "\"migtot\": 0, \"migl3\": ";
    EXPECT_EQ(Between(run.out, ",\n  \"vcpu\"", "]"),
              ",\n  \"vcpu\": [\n    {\"id\": 4294967296, \"used\": 25.00, \"ready\": -10.00, \"cstp\": 5.00, "
              "\"actnot\": 16777216.00, \"migtot\": 16777216, \"migl3\": 20 },\n    {" +
                  idle + "4611686018427387904 } ]");
    nlohmann::json absolute = RunMeter(HOST + counters, "-a -p 7 -t v -i 4").Port(7)["vcpu"][0];
    EXPECT_EQ(absolute["used"], 100.0);
    EXPECT_EQ(absolute["migl3"], 80);
    EXPECT_EQ(run.Port(8), nullptr);
    EXPECT_EQ(Count(RunMeter(HOST, "-p 8 -i 1").trace, "get 457"), 0U) << "a port without a world leader";
}

TEST(Vcpu, ChainThatBreaksCostsTheArrayAndSaysWhere) {
    const std::pair<std::string, std::string> rows[] = {
        {"fault create nth=9", ""},
        {"fault add key=500", SIMULATED + "Unable to add param: worldLeader 500\n"},
        {"fault get 457", SIMULATED + "Unable to get cartel id for 500 leader\n"},
        {"fault add key=501", SIMULATED + "Unable to add param: cartelID 501\n"},
        {"fault get 738", SIMULATED + "Unable to get group ID for 501 cartel\n"},
        {"fault add key=4294967796", SIMULATED + "Unable to add param: groupID 4294967796\n"},
        {"fault get 658", SIMULATED + "Unable to get vcpuleader for 4294967796 group\n"},
        {"fault add key=502", SIMULATED + "Unable to add param: vcpuLeaderID 502\n"},
        {"fault list 753", SIMULATED + "Unable to get vcpuList from vcpuLeaderID 502\n"},
        {"list 753 502 =", "Log0: No vcpus present for worldLeader 500\n"},
    };
    for (const auto &[fault, message] : rows) {
        MeterRun run = RunMeter(HOST + fault + "\n", "-p 7 -i 1");
        EXPECT_EQ(run.err, message) << fault;
        EXPECT_EQ(run.Port(7).count("vcpu"), 0U) << fault;
        EXPECT_EQ(Count(run.trace, "get 770 77"), 0U) << fault;
    }
}

TEST(Vcpu, OneThatCannotBeReadCostsThePortItsArrayForGood) {
    const std::pair<std::string, std::string> rows[] = {
        {"fault add key=77 nth=2", "add id"},
        {"fault add key=\"L3\" nth=4", "add id"},
        {"fault get 770 77 nth=2", "read stateTimes"},
        {"fault get 772 77 nth=2", "read eventCounts"},
        {"fault get 793 77 nth=2", "read total migrations"},
        {"fault get 795 77 nth=2", "read L3 migrations"},
    };
    for (const auto &[fault, what] : rows) {
        // The tool's own process comes behind the ports and adds its "L3" third in the first pass.
        std::string moved = fault == "fault add key=\"L3\" nth=4" ? "fault add key=\"L3\" nth=5" : fault;
        MeterRun run = RunMeter(HOST + moved + "\n", "-p 7 -i 1 -n 2");
        EXPECT_EQ(run.err, SIMULATED + "vcpuid 77: Unable to " + what + "\n") << fault;
        EXPECT_EQ(run.Port(7, 0).count("vcpu") + run.Port(7, 1).count("vcpu"), 0U) << fault;
        EXPECT_EQ(Count(run.trace, "get 770 " + VCPU), 2U) << fault;
        EXPECT_EQ(run.Port(7, 1)["id"], 7) << fault;
    }
}

TEST(Self, OverheadIsTheShareOfTheWholeSpanAndSurvivesAFailedRead) {
    MeterRun run = RunMeter(HOST + "self used=5\nfault get 770 4242 nth=3\n", "-p 8 -i 2 -n 3");
    EXPECT_EQ(run.err, SIMULATED + "vcpuid 4242: Unable to read stateTimes\n");
    EXPECT_EQ(Count(run.out, "],\n\n\"overhead\": {\"used\": 0.50 } }"), 2U);
    EXPECT_EQ(Count(run.out, "],\n\n\"overhead\": {\"used\": 0.00 } }"), 1U) << "no progress divides by nothing";
}

// Histograms of vcpu 77's port: limits 10, 20 and the closing 0; two samples four seconds apart.
std::string Histo(const std::string &kind, const std::string &id, long long count, const std::string &samples) {
    return "record 776 " + id + " \"" + kind + "\" size=352\n" + "field 776 " + id + " \"" + kind +
           "\" at=24 width=8 start=50 then=4:" + std::to_string(50 + count) + "\n" +
           Steps("776 " + id + " \"" + kind + "\"", samples + "  40 8 10 0  56 8 20 0  72 8 0 0");
}

std::string AllHistos(const std::string &id) {
    return Histo("RUN", id, 4, "32 8 1 3  48 8 2 1") + Histo("READY", id, -1, "32 8 0 5  48 8 0 7") +
           Histo("COSTOP", id, 0, "32 8 9 0  48 8 9 0") + Histo("WAIT", id, 8, "32 8 0 8  48 8 0 0");
}

TEST(VcpuHisto, SectionShowsDifferencesMeansAndTheLastLabel) {
    std::string host =
        HOST + "list 753 502 = 77\n" + AllHistos("77") + Steps("770 77", "32 8 5 4003  48 8 6 10  64 8 7 300");
    MeterRun run = RunMeter(host, "-p 7 -t V -i 4");
    EXPECT_EQ(Between(run.out, ",\n    \"histos\"", "] } }"),
              ",\n    \"histos\":{\"buckets\": [ 10, 11],\n      \"values\":["
              "\n        { \"name\": \"run\", \"count\": 4, \"mean\": 1000, \"values\": [3, 1] },"
              "\n        { \"name\": \"ready\", \"count\": -1, \"mean\": -300, \"values\": [5, 7] },"
              "\n        { \"name\": \"cstp\", \"count\": 0, \"mean\": 0, \"values\": [0, 0] },"
              "\n        { \"name\": \"wait\", \"count\": 8, \"mean\": 0, \"values\": [8, 0] }] } }");
    EXPECT_EQ(run.journal, "set 520 \"Cpu\" \"TrackHistos\" : 1 -> 0x0\nset 520 \"Cpu\" \"TrackHistos\" : 0 -> 0x0\n");
}

TEST(VcpuHisto, BucketsAreCountedUpToTheFirstWithoutLimit) {
    std::string host = HOST + "list 753 502 = 77\n" + AllHistos("77") + STILL;
    std::string one = host + "field 776 77 \"RUN\" at=56 width=8 start=0\n";
    EXPECT_EQ(Count(RunMeter(one, "-p 7 -t V -i 4").out, "\"buckets\": [ 0],\n      \"values\":[\n        { \"name\": "
                                                         "\"run\", \"count\": 4, \"mean\": 0, \"values\": [3] }"),
              1U)
        << "the first bucket's own limit does not matter";
    std::string all = host;
    for (int bucket = 2; bucket < 20; bucket++) {
        all += "field 776 77 \"RUN\" at=" + std::to_string(40 + 16 * bucket) +
               " width=8 start=" + std::to_string(10 + 10 * bucket) + "\n";
    }
    nlohmann::json section = RunMeter(all, "-p 7 -t V -i 4").Port(7)["vcpu"][0]["histos"];
    EXPECT_EQ(section["buckets"].size(), 20U);
    EXPECT_EQ(section["buckets"][19], 191) << "one above the limit ahead of the last";
    EXPECT_EQ(section["values"][3]["values"].size(), 20U);
}

// A second VM, so that the option has users on two ports.
const std::string TWO = HOST + "vm vm2 leader=600 vcpus=1\nvnic switch=sw0 port=9 vm=vm2 model=3\n";

TEST(VcpuHisto, OptionFollowsTheUsersOfAllPorts) {
    const std::string on = "set 520 \"Cpu\" \"TrackHistos\" : 1 -> 0x0\n";
    const std::string off = "set 520 \"Cpu\" \"TrackHistos\" : 0 -> 0x0\n";
    const std::string lost = SIMULATED + "vcpu 77 err ";
    struct Row {
        std::string fault;
        std::string message;
        std::string journal;
        const char *withHistos;  // ports that still have the section in the second record
    };
    const Row rows[] = {
        {"", "", on + off, "79"},
        {"fault get 776 77 \"READY\" nth=2", lost + "Unable to read vcpu histo", on + off, "9"},
        {"fault add key=\"WAIT\" nth=2", lost + "Unable to add histotype to worldHistoArgs", on + off, ""},
        {"fault set 520 nth=1", SIMULATED + "Unable to change vcpu histo stateto 1. Disabling forever.",
         "set 520 \"Cpu\" \"TrackHistos\" : 1 -> 0xbad000f\n", ""},
        {"fault add key=\"TrackHistos\" nth=1",
         SIMULATED + "Unable to add params to change vcpu histo stateto 1. Disabling forever.", "", ""},
        {"fault set 520 nth=2", SIMULATED + "Unable to change vcpu histo stateto 0. Disabling forever.",
         on + "set 520 \"Cpu\" \"TrackHistos\" : 0 -> 0xbad000f\n", "79"},
    };
    for (const Row &row : rows) {
        MeterRun run = RunMeter(TWO + AllHistos(VCPU) + AllHistos("77") + row.fault + "\n", "-S sw0 -t V -i 1 -n 2");
        EXPECT_EQ(run.err, row.message) << row.fault;
        EXPECT_EQ(run.journal, row.journal) << row.fault;
        std::string with;
        for (const char *port : {"7", "9"}) {
            nlohmann::json vcpus = run.Port(std::stoull(port), 1)["vcpu"];
            EXPECT_EQ(vcpus.size(), *port == '7' ? 2U : 1U) << row.fault;
            with += vcpus[0].contains("histos") ? port : "";
        }
        EXPECT_EQ(with, row.withHistos) << row.fault;
    }
    std::string journal = RunMeter(TWO, "-S sw0 -t hV -i 1").journal;
    EXPECT_TRUE(journal.ends_with("set 336 \"sw0\" 9 : \"stop\" \"output\" -> 0x0\n" + off)) << "behind all ports";
}

TEST(VcpuHisto, FailedReadSkipsLaterVcpusOfThePassButNotTheirTimes) {
    std::string host = HOST + AllHistos(VCPU) + AllHistos("77") + "fault get 776 " + VCPU + " \"RUN\" nth=2\n";
    MeterRun run = RunMeter(host, "-p 7 -t V -i 1 -n 2");
    EXPECT_EQ(Count(run.trace, "get 776 77"), 4U) << "the first pass alone";
    EXPECT_EQ(Count(run.trace, "get 795 77"), 3U);
    EXPECT_EQ(Count(run.out, "\"histos\""), 0U);
    EXPECT_EQ(Count(run.journal, "TrackHistos\" : 0"), 1U) << "off as soon as the last user is gone";
}

}  // namespace
