#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

const std::string HOST =
    "host name=h1\nswitch none\nswitch mgmt\nplain switch=mgmt port=4 type=10\n"
    "switch sw0\nplain switch=sw0 port=4000000000 type=2 client=b\nplain switch=sw0 port=3 type=1\n"
    "switch a-name-of-22-characters\nplain switch=a-name-of-22-characters port=5 type=3\n"
    "field 368 5 at=4 width=4 start=3000000000\nplain switch=a-name-of-22-characters port=6 type=99999 client=c\n";
const std::string HEADER = "PortNum          Type SubType SwitchName       MACAddress         ClientName\n";
const std::string SW0 = "4000000000          2       0 sw0              02:0a:ee:6b:28:00  b\n";
const std::string LONG = "5                   3 3000000000 a-name-of-22-characters 02:0a:00:00:00:05  \n"
                         "6                99999       0 a-name-of-22-characters 02:0a:00:00:00:06  c\n";

TEST(Enumerate, TableWithAWrongColumnOrHeaderOrPort) {
    MeterRun run = RunMeter(HOST, "-d 1 -l");
    EXPECT_EQ(run.out, HEADER + SW0 + LONG);
    EXPECT_EQ(run.err, "Log1: Mgmt Port 4 will not be displayed\nLog1: Mgmt Port 3 will not be displayed\n");
    EXPECT_EQ(run.status, 0);
    MeterRun selected = RunMeter(HOST, "-A -S nosuch -C nosuch -p 99 -t Z -d 2 -n 0 -l -o file");
    EXPECT_EQ(selected.out, "");
    EXPECT_EQ(RunFile("file"), run.out) << "selectors have a say in a listing";
    EXPECT_EQ(selected.trace, run.trace);
}

TEST(Enumerate, FailureCostsMoreOrLessThanItsSwitch) {
    const std::string created = "Log0: Unable to create switch param to list ports\n";
    const std::tuple<const char *, std::string, std::string> rows[] = {
        {"list 245", SIMULATED + "Unable to read switch list\n", ""},
        {"list 264 \"sw0\"", SIMULATED + "Unable to read port list for sw0 switch\n", HEADER + LONG},
        {"add key=\"sw0\" nth=1", "Log0: Unable to add swich name to param\n", HEADER + LONG},
        {"create nth=1", created, HEADER + SW0 + LONG},
        {"create", created + created + created + created, ""},
        {"get 266 \"sw0\"", SIMULATED + "GetPortsInfo 4000000000 Port Status\n", HEADER + LONG}};
    for (const auto &[fault, messages, table] : rows) {
        MeterRun run = RunMeter(HOST + "fault " + fault + "\n", "-l");
        EXPECT_EQ(run.out, table) << fault;
        EXPECT_EQ(run.err, messages) << fault;
    }
}

TEST(Enumerate, LargeHostIsListedInPart) {
    std::string host = "host name=big\nswitch s{i} count=100\n"
                       "plain switch=s{i/100} port={100000+i} type=2 client=c{i} count=10000\n";
    std::string table = RunMeter(host, "-l").out;
    EXPECT_TRUE(Count(table, "\n") == 10001 && Count(table, "\n109999              2       0 s99 ") == 1);
    nlohmann::json document = RunMeter(host, "-A -i 1").Document();
    for (int i = 0; i < 10000; i++) {
        EXPECT_EQ(document["stats"][0]["ports"][static_cast<unsigned>(i)].value("id", 0), 100000 + i);
    }
}

}  // namespace
