// What a kernel says by netlink, played from messages that are put together here.
#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/netlink/attributes.h"
#include "corekit/linuxhost/source.h"

#include <algorithm>
#include <array>
#include <deque>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <linux/ethtool_netlink.h>
#include <linux/gen_stats.h>
#include <linux/genetlink.h>
#include <linux/if_link.h>
#include <linux/pkt_sched.h>
#include <linux/rtnetlink.h>
#include <sched.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <utility>

namespace {

using Strings = std::vector<std::string>;

template <typename Value>
std::string Bytes(Value value) {
    return {reinterpret_cast<const char *>(&value), sizeof value};
}
std::string Padded(const std::string &text) {
    return text + std::string((4 - text.size() % 4) % 4, '\0');
}
std::string Attr(u16 type, const std::string &payload, u32 more = 0) {
    return Padded(Bytes(nlattr{static_cast<u16>(4 + payload.size() + more), type}) + payload);
}
std::string Message(u16 type, const std::string &payload, u16 flags = 0) {
    return Padded(Bytes(nlmsghdr{static_cast<u32>(16 + payload.size()), type, flags, 0, 0}) + payload);
}
std::string Done(int error = 0) {
    return Message(NLMSG_DONE, Bytes(error));
}
std::string Told(int index, const char *name, const char *kind, u32 master = 0, u16 type = RTM_NEWLINK, u16 flags = 0) {
    ifinfomsg header = {};
    header.ifi_index = index;
    header.ifi_type = 1;
    std::string mac = std::string("\2\0\0\0\0", 5) + static_cast<char>(index);
    return Message(type,
                   Bytes(header) + Attr(IFLA_IFNAME, name) + Attr(0x3ff0, "newer than we are") +
                       Attr(IFLA_MTU, Bytes(1500)) + Attr(IFLA_MASTER, Bytes(master)) + Attr(IFLA_ADDRESS, mac) +
                       Attr(IFLA_LINKINFO, Attr(IFLA_INFO_KIND, kind)),
                   flags);
}
// A NIC, which has a parent device and no kind.
std::string Card(int index, const char *name) {
    ifinfomsg header = {};
    header.ifi_index = index;
    return Message(RTM_NEWLINK, Bytes(header) + Attr(IFLA_IFNAME, name) + Attr(IFLA_MTU, Bytes(1500)) +
                                    Attr(IFLA_PARENT_DEV_NAME, "virtio0"));
}
Strings Torn() {
    return {Told(2, "br0", "bridge", 0, RTM_NEWLINK, NLM_F_DUMP_INTR), Done()};
}
std::string Counted(u32 index, u64 unit) {
    std::array<u64, 8> stats = {1 * unit, 2 * unit, 3 * unit, 4 * unit, 5 * unit, 6 * unit, 7 * unit, 8 * unit};
    return Message(RTM_NEWSTATS, Bytes(if_stats_msg{0, 0, 0, index, 0}) + Attr(IFLA_STATS_LINK_64, Bytes(stats)));
}

// Of the queue disciplines of a NIC the root "mq" and the one of each queue.
std::string Queued(int index, const std::vector<u32> &packets) {
    std::string all;
    for (u32 i = 0; i <= packets.size(); i++) {
        tcmsg header = {};
        header.tcm_ifindex = index;
        header.tcm_handle = i == 0 ? 0x10000 : 0;
        header.tcm_parent = i == 0 ? TC_H_ROOT : 0x10000 + i;
        gnet_stats_basic basic = {100, i == 0 ? 0 : packets[i - 1]};
        all += Message(RTM_NEWQDISC, Bytes(header) + Attr(TCA_KIND, i == 0 ? "mq" : "fq") +
                                         Attr(TCA_STATS2, Attr(TCA_STATS_BASIC, Bytes(basic))));
    }
    return all;
}

// Answers each request by the next entry: datagrams, of which an empty one stands for some that were lost.
struct Kernel {
    std::deque<Strings> answers;
    std::deque<std::string> waiting;
    u32 sequence = 0;

    static ssize_t Send(void *context, const void *message, size_t size) {
        auto *kernel = static_cast<Kernel *>(context);
        if (kernel->answers.empty()) {
            ADD_FAILURE() << "an unexpected request";
            return -1;
        }
        kernel->waiting.insert(kernel->waiting.end(), kernel->answers[0].begin(), kernel->answers[0].end());
        kernel->answers.pop_front();
        memcpy(&kernel->sequence, static_cast<const char *>(message) + 8, 4);
        return static_cast<ssize_t>(size);
    }
    static ssize_t Receive(void *context, void *buffer, size_t) {
        auto *kernel = static_cast<Kernel *>(context);
        errno = EAGAIN;
        if (kernel->waiting.empty()) {
            return -1;
        }
        errno = ENOBUFS;
        std::string text = kernel->waiting[0];
        kernel->waiting.pop_front();
        for (u32 at = 0, length = 0; at + 16 <= text.size(); at += (std::max(length, 16U) + 3) & ~3U) {
            memcpy(&length, &text[at], 4);
            memcpy(&text[at + 8], &kernel->sequence, 4);
        }
        memcpy(buffer, text.data(), text.size());
        return text.empty() ? -1 : static_cast<ssize_t>(text.size());
    }
};

struct Machine {
    inline static u64 clock = 1;
    Kernel route, notices, generic;
    LinuxHost *host = LinuxHostOpen();
    Machine(const std::string &links, const std::vector<int> &ports) {
        host->now = [] { return clock; };
        host->route.io = {Kernel::Send, Kernel::Receive, &route};
        host->notices.io = {Kernel::Send, Kernel::Receive, &notices};
        host->generic.io = {Kernel::Send, Kernel::Receive, &generic};
        route.answers = {{links, Done()}};
        for (int port : ports) {
            EXPECT_EQ(Get(NODE_PORT_TYPE, {ParamOf(port)}), STATUS_OK);
        }
    }
    Machine(const Machine &) = delete;
    ~Machine() { LinuxHostClose(host); }
    KnfStatus Get(u32 node, const Params &keys, std::string *record = nullptr) {
        std::string bytes(NodeRecordSize(node), '?');
        u32 size = NodeRecordSize(node);
        KnfStatus status = LinuxHostSource(host).get(host, node, keys, bytes.data(), size);
        return record != nullptr ? record->swap(bytes), status : status;
    }
};

}  // namespace

// clang-format off
TEST(LinuxNetlink, AttributesOfAnyLengthFillNoMoreThanTheirField) {
    struct Row {
        u32 number = 7;
        char name[4] = {'?', '?', '?', '?'};
        u32 guard = 0x600d;
    };
    constexpr AttrField TABLE[] = {{1, ATTR_UINT, ATTR_AT(Row, number)}, {2, ATTR_TEXT, ATTR_AT(Row, name)}};
    struct Case { std::string bytes; u32 known, number; const char *name; };
    for (const Case &one : {Case{Attr(1, Bytes(u16{300})), 1, 300, "????"}, {Attr(1, Bytes(1LL << 32)), 0, 7, "????"},
                            {Attr(1, "abc"), 0, 7, "????"}, {Attr(2, "toolong") + Attr(1, "x"), 3, 'x', "too"},
                            {Attr(2, ""), 2, 7, ""}, {Attr(9, "?") + Attr(0x4001, Bytes(5)), 1, 5, "????"},
                            {Attr(1, "1234", -8U) + Attr(1, Bytes(6)), 0, 7, "????"},       // a length of 0
                            {Attr(1, "1234", -7U), 0, 7, "????"}, {Attr(1, "1234", 65527), 0, 7, "????"}}) {
        for (size_t cut = 0; cut <= one.bytes.size(); cut++) {
            Row row;
            u32 known = AttrFill(TABLE, std::string_view(one.bytes.data(), cut), &row);
            EXPECT_EQ(row.guard, 0x600dU);
            if (cut == one.bytes.size()) {
                EXPECT_EQ(std::tuple(known, row.number, std::string(row.name, strnlen(row.name, 4))),
                          std::tuple(one.known, one.number, one.name));
            }
        }
    }
}

TEST(LinuxNetlink, ADumpIsBelievedOnlyWhenItsEndWasSeen) {
    std::string both = Told(2, "br0", "bridge") + Told(3, "tap0", "tun", 2);
    struct Case { std::deque<Strings> answers; Outcome outcome; size_t links; };
    std::vector<Case> cases = {
        {{{both, Done()}}, FINE, 2}, {{{both + Done(-EPERM)}}, REFUSED, 0}, {{{Done(-EINVAL)}}, BROKEN, 0},
        {{{Message(NLMSG_ERROR, Bytes(-EOPNOTSUPP))}}, UNSUPPORTED, 0}, {{Torn(), {both, Done()}}, FINE, 2},
        {{{both, "", Done()}, {both + Done()}}, FINE, 2}, {std::deque<Strings>(5, Torn()), FINE, 1}};
    for (size_t cut = 0; cut < both.size() + 20; cut++) {
        cases.push_back({{{(both + Done()).substr(0, cut)}}, BROKEN, 0});
    }
    for (const Case &one : cases) {
        Kernel kernel{one.answers, {}};
        NetlinkSocket socket;
        LinkTable table;
        socket.io = {Kernel::Send, Kernel::Receive, &kernel};
        NetlinkOpen(&socket, 0);
        EXPECT_EQ(LinksLoad(&socket, &table), one.outcome);
        EXPECT_EQ(table.rows.size(), one.links);
        EXPECT_TRUE(kernel.answers.empty() && kernel.waiting.empty());
    }
}

TEST(LinuxNetlink, LinksThatAreGoneLeaveTheTable) {
    Kernel kernel;
    NetlinkSocket notices;
    LinkTable table;
    notices.io = {Kernel::Send, Kernel::Receive, &kernel};
    NetlinkOpen(&notices, 0);
    for (int i = 1; i < 2000; i++) {
        std::string text = Told(i, "v", "veth");
        kernel.waiting = {i % 100 == 0 ? text : text + Told(i, "v", "veth", 0, RTM_DELLINK)};
        EXPECT_EQ(LinksNotices(&notices, &table), FINE);
        EXPECT_LT(table.rows.size(), 40U);
    }
    EXPECT_NE(LinksFind(table, 100), nullptr);
    EXPECT_EQ(LinksFind(table, 1999), nullptr);
}

TEST(LinuxNetlink, APortIsLostWhenItGoesMovesOrIsAnotherAndNotBefore) {
    std::string bridges = Told(2, "br0", "bridge") + Told(3, "br1", "bridge");
    auto torn = [](const std::string &alone) {  // the answers until a port is asked for alone
        return std::deque<Strings>{Torn(), Torn(), Torn(), Torn(), Torn(), {Told(3, "br1", "bridge")}, {alone}};
    };
    std::string port = Told(7, "v0", "veth", 2), gone = Told(7, "v0", "veth", 2, RTM_DELLINK);
    struct Case { const char *what; std::deque<std::string> notices; std::deque<Strings> answers; bool lost; };
    for (const Case &one : {Case{"nothing", {}, {}, false}, {"renamed", {Told(7, "new", "veth", 2)}, {}, false},
                            {"moved", {Told(7, "v0", "veth", 3)}, {}, true}, {"gone", {gone}, {}, true},
                            {"index used again", {gone + port}, {}, true},
                            {"lost notices", {""}, {{bridges + port, Done()}}, false},
                            {"a refused reload", {""}, {{Message(NLMSG_ERROR, Bytes(-ENOBUFS))}}, false},
                            {"gone unseen", {""}, {{bridges, Done()}}, true},
                            {"of another kind", {""}, {{bridges + Told(7, "v0", "dummy", 2), Done()}}, true},
                            {"left out of torn dumps", {""}, torn(port), false},
                            {"moved in torn dumps", {""}, torn(Told(7, "v0", "veth", 3)), true},
                            {"gone in torn dumps", {""}, torn(Message(NLMSG_ERROR, Bytes(-ENODEV))), true}}) {
        Machine machine(bridges + port, {7});
        Machine::clock += NOTICE_LOOK;
        machine.notices.waiting = one.notices;
        machine.route.answers = one.answers;
        KnfStatus status = machine.Get(NODE_PORT_STATUS, {ParamOf(std::string("br0")), ParamOf(7)});
        EXPECT_EQ(status != STATUS_OK, one.lost) << one.what;
        EXPECT_TRUE(machine.route.answers.empty()) << one.what;
    }
}

TEST(LinuxNetlink, ANicWhoseParentIsNotToldIsOneWhereSysShowsItself) {
    std::filesystem::path top = testing::TempDir() + "sys-" + std::to_string(getpid());
    for (const char *index : {"4", "5"}) {  // the second one is of another namespace
        std::filesystem::create_directories(top / "class/net/eth0");
        std::ofstream(top / "class/net/eth0/ifindex") << index << "\n";
        std::ofstream(top / "class/net/eth0/address") << "02:00:00:00:00:04\n";
        std::filesystem::create_symlink("../../../0000:00:03.0", top / "class/net/eth0/device");
        Machine machine("", {});
        ProcRootClose(&machine.host->root);
        ProcRootOpen(&machine.host->root, top.c_str(), top.c_str());
        machine.route.answers = {{Told(4, "eth0", ""), Done()}, {Counted(4, 1), Done()}};
        std::string type, device;
        ASSERT_EQ(machine.Get(NODE_PORT_TYPE, {ParamOf(4)}, &type), STATUS_OK);
        machine.notices.waiting = {Told(4, "eth0", "")};
        Machine::clock += NOTICE_LOOK;
        KnfStatus status = machine.Get(NODE_NIC_PROPERTIES, {ParamOf(std::string("eth0"))}, &device);
        EXPECT_EQ(std::pair(type[0] == 4, type[0] == 2), std::pair(*index == '4', *index != '4'));
        EXPECT_EQ(status == STATUS_OK, *index == '4');
        EXPECT_EQ(device.find("0000:00:03.0") != std::string::npos, *index == '4');
        std::filesystem::remove_all(top);
    }
}

TEST(LinuxNetlink, APassIsOneDumpAndTheNextOneIsAnother) {
    Machine machine(Told(2, "v0", "veth") + Told(3, "v1", "veth"), {2, 3});
    struct Step { u64 after; int port; bool dump; };  // ns
    u64 unit = 0;
    for (const Step &step : {Step{1, 2, true}, {1, 3, false}, {PASS_FLOOR / 2, 2, false}, {PASS_FLOOR, 2, true},
                             {PASS_FLOOR, 3, false}, {PASS_AGE, 3, true}, {PASS_AGE - 1, 2, false}, {2, 2, true}}) {
        Machine::clock += step.after;
        unit += step.dump ? 1 : 0;
        if (step.dump) {
            machine.route.answers = {{Counted(2, unit) + Counted(3, unit) + Counted(99, 77), Done()}};
        }
        std::string record;
        Params keys = {ParamOf(std::string(NO_SWITCH)), ParamOf(step.port)};
        ASSERT_EQ(machine.Get(NODE_PORT_STATS, keys, &record), STATUS_OK);
        std::array<u64, 12> told;  // of each direction packets, bytes, losses: what a veth received its client sent
        memcpy(told.data(), record.data(), sizeof told);
        EXPECT_TRUE(told[0] == unit && told[1] == 3 * unit && told[2] == 12 * unit) << step.after;
        EXPECT_TRUE(told[9] == 2 * unit && told[10] == 4 * unit && told[11] == 14 * unit) << step.after;
        EXPECT_TRUE(machine.route.answers.empty());
    }
}

TEST(LinuxNetlink, AQueueThatBeginsAgainGoesOnAndOneThatIsAwayFails) {
    Machine machine(Card(4, "eth0"), {});
    Params keys = {ParamOf(std::string("eth0"))};
    machine.route.answers = {{Card(4, "eth0"), Done()}};
    rlimit files = {}, none = {};
    getrlimit(RLIMIT_NOFILE, &files);
    none.rlim_max = files.rlim_max;
    setrlimit(RLIMIT_NOFILE, &none);
    std::string record;
    machine.host->generic.io = {};
    EXPECT_EQ(machine.Get(NODE_TXQ_INFO, keys, &record), STATUS_OK) << "no socket for queues";
    EXPECT_EQ(record[0], 0);
    setrlimit(RLIMIT_NOFILE, &files);
    machine.host->generic.io = {Kernel::Send, Kernel::Receive, &machine.generic};
    Machine::clock += PASS_AGE;
    machine.generic.answers = {{Message(NLMSG_ERROR, Bytes(-ENOENT))},
                               {Message(GENL_ID_CTRL, "    " + Attr(CTRL_ATTR_FAMILY_ID, Bytes(u16{30})))},
                               {Message(30, "    " + Attr(ETHTOOL_A_CHANNELS_COMBINED_COUNT, Bytes(2)))}};
    machine.route.answers = {{Queued(4, {50, 60}), Done()}};
    ASSERT_EQ(machine.Get(NODE_TXQ_INFO, keys, &record), STATUS_OK);
    EXPECT_EQ(record[0], 2);
    keys.push_back(ParamOf(1));
    struct Step { std::vector<u32> told; u32 shown; };  // of the second queue; 0: it fails
    for (const Step &step : {Step{{50, 60}, 60}, {{51}, 0}, {{52, 7}, 67}, {{53, 9}, 69}, {{1, 1}, 70}}) {
        Machine::clock += PASS_AGE;
        machine.route.answers = {{Queued(4, step.told), Done()}};
        EXPECT_EQ(machine.Get(NODE_TXQ_STATS, keys, &record) == STATUS_OK, step.shown != 0);
        u32 packets = 0;
        memcpy(&packets, &record[txq_stats::PKTS.offset], sizeof packets);
        EXPECT_EQ(packets, step.shown);
    }
}

TEST(LinuxNetlink, CountersThatAreRefusedStayAsTheyWereAndThoseOfWhatIsGoneFail) {
    Machine machine(Told(2, "v0", "veth") + Told(3, "v1", "veth"), {2, 3});
    Params keys = {ParamOf(std::string(NO_SWITCH)), ParamOf(2)};
    Strings refused = {Message(NLMSG_ERROR, Bytes(-ENOBUFS))};
    std::string record, later;
    machine.route.answers = {{Counted(2, 5) + Counted(3, 5), Done()}};
    ASSERT_EQ(machine.Get(NODE_PORT_STATS, keys, &record), STATUS_OK);
    Machine::clock += PASS_AGE;
    machine.route.answers = {refused, refused, refused};
    EXPECT_EQ(machine.Get(NODE_PORT_STATS, keys, &later), STATUS_OK);
    EXPECT_EQ(later, record);
    Machine::clock += PASS_AGE;
    machine.route.answers = {{Counted(3, 6), Done()}, {Message(NLMSG_ERROR, Bytes(-ENODEV))}};
    EXPECT_NE(machine.Get(NODE_PORT_STATS, keys), STATUS_OK);
}

TEST(LinuxNetlink, CountsThatBeginAgainAreOfAnotherInterfaceWhenNoticesWereLost) {
    std::string links = Told(2, "v0", "veth") + Told(3, "v1", "veth");
    for (bool lost : {false, true}) {
        Machine machine(links, {2});
        Params keys = {ParamOf(std::string(NO_SWITCH)), ParamOf(2)};
        machine.route.answers = {{Counted(2, 5), Done()}};
        ASSERT_EQ(machine.Get(NODE_PORT_STATS, keys), STATUS_OK);
        Machine::clock += PASS_AGE;
        machine.notices.waiting = lost ? std::deque<std::string>{""} : std::deque<std::string>{};
        machine.route.answers = {{Counted(2, 4), Done()}};
        if (lost) {
            machine.route.answers.push_front({links, Done()});
        }
        EXPECT_EQ(machine.Get(NODE_PORT_STATS, keys) == STATUS_OK, !lost);
    }
}

// What counts in the kernel, played: it answers with `samples`, and keeps what it was asked.
struct Counting {
    inline static Strings calls;
    inline static PortSamples samples;
    inline static Outcome outcome = FINE;
    static std::string Text(const TrackedPort *port, PortFamily family) {
        return std::to_string(port->index) + (port->direction == PORT_SENDS ? " sends " : " receives ") +
               (family == PORT_SIZES ? "sizes" : "intervals");
    }
    static TrackingTable Table() {
        calls.clear();
        outcome = FINE;
        TrackingTable table = {};
        table.close = [](Tracking *) {};
        table.reason = [](const Tracking *) { return "played"; };
        table.portStart = [](Tracking *, const TrackedPort *port, PortFamily family) {
            return calls.push_back("start " + Text(port, family)), outcome;
        };
        table.portStop = [](Tracking *, const TrackedPort *port, PortFamily family) {
            calls.push_back("stop " + Text(port, family));
        };
        table.portRead = [](Tracking *, const TrackedPort *, PortFamily, PortSamples *told) {
            return *told = samples, FINE;
        };
        table.vectorWatch = [](Tracking *, u32 irq) {
            return calls.push_back("watch " + std::to_string(irq)), outcome;
        };
        table.vectorRead = [](Tracking *, u32 irq, u32 cpus, VectorSamples *told) {
            for (u32 cpu = 0; cpu < cpus; cpu++) {
                told[cpu] = {10 * irq + cpu + calls.size(), 1000000 * irq};
            }
            return calls.push_back("read " + std::to_string(irq)), outcome;
        };
        table.movesCaches = [](Tracking *, const u32 *, u32 cpus) {
            return calls.push_back("caches " + std::to_string(cpus)), outcome;
        };
        table.movesWatch = [](Tracking *, u32) { return calls.push_back("moves"), outcome; };
        table.movesRead = [](Tracking *, u32, u64 *moves) { return *moves = 7, FINE; };
        return table;
    }
    static Strings Calls() { return std::exchange(calls, {}); }
};

TEST(LinuxDemand, AHistogramHasWhatCameSinceItsResetAndNothingOfAnotherPort) {
    std::string port = Told(7, "v0", "veth", 2);
    Machine machine(Told(2, "br0", "bridge") + port + Told(8, "m0", "macvtap", 2), {7, 8});
    TrackingTable table = Counting::Table();
    machine.host->demand.opened = true;
    machine.host->demand.table = &table;
    NodeSource source = LinuxHostSource(machine.host);
    auto set = [&](u32 node, int index, const char *operation, const char *side) {
        return source.set(source.context, node, {ParamOf(std::string("br0")), ParamOf(index)},
                          {ParamOf(std::string(operation)), ParamOf(std::string(side))}, nullptr, 0);
    };
    Params keys = {ParamOf(std::string("br0")), ParamOf(7)};
    auto shown = [&] {  // least, largest, mean, count, and the first bucket with its limit
        std::string record;
        std::array<u64, 6> fields = {};
        EXPECT_EQ(machine.Get(NODE_SIZES_IN, keys, &record), STATUS_OK);
        memcpy(fields.data(), record.data(), sizeof fields);
        return fields;
    };
    EXPECT_NE(machine.Get(NODE_SIZES_IN, keys), STATUS_OK) << "never started";
    EXPECT_NE(set(NODE_SIZES, 7, "stop", "input"), STATUS_OK);
    ASSERT_TRUE(source.takesText(machine.host));
    ASSERT_TRUE(source.takesText(machine.host));
    for (const char *side : {"input", "output"}) {
        EXPECT_EQ(set(NODE_SIZES, 7, "start", side), STATUS_OK);
        EXPECT_EQ(set(NODE_CLUSTERS, 7, "start", side), STATUS_OK);
        EXPECT_EQ(set(NODE_INTERVALS, 8, "start", side), STATUS_OK);
    }
    EXPECT_EQ(Counting::Calls(), (Strings{"start 0 sends sizes", "start 7 receives sizes", "stop 0 sends sizes",
                                          "start 8 sends intervals", "stop 0 sends sizes", "start 7 sends sizes",
                                          "stop 0 sends sizes"})) << "what a macvtap receives can't be seen";
    EXPECT_EQ(set(NODE_SIZES, 7, "start", "both"), STATUS_BAD_PARAM);
    EXPECT_EQ(set(NODE_SIZES, 7, "halt", "input"), STATUS_BAD_PARAM);
    using Shown = std::array<u64, 6>;
    Counting::samples = {10, 1000, 60, 140, {10}};
    EXPECT_EQ(shown(), (Shown{60, 140, 100, 10, 10, 64}));
    Counting::samples = {11, 1030, 30, 30, {11}};
    EXPECT_EQ(shown(), (Shown{30, 140, 93, 11, 11, 64}));
    Counting::samples = {13, 1230, 90, 110, {13}};
    EXPECT_EQ(set(NODE_SIZES, 7, "reset", "input"), STATUS_OK);
    EXPECT_EQ(shown(), (Shown{90, 110, 100, 2, 2, 64})) << "what came between read and reset is not lost";
    Machine::clock += 2 * PASS_FLOOR;
    Counting::samples = {20, 2000, 1, 999, {20}};
    EXPECT_EQ(set(NODE_SIZES, 7, "reset", "input"), STATUS_OK);
    Counting::samples = {20, 2000, 0, 0, {20}};
    EXPECT_EQ(shown(), (Shown{0, 0, 0, 0, 0, 64})) << "a reset long after the read";
    Counting::samples = {24, 2400, 100, 100, {24}};
    EXPECT_EQ(set(NODE_SIZES, 7, "stop", "input"), STATUS_OK);
    Counting::samples = {3, 150, 50, 50, {3}};
    EXPECT_EQ(shown(), (Shown{100, 100, 100, 4, 4, 64})) << "stopped";
    EXPECT_EQ(set(NODE_SIZES, 7, "start", "input"), STATUS_OK);
    EXPECT_EQ(shown(), (Shown{50, 100, 78, 7, 7, 64})) << "goes on";
    Machine::clock += NOTICE_LOOK;
    machine.notices.waiting = {Told(7, "v0", "veth", 2, RTM_DELLINK) + port};
    EXPECT_NE(machine.Get(NODE_SIZES_IN, keys), STATUS_OK);
    EXPECT_NE(machine.Get(NODE_CLUSTERS_IN, keys), STATUS_OK);
    EXPECT_EQ(machine.Get(NODE_PORT_TYPE, {ParamOf(7)}), STATUS_OK);
    EXPECT_NE(machine.Get(NODE_SIZES_IN, keys), STATUS_OK) << "of the one before";
    Counting::calls.clear();
    EXPECT_EQ(set(NODE_SIZES, 7, "start", "input"), STATUS_OK);
    EXPECT_EQ(Counting::Calls(), (Strings{"stop 7 receives sizes", "stop 7 sends sizes", "start 7 receives sizes",
                                          "stop 0 sends sizes"}));
    EXPECT_EQ(shown(), (Shown{50, 50, 50, 3, 3, 64}));
    Counting::outcome = REFUSED;
    machine.host->demand.asked = false;
    EXPECT_FALSE(source.takesText(machine.host));
}

TEST(LinuxDemand, AVectorIsNamedAfterItsNicsAndReadOnceAPass) {
    std::filesystem::path top = testing::TempDir() + "vectors-" + std::to_string(getpid());
    std::filesystem::create_directories(top / "devices/pci0/virtio0");
    std::filesystem::create_directories(top / "bus/virtio/devices");
    std::filesystem::create_directory_symlink(top / "devices/pci0/virtio0", top / "bus/virtio/devices/virtio0");
    for (const auto &[vector, actions] : {std::pair("30", "eth1-rx\n"), {"31", "config,eth7x\n"}, {"x", ""}}) {
        std::filesystem::create_directories(top / "devices/pci0/msi_irqs" / vector);
        std::filesystem::create_directories(top / "kernel/irq" / vector);
        std::ofstream(top / "kernel/irq" / vector / "actions") << actions;
    }
    Machine machine(Card(4, "eth1") + Card(5, "eth7") + Card(6, "eth10"), {});
    ProcRootClose(&machine.host->root);
    ProcRootOpen(&machine.host->root, top.c_str(), top.c_str());
    ASSERT_EQ(machine.Get(NODE_PORT_TYPE, {ParamOf(4)}), STATUS_OK);
    for (Link &link : machine.host->links.rows) {
        strcpy(link.bus, "virtio");
    }
    TrackingTable table = Counting::Table();
    machine.host->demand.opened = true;
    machine.host->demand.table = &table;
    machine.host->cpusOpen = true;
    machine.host->cpus.topology.cpus = 2;
    NodeSource source = LinuxHostSource(machine.host);
    auto list = [&](u32 node, const Params &keys) {
        Params entries;
        std::string text;
        EXPECT_EQ(source.list(source.context, node, keys, &entries), STATUS_OK);
        for (const KnfParamRec &entry : entries) {
            text += entry.isText ? entry.text : std::to_string(entry.number) + ",";
        }
        return text;
    };
    EXPECT_EQ(list(NODE_VECTOR_LIST, {}), "30,31,");
    EXPECT_EQ(list(NODE_VECTOR_NAMES, {ParamOf(30)}), " eth1 ");
    EXPECT_EQ(list(NODE_VECTOR_NAMES, {ParamOf(31)}), " eth7 config");
    EXPECT_EQ(Counting::Calls(), (Strings{"watch 30", "watch 31"}));
    for (u64 pass : {u64{0}, u64{1}}) {
        for (int vector : {30, 31}) {
            for (u64 cpu : {u64{0}, u64{1}}) {
                std::array<u64, 2> told = {};
                std::string record;
                EXPECT_EQ(machine.Get(NODE_VECTOR_STATS, {ParamOf(vector), ParamOf(i64(cpu))}, &record), STATUS_OK);
                memcpy(told.data(), record.data(), sizeof told);
                u64 before = 2 * pass + (vector == 31 ? 1 : 0);
                EXPECT_EQ(told, (std::array<u64, 2>{10 * u64(vector) + cpu + before, 1000 * u64(vector)}));
            }
        }
        Machine::clock += PASS_AGE;
    }
    EXPECT_EQ(Counting::Calls(), (Strings{"read 30", "read 31", "read 30", "read 31"}));
    EXPECT_NE(machine.Get(NODE_VECTOR_STATS, {ParamOf(30), ParamOf(2)}), STATUS_OK);
    EXPECT_NE(machine.Get(NODE_VECTOR_STATS, {ParamOf(30 + (i64{1} << 32)), ParamOf(0)}), STATUS_OK);
    Counting::outcome = REFUSED;
    EXPECT_EQ(list(NODE_VECTOR_LIST, {}) + list(NODE_VECTOR_LIST, {}), "");
    EXPECT_EQ(Counting::Calls(), (Strings{"watch 30"})) << "asked once";
    std::filesystem::remove_all(top);
}

TEST(LinuxDemand, MovesBetweenCachesAreCountedOfThreadsThatMayMakeThem) {
    for (u32 caches : {1U, 2U}) {
        Machine machine("", {});
        TrackingTable table = Counting::Table();
        machine.host->demand.opened = true;
        machine.host->demand.table = &table;
        machine.host->cpusOpen = true;
        cpu_set_t all;
        ASSERT_EQ(sched_getaffinity(0, sizeof all, &all), 0);
        CpuTopology *topology = &machine.host->cpus.topology;
        topology->cpus = CPU_SETSIZE;
        topology->lastCaches = caches;
        for (u32 cpu = 0, seen = 0; cpu < CPU_SETSIZE; cpu++) {
            topology->lastCache.push_back(CPU_ISSET(cpu, &all) ? seen++ % caches : NO_CPU);
        }
        cpu_set_t one = {};
        CPU_SET(sched_getcpu(), &one);
        ASSERT_EQ(sched_setaffinity(0, sizeof one, &one), 0);
        auto own = static_cast<u32>(gettid());
        EXPECT_EQ(HostCacheMoves(machine.host, own), 0U) << "bound inside one";
        ASSERT_EQ(sched_setaffinity(0, sizeof all, &all), 0);
        bool leaves = caches == 2 && CPU_COUNT(&all) > 1;
        EXPECT_EQ(HostCacheMoves(machine.host, own) + HostCacheMoves(machine.host, own), leaves ? 14U : 0U);
        EXPECT_EQ(Counting::Calls(), leaves ? (Strings{"caches 1024", "moves"}) : Strings());
    }
}
// clang-format on
