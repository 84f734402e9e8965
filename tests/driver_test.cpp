#include "tests/run_meter.h"

#include <chrono>
#include <gtest/gtest.h>

namespace {

// A host on which every figure of the frame is known.
const std::string HOST = R"(
host name=h1 pcpus=2 packages=1 cores=1 llc=7
self used=5
switch sw0
plain switch=sw0 port=7 type=2 client=probe
field 797 0 at=0 width=8 start=50 rate=250
field 797 0 at=16 width=8 start=7 rate=125
field 797 0 at=48 width=8 start=9 rate=1000
field 797 1 at=0 width=8 start=1 rate=1000
field 797 1 at=16 width=8 start=4 rate=0
field 797 1 at=48 width=8 start=2 rate=3000
field 266 "sw0" 7 at=1208 width=4 start=0x0f0e0d0c
field 266 "sw0" 7 at=1212 width=2 start=0x1100
field 266 "sw0" 7 at=3310 width=4 start=3
)" + TRAFFIC;

std::string Record(const std::string &time, const std::string &iteration) {
    return "{ \"time\": " + time + ", \"interval\": 2, \"iteration\": " + iteration +
           R"(,
"cpu": { "topology": { "core": 2, "llc": 7, "package": 2},
"used": [ 25.00,  33.33,   58.33],
"wdt": [ 12.50,   0.00,   12.50] },
"ports":[

{"name": "probe", "switch": "sw0", "id": 7, "mac": "0c:0d:0e:0f:00:11", "rxmode": 3, "uplink": "false",
  "txpps": 1500, "txmbps": 6.0, "txsize": 500, "txeps": 3.00, "rxpps": 20, "rxmbps": 0.2, "rxsize": 1501, "rxeps": 0.00}],

"overhead": {"used": 0.50 } })";
}

TEST(Driver, WholeDocumentByteForByte) {
    MeterRun run = RunMeter(HOST, "-p 7 -i 2 -n 2");
    EXPECT_EQ(run.out, "{ \"sysinfo\": { \"hostname\": \"h1\" },\n\"stats\": [\n" + Record("1700000002", "0") + ",\n" +
                           Record("1700000004", "1") + "\n] }\n");
    EXPECT_EQ(run.err, "");
    EXPECT_EQ(run.status, 0);
    EXPECT_EQ(run.journal, "") << "a run that asks for no histograms writes nothing to the kernel";
}

TEST(Driver, DefaultsAreTenSecondsAndOneRecord) {
    nlohmann::json stats = RunMeter(HOST, "-p 7").Document()["stats"];
    ASSERT_EQ(stats.size(), 1U);
    EXPECT_EQ(stats[0]["interval"], 10);
}

// Arguments, exit status, and what must stand on standard output and standard error, whole.
TEST(Driver, EveryWayOutOfStartUpHasItsTextAndStatus) {
    std::string usage = RunMeter(HOST, "-h").out;
    EXPECT_EQ(usage.substr(0, 45), "Usage:\n\t -l                 : List ports in s");
    EXPECT_TRUE(usage.ends_with("\tbe some inconsistency in numbers, hopefully, not a lot\n"));
    struct Row {
        const char *arguments;
        int status;
        std::string out;
        std::string err;
    };
    const Row rows[] = {
        {"-p 7 --help -i", 0, usage, ""},
        {"-p 7 left over", 1, usage, ""},
        {"-p 7 -i -3", 1, "", "Panic: Invalid interval -3\n"},
        {"-p 7 -i 4294967293", 1, "", "Panic: Invalid interval -3\n"},
        {"-i 0", 1, "", "Panic: Please provide atleast one valid port/switch for monitoring\n"},
        {"-p 0x7", 1, "", "Panic: Please provide atleast one valid port/switch for monitoring\n"},
        {"-x -p 99", 1, "",
         "Log0: xmlformat is now deprecated\nLog0 Status: No such node instance. Message: GetPortsInfo 99 Port "
         "Type\nPanic: Invalid -p option"},
        {"-d 2 -o /nowhere/file -p 7", 1, "",
         "Unable to open file /nowhere/file for writing. Error:No such file or "
         "directory\n"},
    };
    for (const Row &row : rows) {
        MeterRun run = RunMeter(HOST, row.arguments);
        EXPECT_EQ(run.status, row.status) << row.arguments;
        EXPECT_EQ(run.out, row.out) << row.arguments;
        EXPECT_EQ(run.err, row.err) << row.arguments;
    }
}

TEST(Driver, BadOptionsAreDroppedAtTheLevelInForceWhenTheyCome) {
    EXPECT_EQ(Count(RunMeter(HOST, "-Z -d 2 -p 7 -i 1").err, "Discarding"), 0U);
    MeterRun run = RunMeter(HOST, "-d 2 -Z --nonsense -p 7 -i 1");
    EXPECT_EQ(run.status, 0);
    EXPECT_EQ(Count(run.err, "Log2: Discarding bad Option (?:3f)\n"), 2U);
}

TEST(Driver, SignatureMismatchEndsTheRunUnlessToldOtherwise) {
    std::string host = HOST;
    host.insert(host.find(" llc=7") + 6, " signature=\"another build of the kernel\"");
    MeterRun refused = RunMeter(host, "-p 7 -i 1");
    EXPECT_EQ(refused.status, 1);
    EXPECT_NE(refused.err.find(": md5 signature mismatch with running hostcore built on another build of the. (vs "),
              std::string::npos);
    EXPECT_EQ(refused.out, "");
    MeterRun forced = RunMeter(host, "-f -p 7 -i 1");
    EXPECT_EQ(forced.status, 0);
    EXPECT_EQ(forced.err, refused.err);
}

TEST(Driver, FullDiskIsToldAndEndsTheRunOnceTextIsLost) {
    MeterRun once = RunMeter(HOST, "-p 7 -i 1 -o /dev/full");
    EXPECT_EQ(once.status, 0);
    EXPECT_EQ(Count(once.err, "Error No space left on device\n"), 2U) << "end of the iteration, end of the document";
    MeterRun longer = RunMeter(HOST, "-p 7 -i 1 -n 0 -o /dev/full 3>&-", {"COREKIT_TRACE= COREKIT_JOURNAL="});
    EXPECT_EQ(longer.status, 1);
    EXPECT_EQ(Count(longer.err, "\n"), Count(longer.err, "Unable to write to fd 3. Error No space left on device\n"))
        << "the report's is the first descriptor that is free";
    EXPECT_EQ(RunMeter(HOST, "-p 7 -i 1 -n 50 >&-").status, 1) << "standard output closed at start";
    MeterRun nothing = RunMeter("host\nswitch s\n", "-l >&-");
    EXPECT_EQ(nothing.err, "") << "an empty listing is not written";
    EXPECT_EQ(nothing.status, 0);
}

TEST(Driver, ClosedStandardErrorTakesNoReport) {
    RunMeter(HOST, "-d 2 -p 7 -i 1 -o report 2>&-", {"COREKIT_TRACE= COREKIT_JOURNAL="});
    EXPECT_EQ(RunFile("report"), RunMeter(HOST, "-p 7 -i 1").out);
}

// As a disk that fills up, but that the system's default is to kill the process.
TEST(Driver, LimitOfFileSizeEndsALiveRunWithTracking) {
    MeterRun run = RunScript("", "head -c 24576 /dev/zero >out; ulimit -f 48; $METER -A -t hV -i 1 -n 2 >>out 2>err",
                             {"COREKIT_TRACE="});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.err, "Unable to write to fd 1. Error File too large\n");
    EXPECT_TRUE(run.journal.ends_with("set 520 \"Cpu\" \"TrackHistos\" : 0 -> 0x0\n")) << run.journal;
    EXPECT_EQ(Count(run.journal, "\"start\""), Count(run.journal, "\"stop\""));
}

TEST(Driver, TextsAndMessagesOfAnyLengthAreWhole) {
    std::string name = "NetWdt-Async-9-" + std::string(9000, 'n');
    MeterRun run = RunMeter("host\nswitch s\nvm v leader=9\nvnic switch=s port=7 vm=v model=3\nworldlet " + name + "\n",
                            "-d 1 -p 7 -t W -i 1");
    EXPECT_EQ(Count(run.err, "Log1: Added " + name + " wdt for NetWdt-Async-9 mask\n"), 1U);
    EXPECT_EQ(Count(run.err, "No Space in buffer. Resize output buffer from 4096 bytes\n\"afftype\": "), 1U);
    EXPECT_TRUE(run.err.ends_with(", \"name\": \"" + name + "\"}")) << run.err.size();
}

TEST(Driver, ReaderThatGoesAwayEndsAnEndlessRun) {
    MeterRun run = RunScript(HOST, "{ $METER -p 7 -i 0 -n 0 2>err; echo $? >status; } | head -c 1000 >out", {"", true});
    EXPECT_EQ(RunFile("status"), "1\n");
    EXPECT_EQ(run.out.size(), 1000U);
    EXPECT_NE(run.err.find("Error Broken pipe\n"), std::string::npos);
}

// Milliseconds from a signal to the end, for a machine that does other things too: the torture run holds runs to less.
#ifdef __SANITIZE_ADDRESS__
constexpr int LIMIT = 5000;
#else
constexpr int LIMIT = 1000;
#endif

// Starts a run, sends it a signal after a while, and measures how long it takes to end.
// Until the process catches SIGTERM, or two seconds for one that never will.
constexpr char READY[] =
    "for i in $(seq 40); do [ $((0x$(sed -n 's/^SigCgt:.//p' /proc/$pid/status) & 0x4000)) -ne 0 ] && break; "
    "sleep 0.05; done; ";

MeterRun Signalled(const std::string &command, const std::string &signal) {
    // Enough ports that their messages fill a pipe.
    return RunScript(HOST + "plain switch=sw0 port={100+i} type=2 client=many count=2000\n",
                     command + " & pid=$!; " + READY + "sleep 0.3; start=$(date +%s%N); kill -" + signal +
                         " $pid; wait $pid; echo $? >status; echo $((($(date +%s%N) - start) / 1000000)) >ms",
                     {"", true});
}

TEST(Driver, SignalDuringTheSleepEndsItAtOnceWithAnEmptyOutput) {
    for (const char *signal : {"INT", "TERM", "HUP"}) {
        MeterRun run = Signalled("$METER -p 7 -i 100 >out 2>err", signal);
        EXPECT_EQ(RunFile("status"), "1\n") << signal;
        EXPECT_EQ(run.out + run.err, "") << signal;
        EXPECT_LT(std::stoi(RunFile("ms")), LIMIT) << signal;
    }
    MeterRun ignored = Signalled("trap '' HUP; $METER -p 7 -i 1 >out 2>err", "HUP");
    EXPECT_EQ(RunFile("status"), "0\n") << "a hang-up that was ignored at start stays ignored";
    EXPECT_FALSE(ignored.Document().is_discarded());
}

// Each run waits for somebody at the other end of a pipe, who does nothing, or reads what never ends.
TEST(Driver, SignalEndsEveryWaitForAnotherProgram) {
    for (const char *command :
         {"sleep 1 <fifo & $METER -p 7 -i 0 -n 0 >fifo 2>err", "sleep 1 <fifo & $METER -d 1 -A -i 0 -n 0 2>fifo >out",
          "$METER -p 7 -o fifo >out 2>err", "$METER -C fifo >out 2>err",
          "{ printf '7 q'; sleep 1; } >fifo & $METER -C fifo >out 2>err", "yes '' >fifo & $METER -C fifo >out 2>err",
          "{ printf '# '; cat /dev/zero; } >fifo & $METER -C fifo >out 2>err"}) {
        MeterRun run = Signalled(std::string("rm -f fifo; mkfifo fifo; ") + command, "TERM");
        EXPECT_EQ(RunFile("status"), "1\n") << command;
        EXPECT_LT(std::stoi(RunFile("ms")), LIMIT) << command;
        EXPECT_EQ(run.err, "") << command;
    }
}

// A signal comes while the tracking is on and standard error is a terminal that nobody reads.
MeterRun SignalledOnATerminal(const std::string &host, const std::string &arguments) {
    return RunScript(host, "rm -f status; python3 - $METER " + arguments + R"( <<'END'
import os, pty, signal, subprocess, sys, time
mine, its = pty.openpty()
os.set_blocking(its, False)
for size in 512, 1, 1, 1:  # what is on its way to the other side makes room again
    try:
        while os.write(its, b"x" * size):
            pass
    except BlockingIOError:
        time.sleep(0.05)
os.set_blocking(its, True)
run = subprocess.Popen(sys.argv[1:], stderr=its)
while not os.path.exists("trace") or "TrackHistos" not in open("trace").read():
    time.sleep(0.1)
time.sleep(0.2)
run.terminate()
print(run.wait(5), file=open("status", "w"))
END)",
                     {"", true});
}

TEST(Driver, SignalEndsAPanicAndATeardownThatNobodyReads) {
    std::string host = "host\nswitch s\nvm v leader=9 vcpus=1\nvnic switch=s port=7 vm=v model=3\n";
    std::string on = "set 520 \"Cpu\" \"TrackHistos\" : 1 -> 0x0\n";
    WriteRunFile("ports", "7 V\nnone\n");
    EXPECT_EQ(SignalledOnATerminal(host, "-C ports").journal, on + "set 520 \"Cpu\" \"TrackHistos\" : 0 -> 0x0\n");
    EXPECT_EQ(RunFile("status"), "1\n");
    MeterRun run = SignalledOnATerminal(host + "fault set 520 from=2\n", "-p 7 -t V -i 100");
    EXPECT_EQ(run.journal, on + "set 520 \"Cpu\" \"TrackHistos\" : 0 -> 0xbad000f\n");
    EXPECT_EQ(RunFile("status"), "1\n");
}

// The write takes longer than the signal's first cut of a wait would come.
TEST(Driver, SignalCutsNoWriteToTheKernel) {
    for (const char *write : {"520 nth=1", "326 nth=1", "336 nth=2"}) {
        std::string host = "host\nswitch s\nvm v leader=9 vcpus=1\nvnic switch=s port=7 vm=v model=3\n";
        MeterRun run = RunScript(host + "fault set " + write + " delay=900\n",
                                 "$METER -p 7 -t hV -i 100 >out 2>err & pid=$!; sleep 0.4; kill -TERM $pid; wait $pid",
                                 {"", true});
        EXPECT_EQ(run.status, 1) << write;
        EXPECT_EQ(run.err, "") << write;
        EXPECT_EQ(Count(run.journal, " -> 0x0\n"), Count(run.journal, "\n")) << write << run.journal;
        EXPECT_TRUE(run.journal.ends_with("\"TrackHistos\" : 0 -> 0x0\n")) << write << run.journal;
    }
}

TEST(Driver, HandlersThatCannotBeInstalledAreToldOnceAndTheRunGoesOn) {
    for (const char *fault : {"sigaction 1", "sigaction 2", "sigaction 3", "sigaction 5", "timer_create 1"}) {
        std::string script = "LIBC_FAULT='" + std::string(fault) + "' $METER-libc-faults -p 7 -i 1 >out 2>err";
        MeterRun run = RunScript(HOST, script);
        EXPECT_EQ(run.status, 0) << fault;
        EXPECT_EQ(run.err,
                  "Log0: Error Registering SIGINT Signal Handler\nLog0: If you histograms, you should either:\n"
                  "\t1. Let the program end.\t2. Manually disable them.Otherwise, histograms will stay on and "
                  "hurt performance\n")
            << fault;
    }
}

TEST(Driver, SignalAmidAPortWritesNoFurtherText) {
    std::string host = "host\nswitch s\nuplink switch=s port=7 nic=n rxqueues=1000 filters=1\n";
    MeterRun run = RunMeter(host + "fault list 123 \"n\" 1 signal=15\n", "-p 7 -t vq -i 1");
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.out, "");
}

}  // namespace
