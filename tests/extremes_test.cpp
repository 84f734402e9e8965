#include "tests/run_meter.h"

#include <algorithm>
#include <cmath>
#include <gtest/gtest.h>
#include <sstream>

namespace {

using u64 = unsigned long long;

// A port of each kind, with everything behind it.
std::string Host(const std::string &name, const std::string &nic) {
    return "host name=h pcpus=2 packages=1 cores=1\nvm v leader=700 vcpus=2\nswitch " + name +
           "\nuplink switch=" + name + " port=2 nic=" + nic + " rxqueues=2 filters=1,2\nhostnic switch=" + name +
           " port=3 name=k\nvnic " + "switch=" + name +
           " port={4+i} vm=v model={8+i} scheme={1+i} count=3\nplain switch=" + name +
           " port=7 type=2\nworldlet NetWdt-Async-700\nworldlet " + nic + "-tx\nvector 9 names=" + nic + "\n";
}

// The ports of the first record of a run with all statistics that lost nothing, which it would have told.
nlohmann::json Ports(const std::string &host) {
    MeterRun run = RunMeter(host, "-A -t vqiWcCQhV -i 4 -n 2", {"COREKIT_TRACE=", false});
    EXPECT_EQ(std::to_string(run.status) + run.err, "0");
    return run.Document().at("stats").at(0).at("ports");
}

TEST(Extremes, TextsWithoutAnEndEndWithTheirSpan) {
    std::string name(1023, 's');
    std::string nic(1047, 'n');
    std::string host = Host(name, nic) + "fill 368 {2+i} at=1032 size=1024 byte=115 count=6\nfill 266 \"" + name +
                       "\" {2+i} at=148 size=1048 byte=110 count=6\nfill 278 \"" + name +
                       "\" {4+i} at=4 size=64 byte=112 count=3\nfill 72 \"" + nic + "\" at=0 size=193 byte=100\n" +
                       "fill 519 \"Misc\" \"HostName\" at=544 size=1028 byte=104\n";
    nlohmann::json ports = Ports(host);
    EXPECT_EQ(ports[0]["switch"], name);
    EXPECT_EQ(ports[1]["name"], nic);
    EXPECT_EQ(ports[0]["physnic"]["devname"], nic + "." + std::string(192, 'd'));
    EXPECT_EQ(ports[2]["coalesce"]["scheme"], std::string(31, 'p'));
    EXPECT_EQ(RunMeter(host, "-A").Document()["sysinfo"]["hostname"], std::string(1027, 'h'));
}

TEST(Extremes, MostAndFewestQueuesAndNoBuckets) {
    for (int queues : {0, 65535}) {
        std::string count = " \"n\" at=0 width=2 start=" + std::to_string(queues) + "\n";
        nlohmann::json port = Ports(Host("s", "n") + "field 121" + count + "field 131" + count +
                                    "record 132 \"n\" {i} count=65535\nfill 776 {10700000+i} \"RUN\" at=0 size=352 "
                                    "byte=0 count=2\n")[0];
        for (const char *section : {"txqueue", "rxqueue"}) {
            EXPECT_EQ(port[section]["count"], queues);
            EXPECT_EQ(port[section]["details"].size(), queues);
        }
    }
}

// All counters of all records, as words of 8 bytes, step from one value to another between the first two passes.
TEST(Extremes, CountersAtTheEdgesOfTheirWidths) {
    const u64 edges[] = {0, 0x7fffffff, 0x80000000, 0xffffffff, 1ULL << 32, ~0ULL >> 1, 1ULL << 63, ~0ULL};
    for (int step = 0; step < 64; step++) {
        u64 before = edges[step / 8];
        u64 after = edges[step % 8];
        // Node and keys, offset of the first word, end of the last.
        std::istringstream spans(R"(32.0.240 33.0.728 34.0.112 37.0.3328 73/"n".0.4296 132/"n"/0.0.16 797/0.0.160
            797/1.0.160 840/9/0.0.16 840/9/1.0.16 275/"s"/4.0.16 280/"s"/4.6.36 281/"s"/4.9.32 279/"s"/5.25.68
            270/"s"/4.0.112 341/"s"/5.2.140 342/"s"/5.0.128 354/"s"/5/0.6.16 269/"s"/2.0.160 269/"s"/4.0.160
            332/"s"/7.0.224 337/"s"/7.0.336 770/10700000.0.120 772/10700000.4.64 793/10700000.0.8
            795/10700000/"L3".0.8 776/10700000/"RUN".0.352 1478/"n-tx".4.1460)");
        std::string host = Host("s", "n");
        for (std::string span; spans >> span;) {
            std::replace(span.begin(), span.end(), '/', ' ');
            size_t dot = span.find('.');
            for (u64 at = std::stoull(span.substr(dot + 1)); at + 8 <= std::stoull(span.substr(span.rfind('.') + 1));
                 at += 8) {
                host += "field " + span.substr(0, dot) + " at=" + std::to_string(at) +
                        " width=8 start=" + std::to_string(before) + " then=4:" + std::to_string(after) + "\n";
            }
        }
        nlohmann::json port = Ports(host)[0];
        EXPECT_EQ(port["rxpps"], std::nearbyint(static_cast<double>(static_cast<long long>(after - before)) / 4));
        EXPECT_EQ(port["physnic"]["rxpps"], std::nearbyint(double{static_cast<float>(after - before)} / 4));
    }
}

// The pipe is full long before its reader begins, and stays so.
TEST(Extremes, SlowReaderGetsTheWholeDocument) {
    RunScript(
        Host("s", "n") + "plain switch=s port={100+i} type=2 count=1000\n",
        "$METER -o whole -A -n 2; { $METER -A -n 2; echo $? >status; } | { sleep 0.2; dd bs=100 2>/dev/null; } >out");
    EXPECT_EQ(RunFile("status"), "0\n");
    EXPECT_GT(RunFile("whole").size(), 300000U);
    EXPECT_TRUE(RunFile("out") == RunFile("whole"));
}

// The superuser writes anywhere, so the run is without that privilege.
TEST(Extremes, ReadOnlyDirectoryIsToldAheadOfTheFirstWriteToTheKernel) {
    MeterRun run = RunScript(Host("s", "n"), "rm -rf closed; mkdir -m 555 closed; [ $(id -u) != 0 ] || "
                                             "drop='setpriv --bounding-set=-all --inh-caps=-all'\n"
                                             "$drop $METER -A -t hV -o closed/report >out 2>err");
    EXPECT_EQ(run.err, "Unable to open file closed/report for writing. Error:Permission denied\n");
    EXPECT_EQ(std::to_string(run.status) + run.out + run.journal, "1");
}

}  // namespace
