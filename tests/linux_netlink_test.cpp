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
#include <sys/resource.h>
#include <sys/socket.h>

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
// clang-format on
