#include "tests/run_meter.h"

#include <gtest/gtest.h>

namespace {

const std::string HOST =
    "host name=h1 pcpus=1 packages=1 cores=1 llc=7\nvm vm1 leader=500\nvm vm2 leader=600\nvm vm11 leader=700\n"
    "switch sw0\nuplink switch=sw0 port=1 nic=nic0\nvnic switch=sw0 port=2 vm=vm1 model=parlan3\n"
    "uplink switch=sw0 port=3 nic=nic3\nvnic switch=sw0 port=4 vm=vm2 model=parlan2\n"
    "plain switch=sw0 port=5 type=1 client=vm1\nhostnic switch=sw0 port=6 name=host0\n"
    "vnic switch=sw0 port=7 vm=vm1 model=parlan2\nplain switch=sw0 port=8 type=2 client=mirror tx=30\n"
    "switch sw1\nuplink switch=sw1 port=11 nic=nic1\nvnic switch=sw1 port=12 vm=vm11 model=parlan3\n"
    "switch sw2\nvnic switch=sw2 port=21 vm=vm1 model=parlan3\nuplink switch=sw2 port=22 nic=nic2\n"
    "switch none\nplain switch=none port=31 type=10\nswitch empty\n"
    "worldlet NetWdt-Async-500\nworldlet nic0-tx\nworldlet host0-rx\nvector 64 names=nic0\n";
const std::string UNREAD = "Unable to read port list for ";

std::string Ids(const MeterRun &run) {
    std::string ids;
    nlohmann::json document = run.Document();
    for (const auto &port : document["stats"][0]["ports"]) {
        ids.append(ids.empty() ? "" : " ").append(port["id"].dump());
    }
    return ids;
}

// What ports report beyond identity and client counters, in alphabetical order.
std::string Sections(const MeterRun &run, std::initializer_list<unsigned> ports) {
    std::string names;
    for (unsigned number : ports) {
        nlohmann::json port = run.Port(number);
        for (const auto &[name, section] : port.items()) {
            names += section.is_structured() ? name + " " : "";
        }
        names += "|";
    }
    return names;
}

TEST(Selection, LaterSelectorOfThePriorityListHasASay) {
    const std::pair<std::string, std::string> rows[] = {{" -A -S nosuch", "1 2 3 4 6 7 8 11 12 21 22"},
                                                        {" -S sw2 -N nosuch", "21 22"},
                                                        {" -N nic1 -V nosuch", "11 12"},
                                                        {" -V vm1 -p 99", "2 7 1 3 21 22"},
                                                        {" -p 8 -C nosuch", "8"},
                                                        {" -p 0", "4"}};
    for (const auto &[selectors, ids] : rows) {
        WriteRunFile("cfg", "4\n");
        MeterRun run = RunMeter(HOST, "-i 1 -C cfg" + selectors);
        EXPECT_EQ(Ids(run), ids) << selectors;
        EXPECT_EQ(run.err, "") << selectors;
    }
}

TEST(Selection, RunWithoutAPortGoesOnOrSaysSomethingElse) {
    const std::string please = "Panic: Please provide atleast one valid port/switch for monitoring\n";
    const std::string nic = "Panic: Bad nic name given: nic0\n";
    const std::string missing = "Log0 Status: No such node instance. Message: ";
    const std::tuple<const char *, const char *, std::string> rows[] = {
        {"", "", please},
        {"fault list 245", "-A", SIMULATED + "Unable to read switch list\n" + please},
        {"list 245 = \"none\" \"empty\"", "-A", please},
        {"fault list 264 \"sw1\"", "-A", SIMULATED + UNREAD + "sw1 switch\nPanic: Bad switch name provided: sw1\n"},
        {"", "-S nosuch", missing + UNREAD + "nosuch switch\nPanic: Bad switch name provided: nosuch\n"},
        {"", "-S none", "Panic: Bad switch name given: none\n"},
        {"", "-N nosuch", missing + "Unable to read properties for nic nosuch\nPanic: Bad nic name given: nosuch\n"},
        {"fault create nth=5", "-N nic0", "Log0: Unable to create nic props param\n" + nic},
        {"fault add key=\"nic0\"", "-N nic0", "Log0: Unable to add nic name to nicPropsParam\n" + nic},
        {"field 72 \"nic0\" at=193 width=4 start=0", "-N nic0", nic},
        {"field 72 \"nic0\" at=193 width=4 start=31", "-N nic0", nic},
        {"fault list 264", "-N nic0", SIMULATED + UNREAD + "sw0 switch\nPanic: Bad switch name provided: sw0\n"},
        {"", "-V VM1", "Panic: Bad vm name given: VM1\n"},
        {"fault list 245", "-V vm1", SIMULATED + "Unable to read switch list\nPanic: Bad vm name given: vm1\n"},
        {"", "-C nosuch", "Panic: Unable to open config file. Error:No such file or directory\n"},
        {"", "-C /dev/null", please}};
    for (const auto &[line, arguments, message] : rows) {
        MeterRun run = RunMeter(HOST + line + "\n", std::string("-i 1 -t V ") + arguments);
        EXPECT_EQ(run.err, message) << arguments;
        EXPECT_EQ(run.status, 1) << arguments;
        EXPECT_EQ(Count(run.journal, "\"TrackHistos\" : 0"), 0U) << "histograms are switched off on the way out";
    }
}

TEST(Selection, VmPortsAndUplinksInAnotherOrder) {
    const std::tuple<std::string, std::string, std::string> rows[] = {
        {"field 266 \"sw0\" 8 at=1200 width=4 start=65\nfield 266 \"sw0\" 3 at=1200 width=4 start=1", "2 7 1 8 21 22",
         ""},
        {"fault list 264 \"sw0\"", "21 22", SIMULATED + UNREAD + "sw0 switch\n"},
        {"fault get 368 2 nth=1", "7 1 3 21 22", SIMULATED + "GetPortsInfo 2 Port Type\n"},
        {"fault get 368 21 nth=2", "2 7 1 3 22", SIMULATED + "GetPortsInfo 21 Port Type\n"}};
    for (const auto &[line, ids, message] : rows) {
        MeterRun run = RunMeter(HOST + line + "\n", "-i 1 -V vm1");
        EXPECT_EQ(Ids(run), ids) << line;
        EXPECT_EQ(run.err, message) << line;
    }
    std::string many = "host name=h1\nvm vm1 leader=500\nswitch a\nswitch b\n"
                       "uplink switch=a port={100+i} nic=a{i} count=64\nvnic switch=a port=1 vm=vm1 model=parlan3\n"
                       "vnic switch=b port=2 vm=vm1 model=parlan3\nuplink switch=b port={200+i} nic=b{i} count=64\n";
    std::string ids = Ids(RunMeter(many, "-i 1 -t c -V vm1"));
    EXPECT_TRUE(ids.starts_with("1 100 101 ") && Count(ids, " 162 163 2 200 201 ") == 1) << ids;
    EXPECT_EQ(Count(ids, " "), 129U);
    MeterRun over = RunMeter(many + "switch c\nuplink switch=c port={300+i} nic=c{i} count=65\n", "-i 1 -V vm1");
    EXPECT_EQ(over.err, "Panic: More than 64 uplinks. Ordering not maintained\n") << "also where the VM has no port";
}

TEST(Selection, LetterOrDefaultBringsOtherSections) {
    const std::string stack = "ipv4 ipv6 tcprx tcptx udp |";
    const std::string all = "vcpu vnic wdt |intr physnic rxqueue txqueue wdt |";
    const std::pair<const char *, std::string> rows[] = {{"-A", "vcpu ||||"},
                                                         {"-A -t elqQ", "vcpu ||||"},
                                                         {"-A -t h", "histos vcpu |histos |histos |histos |"},
                                                         {"-A -t i", "vcpu vnic |intr physnic |" + stack + "|"},
                                                         {"-A -t W", "vcpu wdt |wdt |wdt ||"},
                                                         {"-N nic0", all + "ipv4 ipv6 tcprx tcptx udp wdt ||"},
                                                         {"-N nic0 -t v", "vcpu vnic |physnic |" + stack + "|"},
                                                         {"-V nic0", "|physnic wdt |||"},
                                                         {"-V vm1", all + "||"}};
    for (const auto &[arguments, sections] : rows) {
        EXPECT_EQ(Sections(RunMeter(HOST, std::string("-i 1 ") + arguments), {2, 1, 6, 8}), sections) << arguments;
    }
    EXPECT_EQ(Count(RunMeter(HOST, "-p 2 -t V -i 1").out, "\"histos\""), 1U);
    EXPECT_EQ(Count(RunMeter(HOST, "-A -t l -i 1").trace, "create 0 2 "), 11U) << "an argument list a port";
    EXPECT_EQ(RunMeter(HOST, "-p 8 -t e -i 2").Port(8)["txpps"], 60) << "an absolute count";
}

// A file, the ports that it gives, and what is told at level 2.
TEST(Selection, FileIsReadByOtherRulesThanItsEntries) {
    const std::tuple<std::string, std::string, std::string> rows[] = {
        {"#4 v\n\n \n  8 vX\n", "8",
         "Log2: Bad option ( :20) supplied at 0 idx\nLog2: Bad option (X:58) supplied at 2 idx\n"
         "Log2: Bad switch in 3 line in cfg file\n"},
        {"8\tv\xe9\n4", "8 4",
         "Log2: Bad option (\t:9) supplied at 0 idx\nLog2: Bad option (\xe9:ffffffe9) supplied at 2 idx\n"},
        {"5\n99\n8abc\n31\n4", "8 4", ""},
        {std::string("8") + std::string(127, 'x') + "v\n4", "8 4", ""},
        {std::string("8\t") + std::string(126, 'v') + "XZ\n4", "8 4",
         "Log2: Bad option (\t:9) supplied at 0 idx\nLog2: Bad option (X:58) supplied at 127 idx\n"}};
    for (const auto &[text, ids, messages] : rows) {
        WriteRunFile("cfg", text);
        EXPECT_EQ(Ids(RunMeter(HOST, "-d 2 -i 1 -C cfg; grep -a Log2 err >told")), ids) << text;
        EXPECT_EQ(RunFile("told"), messages) << text;
    }
    EXPECT_EQ(Count(RunMeter(HOST, "-d 2 -C .").err, "Log2: Bad switch in 1 line in . file\nPanic: Please"), 1U);
    WriteRunFile("cfg", "0 v");
    EXPECT_TRUE(RunMeter(HOST, "-C cfg").err.ends_with("Panic: Bad switch name provided: 0\n"));
}

TEST(Selection, EntryGetsTheWordOfAnotherOrDropsTheSwitchsE) {
    WriteRunFile("cfg", std::string("7 v\n4\n2") + std::string(127, 'x') + "h\nsw0 vVe\n");
    MeterRun run = RunMeter(HOST, "-t c -i 2 -C cfg");
    EXPECT_EQ(Ids(run), "7 4 2 1 2 3 4 6 7 8");
    EXPECT_EQ(Sections(run, {7, 4, 2}), "coalesce vcpu vnic |coalesce vcpu |coalesce histos vcpu |");
    EXPECT_EQ(run.Port(8)["txpps"], 60) << "an absolute count, for all ports";
    WriteRunFile("cfg", "sw0 h");
    run = RunMeter(HOST, "-i 2 -C cfg");
    EXPECT_EQ(Sections(run, {1, 6}), "intr physnic rxqueue txqueue wdt |ipv4 ipv6 tcprx tcptx udp wdt |");
}

}  // namespace
