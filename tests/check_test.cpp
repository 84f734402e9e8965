// The stand-in against its users: misuse ends a process in check mode, and nothing that a user does ends it otherwise.
#include "corekit/entry/control.h"
#include "interface/corekit.h"
#include "interface/types.h"
#include "tests/failing_new.h"
#include "tests/run_meter.h"

#include <csignal>
#include <cstring>
#include <functional>
#include <gtest/gtest.h>
#include <sstream>
#include <string>
#include <unistd.h>
#include <utility>
#include <vector>

namespace {

constexpr char HOST[] = "host name=h pcpus=2\nswitch s\nplain switch=s port=5 type=2\nworldlet w\n";
char record[160];

KnfParamList PortKeys() {
    KnfParamList list = KNF_ParamListCreate(KNF_INSTANCE_LIST, 3);
    KNF_ParamListAddString(list, "s");
    KNF_ParamListAddInt(list, 5);
    return list;
}

KnfParamList Destroyed() {
    KnfParamList list = PortKeys();
    KNF_ParamListDestroy(list);
    return list;
}

KnfParamList Listed(uint32_t node) {
    KnfParamList list = nullptr;
    EXPECT_EQ(KNF_GetInstanceListAlloc(node, nullptr, &list), 0U);
    return list;
}

void UseNoCache() {
    KNF_UseCache("/nowhere", 0);
}

}  // namespace

TEST(Check, MisuseEndsTheProcessWithALineThatNamesIt) {
    const std::pair<const char *, void (*)()> rows[] = {
        {"ParamListGetParam \"s\" 5: entry 2 of 2, list #[0-9]+\n", [] { KNF_ParamListGetParam(PortKeys(), 2); }},
        {"ParamListGetParam: entry 0 of 0, a null list\n", [] { KNF_ParamListGetParam(nullptr, 0); }},
        {"ParamListGetString 1476: entry 1 of 1, list #[0-9]+\n",
         [] {
             const char *text = nullptr;
             KNF_ParamListGetString(Listed(1476), 1, &text);
         }},
        {"ParamGetInt \"s\" 5: the integer of \"s\", list #[0-9]+\n",
         [] { KNF_ParamGetInt(KNF_ParamListGetParam(PortKeys(), 0)); }},
        {"ParamGetInt 245: the integer of \"s\", list #[0-9]+\n",
         [] { KNF_ParamGetInt(KNF_ParamListGetParam(Listed(245), 0)); }},
        {"ParamGetString \"s\" 5: the text of 5, list #[0-9]+\n",
         [] { KNF_ParamGetString(KNF_ParamListGetParam(PortKeys(), 1)); }},
        {"ParamListGetString \"s\" 5: the text of 5, list #[0-9]+\n",
         [] {
             const char *text = nullptr;
             KNF_ParamListGetString(PortKeys(), 1, &text);
         }},
        {"ParamListAddInt \"s\" 5: list #[0-9]+ was destroyed\n", [] { KNF_ParamListAddInt(Destroyed(), 1); }},
        {"ParamListAddString \"s\" 5: list #[0-9]+ was destroyed\n", [] { KNF_ParamListAddString(Destroyed(), "a"); }},
        {"ParamListRemoveLastParam \"s\" 5: list #[0-9]+", [] { KNF_ParamListRemoveLastParam(Destroyed()); }},
        {"ParamListUsedCount \"s\" 5: list #[0-9]+", [] { KNF_ParamListUsedCount(Destroyed()); }},
        {"ParamListDestroy \"s\" 5: list #[0-9]+ was", [] { KNF_ParamListDestroy(Destroyed()); }},
        {"Get 269 \"s\" 5: list #[0-9]+ was", [] { KNF_Get(269, Destroyed(), record, 160); }},
        {"Set 331 \"s\" 5: list #[0-9]+ was", [] { KNF_Set(331, PortKeys(), Destroyed(), nullptr, 0); }},
        {"ParamListDestroy: no list that", [] { KNF_ParamListDestroy(reinterpret_cast<KnfParamList>(record)); }},
        {"GetInstanceListAlloc 1476: overwrites the handle of list #[0-9]+, which is alive\n",
         [] {
             KnfParamList list = Listed(245);
             KNF_GetInstanceListAlloc(1476, nullptr, &list);
         }},
        {"Init 1 0 2: expected 1 0 0\n", [] { HckSyscall_Init(1, 0, 2); }},
        {"Init 1 0 0: a second time\n",
         [] {
             HckSyscall_Init(1, 0, 0);
             HckSyscall_Init(1, 0, 0);
         }},
        {"Init 1 0 0: during a replay\n",
         [] {
             UseNoCache();
             HckSyscall_Init(1, 0, 0);
         }},
        {"CheckSig 20: expected a size of 21\n", [] { KNF_CheckSig(record, 20, nullptr); }},
        {"UseCache \"a\" 1: expected flags 0\n", [] { KNF_UseCache("a", 1); }},
        {"UseCache \"/nowhere\" 0: a second time without KNF_CacheCleanup\n",
         [] {
             UseNoCache();
             UseNoCache();
         }},
    };
    ASSERT_TRUE(CorekitLoad(HOST, nullptr));
    for (const auto &[line, misuse] : rows) {
        EXPECT_EXIT(misuse(), testing::KilledBySignal(SIGABRT), "corekit: misuse: .*" + std::string(line)) << line;
    }
    UseNoCache();
    KNF_CacheCleanup();
    UseNoCache();  // in order
}

// What a host lists is not the caller's doing: a name that is a number is asked for as a name all the same.
TEST(Check, EntriesThatAHostGotWrongAreNoMisuse) {
    const char *host = "host name=h pcpus=1\nswitch s\nuplink switch=s port=7 nic=n\nlist 264 \"s\" = 7 \"x\"\n"
                       "list 245 = \"s\" 4\nlist 1476 = 5 \"n\"\nlist 639 = \"v\" 0\nlist 641 0 = 8\n"
                       "list 123 \"n\" 0 = \"f\"\n";
    EXPECT_EQ(RunMeter(host, "-p 7 -t qiW -i 1").status, 0);
    EXPECT_EQ(RunMeter(host, "-A").status, 1) << "no such switch";
    EXPECT_EQ(RunScript(host, "${METER% *} " RECORD_BINARY " -o s -n 1 >out 2>err").status, 0);
}

// The number is what a run itself shows: as many after five iterations as after one.
TEST(Check, ListsThatOutliveARunBeyondThoseItKeepsAreMisuse) {
    int kept = 0;
    std::istringstream trace(RunMeter("", "-A -t vqiWcCQhV -i 1").trace);
    for (std::string line; std::getline(trace, line);) {
        bool made = line.starts_with("create ") || line.starts_with("list ");
        kept += line.find(" -> 0x0 #") == line.npos ? 0 : made ? 1 : line.starts_with("destroy ") ? -1 : 0;
    }
    EXPECT_GT(kept, 50);
    auto run = [](const char *iterations, int most) {
        return RunScript("", std::string("$METER -A -t vqiWcCQhV -i 1 >out 2>told -n ") + iterations,
                         {"COREKIT_LISTS_AT_EXIT=" + std::to_string(most)});
    };
    EXPECT_EQ(run("5", kept).status, 0) << RunFile("told");
    EXPECT_EQ(run("1", kept - 1).status, 128 + SIGABRT);
    std::string line = ": " + std::to_string(kept) + " lists are alive, expected at most " + std::to_string(kept - 1);
    EXPECT_EQ(Count(RunFile("told"), line), 1U) << RunFile("told");
}

TEST(Check, WhatAFailedCallOrADestroyedListLeavesIsNoUse) {
    const std::string pattern(sizeof record, '\xa5');
    ASSERT_TRUE(CorekitLoad(std::string(HOST) + "fault get 269 nth=1\nfault set 331\n", nullptr));
    KnfParamList keys = PortKeys();
    auto left = [&](auto call, bool fails) {
        memset(record, 0, sizeof record);
        EXPECT_EQ(call() != 0, fails);
        return std::string(record, sizeof record) == pattern;
    };
    EXPECT_TRUE(left([&] { return KNF_Get(269, keys, record, 160); }, true)) << "a fault";
    EXPECT_FALSE(left([&] { return KNF_Get(269, keys, record, 160); }, false));
    EXPECT_TRUE(left([&] { return KNF_Get(270, keys, record, 160); }, true)) << "no such instance";
    EXPECT_TRUE(left([&] { return KNF_Set(331, keys, nullptr, record, 160); }, true));
    const char *text = KNF_ParamGetString(KNF_ParamListGetParam(keys, 0));
    EXPECT_EQ(CorekitCallCounts().alive, 1U);
    KNF_ParamListDestroy(keys);
    EXPECT_EQ(CorekitCallCounts().alive, 0U);
    // A sanitizer ends the process that looks.
    EXPECT_EXIT(
        _exit(strcmp(text, "s") == 0 ? 0 : 3), [](int status) { return status != 0; }, "");
}

// Each allocation of each call fails once, those of its trace line and of check mode included.
TEST(Check, NoExceptionLeavesACallWithoutMemory) {
    KnfParamList made = nullptr, keys = KNF_ParamListCreate(KNF_INSTANCE_LIST, 65536);
    auto drop = [&] { KNF_ParamListDestroy(std::exchange(made, nullptr)); };
    const std::function<bool()> calls[] = {
        // true when all went well
        [] { return CorekitUnload(), HckSyscall_Init(1, 0, 0) == 0; },
        [] { return KNF_CheckSig(record, KNF_SIGNATURE_SIZE, nullptr) == 0; },
        [] { return KNF_Get(603, nullptr, record, 36) == 0; },
        [] { return KNF_Set(520, nullptr, nullptr, nullptr, 0) != 0; },
        [&] { return drop(), KNF_GetInstanceListAlloc(245, nullptr, &made) == 0; },
        [&] { return drop(), KNF_GetInstanceListAlloc(1476, nullptr, &made) == 0; },
        [&] { return drop(), (made = KNF_ParamListCreate(KNF_INPUT_LIST, 9)) != nullptr; },
        [&] { return KNF_ParamListAddString(keys, "a text that is longer than a string has room for") == 0; },
        [&] { return KNF_ParamListAddInt(keys, 1) == 0; },
        [&] { return KNF_ParamListRemoveLastParam(keys), KNF_ParamListUsedCount(keys) > 0; },
        [&, text = ""]() mutable { return KNF_ParamListGetString(keys, 0, &text) == 0; },
        [&] { return KNF_ParamListGetParam(keys, 0) != nullptr; },
        [] { return KNF_UseCache("/nowhere", 0) != 0 && KNF_CacheCleanup() == 0; },
    };
    CorekitRecord(true);
    for (const char *host : {"demo", ""}) {
        setenv("COREKIT_HOST", host, 1);
        int failures = 0;
        for (const auto &call : calls) {
            for (int n = 1; failingNew == 0; n += 1 + n / 50, failures++) {
                failingNew = n;
                call();
                failingNew = failingNew > 0 ? -1 : 0;  // it does not ask so often
            }
            failingNew = 0;
            EXPECT_TRUE(call()) << host << &call - calls;
        }
        EXPECT_GT(failures, 100);
    }
    drop();
    KNF_ParamListDestroy(keys);
}

TEST(Check, ReadsFromTheEndOfAProcessStillWork) {
    static std::string before(160, '\0');
    auto read = [](std::string *into) { return KNF_Get(269, PortKeys(), into->data(), 160) == 0; };
    EXPECT_EXIT(
        {
            // Ahead of all that a first read makes, and so run when that is gone.
            atexit([] {
                std::string again(160, '\0');
                _exit(KNF_Get(269, PortKeys(), again.data(), 160) == 0 && again == before ? 42 : 1);
            });
            exit(CorekitLoad(HOST, nullptr) && read(&before) ? 0 : 1);
        },
        testing::ExitedWithCode(42), "");
}

// A program with the set-user-id bit, run by nobody: had the library obeyed, it would write wherever nobody says.
TEST(Check, EnvironmentOfALesserUserIsNotHonoured) {
    MeterRun run = RunScript("", "[ $(id -u) = 0 ] || exit 77; chmod 755 .; cp $(command -v id) id; cp " RECORD_BINARY
                                 " record; chmod 4755 id record; as='setpriv --reuid=65534 --clear-groups'\n"
                                 "[ \"$($as ./id -u)\" = 0 ] || exit 77; export ASAN_OPTIONS=detect_leaks=0"
                                 " COREKIT_HOST=demo COREKIT_TRACE=trace COREKIT_JOURNAL=journal COREKIT_CHECK=1\n"
                                 "$as ./record -o mine -n 1 && [ ! -e trace ] && [ ! -e journal ] || exit 1\n"
                                 "./record -o theirs -n 1 && [ -s trace ] && ./record --dump theirs.0 >out\n"
                                 "./record --dump mine.0 >err");
    if (run.status == 77) {
        GTEST_SKIP() << "needs root, setpriv and a /tmp that honours the set-user-id bit";
    }
    EXPECT_EQ(run.status, 0);
    EXPECT_EQ(Count(run.out, "list 245 = \"vSwitch0\" "), 1U);
    EXPECT_EQ(Count(run.err, "list 245 = \"vSwitch0\" "), 0U) << "not the machine itself";
}

TEST(Check, SignatureSnapshotAndNamesFailOnDemand) {
    WriteRunFile("faults", "fault cache nth=2\n");
    const std::string host = std::string(HOST) + "uplink switch=s port=7 nic=w\n";
    const std::string differs = ": md5 signature mismatch with running hostcore built on ";
    MeterRun run = RunMeter(host + "fault signature nth=1\n", "-p 7");
    EXPECT_EQ(run.status, 1);
    EXPECT_TRUE(run.err.starts_with("0xbad000f" + differs + "Mar 14 2024")) << run.err;
    EXPECT_TRUE(RunMeter(host, "-p 7 -t W -i 1").Port(7).contains("wdt"));
    EXPECT_FALSE(RunMeter(host + "fault text\n", "-p 7 -t W -i 1").Port(7).contains("wdt"));
    run = RunScript(host, "${METER% *} " RECORD_BINARY " -o s -i 1 -n 2 >out && $METER >out 2>err -p 7 -c s.0:s.1",
                    {"COREKIT_FAULTS=faults"});
    EXPECT_TRUE(run.err.starts_with(SIMULATED + "Couldn't open cache file s.1\n0xbad0002" + differs)) << run.err;
    EXPECT_EQ(run.Document().at("stats").size(), 0U);
}

// Filters are listed anew for each record. Whatever else was found at the start is read to the end, and no more.
TEST(Check, ListsThatShrinkVanishAndComeBackBetweenPasses) {
    const std::pair<const char *, std::vector<std::string>> lists[] = {
        {"list 123 \"n\" 0", {"10", "11", "12"}},
        {"list 753 502", {"10500000", "10500001", "10500002"}},
        {"list 1476", {"\"n-a\"", "\"n-b\"", "\"n-c\""}},
        {"list 639", {"64", "65", "66"}},
    };
    std::string host =
        "host name=h pcpus=1\nswitch s\nuplink switch=s port=9 nic=n filters=3\nvm v leader=500 vcpus=3\n"
        "vnic switch=s port=7 vm=v model=3\nplain switch=s port={5+i} type=2 count=2\nworldlet n-a\nworldlet n-b\nworldlet n-c\n"
        "vector {64+i} names=n count=3\n";
    for (const auto &[list, entry] : lists) {
        host += std::string(list) + " = " + entry[0] + " " + entry[1] + " then=2 " + entry[0] + " then=4 then=6 " +
                entry[1] + " " + entry[2] + " " + entry[0] + "\n";
    }
    MeterRun run = RunMeter(host, "-S s -t vqiW -i 2 -n 3");
    EXPECT_EQ(run.err, "");
    EXPECT_EQ(run.Port(9, 0)["rxqueue"]["details"].dump(), "[[7]]");
    EXPECT_EQ(run.Port(9, 1)["rxqueue"]["details"].dump(), "[[]]");
    EXPECT_EQ(run.Port(9, 2)["rxqueue"]["details"].dump(), "[[5,6,7]]");
    for (const auto &[get, entries] : {std::pair{"\nget 770 ", lists[1].second},
                                       {"\nget 1478 ", lists[2].second},
                                       {"\nget 840 ", lists[3].second}}) {
        EXPECT_EQ(Count(run.trace, get + entries[0] + " "), 4U) << get;
        EXPECT_EQ(Count(run.trace, get + entries[1] + " "), 4U) << get;
        EXPECT_EQ(Count(run.trace, get + entries[2] + " "), 0U) << get;
    }
}

TEST(Check, PortOfNobodyHasNeitherVcpusNorWorldlets) {
    MeterRun run =
        RunMeter("host name=h pcpus=1\nswitch s\nvnic switch=s port=7 model=parlan3 tx=40 size=100\n", "-A -t vW -i 1");
    EXPECT_EQ(run.Port(7)["txpps"], 40);
    EXPECT_EQ(run.Port(7)["name"], "");
    EXPECT_TRUE(run.Port(7).contains("vnic"));
    EXPECT_FALSE(run.Port(7).contains("vcpu") || run.Port(7).contains("wdt"));
    EXPECT_EQ(run.err, "");
}
