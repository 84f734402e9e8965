// What holds on a real host, added up from the nodes of simulated ones whose counters nobody set by hand.
#include "corekit/entry/control.h"
#include "corekit/nodes.h"
#include "interface/corekit.h"
#include "tests/fixed_clock.h"

#include <cstring>
#include <fstream>
#include <gtest/gtest.h>
#include <map>
#include <memory>
#include <random>
#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace {

using List = std::unique_ptr<KnfParamListRec, void (*)(KnfParamList)>;
constexpr i64 NONE = -1;
constexpr i64 OWN_PROCESS = 4242;

List Keys(const std::string &text, i64 number, i64 last = NONE) {
    List list(KNF_ParamListCreate(KNF_INSTANCE_LIST, 3), KNF_ParamListDestroy);
    EXPECT_TRUE(text.empty() || KNF_ParamListAddString(list.get(), text.c_str()) == 0);
    EXPECT_TRUE(number == NONE || KNF_ParamListAddInt(list.get(), number) == 0);
    EXPECT_TRUE(last == NONE || KNF_ParamListAddInt(list.get(), last) == 0);
    return list;
}

struct Record {
    Record(u32 node, const List &keys) : bytes(NodeRecordSize(node)) {
        EXPECT_EQ(KNF_Get(node, keys.get(), bytes.data(), NodeRecordSize(node)), 0U) << node;
    }
    u64 operator[](FieldLayout at) const {
        u64 value = 0;
        memcpy(&value, &bytes[at.offset], at.width);
        return value;
    }
    template <size_t Kinds>
    u64 Sum(const FieldLayout (&kinds)[Kinds]) const {
        u64 sum = 0;
        for (FieldLayout kind : kinds) {
            sum += (*this)[kind];
        }
        return sum;
    }
    std::vector<char> bytes;
};

KnfParamList Listed(u32 node, const List &keys) {
    KnfParamList list = nullptr;
    EXPECT_EQ(KNF_GetInstanceListAlloc(node, keys.get(), &list), 0U) << node;
    return list;
}

std::vector<std::string> Names(u32 node) {
    List list(Listed(node, Keys("", NONE)), KNF_ParamListDestroy);
    std::vector<std::string> names;
    for (u32 i = 0; i < KNF_ParamListUsedCount(list.get()); i++) {
        names.emplace_back(KNF_ParamGetString(KNF_ParamListGetParam(list.get(), i)));
    }
    return names;
}

std::vector<i64> Numbers(u32 node, const List &keys) {
    List list(Listed(node, keys), KNF_ParamListDestroy);
    std::vector<i64> numbers;
    for (u32 i = 0; i < KNF_ParamListUsedCount(list.get()); i++) {
        numbers.push_back(KNF_ParamGetInt(KNF_ParamListGetParam(list.get(), i)));
    }
    return numbers;
}

i64 Distance(u64 one, u64 other) {
    return std::abs(static_cast<i64>(one - other));
}

struct Described {
    std::string text;                 // empty: the built-in one
    std::map<u64, u64> sizes, rates;  // of ports that state them; rates of sending under a constant load
    std::set<i64> leaders;
};

class HostReader {
public:
    explicit HostReader(const Described &whole) : described(whole) {}
    void Check() {
        for (const std::string &name : Names(NODE_SWITCH_LIST)) {
            CheckSwitch(name);
        }
        CheckTime();
    }

private:
    void CheckPort(const Record &stats, u64 number) {
        u64 sent = stats[port_stats::TX_PKTS] + stats[port_stats::TX_PKTS_EXTRA];
        u64 size = sent == 0 ? 0 : (stats[port_stats::TX_BYTES] + stats[port_stats::TX_BYTES_EXTRA]) / sent;
        EXPECT_EQ(size, sent == 0 || described.sizes.count(number) == 0 ? size : described.sizes.at(number));
        EXPECT_EQ(stats[port_stats::TX_BYTES], stats[port_stats::TX_PKTS] * size);
        EXPECT_EQ(stats[port_stats::TX_BYTES_EXTRA], stats[port_stats::TX_PKTS_EXTRA] * size);
        EXPECT_TRUE(sent == 0 || stats[port_stats::RX_BYTES] == stats[port_stats::RX_PKTS] * size);
        u64 micros = Record(NODE_PCPU_STATS, Keys("", 0))[pcpu_stats::ELAPSED];
        u64 worth = described.rates.count(number) == 0 ? sent : described.rates.at(number) * micros / 1000000;
        EXPECT_LE(sent - worth, 1U) << "packets of the host's lifetime";
        EXPECT_TRUE(sent >= last[number]) << "a counter went back";
        last[number] = sent;
    }

    void CheckVnic(const Record &stats, u64 model, const List &port) {
        if (model == MODEL_PARLAN2) {
            Record nic(NODE_PARLAN2, port);
            const FieldLayout kinds[] = {parlan2::RX_BUF_UNDERFLOW, parlan2::OUT_OF_SLOTS, parlan2::RX_OVERFLOW,
                                         parlan2::RX_ERR_A,         parlan2::RING2_ERRORS, parlan2::MAX_FRAGS,
                                         parlan2::MAP_FAILURES,     parlan2::RX_ERR_B,     parlan2::RX_ERR_C,
                                         parlan2::RX_ERR_D};
            EXPECT_EQ(nic.Sum(kinds), stats[port_stats::RX_DROPPED]);
            EXPECT_EQ(nic[parlan2::TX_OVERFLOW], stats[port_stats::TX_DROPPED]);
        } else if (model == MODEL_PARLAN3) {
            Record tx(NODE_PARLAN3_TX, port);
            Record rx(NODE_PARLAN3_RX, port);
            EXPECT_EQ(tx[parlan3_tx::PKTS], stats[port_stats::TX_PKTS] + stats[port_stats::TX_PKTS_EXTRA]);
            EXPECT_EQ(tx[parlan3_tx::BYTES], stats[port_stats::TX_BYTES] + stats[port_stats::TX_BYTES_EXTRA]);
            EXPECT_EQ(rx[parlan3_rx::PKTS], stats[port_stats::RX_PKTS]);
            EXPECT_EQ(rx[parlan3_rx::BYTES], stats[port_stats::RX_BYTES]);
            EXPECT_EQ(tx[parlan3_tx::ERRORS], stats[port_stats::TX_DROPPED]);
            EXPECT_EQ(rx[parlan3_rx::ERR_A] + rx[parlan3_rx::ERR_B], stats[port_stats::RX_DROPPED]);
        }
    }

    void CheckNic(const Record &stats, const std::string &name, const std::set<i64> &ports) {
        Record nic(NODE_NIC_STATS, Keys(name, NONE));
        EXPECT_EQ(nic[nic_stats::TX_PKTS], stats[port_stats::TX_PKTS] + stats[port_stats::TX_PKTS_EXTRA]);
        EXPECT_EQ(nic[nic_stats::TX_BYTES], stats[port_stats::TX_BYTES] + stats[port_stats::TX_BYTES_EXTRA]);
        EXPECT_EQ(nic[nic_stats::RX_PKTS], stats[port_stats::RX_PKTS]);
        EXPECT_EQ(nic[nic_stats::RX_BYTES], stats[port_stats::RX_BYTES]);
        EXPECT_EQ(nic.Sum(nic_stats::TX_ERRORS), stats[port_stats::TX_DROPPED]);
        EXPECT_EQ(nic.Sum(nic_stats::RX_ERRORS), stats[port_stats::RX_DROPPED]);
        auto queues = static_cast<i64>(Record(NODE_TXQ_INFO, Keys(name, NONE))[queue_info::COUNT]);
        u32 packets = 0;
        u32 errors = 0;
        for (i64 queue = 0; queue < queues; queue++) {
            Record record(NODE_TXQ_STATS, Keys(name, queue));
            packets += static_cast<u32>(record[txq_stats::PKTS]);
            errors += static_cast<u32>(record[txq_stats::ERRORS]);
        }
        EXPECT_EQ(packets, queues == 0 ? 0 : static_cast<u32>(nic[nic_stats::TX_PKTS]));
        EXPECT_EQ(errors, queues == 0 ? 0 : static_cast<u32>(stats[port_stats::TX_DROPPED]));
        queues = static_cast<i64>(Record(NODE_RXQ_INFO, Keys(name, NONE))[queue_info::COUNT]);
        for (i64 queue = 0; queue < queues; queue++) {
            for (i64 filter : Numbers(NODE_RXQ_FILTERS, Keys(name, queue))) {
                Record record(NODE_RXQ_FILTER, Keys(name, queue, filter));
                EXPECT_EQ(ports.count(static_cast<i64>(record[rxq_filter::PORT])), 1U);
            }
        }
    }

    // What comes in by ports and uplinks, less what goes out by them or is dropped.
    void CheckSwitch(const std::string &name) {
        i64 balance = 0;
        std::vector<i64> listed = Numbers(NODE_SWITCH_PORTS, Keys(name, NONE));
        std::set<i64> ports(listed.begin(), listed.end());
        for (i64 number : ports) {
            List port = Keys(name, number);
            Record type(NODE_PORT_TYPE, Keys("", number));
            Record status(NODE_PORT_STATUS, port);
            Record stats(NODE_PORT_STATS, port);
            SCOPED_TRACE(name + " port " + std::to_string(number));
            CheckPort(stats, static_cast<u64>(number));
            bool isUplink = type[port_type::TYPE] == PORT_UPLINK;
            balance += static_cast<i64>(stats[port_stats::TX_PKTS] + stats[port_stats::TX_PKTS_EXTRA] +
                                        (isUplink ? stats[port_stats::TX_DROPPED] : 0)) *
                       (isUplink ? -1 : 1);
            balance += static_cast<i64>(stats[port_stats::RX_PKTS] + (isUplink ? 0 : stats[port_stats::RX_DROPPED])) *
                       (isUplink ? 1 : -1);
            if (isUplink) {
                CheckNic(stats, &status.bytes[port_status::CLIENT_NAME.offset], ports);
            } else if (type[port_type::TYPE] == PORT_VNIC) {
                CheckVnic(stats, type[port_type::SUB_TYPE], port);
                described.leaders.insert(static_cast<i64>(status[port_status::WORLD_LEADER]));
            }
        }
        EXPECT_LE(std::abs(balance), static_cast<i64>(3 * ports.size()))
            << name << ": a packet a counter is on its way";
    }

    void CheckVcpu(i64 id, u64 elapsed) {
        Record times(NODE_VCPU_TIMES, Keys("", id));
        u64 active = times[vcpu_times::USED] + times[vcpu_times::READY] + times[vcpu_times::COSTOP];
        EXPECT_EQ(times[vcpu_times::ELAPSED], elapsed);
        EXPECT_LE(active, elapsed + 3) << "what is left is the time that it waited";
        used += times[vcpu_times::USED];
        runs++;
        vcpus.insert(static_cast<u64>(id));
    }

    void CheckVcpus(u64 elapsed) {
        vcpus.clear();
        CheckVcpu(OWN_PROCESS, elapsed);
        for (i64 leader : described.leaders) {
            auto cartel = static_cast<i64>(Record(NODE_WORLD_CARTEL, Keys("", leader))[vcpu_chain::CARTEL]);
            auto group = static_cast<i64>(Record(NODE_CARTEL_GROUP, Keys("", cartel))[vcpu_chain::GROUP]);
            auto first = static_cast<i64>(Record(NODE_GROUP_LEADER, Keys("", group))[vcpu_chain::LEADER]);
            for (i64 vcpu : Numbers(NODE_VCPU_LIST, Keys("", first))) {
                CheckVcpu(vcpu, elapsed);
            }
        }
    }

    // Gives the time that worldlets ran on each pcpu that they are bound to, in nanoseconds.
    std::map<u64, u64> CheckWorldlets(u64 elapsed) {
        std::map<u64, u64> bound;
        std::vector<std::string> names = Names(NODE_WORLDLET_LIST);
        for (const std::string &name : names) {
            Record stats(NODE_WORLDLET_STATS, Keys(name, NONE));
            u64 ran = stats[worldlet_stats::USED];
            u64 all = ran + stats[worldlet_stats::READY] + stats[worldlet_stats::WAIT];
            EXPECT_LE(Distance(all, elapsed * 1000), 3) << name;
            inWorldlets += ran / 1000;
            runs++;
            u64 vcpu = stats[worldlet_stats::AFFINE_VCPU];
            u64 worldlet = stats[worldlet_stats::AFFINE_WORLDLET];
            EXPECT_TRUE(vcpu == 0 || vcpus.count(vcpu) == 1) << vcpu;
            EXPECT_TRUE(worldlet == 0xffffffff || worldlet < names.size()) << worldlet;
            bound[stats[worldlet_stats::AFFINE_PCPU]] += vcpu == 0 && worldlet == 0xffffffff ? ran : 0;
        }
        return bound;
    }

    void CheckTime() {
        used = inWorldlets = runs = 0;
        u64 elapsed = Record(NODE_PCPU_STATS, Keys("", 0))[pcpu_stats::ELAPSED];
        CheckVcpus(elapsed);
        std::map<u64, u64> bound = CheckWorldlets(elapsed);
        auto pcpus = static_cast<i64>(Record(NODE_TOPOLOGY, Keys("", NONE))[topology::PCPUS]);
        u64 busy = 0;
        u64 worldlets = 0;
        for (i64 pcpu = 0; pcpu < pcpus; pcpu++) {
            Record stats(NODE_PCPU_STATS, Keys("", pcpu));
            busy += stats[pcpu_stats::BUSY];
            worldlets += stats[pcpu_stats::WORLDLETS];
            EXPECT_EQ(stats[pcpu_stats::ELAPSED], elapsed);
            EXPECT_LE(stats[pcpu_stats::BUSY], elapsed + 1);
            EXPECT_LE(stats[pcpu_stats::WORLDLETS], stats[pcpu_stats::BUSY] + 1);
            EXPECT_LE(bound[static_cast<u64>(pcpu)] / 1000, stats[pcpu_stats::WORLDLETS] + runs);
        }
        i64 slack = static_cast<i64>(runs) + pcpus;
        EXPECT_LE(Distance(busy, used + inWorldlets), slack);
        EXPECT_LE(Distance(worldlets, inWorldlets), slack);
    }

    Described described;
    std::map<u64, u64> last;  // packets that a port had sent
    std::set<u64> vcpus;
    u64 used = 0, inWorldlets = 0;  // microseconds
    u64 runs = 0;                   // vcpus and worldlets
};

// A random host that states less than all, and of time more than there is.
class Dice {
public:
    explicit Dice(u64 seed) : random(seed) {}
    Described Roll() {
        pcpus = Under(16) + 1;
        out << "host name=h pcpus=" << pcpus;
        Maybe("uptime", 3000000);
        Load();
        for (i64 vm = 1; vm <= 1 + Under(4); vm++) {
            vcpus.push_back(1 + Under(8));
            host.leaders.insert(100 * vm);
            out << "vm vm" << vm << " leader=" << 100 * vm << " vcpus=" << vcpus.back();
            Maybe("used", 800);
            Maybe("ready", 100);
            Maybe("costop", 50);
            Rarely("pcpu", pcpus + 2);
            Load();
        }
        for (i64 name = 0; name < 1 + Under(3); name++) {
            Switch(name, Under(4));
        }
        for (i64 i = 0; i < Under(8); i++) {
            out << "worldlet w" << i;
            Maybe("used", 500);
            Maybe("ready", 200);
            Affinity(i);
            Load();
        }
        host.text = out.str();
        return host;
    }

private:
    i64 Under(i64 limit) { return static_cast<i64>(random() % static_cast<u64>(limit)); }
    void Maybe(const char *key, i64 limit) {
        if (Under(4) > 0) {
            out << " " << key << "=" << Under(limit);
        }
    }
    void Rarely(const char *key, i64 limit) {
        if (Under(4) == 0) {
            out << " " << key << "=" << Under(limit);
        }
    }
    void Load() {
        const char *loads[] = {" load=constant", " load=wave", " load=burst", " load=burst:7", "", ""};
        out << loads[Under(6)] << "\n";
    }

    i64 Vm() { return 1 + Under(static_cast<i64>(vcpus.size())); }

    void Affinity(i64 worldlets) {
        i64 vm = Vm();
        switch (Under(4)) {
        case 0:
            out << " pcpu=" << Under(pcpus);
            break;
        case 1:
            out << " vcpu=vm" << vm << "/" << Under(vcpus[static_cast<size_t>(vm - 1)]);
            break;
        case 2:
            out << (worldlets > 0 ? " worldlet=w0" : "");
            break;
        default:
            break;
        }
    }

    void Port(i64 onSwitch) {
        const char *kinds[] = {"plain type=2", "vnic model=parlan2 vm=vm", "vnic model=parlan3 vm=vm",
                               "hostnic name=h"};
        i64 kind = Under(4);
        out << kinds[kind];
        if (kind > 0) {
            out << Vm();
        }
        out << " switch=s" << onSwitch << " port=" << ++ports;
        Maybe("rx", 100000);
        Rarely("errors", 9);
        Rarely("rxerrors", 900);
        if (Under(2) == 0) {
            auto number = static_cast<u64>(ports);
            host.sizes[number] = static_cast<u64>(Under(9000));
            host.rates[number] = static_cast<u64>(Under(200000));
            out << " load=constant tx=" << host.rates[number] << " size=" << host.sizes[number] << "\n";
        } else {
            Maybe("tx", 100000);
            Load();
        }
    }

    // With one or two uplinks, with one that states a direction, or with none; the last port takes what is left.
    void Switch(i64 name, i64 uplinks) {
        out << "switch s" << name << "\n";
        for (i64 i = 0; i < (uplinks == 3 ? 1 : uplinks); i++) {
            ports++;
            out << "uplink switch=s" << name << " port=" << ports << " nic=n" << ports << " rxqueues=4 filters=1,3,0,2";
            Maybe("txqueues", 70);
            Rarely("first", 1001);
            if (uplinks == 3) {
                out << (Under(2) == 0 ? " tx=" : " rx=") << Under(90000);
            } else {
                Maybe("errors", 3);
                Maybe("rxerrors", 50);
            }
            Load();
        }
        out << "hostnic switch=s" << name << " name=k port=" << ++ports << " rx=9 tx=" << 1000 + Under(9000) << "\n";
        for (i64 i = 0; i < Under(7); i++) {
            Port(name);
        }
        out << "plain switch=s" << name << " type=2 port=" << ++ports << "\n";
    }

    std::mt19937_64 random;
    std::ostringstream out;
    Described host;
    i64 pcpus = 0;
    i64 ports = 0;
    std::vector<i64> vcpus;
};

void CheckLaws(const Described &described) {
    std::string error;
    if (described.text.empty()) {
        setenv("COREKIT_HOST", "demo", 1);
        ASSERT_EQ(HckSyscall_Init(1, 0, 0), 0);
        unsetenv("COREKIT_HOST");
    } else {
        ASSERT_TRUE(CorekitLoad(described.text, &error)) << error;
    }
    HostReader host(described);
    for (i64 later : {0LL, 999'983LL, 61'000'000LL, 7'000'003LL, 40'000'000'000LL}) {
        FixedClockAdvance(later);
        host.Check();
    }
}

}  // namespace

TEST(Laws, HoldOnTheBuiltInHost) {
    CheckLaws({{}, {}, {}, {}});
}

TEST(Laws, HoldOnTheExampleThatThePageShows) {
    auto text = [](const char *name) {
        std::ostringstream whole;
        whole << std::ifstream(std::string(DATA_DIRECTORY "/../../docs/") + name).rdbuf();
        return whole.str();
    };
    std::string example = text("examples/office.host");
    EXPECT_NE(text("host-description.md").find("\n```\n" + example + "```\n"), std::string::npos);
    CheckLaws({example, {}, {}, {}});
}

TEST(Laws, HoldOnRandomHosts) {
    for (u64 seed = 1; seed <= 1000 && !HasFailure(); seed++) {
        Described host = Dice(seed).Roll();
        SCOPED_TRACE(host.text);
        FixedClockAdvance(static_cast<i64>(seed) * 1'234'567'891);
        CheckLaws(host);
    }
}

namespace {

u64 Sent(i64 port) {
    Record stats(NODE_PORT_STATS, Keys("s", port));
    return stats[port_stats::TX_PKTS] + stats[port_stats::TX_PKTS_EXTRA];
}

// Packets that a port sends from now on.
u64 SentIn(i64 port, i64 seconds) {
    u64 before = Sent(port);
    FixedClockAdvance(seconds * 1000000);
    return Sent(port) - before;
}

}  // namespace

// A full load is 1,000 packets a second.
TEST(Laws, AgeAndLoadAreThoseThatAreStated) {
    std::string error;
    ASSERT_TRUE(CorekitLoad("host pcpus=1 uptime=5000\nswitch s\nplain switch=s type=2 port=1 tx=1000\n"
                            "plain switch=s type=2 port=2 tx=1000 load=wave\n"
                            "plain switch=s type=2 port={3+i} tx=1000 load=burst:{i} count=2\n",
                            &error))
        << error;
    EXPECT_EQ(Record(NODE_PCPU_STATS, Keys("", 0))[pcpu_stats::ELAPSED] / 1000000, 5000U);
    EXPECT_EQ(Sent(1) / 1000, 5000U);
    auto now = static_cast<i64>(Record(NODE_TIME, Keys("", NONE))[host_time::SECONDS]);
    FixedClockAdvance((86400 - now % 86400 + 11 * 3600LL) * 1000000);
    EXPECT_NEAR(static_cast<double>(SentIn(2, 1)), 1000, 1) << "at eleven";
    FixedClockAdvance(57'599'000'000);
    EXPECT_NEAR(static_cast<double>(SentIn(2, 1)), 330, 1) << "at three";
    EXPECT_NEAR(static_cast<double>(SentIn(2, 86400)), 59'580'000, 1) << "the mean is 69 %";
    FixedClockAdvance(119'000'000);  // to a full hour
    EXPECT_NEAR(static_cast<double>(SentIn(3, 120)), 48'750, 1) << "a quarter, and 25 seconds full";
    int full[] = {0, 0};
    int together = 0;
    for (int second = 0; second < 1200; second++) {
        u64 other = Sent(4);
        bool first = SentIn(3, 1) > 990;
        full[0] += first ? 1 : 0;
        full[1] += Sent(4) - other > 990 ? 1 : 0;
        together += first && Sent(4) - other > 990 ? 1 : 0;
    }
    EXPECT_TRUE(full[0] >= 240 && full[1] >= 240 && together < 200) << full[0] << " " << full[1] << " " << together;
}

TEST(Laws, WhoAsksForMoreTimeThanThereIsWaitsForTheRest) {
    std::string error;
    ASSERT_TRUE(CorekitLoad("host pcpus=2\nvm bound leader=100 vcpus=2 used=900 ready=50 pcpu=0\n"
                            "vm free leader=200 vcpus=3 used=500\n",
                            &error))
        << error;
    const std::tuple<i64, u64, u64> rows[] = {{10100000, 500'000, 450'000}, {10200000, 332'889, 167'111}};
    for (const auto &[id, used, ready] : rows) {
        Record before(NODE_VCPU_TIMES, Keys("", id));
        FixedClockAdvance(1000000);
        Record after(NODE_VCPU_TIMES, Keys("", id));
        EXPECT_EQ(after[vcpu_times::USED] - before[vcpu_times::USED], used);
        EXPECT_EQ(after[vcpu_times::READY] - before[vcpu_times::READY], ready);
    }
}
