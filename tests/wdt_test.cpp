#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

const std::string HOST = "host name=h1 pcpus=1 packages=1 cores=1 llc=7\nswitch sw0\n"
                         "hostnic switch=sw0 port=7 name=abc1\nhostnic switch=sw0 port=8 name=zz\n";

// The worldlets that a port got, in the order of its report.
std::string Found(const std::string &names, const std::string &lines = "") {
    std::string host = HOST + lines;
    std::istringstream words(names);
    for (std::string name; words >> name;) {
        host += "worldlet " + name + "\n";
    }
    std::string found;
    nlohmann::json port = RunMeter(host, "-p 7 -t W -i 1").Port(7);
    for (const auto &worldlet : port.value("wdt", nlohmann::json::array())) {
        found += worldlet["name"].get<std::string>() + " ";
    }
    return found;
}

TEST(Wdt, MaskTakesItsFirstOccurrenceAloneAndNoDigitBehindIt) {
    EXPECT_EQ(Found("abc1 xabc1-q abc12 abc1-backup backup-abc1 abc12-abc1 ABC1 abc1x abc1."),
              "abc1 xabc1-q abc1x abc1. ");
    EXPECT_EQ(Found("other"), "");
    std::string vm = "vm vm1 leader=12\nvnic switch=sw0 port=9 vm=vm1 model=3\n"
                     "worldlet NetWdt-Async-12\nworldlet NetWdt-Async-121\n";
    EXPECT_EQ(RunMeter(HOST + vm, "-p 9 -t W -i 1").Port(9)["wdt"].size(), 1U) << "named by the world leader";
    EXPECT_EQ(Count(RunMeter(HOST + "plain switch=sw0 port=9 type=2 client=abc1\n", "-p 9 -t W -i 1").trace, "1476"),
              0U);
}

TEST(Wdt, FiguresByteForByte) {
    const std::string record = "1478 \"abc1\"";
    // Starts near the top, so that differences wrap; the run count is above what single precision holds.
    std::string host =
        HOST + "worldlet abc1\n" +
        Steps(record,
              "12 8 18446744073709551615 67108868  44 8 5 40  140 8 6 80  148 8 7 120  220 8 8 1000000000  516 8 9 "
              "400000000  812 8 18446744073709551615 2000000000  0 4 3 0  4 4 0 0  8 4 4294967295 0");
    auto section = [](const std::string &text) {
        std::size_t begin = text.find(",\n  \"wdt\"");
        return text.substr(begin, text.find('}', begin) + 3 - begin);
    };
    const std::string figures = ",\n  \"wdt\": [\n    {\"used\": 25.00, \"ready\": 10.00, \"wait\": 50.00, \"runct\": "
                                "16777216, \"remoteactct\": 30, \"migct\": 10, \"overrunct\": 20, \"afftype\": ";
    EXPECT_EQ(section(RunMeter(host, "-p 7 -t W -i 4").out),
              figures + "\"pcpu\", \"affval\": 3, \"name\": \"abc1\"} ]");
    host += "field " + record + " at=8 width=4 start=9 then=4:4294967294\n";
    EXPECT_EQ(section(RunMeter(host, "-p 7 -t W -i 4").out), figures + "\"wdt\", \"affval\": -2, \"name\": \"abc1\"} ]")
        << "the newer sample's affinity";
    host += "field " + record + " at=4 width=4 start=0 then=4:10001\n";
    EXPECT_EQ(section(RunMeter(host, "-p 7 -t W -i 4").out),
              figures + "\"vcpu\", \"affval\": 10001, \"name\": \"abc1\"} ]");
}

TEST(Wdt, SamplesTurnOverAndPortsOfOneNameDoNotShareThem) {
    std::string host = HOST +
                       "hostnic switch=sw0 port=9 name=abc1\nworldlet abc1\nfield 1478 \"abc1\" at=44 width=8 start=0 "
                       "then=1:100 then=2:103\n";
    MeterRun run = RunMeter(host, "-S sw0 -t W -i 1 -n 2");
    for (unsigned port : {7U, 9U}) {
        EXPECT_EQ(run.Port(port, 0)["wdt"][0]["migct"], 100);
        EXPECT_EQ(run.Port(port, 1)["wdt"][0]["migct"], 3);
    }
    EXPECT_EQ(Count(run.trace, "list 1476"), 1U) << "one listing serves the run";
}

TEST(Wdt, FailuresCostTheSetAndSaySo) {
    struct Row {
        std::string lines;
        std::string err;
        std::size_t listings;
        bool reported;
    };
    const Row rows[] = {
        {"fault list 1476\n", SIMULATED + "Unable to build worldlet list\n", 1, false},
        {"list 1476 =\n", "", 2, false},
        {"fault add key=\"abc1-b\"\n", SIMULATED + "Unable to create param list for abc1-b wdt\n", 1, false},
        {"fault get 1478 \"abc1-b\" nth=2\n", SIMULATED + "abc1-b wdt: stats read error. Cleaning up wdt\n", 1, false},
        {"fault get 1478 \"abc1-b\" nth=3\n", SIMULATED + "abc1-b wdt: stats read error. Cleaning up wdt\n", 1, true},
    };
    for (const Row &row : rows) {
        MeterRun run =
            RunMeter(HOST + "worldlet abc1-a\nworldlet abc1-b\nworldlet zz\n" + row.lines, "-S sw0 -t W -i 1 -n 2");
        EXPECT_EQ(run.err, row.err) << row.lines;
        EXPECT_EQ(Count(run.trace, "list 1476"), row.listings) << row.lines;
        EXPECT_EQ(run.Port(7, 0).contains("wdt"), row.reported) << row.lines;
        EXPECT_FALSE(run.Port(7, 1).contains("wdt")) << row.lines;
        EXPECT_EQ(run.Port(7, 1)["id"], 7) << row.lines;
    }
    EXPECT_NE(RunMeter(HOST + "worldlet zz\n", "-S sw0 -d 1 -t W -i 1")
                  .err.find("Log1: No worldlet matches found for abc1 mask\n"),
              std::string::npos);
    EXPECT_NE(RunMeter(HOST + "worldlet zz\n", "-S sw0 -d 1 -t W -i 1").err.find("Log1: Added zz wdt for zz mask\n"),
              std::string::npos);
}

}  // namespace
