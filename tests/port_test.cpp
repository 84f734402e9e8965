#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

// One plain port with counters that differ from one another; node 269 has them at rates worked out by hand.
const std::string HOST = R"(
host name=h1 pcpus=1 packages=1 cores=1 llc=7
switch sw0
plain switch=sw0 port=7 type=2 client=probe
)" + TRAFFIC;

std::string Messages(const std::string &fault, const std::string &arguments = "-d 1 -i 1 -n 2 -p 7") {
    return RunMeter(HOST + fault + "\n", arguments).err;
}

TEST(Port, RatesComeFromBothCountersAndThePortsOwnTime) {
    nlohmann::json port = RunMeter(HOST, "-p 7 -i 4").Port(7);
    EXPECT_EQ(port["txpps"], 1500);
    EXPECT_EQ(port["txmbps"], 6.0);
    EXPECT_EQ(port["txsize"], 500);
    EXPECT_EQ(port["txeps"], 3.0);
    EXPECT_EQ(port["rxpps"], 20);
    EXPECT_EQ(port["rxmbps"], 0.2);
    EXPECT_EQ(port["rxsize"], 1501);
    EXPECT_EQ(port["rxeps"], 0.0);
    nlohmann::json absolute = RunMeter(HOST, "-a -p 7 -i 4").Port(7);
    EXPECT_EQ(absolute["txpps"], 6000);
    EXPECT_EQ(absolute["txmbps"], 24.0);
    EXPECT_EQ(absolute["txeps"], 12.0);
}

TEST(Port, NameIsThatOfTheLatestPassAndMayGrow) {
    std::string grows = "field 266 \"sw0\" 7 at=148 width=8 start=0x61 then=3:0x6161616161616161\n"
                        "fill 266 \"sw0\" 7 at=156 size=1 byte=0\n";
    MeterRun run = RunMeter(HOST + grows, "-p 7 -i 2 -n 2");
    EXPECT_EQ(run.Port(7)["name"], "a");
    EXPECT_EQ(run.Port(7, 1)["name"], "aaaaaaaa");
}

TEST(Port, CounterThatWentBackwardsIsNegative) {
    std::string back = R"(
field 269 "sw0" 7 at=72 width=8 start=900 rate=0 then=1:400
field 269 "sw0" 7 at=80 width=8 start=9000 rate=0 then=1:10000
)";
    nlohmann::json port = RunMeter(HOST + back, "-p 7 -i 2").Port(7);
    EXPECT_EQ(port["rxpps"], -250);
    EXPECT_EQ(port["rxsize"], 4294967294U) << "-2, of which the low 32 bits are printed";
}

TEST(Port, ClockThatStandsStillIsToldAndDividesByAMillionth) {
    MeterRun run = RunMeter(HOST, "-p 7 -i 0");
    EXPECT_EQ(run.err, "Log0: Time going backwards?: Diff is 0.000000\n");
    EXPECT_EQ(run.Port(7)["txpps"], 0);
    EXPECT_EQ(RunMeter(HOST, "-p 7 -i 0", {"FIXED_CLOCK_STEP=-177721711"}).err,
              "Log0: Time going backwards?: Diff is -1421.773682\n")
        << "-1421.773688 before it is narrowed to single precision";
}

TEST(Port, MacComesFromTheFieldOfItsKind) {
    std::string macs = R"(
field 266 "sw0" 7 at=1208 width=4 start=0x0f0e0d0c
field 266 "sw0" 7 at=1212 width=2 start=0x1100
field 266 "sw0" 7 at=2262 width=4 start=0x05040302
field 266 "sw0" 7 at=2266 width=2 start=0xff06
)";
    EXPECT_EQ(RunMeter(HOST + macs, "-p 7 -i 1").Port(7)["mac"], "0c:0d:0e:0f:00:11");
    std::string vnic = "field 368 7 at=0 width=4 start=5\n";
    EXPECT_EQ(RunMeter(HOST + macs + vnic, "-p 7 -i 1").Port(7)["mac"], "02:03:04:05:06:ff");
}

TEST(Port, FailedReadDisablesItForGoodAtItsPlace) {
    for (const char *node : {"266", "269"}) {
        std::string host = HOST + "plain switch=sw0 port=8 type=6 client=other\nfault get " + node +
                           " \"sw0\" 7 nth=" + (std::string(node) == "266" ? "4" : "3") + "\n";
        MeterRun run = RunMeter(host, "-S sw0 -i 1 -n 3");
        EXPECT_EQ(run.status, 0);
        std::string stage = std::string(node) == "266" ? "portStatus" : "clientStats";
        EXPECT_EQ(run.err, "Log0 Status: Simulated failure. Message: Port 7 Stat \"" + stage +
                               "\" read error. Stats Disabled\n");
        nlohmann::json stats = run.Document()["stats"];
        EXPECT_EQ(stats[0]["ports"][0]["id"], 7);
        EXPECT_EQ(stats[1]["ports"][0], nlohmann::json::object());
        EXPECT_EQ(stats[2]["ports"][0], nlohmann::json::object());
        EXPECT_EQ(stats[2]["ports"][1]["id"], 8);
    }
}

TEST(Port, EachStepOfAnIdentificationThatFailsSaysItsStage) {
    const std::pair<const char *, const char *> rows[] = {
        {"fault create nth=5", "Log0: GetPortsInfo 7 Allocating mem for port params\n"},
        {"fault create nth=6", "Log0: GetPortsInfo 7 Allocating mem for openPorts param\n"},
        {"fault add key=7 nth=1", "Log0 Status: Simulated failure. Message: GetPortsInfo 7 Adding port num\n"},
        {"fault get 368 7", "Log0 Status: Simulated failure. Message: GetPortsInfo 7 Port Type\n"},
        {"fault add key=\"sw0\" nth=1",
         "Log0 Status: Simulated failure. Message: GetPortsInfo 7 Adding switch name to portParams\n"},
        {"fault add key=7 nth=2", "Log0 Status: Simulated failure. Message: GetPortsInfo 7 Adding port num\n"},
        {"fault get 266 \"sw0\" 7", "Log0 Status: Simulated failure. Message: GetPortsInfo 7 Port Status\n"},
        {"field 368 7 at=0 width=4 start=10", "Log1: Mgmt Port 7 will not be displayed\n"},
        {"field 368 7 at=0 width=4 start=1", "Log1: Mgmt Port 7 will not be displayed\n"},
    };
    for (const auto &[fault, message] : rows) {
        EXPECT_EQ(Messages(fault),
                  std::string(message) + "Log1: Unable to get port info for port 7\nPanic: Invalid -p option")
            << fault;
    }
}

TEST(Port, CreationThatFailsUnwindsAndSaysWhy) {
    const std::pair<const char *, const char *> rows[] = {
        {"fault create nth=7", "Unable to create instance list\n"},
        {"fault add key=\"sw0\" nth=2", "Unable to populate knf instance param for port 7\n"},
        {"fault add key=7 nth=3", "Unable to populate knf instance param for port 7\n"},
        {"fault create nth=8", "Unable to create port queue params list\n"},
        {"fault add key=7 nth=4", "Unable to populate knf queue param for port 7\n"},
        {"fault create nth=9", "Unable to create input arguments for histograms\n"},
    };
    for (const auto &[fault, message] : rows) {
        EXPECT_EQ(Messages(fault, "-t h -d 1 -i 1 -p 7"), "Log1: Port 7 Switch sw0 Client:probe Type: 2 SubType: 0\n"
                                                          "Log0: " +
                                                              std::string(message) + "Panic: Invalid -p option")
            << fault;
    }
}

}  // namespace
