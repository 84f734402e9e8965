#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

const std::string HOST = "host name=h1 pcpus=1 packages=1 cores=1 llc=7\nswitch sw0\n"
                         "hostnic switch=sw0 port=7 name=a\nhostnic switch=sw0 port=8 name=b\n"
                         "hostnic switch=sw0 port=9 name=c\n";
// Each counter moves by a figure of its own; the sent packets of version 4 by more than single precision holds.
const std::string COUNTERS =
    Steps("32", "0 8 1 40  56 8 2 80  112 8 3 120  120 8 4 67108868  128 8 5 200  136 8 6 240  144 8 7 280") +
    Steps("37", "0 8 1 44  32 8 2 84  80 8 3 124  88 8 4 164  96 8 5 204  104 8 6 244  112 8 7 284") +
    Steps("33", "72 8 1 30  128 8 2 399  136 8 3 200  144 8 4 2000000  152 8 5 48  176 8 6 99  184 8 7 52  200 8 8 56 "
                "216 8 9 499  224 8 1 100  232 8 2 3000000  240 8 3 4  248 8 4 8  256 8 5 12  264 8 6 16  272 8 7 60 "
                "304 8 8 64  320 8 9 20  344 8 1 68  384 8 2 72  392 8 3 24  664 8 4 76") +
    Steps("34", "0 8 1 88  8 8 2 4  16 8 3 8  24 8 4 12  32 8 5 16  40 8 6 20  56 8 7 92  80 8 8 96");

std::string Sections(const std::string &out) {
    std::size_t begin = out.find(",\n  \"ipv4\"");
    return out.substr(begin, out.find("},\n\n{", begin) - begin);
}

TEST(HostNic, FiveSectionsByteForByte) {
    EXPECT_EQ(
        Sections(RunMeter(HOST + COUNTERS, "-S sw0 -t v -i 4").out),
        ",\n  \"ipv4\": { \"txpps\": 16777216, \"txeps\": 50, \"txfrags\": 70, \"rxpps\": 10, \"rxdeliv\": 30, "
        "\"rxeps\": 20, \"rxreass\": 60 }"
        ",\n  \"ipv6\": { \"txpps\": 41, \"txeps\": 51, \"txfrags\": 71, \"rxpps\": 11, \"rxdeliv\": 31, \"rxeps\": "
        "21, \"rxreass\": 61 }"
        ",\n  \"tcptx\": { \"pps\": 100, \"datapct\": 50.0, \"mbps\": 4.0, \"size\": 5000, \"delackpct\": 30.0, "
        "\"rexmit\": 12.0, \"sackrexmit\": 19.0, \"winprb\": 13.0, \"winupd\": 14.0 }"
        ",\n  \"tcprx\": { \"pps\": 125, \"datapct\": 20.0, \"mbps\": 6.0, \"size\": 6000, \"dups\": 15.0, \"oo\": "
        "16.0, \"winprb\": 17.0, \"winupd\": 18.0, \"othereps\": 21.0}"
        ",\n  \"udp\": {\"txpps\": 24, \"rxpps\": 22, \"rxsockeps\": 23.0, \"rxothereps\": 15.0}");
}

TEST(HostNic, CountersThatGoBackAreEnormousAndNeverTrap) {
    std::string back =
        "field 33 at=128 width=8 start=900 then=4:899\nfield 33 at=144 width=8 start=5 then=4:4294967300\n"
        "field 33 at=216 width=8 start=900 then=4:900\nfield 33 at=232 width=8 start=5 then=4:3000000005\n";
    nlohmann::json port = RunMeter(HOST + back, "-S sw0 -a -t v -i 4").Port(7);
    EXPECT_EQ(port["tcptx"]["pps"], 18446744073709551615.0 + 1);
    EXPECT_EQ(port["tcptx"]["size"], 0) << "a divisor that wrapped to 0";
    EXPECT_EQ(port["tcptx"]["datapct"], 0.0);
    EXPECT_EQ(port["tcprx"]["size"], -1294967296) << "signed, of the low 32 bits";
}

TEST(HostNic, OneReadAndOneReportServeAllPorts) {
    MeterRun run = RunMeter(HOST + COUNTERS, "-S sw0 -t v -i 4 -n 2");
    for (const char *node : {"get 32 ", "get 33 ", "get 34 ", "get 37 "}) {
        EXPECT_EQ(Count(run.trace, node), 3U) << node;
    }
    EXPECT_LT(run.trace.find("get 37 "), run.trace.find("get 33 "));
    for (std::size_t iteration : {0U, 1U}) {
        EXPECT_TRUE(run.Port(7, iteration).contains("udp"));
        EXPECT_FALSE(run.Port(8, iteration).contains("udp"));
    }
    nlohmann::json second = run.Port(7, 1);
    for (const char *section : {"ipv4", "ipv6", "tcptx", "tcprx", "udp"}) {
        for (const auto &figure : second[section]) {
            EXPECT_EQ(figure, 0) << section << ": the reported sample became the older one";
        }
    }
    EXPECT_EQ(Count(RunMeter(HOST, "-S sw0 -t W -i 1").trace, "get 32 "), 0U);
}

TEST(HostNic, FailedReadHandsTheReportToTheNextPort) {
    const std::pair<const char *, const char *> rows[] = {
        {"32", "IPv4 Stats"}, {"37", "IPv6 Stats"}, {"33", "TCP Stats"}, {"34", "UDP Stats"}};
    for (const auto &[node, label] : rows) {
        for (std::size_t nth : {1U, 2U, 3U}) {
            MeterRun run = RunMeter(HOST + COUNTERS + "fault get " + node + " nth=" + std::to_string(nth) + "\n",
                                    "-S sw0 -t v -i 4 -n 2");
            EXPECT_EQ(run.err, SIMULATED + "hostnic stats read error (node:" + label + ")\n");
            EXPECT_EQ(run.Port(7, 0).contains("udp"), nth == 3) << node << " " << nth;
            EXPECT_EQ(run.Port(8, 0).contains("udp"), nth < 3) << node << " " << nth;
            EXPECT_TRUE(run.Port(8, 1).contains("udp")) << node << " " << nth;
            EXPECT_EQ(run.Port(8, nth < 3 ? 0 : 1)["ipv4"]["rxpps"], nth < 3 ? 10 : 0) << node << " " << nth;
        }
    }
}

}  // namespace
