#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

// Filters serve the other ports, from 10 on.
const std::string HEAD = "host name=h1 pcpus=1 packages=1 cores=1 llc=7\nswitch sw0\n"
                         "plain switch=sw0 type=2 port={10+i} count=4\n";
const std::string HOST =
    HEAD + "uplink switch=sw0 port=9 nic=nic0 device=dev.0 txqueues=3 rxqueues=4 filters=2,0,0,1\n";

const std::string TXQ = "field 131 \"nic0\" at=0 width=2 ";
const std::string RXQ = "field 121 \"nic0\" at=0 width=2 ";

std::string NicSections(const MeterRun &run, std::size_t iteration) {
    std::string names;
    nlohmann::json port = run.Port(9, iteration);
    EXPECT_EQ(port.value("id", 0), 9) << "the port's own life does not hang on its NIC";
    for (const char *name : {"physnic", "txqueue", "rxqueue"}) {
        names += port.contains(name) ? name + std::string(" ") : "";
    }
    return names;
}

std::size_t NicReads(const std::string &trace) {
    std::size_t reads = 0;
    for (const char *node : {"get 73 ", "get 121 ", "get 131 ", "get 132 ", "list 123 ", "get 126 "}) {
        reads += Count(trace, node);
    }
    return reads;
}

TEST(PhysNic, FigureFromTheWrongOffsetWidthOrDivisor) {
    const std::string link =
        "0 8 7 60  8 8 -20 100  16 8 9 6005900  24 8 11 2700099  32 8 1 1  48 8 2 2  80 8 3 4  88 8 4 8  96 8 5 16 "
        "104 8 6 32  112 8 7 64  120 8 8 128  40 8 9 256  56 8 1 512  128 8 2 1024  136 8 3 2048  144 8 4 4096 "
        "152 8 5 8192  160 8 6 16384";
    std::string queues = Steps("132 \"nic0\" 0", "0 4 900 403  4 4 50 27  12 4 7 11") +
                         Steps("132 \"nic0\" 1", "0 4 900 404  4 4 4294967290 11  12 4 7 0") +
                         Steps("132 \"nic0\" 2", "0 4 4294967295 1001  4 4 0 4294967290  12 4 3 7");
    std::string filters = "list 123 \"nic0\" 3 = 8589934590\nrecord 126 \"nic0\" 3 -2\n"
                          "field 126 \"nic0\" 3 -2 at=14 width=4 start=305\n"
                          "field 126 \"nic0\" 0 10 at=14 width=4 start=4000000000\nfault list 123 \"nic0\" 2\n";
    MeterRun run = RunMeter(HOST + Steps("73 \"nic0\"", link) + queues + filters, "-p 9 -t vq -i 4 -n 2");
    std::string sections = run.out.substr(0, run.out.find("}],\n\n\"overhead\""));
    EXPECT_EQ(sections.substr(sections.find(",\n  \"physnic\"")), R"(,
  "physnic": {"devname": "nic0.dev.0",
    "txpps": 25, "txmbps": 5.4, "txsize": 27000, "txeps": 8128.00, "rxpps": 15, "rxmbps": 12.0, "rxsize": 100098, "rxeps": 63.75 },
  "txqueue": { "count": 3, "details": [
    {"pps": 100, "eps": 6, "qstops": 2},
    {"pps": 101, "eps": 0, "qstops": 0},
    {"pps": 0, "eps": 1073741822, "qstops": 1}],
    "active": 1 },
  "rxqueue": { "count": 4, "details": [
    [4000000000, 11 ],
    [],
    [],
    [305 ]],
    "active": 2, "filters": 1, "ports": 3 })");
    EXPECT_EQ(run.err, "") << "a list that fails is no news";
    EXPECT_EQ(run.Port(9, 1)["physnic"]["txpps"], 0) << "samples are not turned over";
    EXPECT_EQ(run.Port(9, 1)["txqueue"]["details"][1]["pps"], 0) << "samples are not turned over";
}

// 2^60 + 2^36 + 1 goes up to 2^60 + 2^37 in single precision, but down to 2^60 by way of double precision.
TEST(PhysNic, LinkFigureThatIsSignedRoundedOrDividedWrongly) {
    const std::string huge = "0 8 5 -1  8 8 5 1152921573326323713  16 8 -7 2305843009214693952  24 8 5 9 "
                             "40 8 6 16777217  56 8 6 0  128 8 6 0  136 8 6 0  144 8 6 0  152 8 6 0  160 8 6 0";
    nlohmann::json nic = RunMeter(HOST + Steps("73 \"nic0\"", huge), "-a -p 9 -t v -i 4").Port(9)["physnic"];
    EXPECT_EQ(nic["rxpps"], 18446744073709551616.0) << "a counter that went backwards";
    EXPECT_EQ(nic["txpps"], 1152921642045800448U);
    EXPECT_EQ(nic["rxmbps"], 8.0) << "2^61 + 1000000 bytes; their bits wrap";
    EXPECT_EQ(nic["txeps"], 16777216.0);
    std::string sizes = Steps("73 \"nic0\"", "0 8 5 2  16 8 5 12884901898  8 8 5 0  24 8 5 77");
    nic = RunMeter(HOST + sizes, "-p 9 -t v -i 4").Port(9)["physnic"];
    EXPECT_EQ(nic["rxsize"], 2147483653) << "the low half of 2^32 + 2^31 + 5";
    EXPECT_EQ(nic["txsize"], 0) << "no packets";
}

TEST(PhysNic, NodeReadUnasked) {
    const std::tuple<const char *, std::size_t, const char *> rows[] = {
        {"v", 2 + 2, "physnic "},
        {"vq", 2 + 2 * (3 + 3) + 4 + 3, "physnic txqueue rxqueue "},
        {"Qv", 2 + 2 * (3 + 3) + 4 + 3, "physnic txqueue rxqueue "},
        {"qQW", 0, ""}};
    for (const auto &[letters, reads, sections] : rows) {
        MeterRun run = RunMeter(HOST, std::string("-d 1 -p 9 -i 1 -t ") + letters);
        EXPECT_EQ(Count(run.err, "Log1: nic nic0.dev.0 has 4 rxQ and 3 txQ\n"), reads > 4);
        EXPECT_EQ(NicReads(run.trace), reads) << letters;
        EXPECT_EQ(NicSections(run, 0), sections) << letters;
    }
}

// What goes wrong in the creation, in the first pass or in the third, what is told, and all reads of NIC nodes ahead of
// the end of the NIC: 2 at its creation, 6 in a pass, 7 for a record; 21 ahead of the third pass.
TEST(PhysNic, FailureGoesOnOrIsTriedAgainOrCostsThePort) {
    const std::string add = "fault add key=\"nic0\" nth=";
    const std::string error = "Log0: Error in physnic creation:";
    const std::string stat = SIMULATED + "physnic nic0.dev.0 stat \"";
    const std::string cleaned = "\" read error. Cleaning nic\n";
    const std::string restart = "Log0: Restart the program again as #";
    const std::string grown = " for nic0.dev.0 physnic\n";
    const std::tuple<std::string, std::string, std::size_t> rows[] = {
        {"fault create nth=9", error + "Param List Creation\n", 0},
        {"fault create nth=11", error + "Param List Creation\n", 0},
        {add + "1", error + "Adding nicname to param list instance\n", 0},
        {add + "3", error + "Adding nicname to param list instance\n", 0},
        {"fault get 72", error + "Pnic Properties\n", 0},
        {"fault get 131 nth=1", error + "PNIC TxQ Properties\n", 1},
        {"fault get 121 nth=1", error + "PNIC RxQ Properties\n", 2},
        {"fault get 73 nth=1", stat + "pnic stats" + cleaned, 2 + 1},
        {"fault get 73 nth=3", stat + "pnic stats" + cleaned, 21 + 1},
        {"fault get 121 nth=4", stat + "RxQInfo" + cleaned, 21 + 2},
        {"fault get 131 nth=4", stat + "TxQInfo" + cleaned, 21 + 3},
        {"fault get 132 \"nic0\" 1 nth=3", stat + "TxQ Stats" + cleaned, 21 + 5},
        {"fault add key=2 nth=4", stat + "Adding txQ num to param list" + cleaned, 21 + 5},
        {TXQ + "start=3 then=2:40000", restart + "TX queues has increased from 3 to 40000" + grown, 21 + 3},
        {TXQ + "start=0 then=2:1", restart + "TX queues has increased from 0 to 1" + grown, 2 + 3 + 3 + 7 + 3},
        {RXQ + "start=4 then=2:5", restart + "RX queues has increased from 4 to 5" + grown, 21 + 2},
        {RXQ + "start=4 then=2:5\n" + TXQ + "start=3 then=2:4", restart + "RX queues has increased from 4 to 5" + grown,
         23}};
    for (const auto &[lines, message, reads] : rows) {
        MeterRun run = RunMeter(HOST + lines + "\n", "-p 9 -t vq -i 1 -n 3");
        EXPECT_EQ(run.err, message);
        EXPECT_EQ(NicReads(run.trace), reads) << lines;
        EXPECT_EQ(NicSections(run, 0), reads > 3 ? "physnic txqueue rxqueue " : "") << lines;
        EXPECT_EQ(NicSections(run, 1) + NicSections(run, 2), "") << lines;
    }
}

// Queue 2 has 1000, 1800 and, after a gap, 3400 packets. Its element holds by then the rate of the first record, 200.
TEST(PhysNic, QueueThatComesBackStartsFromAnotherSample) {
    const std::string at = "field 132 \"nic0\" 2 at=";
    std::string queue =
        at + "0 width=4 start=1000 rate=200\n" + at + "4 width=4 start=40 rate=4\n" + at + "12 width=4 start=12\n";
    std::string counts = TXQ + "start=3 then=8:2 then=12:3\n" + RXQ + "start=4 then=8:0 then=12:4\n";
    MeterRun run = RunMeter(HOST + queue + counts, "-p 9 -t vq -i 4 -n 4");
    EXPECT_EQ(run.err, "");
    EXPECT_EQ(run.Port(9, 1)["txqueue"]["details"].size(), 2U);
    EXPECT_EQ(run.Port(9, 2)["txqueue"]["details"][2], nlohmann::json({{"pps", 800}, {"eps", 21}, {"qstops", 3}}));
    EXPECT_EQ(run.Port(9, 3)["txqueue"]["details"][2], nlohmann::json({{"pps", 200}, {"eps", 4}, {"qstops", 0}}));
}

TEST(PhysNic, FilterFailureBreaksTheArraysOrTheTotals) {
    const std::string uplink = "uplink switch=sw0 port=9 nic=nic0 rxqueues=3 filters=1,2,1\n";
    const std::string queue = "Log0: Error adding queue index for rxqinfo\n";
    const std::string filter = "Log0: Error adding filter index for rxinfo\n";
    const std::tuple<const char *, std::string, const char *> rows[] = {
        {"add key=2", queue, R"({"active":2,"count":3,"details":[[10],[11,12]],"filters":2,"ports":3})"},
        {"add key=21", filter, R"({"active":3,"count":3,"details":[[10],[11],[13]],"filters":3,"ports":4})"},
        {"get 126 \"nic0\" 1 20", "", R"({"active":3,"count":3,"details":[[10],[],[13]],"filters":3,"ports":4})"},
        {"get 126 \"nic0\" 1 21", "", R"({"active":3,"count":3,"details":[[10],[11],[13]],"filters":3,"ports":4})"},
        {"list 123 \"nic0\" 1", "", R"({"active":2,"count":3,"details":[[10],[],[13]],"filters":1,"ports":2})"},
        {"list 123 \"nic0\" 0", "", R"({"active":2,"count":3,"details":[[],[11,12],[13]],"filters":3,"ports":3})"}};
    for (const auto &[fault, message, details] : rows) {
        MeterRun run = RunMeter(HEAD + uplink + "fault " + fault + " nth=1\n", "-p 9 -t vq -i 1 -n 2");
        EXPECT_EQ(run.Port(9)["rxqueue"].dump(), details) << fault;
        EXPECT_EQ(Count(run.out, "[ ]"), fault == std::string("get 126 \"nic0\" 1 20")) << fault;
        EXPECT_EQ(run.err, message) << fault;
        EXPECT_EQ(run.Port(9, 1)["rxqueue"]["ports"], 4) << fault << " is not tried again";
    }
}

}  // namespace
