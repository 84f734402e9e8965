#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

const std::string HOST = "host name=h1 pcpus=1 packages=1 cores=1 llc=7\nswitch sw0\n"
                         "plain switch=sw0 port=7 type=2 client=probe\nplain switch=sw0 port=8 type=2 client=other\n";

// The six writes of one operation on port 7, in their order.
std::string Writes(const std::string &op, const std::string &port = "7") {
    std::string lines;
    for (const char *direction : {"input", "output"}) {
        for (const char *node : {"326", "331", "336"}) {
            lines +=
                std::string("set ") + node + " \"sw0\" " + port + " : \"" + op + "\" \"" + direction + "\" -> 0x0\n";
        }
    }
    return lines;
}

// A record of so many limits, 100 apart; bucket i has i samples and the kernel's count is ten times their number.
std::string Record(const std::string &node, int limits) {
    std::string record = "record " + node + " \"sw0\" 7 size=" + std::to_string(48 + 16 * limits) + "\n" +
                         Steps(node + " \"sw0\" 7", "0 8 11 0  8 8 18446744073709551615 0  16 8 33 0  24 8 400 0");
    for (int i = 0; i <= limits; i++) {
        record += Steps(node + " \"sw0\" 7", std::to_string(32 + 16 * i) + " 8 " + std::to_string(i) + " 0");
        record += i < limits ? Steps(node + " \"sw0\" 7",
                                     std::to_string(40 + 16 * i) + " 8 " + std::to_string(100 * i + 100) + " 0")
                             : "";
    }
    return record;
}

TEST(Histo, SectionByteForByteAndPairsByKind) {
    std::string host = HOST + Record("332", 11) + Record("333", 11) + Record("327", 14) + Record("328", 14) +
                       Record("337", 18) + Record("338", 18) + "field 338 \"sw0\" 7 at=24 width=8 start=0\n";
    MeterRun run = RunMeter(host, "-p 7 -t h -i 4");
    EXPECT_EQ(
        Count(run.out,
              ",\n  \"histos\":[\n    { \"name\": \"pktsizein\", \"min\": 11, \"max\": 18446744073709551615 ,\"mean\": "
              "33, \"count\": 100,\n      \"values\":[[100, 0.0], [200, 0.2], [300, 0.5], [400, 0.8], [500, 1.0], "
              "[600, 1.2], [700, 1.5], [800, 1.8], [900, 2.0], [1000, 2.2], [1100, 2.5], [1101, 2.8]] },\n    { "
              "\"name\": \"pktsizeout\""),
        1U)
        << run.out;
    nlohmann::json histos = run.Port(7)["histos"];
    const std::pair<const char *, std::size_t> kinds[] = {{"pktsizein", 12},     {"pktsizeout", 12},
                                                          {"clusterin", 15},     {"clusterout", 15},
                                                          {"pktintervalin", 19}, {"pktintervalout", 19}};
    for (std::size_t i = 0; i < 6; i++) {
        EXPECT_EQ(histos[i]["name"], kinds[i].first);
        EXPECT_EQ(histos[i]["values"].size(), kinds[i].second);
    }
    EXPECT_EQ(histos[5]["count"], 0) << "no samples";
    EXPECT_EQ(histos[5]["values"][18][1], 1800.0) << "of the 1 that took the place of the divisor";
    EXPECT_NE(run.out.find("] } ]}],\n\n\"overhead\""), std::string::npos);
}

TEST(Histo, KernelIsAskedToStartResetAndStopInThisOrder) {
    EXPECT_EQ(RunMeter(HOST, "-p 7 -t h -i 1 -n 2").journal,
              Writes("start") + Writes("reset") + Writes("reset") + Writes("stop"));
    MeterRun disabled = RunMeter(HOST + "fault get 269 \"sw0\" 7 nth=2\n", "-S sw0 -t h -i 1");
    EXPECT_EQ(disabled.journal,
              Writes("start") + Writes("start", "8") + Writes("reset", "8") + Writes("stop") + Writes("stop", "8"))
        << "a disabled port's histograms are stopped too";
    MeterRun argumentsAlone = RunMeter(HOST, "-p 7 -t l -i 1");
    EXPECT_EQ(argumentsAlone.journal, "");
    EXPECT_EQ(Count(argumentsAlone.trace, "create 0 2"), 1U);
    EXPECT_FALSE(argumentsAlone.Port(7).contains("histos"));
    EXPECT_EQ(Count(RunMeter(HOST, "-p 7 -t h -i 1").trace, "get 332 "), 1U) << "the first pass reads nothing";
}

TEST(Histo, SignalDuringTheSleepLeavesNothingOn) {
    MeterRun run = RunScript(HOST, "$METER -p 7 -t h -i 100 >out 2>err & pid=$!; sleep 0.3; kill -INT $pid; wait $pid",
                             {"", true});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.journal, Writes("start") + Writes("stop"));
    EXPECT_EQ(run.out + run.err, "");
}

TEST(Histo, FailuresEndHistogramsOrPassInSilenceByOperation) {
    struct Row {
        std::string fault;
        std::string message;
        std::size_t sections;  // records with a "histos" section, of two
    };
    auto failed = [](const std::string &op, const std::string &stage) {
        return SIMULATED + "Histogram op " + op + " failed in stage " + stage + "\n";
    };
    std::vector<Row> rows = {
        {"fault add key=\"start\"", failed("start", "start"), 0},
        {"fault add key=\"reset\" nth=2", failed("reset", "reset"), 1},
        {"fault add key=\"input\" nth=2", failed("reset", "adding input histo"), 0},
        {"fault add key=\"output\" nth=1", "", 2},
        {"fault add key=\"output\" nth=4", failed("stop", "adding output histo"), 2},
        {"fault set 331 \"sw0\" 7 nth=1", "", 2},
        {"fault set 336 \"sw0\" 7 nth=4", "", 2},
    };
    const std::pair<const char *, const char *> stages[] = {
        {"326", "clusterSizes"}, {"331", "pktSizes"}, {"336", "pkt"}};
    for (const auto &[node, family] : stages) {
        std::string name = family;
        bool intervals = name == "pkt";
        rows.push_back({std::string("fault set ") + node + " nth=7",
                        failed("stop", "input on " + (intervals ? "pktIntervals" : name)), 2});
        rows.push_back({std::string("fault set ") + node + " nth=8",
                        failed("stop", "output on " + (intervals ? "pktIntverals" : name)), 2});
    }
    for (const Row &row : rows) {
        MeterRun run = RunMeter(HOST + row.fault + "\n", "-p 7 -t h -i 1 -n 2");
        EXPECT_EQ(run.err, row.message) << row.fault;
        EXPECT_EQ(Count(run.out, "\"histos\""), row.sections) << row.fault;
        EXPECT_EQ(run.Port(7, 1)["id"], 7) << row.fault;
    }
}

TEST(Histo, RecordThatCannotBeReadDisablesThePort) {
    const std::pair<const char *, const char *> stages[] = {{"332", "Port Pkt Input Histo"},
                                                            {"333", "Port Pkt Output Histo"},
                                                            {"327", "Port Cluster Input Histo"},
                                                            {"328", "Port Cluster Output Histo"},
                                                            {"337", "Port Cluster Intervals Input Histo"},
                                                            {"338", "Port Cluster Intervals Output Histo"}};
    for (const auto &[node, stage] : stages) {
        MeterRun run = RunMeter(HOST + "fault get " + node + " nth=2\n", "-p 7 -t h -i 1 -n 3");
        EXPECT_EQ(run.err, SIMULATED + "Port 7 Stat \"" + stage + "\" read error. Stats Disabled\n");
        EXPECT_EQ(Count(run.out, "\n\n{}]"), 2U);
        EXPECT_EQ(run.journal, Writes("start") + Writes("reset") + Writes("stop")) << node;
    }
}

}  // namespace
