#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

// A port of a VM without vcpus and without traffic, so that its object ends with the sections of its NIC.
std::string Host(const std::string &model, int scheme = 0) {
    return "host name=h1 pcpus=1 packages=1 cores=1 llc=7\nswitch sw0\nvm vm1 leader=500\n"
           "vnic switch=sw0 port=7 vm=vm1 model=" +
           model + " scheme=" + std::to_string(scheme) + "\nfield 266 \"sw0\" 7 at=1196 width=4 start=0\n";
}

// The text of the first record behind the port's receive line.
std::string Sections(const MeterRun &run) {
    const std::string line = "\"rxsize\": 0, \"rxeps\": 0.00";
    std::size_t begin = run.out.find(line) + line.size();
    return run.out.substr(begin, run.out.find("}],\n\n\"overhead\"") - begin);
}

std::string SectionNames(const MeterRun &run, std::size_t iteration) {
    std::string names;
    nlohmann::json port = run.Port(7, iteration);
    for (const auto &[name, section] : port.items()) {
        names += section.is_structured() ? name + " " : "";
    }
    return names;
}

// The nodes of a virtual NIC in the order of their reads.
std::string Reads(const MeterRun &run) {
    const std::string nodes = "270 275 278 279 280 281 282 341 342 354 ";
    std::string reads;
    for (std::size_t at = 0; (at = run.trace.find("\nget ", at)) != std::string::npos; at++) {
        std::string node = run.trace.substr(at + 5, 4);
        reads += nodes.find(node) != std::string::npos ? node : "";
    }
    return reads;
}

// 16777217 and 16777219 have 25 significant bits: narrowed to single precision they are 16777216 and 16777220.
const char PARLAN2[] =
    "0 4 4294967290 36  4 4 70 39  12 4 9 13  16 4 55 1182  20 4 100 11  24 4 4294967295 16777219  28 4 1 47  36 4 3 10 "
    "40 8 -3 14  48 8 4 16777217  56 8 5 3  64 8 6 18  72 8 7 22  80 8 8 26  88 8 9 5  96 8 10 70  104 8 11 900";

TEST(Vnic, Parlan2FigureFromTheWrongFieldWidthOrDivisor) {
    std::string host = Host("parlan2") + Steps("270 \"sw0\" 7", PARLAN2);
    MeterRun run = RunMeter(host, "-p 7 -t v -i 4 -n 2");
    EXPECT_EQ(Sections(run), R"(,
  "vnic": { "type": "parlan2", "txcalls": 9, "copypct": 32.50, "maxpend": 1237, "intr": 12, "qstop": 11, "txeps": 4194304.8, "rxeps": 4194571.0,
    "txoflow": 4194304.8, "rxbuflow": 2.5, "ooslots": 3.5, "rxoflow": 4194304.0, "ring2err": 4.5, "maxfrags": 5.5, "mapfail": 6.5})");
    EXPECT_EQ(run.Port(7, 1)["vnic"]["rxeps"], 0) << "the sample is not turned over";
}

TEST(Vnic, Parlan3FigureFromTheWrongFieldWidthOrDivisor) {
    std::string tx =
        Steps("341 \"sw0\" 7", "2 8 -10 7  10 8 2 9  18 8 3 3  26 8 4 4  34 8 5 5  82 8 6 16777217  90 8 7 30 "
                               "106 4 4294967295 34  110 4 8 38  126 4 9 16777219");
    const std::string rx =
        "0 8 1 2  8 8 2 7  16 8 3 4  24 8 4 19  32 8 5 3  80 8 100 -5  88 8 1 47  96 4 6 46  100 4 7 50  124 4 8 54";
    std::string queue = Steps("354 \"sw0\" 7 0", "6 4 512 188  10 4 128 4294967167");
    MeterRun run = RunMeter(Host("parlan3") + tx + Steps("342 \"sw0\" 7", rx) + queue, "-p 7 -t v -i 4 -n 2");
    EXPECT_EQ(Sections(run), R"(,
  "vnic": { "type": "parlan3", "ring1sz": 700, "ring2sz": -1, "tsopct": 37.5, "tsotputpct": 40.0, "txucastpct": 62.5, "txeps": 4194304.0,
    "lropct": 40.0, "lrotputpct": 35.0, "rxucastpct": 60.0, "rxeps": 10.5,
    "txdisc": 7.5, "qstop": 9.5, "txallocerr": 8.5, "txtsosplit": 4194304.8, "r1full": 11.5, "r2full": 12.5, "sgerr": 13.5})");
    nlohmann::json still = run.Port(7, 1)["vnic"];
    EXPECT_TRUE(still["txdisc"] == 0 && still["r1full"] == 0) << "a sample is not turned over";
}

// 2^60 + 2^36 + 1 goes up to 2^60 + 2^37 in single precision, but down to 2^60 by way of double precision. The last
// pair is 2^61 - 1 and 2^60. Expected are 2^64 / 4 and (2^60 + 2^37) / 4.
TEST(Vnic, HugeDifferenceIsSignedOrRoundedTwice) {
    std::string host = Host("parlan2") + Steps("270 \"sw0\" 7", PARLAN2) +
                       Steps("270 \"sw0\" 7", "40 8 5 -1  48 8 4 0  72 8 7 0  80 8 8 1152921573326323713");
    nlohmann::json vnic = RunMeter(host, "-p 7 -t v -i 4").Port(7)["vnic"];
    EXPECT_EQ(vnic["ooslots"], 4611686018427387904.0);
    EXPECT_EQ(vnic["mapfail"], 288230410511450112.0);
    EXPECT_EQ(vnic["rxeps"], 288230410511450112.0);
    host = Host("parlan3") + Steps("341 \"sw0\" 7", "10 8 2 2305843009213693951  26 8 4 1152921504606846976");
    EXPECT_EQ(RunMeter(host, "-p 7 -t v -i 4").Port(7)["vnic"]["tsotputpct"], 50.0);
}

TEST(Vnic, CoalescingDetailFromTheWrongRecordOrAsADifference) {
    std::string scheme1 = Steps("280 \"sw0\" 7", "0 4 1 64  4 1 1 199  6 4 2 29  10 4 3 50") +
                          Steps("281 \"sw0\" 7", "0 4 1 -3  8 1 1 2  9 4 1 4  13 4 7 -6  17 4 1 2  21 4 0 0") +
                          Steps("282 \"sw0\" 7", "0 4 1 16  4 1 1 3");
    EXPECT_EQ(Sections(RunMeter(Host("parlan2", 1) + scheme1, "-p 7 -t c -i 4")), R"(,
  "coalesce": { "scheme": "fixed", "params": "rxdepth=64,txdepth=32",
    "tx": { "dyn": 3, "depth": -2, "split": {"hckcall": 50, "oppor": 10, "to": 30, "hc": 0} },
    "txcomp": { "dyn": 4, "depth": 17},
    "rx": { "dyn": 200, "depth": 65, "intrreq": 13, "intrpost": 8}})");
    std::string scheme2 =
        Steps("279 \"sw0\" 7", "8 1 0 255  9 1 0 2  10 1 0 3  12 4 1 20  16 4 1 30  20 4 1 40  25 4 1 24  29 4 1 12 "
                               "49 4 0 4294967295  53 4 0 4  57 4 0 6  61 4 0 0");
    EXPECT_EQ(Sections(RunMeter(Host("parlan2", 2) + scheme2, "-p 7 -t c -i 4")), R"(,
  "coalesce": { "scheme": "adaptive", "params": "rate=4000",
    "tx": { "dyn": 255, "depth": 21, "split": {"hck": 42949672950, "oppor": 40, "to": 60, "hc": 0} },
    "txcomp": { "dyn": 2, "depth": 31},
    "rx": { "dyn": 3, "depth": 41, "intrreq": 3, "intrpost": 6}})");
    std::string text(31, 'a');
    EXPECT_EQ(Sections(RunMeter(Host("3", 7) + "fill 278 \"sw0\" 7 at=4 size=64 byte=0x61\n", "-p 7 -t c -i 4")),
              ",\n  \"coalesce\": { \"scheme\": \"" + text + "\", \"params\": \"" + text + "\"}");
}

// 4 poll, 8 call, 12 to, 16 hc, 40 other and the 1 of the total.
TEST(Vnic, WorldletCountersAsSharesOfAnotherTotal) {
    std::string record = "275 \"sw0\" 7";
    std::string counters = Steps(record, "0 4 1 3  4 4 1 7  8 4 1 11  12 4 1 15  16 4 1 39");
    MeterRun run = RunMeter(Host("3") + counters, "-p 7 -t C -i 4");
    EXPECT_EQ(Sections(run), R"(,
  "coalesce": { "scheme": "off", "params": ""},
  "txwdt": { "total": 20, "hckcall": 9.9, "poll": 4.9, "to": 14.8, "hc": 19.8, "other": 49.4 })");
    counters = Steps(record, "0 4 0 4294967295  4 4 0 16777218  8 4 0 1  12 4 0 0  16 4 0 0");
    nlohmann::json wrapped = RunMeter(Host("3") + counters, "-a -p 7 -t C -i 4").Port(7)["txwdt"];
    EXPECT_EQ(wrapped["total"], 16777220) << "16777219, narrowed";
}

// Three passes, two records: the NIC, the letters, what fails at its first, second or third read, all reads, the
// sections of both records and what is told.
TEST(Vnic, ReadThatIsUnaskedOrOutOfOrderOrFailsAtAnotherPrice) {
    const std::string all = "278 280 281 282 275 270 ";
    const std::string rest = "275 270 ";
    const std::string lost = "txwdt vnic txwdt vnic ";
    const std::string failed = "Log1 Status: Simulated failure. Message: ";
    const std::string stage = "Log0 Status: Simulated failure. Message: Port 7 Stat \"";
    const std::string dead = "\" read error. Stats Disabled\n" + stage + "vnic stats\" read error. Stats Disabled\n";
    auto thrice = [](const std::string &reads) { return reads + reads + reads; };
    const std::tuple<const char *, int, const char *, const char *, std::string, std::string, std::string> rows[] = {
        {"parlan2", 1, "c", "", thrice("278 280 281 282 "), "coalesce coalesce ", ""},
        {"parlan2", 2, "Cv", "", thrice("278 279 275 270 "), "coalesce txwdt vnic coalesce txwdt vnic ", ""},
        {"parlan3", 1, "i", "", thrice("354 342 341 "), "vnic vnic ", ""},
        {"parlan3", 0, "vC", "", thrice("278 275 354 342 341 "), "coalesce txwdt vnic coalesce txwdt vnic ", ""},
        {"parlan3", 3, "qQel", "", "", "", ""},
        {"10", 2, "v", "", "", "", "Log2: No vnic stats for nic of type 10\n"},
        {"10", 2, "cv", "", thrice("278 279 "), "coalesce coalesce ", ""},
        {"0", 1, "C", "", thrice("278 280 281 282 275 "), "coalesce txwdt coalesce txwdt ", ""},
        {"parlan2", 1, "vC", "278 nth=1", "278 " + thrice(rest), lost, failed},
        {"parlan2", 1, "vC", "278 nth=2", all + all + rest, lost, failed},
        {"parlan2", 1, "vC", "278 nth=3", thrice(all), "coalesce txwdt vnic txwdt vnic ", failed},
        {"parlan2", 1, "vC", "280 nth=2", all + all + rest, lost, failed},
        {"parlan2", 1, "vC", "281 nth=2", all + all + rest, lost, failed},
        {"parlan2", 1, "vC", "282 nth=1", all + rest + rest, lost, failed},
        {"parlan2", 1, "vC", "280\nfault get 281\nfault get 282", all + rest + rest, lost, thrice(failed)},
        {"parlan2", 2, "vC", "279 nth=2", "278 279 275 270 278 279 " + rest + rest, lost, failed},
        {"parlan2", 1, "vC", "275 nth=2", all + all + "278 280 281 282 270 ", "coalesce vnic coalesce vnic ", failed},
        {"parlan2", 0, "v", "270 nth=2", "270 270 ", "", stage + "parlan2 stats" + dead},
        {"parlan3", 0, "v", "354 nth=2", "354 342 341 354 ", "", stage + "parlan3 rxqueue0 status" + dead},
        {"parlan3", 0, "v", "342 nth=2", "354 342 341 354 342 ", "", stage + "parlan3 rx summary" + dead},
        {"parlan3", 0, "v", "341 nth=2", "354 342 341 354 342 341 ", "", stage + "parlan3 tx summary" + dead}};
    for (const auto &[model, scheme, letters, fault, reads, sections, told] : rows) {
        std::string host = Host(model, scheme) + (*fault == 0 ? "" : "fault get ") + fault + "\n";
        MeterRun run = RunMeter(host, std::string("-d 2 -p 7 -i 1 -n 2 -t ") + letters);
        EXPECT_EQ(Reads(run), reads) << model << letters << fault;
        EXPECT_EQ(SectionNames(run, 0) + SectionNames(run, 1), sections) << model << letters << fault;
        EXPECT_EQ(run.err.substr(run.err.find('\n') + 1), told);
        EXPECT_EQ(run.Port(7).is_null(), told.ends_with(dead)) << "the port goes on or not";
        EXPECT_EQ(Count(run.trace, "0 -> 0xbad000f\nremove 0 -> 0x0 #"), *fault == '3' && fault[1] == '5') << fault;
    }
}

TEST(Vnic, FailureOnOnePortClearsTheBitsOfAnother) {
    std::string two = Host("parlan2", 1) + "vnic switch=sw0 port=8 vm=vm1 model=parlan2 scheme=1\n";
    MeterRun run = RunMeter(two + "fault get 278 \"sw0\" 7\nfault get 275 \"sw0\" 7\n", "-S sw0 -t C -i 1");
    EXPECT_TRUE(run.Port(8).contains("coalesce") && run.Port(8).contains("txwdt"));
}

TEST(Vnic, QueueNumberThatCannotBeAddedCostsThePort) {
    std::string host = Host("parlan3") + Steps("354 \"sw0\" 7 0", "6 4 512 188  10 4 128 1");
    std::string trace = RunMeter(host, "-p 7 -i 4 -t v").trace;
    std::string nth = std::to_string(Count(trace.substr(0, trace.rfind("get 354 ")), "add 0 -> "));
    MeterRun run = RunMeter(host + "fault add key=0 nth=" + nth + "\n", "-p 7 -i 4 -n 2 -t v");
    EXPECT_EQ(run.err, "Log0: Unable to set 0 in queueParams for port 7\n");
    EXPECT_EQ(Reads(run), "354 342 341 342 341 354 342 341 ");
    EXPECT_EQ(run.Port(7, 0)["vnic"]["ring1sz"], 512) << "the size of the pass before";
    EXPECT_EQ(run.Port(7, 1)["vnic"]["ring1sz"], 700);
}

}  // namespace
