// The stand-in itself: what the other tests rest on.
#include "corekit/entry/control.h"
#include "interface/corekit.h"
#include "interface/types.h"
#include "tests/fixed_clock.h"
#include "tests/run_meter.h"

#include <bit>
#include <cmath>
#include <cstring>
#include <gtest/gtest.h>
#include <memory>
#include <random>
#include <string>
#include <vector>

namespace {

using Bytes = std::vector<unsigned char>;
struct Key {
    Key(int64_t value) : number(value) {}
    Key(const char *value) : text(value) {}
    int64_t number = 0;
    const char *text = nullptr;
};
using List = std::unique_ptr<KnfParamListRec, void (*)(KnfParamList)>;

List Parameters(uint32_t kind, const std::vector<Key> &keys) {
    List list(KNF_ParamListCreate(kind, static_cast<uint32_t>(keys.size())), KNF_ParamListDestroy);
    for (const Key &key : keys) {
        EXPECT_EQ(key.text != nullptr ? KNF_ParamListAddString(list.get(), key.text)
                                      : KNF_ParamListAddInt(list.get(), key.number),
                  0U);
    }
    return list;
}

KnfStatus Get(uint32_t node, const std::vector<Key> &keys, Bytes *record) {
    return KNF_Get(node, Parameters(KNF_INSTANCE_LIST, keys).get(), record->data(),
                   static_cast<uint32_t>(record->size()));
}

KnfStatus Set(uint32_t node, const std::vector<Key> &keys, const std::vector<Key> &input) {
    return KNF_Set(node, Parameters(KNF_INSTANCE_LIST, keys).get(), Parameters(KNF_INPUT_LIST, input).get(), nullptr,
                   0);
}

template <typename Number = uint64_t>
Number At(const Bytes &record, size_t offset) {
    Number value = 0;
    memcpy(&value, record.data() + offset, sizeof value);
    return value;
}

Bytes Record(uint32_t node, const std::vector<Key> &keys, size_t size) {
    Bytes record(size);
    EXPECT_EQ(Get(node, keys, &record), 0U) << node;
    return record;
}

void Load(const std::string &text) {
    std::string error;
    ASSERT_TRUE(CorekitLoad("host name=h pcpus=2\n" + text, &error)) << error;
}

constexpr char SMALL[] = "switch s\nvm v leader=7 vcpus=2 used=300\n"
                         "vnic switch=s port=5 vm=v model=parlan3 tx=1001 rx=700 size=100 errors=3\n";

}  // namespace

TEST(Corekit, NullAndFullListsAreRefusedAndHarmless) {
    CorekitCheck(false);
    EXPECT_EQ(KNF_ParamListAddInt(nullptr, 1), KNF_FAILURE);
    EXPECT_EQ(KNF_ParamListAddString(nullptr, "a"), KNF_FAILURE);
    EXPECT_EQ(KNF_ParamListUsedCount(nullptr), 0U);
    EXPECT_EQ(KNF_ParamListGetParam(nullptr, 0), nullptr);
    KNF_ParamListRemoveLastParam(nullptr);
    KNF_ParamListDestroy(nullptr);

    List list(KNF_ParamListCreate(1, 2), KNF_ParamListDestroy);
    KNF_ParamListRemoveLastParam(list.get());
    char text[] = "name";
    EXPECT_EQ(KNF_ParamListAddString(list.get(), text), 0U);
    text[0] = 'X';  // the list keeps a copy
    EXPECT_EQ(KNF_ParamListAddInt(list.get(), -9), 0U);
    EXPECT_NE(KNF_ParamListAddInt(list.get(), 3), 0U);
    EXPECT_EQ(KNF_ParamListUsedCount(list.get()), 2U);
    const char *got = nullptr;
    EXPECT_EQ(KNF_ParamListGetString(list.get(), 0, &got), 0U);
    EXPECT_STREQ(got, "name");
    EXPECT_NE(KNF_ParamListGetString(list.get(), 1, &got), 0U);
    EXPECT_EQ(KNF_ParamGetInt(KNF_ParamListGetParam(list.get(), 1)), -9);
    EXPECT_STREQ(KNF_ParamGetString(KNF_ParamListGetParam(list.get(), 2)), "");
    for (KnfStatus status : {0U, KNF_FAILURE, 1U, 0xffffffffU}) {
        EXPECT_GT(strlen(HCK_ReturnStatusToString(status)), 3U);
    }
}

TEST(Corekit, CountersFollowClockRateAndCourse) {
    Load(std::string(SMALL) + "field 269 \"s\" 5 at=16 width=8 start=18446744073709551615 rate=2\n"
                              "field 269 \"s\" 5 at=88 width=4 start=100 rate=-7 then=2:50 then=3:0xffffffff:1\n"
                              "field 269 \"s\" 5 at=96 width=8 start=-9223372036854775808\n");
    Bytes start = Record(269, {"s", 5}, 160);
    EXPECT_EQ(start, Record(269, {"s", 5}, 160));  // a clock that stands still moves nothing, noise included
    EXPECT_NE(At(start, 40), 0U);
    EXPECT_EQ(At(start, 96), 0x8000000000000000U);
    FixedClockAdvance(1500000);
    Bytes later = Record(269, {"s", 5}, 160);
    EXPECT_NEAR(static_cast<double>(At(later, 0) - At(start, 0)), 1126, 1);   // three quarters of 1001 a second
    EXPECT_NEAR(static_cast<double>(At(later, 24) - At(start, 24)), 375, 1);  // a quarter
    EXPECT_EQ(At(later, 80) - At(start, 80), 105000U);
    EXPECT_EQ(At(later, 16), 2U);             // -1 + 3, wrapped
    EXPECT_EQ(At<uint32_t>(later, 88), 90U);  // 100 - 10, cut towards zero
    FixedClockAdvance(500000);
    EXPECT_EQ(At<uint32_t>(Record(269, {"s", 5}, 160), 88), 50U);
    FixedClockAdvance(3000000);
    EXPECT_EQ(At<uint32_t>(Record(269, {"s", 5}, 160), 88), 1U);
}

TEST(Corekit, VcpuHistogramsFollowTheHostWideOption) {
    Load(SMALL);
    auto count = [] { return At(Record(776, {10007000, "RUN"}, 352), 24); };
    uint64_t start = count();
    EXPECT_NE(start, 0U);
    FixedClockAdvance(1000000);
    EXPECT_EQ(count(), start);
    EXPECT_EQ(Set(520, {"Cpu", "TrackHistos"}, {1}), 0U);
    EXPECT_EQ(Record(519, {"Cpu", "TrackHistos"}, 1572)[544], '1');
    FixedClockAdvance(1000000);
    EXPECT_EQ(Set(520, {"Cpu", "TrackHistos"}, {int64_t{0}}), 0U);
    EXPECT_NEAR(static_cast<double>(count() - start), 300, 12);
}

TEST(Corekit, FaultsFailTheCallsTheyName) {
    struct Case {
        const char *fault;
        const char *outcome;  // of five reads of port 5's counters, then one of port 6's
    };
    for (const Case &row : {Case{"fault get 269", "FFFFFF"}, Case{"fault get 269 \"s\" 5 nth=2", ".F...."},
                            Case{"fault get 269 \"s\" 5 from=3", "..FFF."}, Case{"fault get nth=6", ".....F"},
                            Case{"fault get 266", "......"}, Case{"fault list", "......"}}) {
        Load(std::string(SMALL) + "plain switch=s port=6 type=2\n" + row.fault + "\n");
        std::string outcome;
        for (int64_t port : {5, 5, 5, 5, 5, 6}) {
            Bytes record(160);
            outcome += Get(269, {"s", port}, &record) == 0 ? '.' : 'F';
        }
        EXPECT_EQ(outcome, row.outcome) << row.fault;
    }
}

TEST(Corekit, FaultsOfAFileMeetEachSource) {
    WriteRunFile("faults", "# of any host\nfault get 603 status=7\n");
    WriteRunFile("bad", "\nfault gett\n");
    MeterRun run = RunScript("", "${METER% *} " RECORD_BINARY " -o s -i 0 -n 1 >table; rm trace\n"
                                 "for faults in faults bad; do for source in demo '' ' -c s.0'; do\n"
                                 "  set -- ${source#demo}; ${METER%%demo*}${source%% *} COREKIT_FAULTS=$faults"
                                 " ${METER#*demo} -A $* -i 0 && echo passed; done; done >out 2>err");
    EXPECT_EQ(Count(run.trace, "get 603 -> 0x7\n"), 3U);
    EXPECT_EQ(Count(run.err, "bad:2: call \"gett\": expected get, list, "), 3U) << run.err;
    EXPECT_EQ(run.out.find("passed"), std::string::npos);
}

TEST(Corekit, ErrorsInDescriptionsNameLineAndExpectation) {
    const std::vector<std::pair<const char *, const char *>> cases = {
        {"switch s\nswich t\n", "text:3: keyword \"swich\": expected host, pcpu"},
        {"\n# c\nswitch s\nvnic switch=s port=1 vm=v model=3\n", "text:5: vm \"v\" unknown: expected the name of a vm"},
        {"switch s\nplain switch=s port=1 type=2 colour=3\n", "text:3: key colour= unknown or repeated: expected"},
        {"switch s{i/0} count=2\n", "text:2: braces in \"s{i/0}\": expected {i}"},
        {"switch s{-9223372036854775808/-1} count=2\n", "text:2: braces in "},
        {"field 603 at=33 width=4 start=1\n", "text:2: at= goes past the record: expected 4 bytes within 36"},
        {"field 9 at=0 width=4 start=1\n", "text:2: no such instance: expected node and keys"},
        {"field 603 at=8 width=4 start=1x\n", "text:2: value \"1x\": expected a number of 32 bits"},
        {"field 603 at=8 width=8 start=-9223372036854775809\n", "text:2: value \"-9223372036854775809\": expected a"},
        {"host name=again\n", "text:2: keyword \"host\": expected one host line"},
        {"switch \"a\\x1\"\n", "text:2: \\x1\" in a text: expected two hexadecimal digits behind \\x"},
        {"switch \"a\\x1g\"\n", "text:2: \\x1g in a text: expected two hexadecimal digits"},
        {"field 603 at=8 width=2 start=65536\n", "text:2: value \"65536\": expected a number of 16 bits"},
        {"field 603 at=8 width=2 start=65535 then=2:-32769\n", "text:2: value \"-32769\": expected a number of 16"},
        {"fault get nth=2 from=3\n", "text:2: nth= and from=: expected one of them"},
        {"fault get signal=15 status=3\n", "text:2: signal= and status=: expected one of them"},
        {"fault get signal=15 delay=3\n", "text:2: signal= and delay=: expected one of them"},
        {"fault cache 603\n", "text:2: node too many: expected one for get, list, set and any alone"},
        {"pcpu 0 busy=5 worldlet=6\n", "text:2: worldlet=, a part of busy=: 6 per mille, expected at most 5"},
        {"vm v leader=7 used=900 ready=90 costop=11\n", "text:2: used=, ready= and costop= together: 1001 per mille"},
        {"worldlet w used=900 ready=90 wait=11\n", "text:2: used=, ready= and wait= together: 1001 per mille"},
        {"self count=9\nself count=999992\n", "text:3: count= \"999992\": expected a number from 1 to 999991"},
        {"record 9 {i} size=1 count=999999\n", "text:2: too large a host: expected at most 1000000 records and"},
        {"list 9 = 1 then=3 1 then=2\n", "text:2: then= \"2\": expected ascending seconds"},
    };
    for (const auto &[text, expected] : cases) {
        std::string error;
        EXPECT_FALSE(CorekitLoad(std::string("host name=h\n") + text, &error));
        EXPECT_EQ(error.substr(0, strlen(expected)), expected);
    }
    std::string error;
    EXPECT_FALSE(CorekitLoad("host count=2\n", &error));
    EXPECT_EQ(error.substr(0, 20), "text:1: key count= u");
    CorekitRecord(true);
    setenv("COREKIT_HOST", "/nowhere", 1);
    EXPECT_EQ(HckSyscall_Init(1, 0, 0), -1);
    unsetenv("COREKIT_HOST");
    Bytes record(36);
    EXPECT_NE(Get(603, {}, &record), 0U);  // nothing of a bad description stays connected
    Load("");
    EXPECT_EQ(HckSyscall_Init(1, 0, 0), 0);
    EXPECT_NE(CorekitRecorded().front(), "init -> 0x0");
    EXPECT_EQ(CorekitRecorded().back(), "init -> 0x0");
}

TEST(Corekit, FormatsEveryNumberAsTheCLibraryDoes) {
    std::mt19937_64 random(1);
    auto same = [&](const char *format, auto value) {
        char ours[80] = {}, theirs[80] = {};
        size_t size = random() % 8 == 0 ? random() % 12 : sizeof ours;  // that it does not fit, too
        int length = snprintf(theirs, size, format, value);
        EXPECT_EQ(Str_Snprintf(ours, size, format, value), static_cast<size_t>(length) < size ? length : -1);
        EXPECT_EQ(memcmp(ours, theirs, sizeof ours), 0) << format << " " << value << ": " << ours << ", " << theirs;
    };
    for (int i = 0; i < 20000; i++) {
        u64 bits = random() >> random() % 64;
        double halves = static_cast<double>(static_cast<i64>(bits % 8000000) - 4000000) / (1 << random() % 12);
        double any = std::bit_cast<double>(random()), number = random() % 2 == 0 ? halves : any;
        number = std::abs(number) < 1e40 ? number : std::copysign(HUGE_VAL, number);
        for (const char *format : {"%.0f", "%.1f;", "%6.2f", "%.3f%%", "%06.1f", "%f"}) {
            same(format, number);
        }
        for (const char *format : {"%Ld", "%lu", "%5Ld", "%020Ld", "%-9Ld;"}) {
            same(format, i % 2 == 0 ? bits : 0 - bits);
        }
        for (const char *format : {"%d", "%u", "%02x:", "%+d"}) {
            same(format, static_cast<u32>(bits));
        }
    }
    for (const char *text : {"", "twelve bytes", "%s"}) {
        same("<%s>", text);
        same("%4s", text);
    }
}

// Every layout, offset, factor, rate and default of the simulated host in one figure, noise included. After a wanted
// change the new one comes from the test's own output.
TEST(Corekit, RecordsOfTheBuiltInAndOfABareHostAreTheKnownOnes) {
    WriteRunFile("bare", "host\nswitch s\nuplink switch=s port=1 nic=n\nhostnic switch=s port=2 name=h\n"
                         "vm v leader=7\nvnic switch=s port=3 vm=v model=parlan2\nworldlet w\nvector 9 names=n\n");
    MeterRun run = RunScript("", "for host in demo bare; do ${METER% *} COREKIT_HOST=$host " RECORD_BINARY
                                 " -o s -i 3 -n 2 && ${METER% *} " RECORD_BINARY " --dump s.1 >>dump; wc -c s.1 >>size;"
                                 " done >out; grep -v ^snapshot dump | cksum >sum; head -1 dump >>sum");
    EXPECT_TRUE(RunFile("sum").starts_with("40590257 396722\n")) << RunFile("sum");
    EXPECT_EQ(Count(RunFile("sum"), " time=1700000003.000000000 "), 1U) << RunFile("sum");
    // With all letters, and so with histograms, which no snapshot holds.
    RunScript("", "$METER -A -t vqiWcCQhV -i 3 -n 3 | cksum >sum");
    EXPECT_EQ(RunFile("sum"), "1589113585 106062\n");
    EXPECT_LT(std::stoi(RunFile("size")), 30000) << "packed to a sixth";
}

// What the program makes of counters, apart from how a simulated host moves by itself: each figure of these reports
// comes from a field line.
TEST(Corekit, ReportOfCountersSetByHandIsTheKnownOne) {
    RunScript("", "for more in '' -a; do ${METER% *} COREKIT_HOST=" TEST_DATA "/explicit.host build/lan-meter -A -t "
                  "vqiWcCQhV -i 3 -n 3 $more | cksum; done >sum");
    EXPECT_EQ(RunFile("sum"), "2159643162 85669\n3024732459 85950\n");
}
