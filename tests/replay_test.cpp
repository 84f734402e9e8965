// Recording and replay, end to end on real files.
#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

// Moves 300 packets between two snapshots, which are taken 10 seconds apart whatever time they tell.
const std::string HOST = "host name=h1 pcpus=2\nswitch sw0\nplain switch=sw0 port=7 type=2 client=probe\n"
                         "field 269 \"sw0\" 7 at=0 width=8 start=1000 rate=30\n"
                         "field 269 \"sw0\" 7 at=24 width=8 start=5\n"
                         "vm v leader=7 used=9\nvnic switch=sw0 port=9 vm=v model=parlan3 scheme=1 tx=99 errors=3\n";

std::string Times(const std::string &seconds, const std::string &nanoseconds) {
    return "field 1419 at=0 width=4 start=" + seconds + "\nfield 1419 at=4 width=4 start=" + nanoseconds + "\n";
}

// Runs the recorder in place of the program.
MeterRun Record(const std::string &host, const std::string &arguments) {
    return RunScript(host, "${METER% *} " RECORD_BINARY " >out 2>err " + arguments);
}

// Files good.0 to other.0 for the runs that follow.
void RecordAll() {
    std::string other = HOST;
    other.replace(other.find('\n'), 0, " signature=\"another build\"");
    const std::pair<std::string, std::string> hosts[] = {
        {HOST + Times("100 then=10:101", "900000000 then=10:100000000"), "-o good -n 2"},
        {HOST + Times("100", "500000000 then=10:250000000"), "-o back -n 2"},
        {HOST + Times("0 then=10:100 then=20:104", "0"), "-o zero -n 3"},
        {HOST + Times("100", "0"), "-o still -n 2"},
        {HOST + "remove 1419\n", "-o notime -n 1"},
        {other + Times("90", "0"), "-o other -n 1"},
    };
    for (const auto &[host, arguments] : hosts) {
        ASSERT_EQ(Record(host, arguments).status, 0) << arguments;
    }
}

nlohmann::json WithoutOverhead(const MeterRun &run) {
    nlohmann::json document = run.Document();
    for (auto &record : document["stats"]) {
        record.erase("overhead");
    }
    return document;
}

}  // namespace

TEST(Replay, ReportsWhatALiveRunOfTheSameMomentsReports) {
    nlohmann::json live = WithoutOverhead(RunMeter("", "-A -t vqiWc -i 10 -n 2"));
    std::string table = RunMeter("", "-l").out;
    MeterRun recorder = Record("", "-o s -i 10 -n 3");
    EXPECT_EQ(recorder.err + recorder.journal, "");
    EXPECT_TRUE(recorder.out.ends_with("\nlan-meter -A -c s.0:s.1:s.2\n")) << recorder.out;
    EXPECT_EQ(Count(recorder.out, " 0 reads failed\n"), 3U);
    for (const char *more : {"", "-n 1 -i 86400", "-t vqiWch"}) {
        MeterRun run = RunMeter("", std::string("-c s.0:s.1:s.2 -A -t vqiWc -d 2 ") + more, {"", true});
        EXPECT_EQ(WithoutOverhead(run), live) << more;
        EXPECT_EQ(Count(run.out, R"("overhead": {"used": 0.00 })"), 2U) << more;
        EXPECT_EQ(Count(run.err, "Bad option"), 0U) << more;
    }
    EXPECT_EQ(RunMeter("", "-c s.0 -l").out, table);
    MeterRun run = RunMeter("", "-c s.0:s.1 -A -t vqiWchV");
    EXPECT_EQ(run.journal, "");
    for (const char *call : {"init ", "set ", " 4242 ", "get 770 0 "}) {
        EXPECT_EQ(Count(run.trace, call), 0U) << call;
    }
}

TEST(Replay, EveryWayThatTheListEndsHasItsMessagesAndStatus) {
    RecordAll();
    const std::string differs =
        "0xbad0008: md5 signature mismatch with running hostcore built on another build. (vs Mar "
        "14 2024 09:26:53 for app sysinfo)\n";
    const std::string nothing =
        "0xbad0002: md5 signature mismatch with running hostcore built on . (vs Mar 14 2024 09:26:53 for app sysinfo)\n";
    const std::string absent = "Log0 Status: Snapshot file can't be read. Message: Couldn't open cache file ";
    const std::string timeless = ". Message: unable to read time from cache file ";
    const std::string none = "No such node instance";
    // Arguments, status, records unless the document stays open, messages.
    const std::tuple<const char *, int, size_t, std::string> rows[] = {
        {"good.0:good.1 -n 5", 0, 1, ""},
        {"good.0:good.1:", 0, 1, absent + "\n" + nothing},
        {"good.0:good.1: -f", 0, 1, absent + "\nLog0 Status: Not connected to a kernel" + timeless + "\n"},
        {"good.0:nope:good.1", 0, 0, absent + "nope\n" + nothing},
        {"nope:good.0", 1, 0, absent + "nope\n" + nothing + nothing},
        {"other.0:good.0", 1, 0, differs + differs},
        {"other.0:good.0 -f", 0, 1, differs},
        {"good.0:other.0:good.1", 0, 0, differs},
        {"notime.0:good.0", 1, 0,
         "Log0 Status: " + none + timeless + "notime.0\nPanic: Unable to read ntp time from knf node:" + none + "\n"},
        {"good.0:notime.0:good.1", 0, 0, "Log0 Status: " + none + timeless + "notime.0\n"},
        {"back.0:back.1", 1, 0,
         "Panic: Time goes backward in the cache files!!!\nStart: 100 sec 500000000 nsec End: 100 sec 250000000 nsec "
         "Diff: -0.250000 sec\n"},
    };
    for (const auto &[arguments, status, records, messages] : rows) {
        MeterRun run = RunMeter("", std::string("-p 7 -c ") + arguments);
        EXPECT_EQ(run.status, status) << arguments;
        EXPECT_EQ(run.err, messages) << arguments;
        if (status == 0) {
            EXPECT_EQ(run.Document().at("stats").size(), records) << arguments;
        }
    }
    EXPECT_EQ(RunMeter("", "-p 7 -c good.0").out, "{ \"sysinfo\": { \"hostname\": \"h1\" },\n\"stats\": [\n\n] }\n");
}

TEST(Replay, RatesFollowTheTimesInTheSnapshots) {
    RecordAll();
    // Files, record, 300 packets over the seconds between the snapshots, and the difference of whole seconds.
    const std::tuple<const char *, size_t, int, int> rows[] = {{"good.0:good.1", 0, 1500, 1},
                                                               {"zero.0:zero.1:zero.2", 0, -300, 100},
                                                               {"zero.0:zero.1:zero.2", 1, 75, 4},
                                                               {"still.0:still.1", 0, 0, 0}};
    for (const auto &[list, record, txpps, interval] : rows) {
        MeterRun run = RunMeter("", std::string("-p 7 -d 1 -c ") + list);
        EXPECT_EQ(run.Port(7, record)["txpps"], txpps) << list;
        EXPECT_EQ(run.Document()["stats"][record]["interval"], interval) << list;
        EXPECT_EQ(Count(run.err, "Cache Elapsed Time: "), 1U) << run.err;
    }
    nlohmann::json port = RunMeter("", "-c still.0:still.1 -A -t vqiWc").Port(9);
    EXPECT_EQ(port["vcpu"][0]["used"], 0.0) << "no quotient leaves the document";
}

TEST(Replay, SignalEndsItByItsDefaultAction) {
    RecordAll();
    RunScript("", "mkfifo fifo; for s in INT TERM; do timeout --preserve-status -s $s 0.3 $METER -p 7 -o fifo -c "
                  "good.0:good.1; echo $?; done >out 2>err");
    EXPECT_EQ(RunFile("out"), "130\n143\n");
}

TEST(Replay, FilesOfTheFirstVersionAreStillRead) {
    EXPECT_TRUE(RunMeter("", "-c " TEST_DATA "/version-1.knf -l")
                    .out.ends_with("\n7                   2       0 sw0              02:0a:00:00:00:07  probe\n"));
    std::string dump = Record("", "--dump " TEST_DATA "/version-1.knf").out;
    EXPECT_EQ(Count(dump, "record 269 \"sw0\" 7 size=160 e803000000000000"), 1U);  // 1000 packets
    EXPECT_EQ(Count(dump, "list 641 9 = \"nic0\" \"timer\"\n"), 1U);
}

TEST(Recorder, LeavesOutWhatCanNotBeReadAndCountsEachOnce) {
    MeterRun run = Record(HOST + "vnic switch=sw0 port=10 vm=v model=parlan3\nremove 1419\nfault get 269\n"
                                 "fault get 772\nfault list 639\n",
                          "-o part -n 1");
    EXPECT_EQ(Count(run.out, " 4 lists, "), 1U) << run.out << "of switches, ports, vcpus and worldlets";
    EXPECT_EQ(Count(run.out, "; 6 reads failed\n"), 1U) << run.out;
    std::string dump = Record("", "--dump part.0").out;
    EXPECT_EQ(Count(dump, " time=0.000000000 signature \"Mar 14 2024 09:26:53\"\n"), 1U);
    EXPECT_EQ(Count(dump, "\nlist 264 \"sw0\" = 7 9 10\n"), 1U);
    EXPECT_EQ(Count(dump, "record 269 ") + Count(dump, "record 1419 ") + Count(dump, "list 639 "), 0U);
}

TEST(Recorder, StopsAtASignalWithTheFilesSoFar) {
    const std::tuple<const char *, const char *, const char *, const char *> rows[] = {
        {"INT 0.5 ", "-i 100 -n 3", "0knf-record: stopped after 1 of 3 snapshots: Interrupt\n", "-l -c stop.0\n"},
        {"HUP 0.5 ", "-i 100 -n 3", "0knf-record: stopped after 1 of 3 snapshots: Hangup\n", "-l -c stop.0\n"},
        {"HUP 0.5 nohup ", "-i 1 -n 2 </dev/null", "0", "-A -c stop.0:stop.1\n"},
    };
    for (const auto &[signal, arguments, messages, replay] : rows) {
        std::string command = std::string("timeout --preserve-status -s ") + signal + "${METER% *} " RECORD_BINARY;
        MeterRun run = RunScript(HOST, command + " -o stop >out 2>err " + arguments, {"", true});
        EXPECT_EQ(std::to_string(run.status) + run.err, messages);
        EXPECT_TRUE(run.out.ends_with(std::string("\nlan-meter ") + replay)) << run.out;
    }
    EXPECT_EQ(RunScript("", "ls | grep -c stop >out").out, "2\n");
}

TEST(Recorder, SaysWhatIsWrongAndHarmsNoFile) {
    const std::string numbers = ": expected a whole number of ";
    const std::pair<const char *, std::string> rows[] = {
        {"$R -n 0 -o x 2>&1 | head -n 1", "knf-record: -n 0" + numbers + "snapshots from 1 to 1000000\n"},
        {"$R -i 0.5 -o x 2>&1 | head -n 1", "knf-record: -i 0.5" + numbers + "seconds from 0 to 86400\n"},
        {"echo old >full.0; (ulimit -f 1; $R -o full); echo $? $(ls full*) $(cat full.0)",
         "knf-record: full.0: File too large\n1 full.0 old\n"},
        // A writer of the same number in another name space, one that lives and one that was killed.
        {"touch two.0.4242.partial two.3.0badcafe.partial; umask 027\n"
         "flock two.0.00c0ffee.partial $R -o two -n 1 >/dev/null; ls two*; stat -c %a two.0",
         "two.0\ntwo.0.00c0ffee.partial\ntwo.0.4242.partial\n640\n"},
        {"mkdir -p shut; chmod 300 shut; [ $(id -u) != 0 ] || limit='setpriv --bounding-set=-all'\n"
         "$limit $R -o shut/x >/dev/null; chmod 700 shut; ls shut",
         "x.0\nx.1\n"},
        {"mkfifo pipe; exec 3<>pipe 4>pipe 3>&-; $R -o p >&4; echo $? $(ls p.*)",
         "knf-record: standard output: Broken pipe\n1 p.0 p.1\n"},
        {"$R -o \"it's \\$HOME\" >said; eval \"$METER $(sed -n 's/^lan-meter//p' said)\" | grep -c '^{ \"time\"'",
         "1\n"},
    };
    for (const auto &[script, expected] : rows) {
        RunScript(HOST,
                  std::string("R=\"${METER% *} COREKIT_TRACE= " RECORD_BINARY " -i 0\"; exec >out 2>&1; ") + script);
        EXPECT_EQ(RunFile("out"), expected) << script;
    }
}
