// What a Linux host says in /proc and /sys, in trees made file by file.
#include "corekit/linuxhost/guests/command_line.h"
#include "corekit/linuxhost/guests/guests.h"
#include "corekit/linuxhost/proc/cpu.h"
#include "corekit/linuxhost/proc/stack.h"
#include "corekit/linuxhost/proc/thread.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <numeric>
#include <sched.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>

namespace {

using Strings = std::vector<std::string>;

struct Tree : testing::Test {
    std::filesystem::path top = testing::TempDir() + "tree-" + std::to_string(gettid());
    ProcRoot root;
    Tree() {
        std::filesystem::create_directories(top);
        ProcRootOpen(&root, top.c_str(), top.c_str());
    }
    ~Tree() override { std::filesystem::remove_all(top); }
    void Put(const std::string &path, const std::string &text) const {
        std::filesystem::create_directories((top / path).parent_path());
        std::ofstream(top / path, std::ios::binary) << text;
    }
    // A tap for each name, from descriptor 3 on.
    void PutProcess(const std::string &pid, const std::string &comm, u32 flags, const Strings &taps,
                    const Strings &arguments, const Strings &threads) const {
        Put(pid + "/comm", comm + "\n");
        Put(pid + "/stat", pid + " (" + comm + ") S 2 0 0 0 -1 " + std::to_string(flags) + " 0\n");
        std::filesystem::create_directories(top / pid / "fd");
        for (size_t i = 0; i < taps.size(); i++) {
            std::filesystem::create_symlink("/dev/net/tun", top / pid / "fd" / std::to_string(i + 3));
            Put(pid + "/fdinfo/" + std::to_string(i + 3), "pos:\t0\niff:\t" + taps[i] + "\n");
        }
        Put(pid + "/cmdline", std::accumulate(arguments.begin(), arguments.end(), std::string(),
                                              [](auto all, auto &one) { return all + one + '\0'; }));
        for (size_t i = 0; i < threads.size(); i++) {
            Put(pid + "/task/" + pid + std::to_string(i) + "/comm", threads[i] + "\n");
        }
    }
};

}  // namespace

TEST_F(Tree, CpusThatAreOffStandStillAndComeBackWithoutAStep) {
    Put("devices/system/cpu/present", "0-1,3\n");
    Put("devices/system/cpu/cpu0/topology/physical_package_id", "5\n");
    Put("devices/system/cpu/cpu3/topology/physical_package_id", "9\n");
    Put("devices/system/cpu/cpu3/cache/index0/level", "3\n");
    Put("devices/system/cpu/cpu3/cache/index0/shared_cpu_list", "1,3\n");
    Put("stat", "cpu  1 1 1 1\ncpu0 100 20 3 4000 500 60 7 8 900 10\ncpu3 1 2 3 4\nintr 1\ncpu1 9 9 9 9\n");
    Cpus cpus;
    ASSERT_EQ(CpusOpen(&cpus, root), FINE);
    const CpuTopology &topology = cpus.topology;
    EXPECT_EQ(std::tuple(topology.cpus, topology.packages, topology.lastCacheSharers), std::tuple(4, 2, 2));
    EXPECT_EQ(topology.lastCache, (std::vector<u32>{NO_CPU, 3, NO_CPU, 3}));
    CpusRead(&cpus, 1);
    const CpuRow *row = cpus.rows.data();
    EXPECT_EQ(std::tuple(row->busy, row->interrupts, row->elapsed), std::tuple(1980000, 670000, 46980000));
    u64 off = row[1].elapsed;
    EXPECT_EQ(std::tuple(row[1].busy, row[1].on, row[3].busy), std::tuple(0, false, 60000));
    Put("stat", "cpu0 101 20 3 3990 500 60 7 8\ncpu1 0 0 7 1\ncpu3 1 2\n");
    CpusRead(&cpus, 1);
    EXPECT_EQ(row->busy, 1980000U) << "the same generation";
    CpusRead(&cpus, 2);
    EXPECT_EQ(std::tuple(row->busy, row->elapsed), std::tuple(1990000, 46980000)) << "idle time went back";
    u64 on = row[1].elapsed;
    EXPECT_LT(on - off, 60000000U);
    EXPECT_EQ(std::tuple(row[1].busy, row[3].busy, row[3].on), std::tuple(70000, 60000, false));
    Put("stat", "cpu0 101 20 3 3990 500 60 7 8\ncpu1 0 0 7 101\n");
    CpusRead(&cpus, 3);
    EXPECT_EQ(row[1].elapsed - on, 1000000U);
    CpusClose(&cpus);
}

TEST_F(Tree, CountersOfTheStackAreFoundByKey) {
    Put("net/snmp", "Ip: New InReceives InHdrErrors OutRequests\nIp: 9 70000000000 18446744073709551616 5\n"
                    "Tcp: MaxConn OutSegs\nTcp: -1 12\nUdp: InDatagrams\nTcp: 4\nUdp: InErrors\nUdp: 5\n");
    Put("net/snmp6", "Ip6OutRequests \t 6\nIp6OutTransmits 8\nUdp6NoPorts\nIp6InReceives 7");
    Stack stack;
    StackOpen(&stack, root);
    ASSERT_EQ(StackRead(&stack, 1), FINE);
    EXPECT_EQ(std::tuple(StackIp4Sent(stack.row), StackIp6Sent(stack.row), StackValue(stack.row, IP6_IN)),
              std::tuple(5, 8, 7));
    EXPECT_EQ(std::tuple(StackValue(stack.row, IP4_IN), StackValue(stack.row, TCP_OUT_SEGMENTS)),
              std::tuple(70000000000, 12));
    EXPECT_EQ(__builtin_popcountll(stack.row.known), 6) << "what is missing or no number is not known";
    Put("net/snmp", "");
    ASSERT_EQ(StackRead(&stack, 2), FINE);
    EXPECT_EQ(StackValue(stack.row, IP4_IN), 70000000000) << "a file that fails once made a total fall to 0";
    StackClose(&stack);
}

TEST_F(Tree, NamesOfThreadsPassForNoFigure) {
    Put("sys/kernel/sched_schedstats", "1\n");
    const std::string stat = "8 (a) S 1 1) R 1 1 1 0 -1 0 0 0 0 0 0 0 0 0 20 0 1 0 ";
    Put("7/task/8/status", "Name:\tCpus_allowed_list:\t1\nCpus_allowed_list:\t4\n");
    Put("7/task/8/sched", "\nnr_migrations : 3 (8, #threads: 1)\nse.nr_migrations : 4\n" + std::string(40, '-') +
                              "\nse.nr_migrations   :   41\nnr_wakeups_remote : 42\nnr_switches : 43\n");
    for (u32 kept : {9U, 1U, 0U}) {  // the rest is opened by each read, and a thread known by its start
        ProcLimitKept(kept);
        Put("7/task/8/schedstat", "5000000 600 70\n");
        Put("7/task/8/stat", stat + "250 0 0\n");
        Threads threads;
        const ThreadRow *row = nullptr;
        ThreadsOpen(&threads, &root, false);
        ASSERT_EQ(ThreadWatch(&threads, 7, 8, 15), FINE);
        ASSERT_EQ(ThreadRead(&threads, 8, 1, &row), FINE);
        EXPECT_EQ(std::tuple(row->known, row->run, row->ready, row->runs), std::tuple(15, 5000000, 600, 70));
        EXPECT_EQ(std::tuple(row->migrations, row->remoteWakeups, row->affinity), std::tuple(41, 42, 4));
        EXPECT_EQ(ThreadWatch(&threads, 7, 9, 15), GONE);
        Put("7/task/8/schedstat", "0 0 0\n");
        ASSERT_EQ(ThreadRead(&threads, 8, 3, &row), FINE);
        EXPECT_EQ(row->known & THREAD_TIMES, 0) << "a kernel that does not account";
        Put("7/task/8/stat", stat + "251 0 0\n");
        EXPECT_EQ(ThreadRead(&threads, 8, 2, &row), kept == 0 ? GONE : FINE) << "a later thread of this number";
        ThreadsClose(&threads);
    }
    ProcBuffer buffer;
    std::string_view text;
    EXPECT_EQ(ProcReadOnce(root.proc, "7/task/8/schedstat", 5, &buffer, &text), BROKEN) << "never cut";
    EXPECT_EQ(text, "");
}

TEST(Threads, AThreadOfOursRunsAsItsClockSaysAndIsGoneWhenItEnded) {
    ProcRoot root;
    Threads threads;
    const ThreadRow *row = nullptr;
    u32 tid = 0;
    i64 difference = 1000000000;
    ProcRootOpen(&root);
    ThreadsOpen(&threads, &root, true);
    std::thread([&] {
        tid = static_cast<u32>(gettid());
        auto pid = static_cast<u32>(syscall(SYS_getpid));  // both are made up in these tests, as the clock
        ASSERT_EQ(ThreadWatch(&threads, pid, tid, THREAD_TIMES | THREAD_MIGRATIONS), FINE);
        timespec clock = {};
        while (clock.tv_nsec < 50000000) {
            syscall(SYS_clock_gettime, CLOCK_THREAD_CPUTIME_ID, &clock);
        }
        ASSERT_EQ(ThreadRead(&threads, tid, 1, &row), FINE);
        difference = clock.tv_nsec - static_cast<i64>(row->run);
        EXPECT_EQ(row->known, THREAD_TIMES | THREAD_MIGRATIONS);
    }).join();
    EXPECT_LT(std::abs(difference), 12000000) << "a tick at most";
    for (u64 tries = 2; tries < 1000000 && ThreadRead(&threads, tid, tries, &row) != GONE; tries++) {
        sched_yield();  // the kernel may still be burying it
    }
    EXPECT_EQ(ThreadRead(&threads, tid, 3, &row), GONE);
    ThreadsClose(&threads);
}

TEST_F(Tree, OnlyWhoHoldsATapIsBelieved) {
    PutProcess("20", "liar", 0, {}, {"x", "-name", "web1"}, {"CPU 0/KVM"});
    PutProcess("21", "vhost-30", 0, {}, {}, {});
    PutProcess("22", "vhost-30", 0x208040, {}, {}, {});
    PutProcess("23", "irq/9-eth0) S 1", 0x208040, {}, {}, {});
    PutProcess("29", "giver", 0, {"tap0", "../../x", "longer-than-any-name"}, {"x", "-name", std::string(2 << 20, 'x')},
               {});
    PutProcess("30", "guest", 0, {"tap0", "tap0", "tap1"},
               {"x", "-name", "guest=we\nb,,\",debug-threads=on", "-netdev", "tap,id=a,fds=3:99999999999", "-device",
                "virtio,netdev=a,mac=52:54:0:1:2:ff", "-netdev", R"({"type":"tap","fd":"5","id":"b"})", "-device",
                R"({"driver":"v","netdev":"b","x":{"mac":"0:0:0:0:0:1"},"mac":"52:54:00:44:55:66"})", "-device"},
               {"CPU 1/KVM", "CPU 0/KVM", "CPU 99999999999/KVM", "CPU -1/TCG", "CPU 2/KVM ", "vhost-30", "CPU 0/KVM"});
    Guests guests;
    ASSERT_EQ(GuestsScan(root, &guests), FINE);
    ASSERT_EQ(std::pair(guests.guests.size(), guests.taps.size()), std::pair(size_t{2}, size_t{3}));
    EXPECT_EQ(guests.guests[0].name, "") << "of a command line beyond the limit";
    const Guest &guest = guests.guests[1];
    EXPECT_EQ(std::pair(guest.name, guest.vcpus), std::pair(std::string("we\nb,\""), std::vector<u32>{301, 300}));
    ASSERT_EQ(guest.vhost.size(), 2U) << "its own thread, and the kernel's";
    EXPECT_EQ(std::pair(guest.vhost[0].tid, guest.vhost[1].tid), std::pair(305U, 22U));
    EXPECT_TRUE(guests.nics.size() == 1 && guests.nics[0].name == "irq/9-eth0) S 1");
    const HeldTap *tap = GuestsFind(guests, "tap0", 7);
    ASSERT_TRUE(tap != nullptr && GuestsFind(guests, "tap1", 0) != nullptr && GuestsFind(guests, "tap2", 0) == nullptr);
    EXPECT_EQ(std::tuple(tap->guest, tap->macTold, tap->mac[5], GuestsFind(guests, "tap1", 0)->mac[5]),
              std::tuple(1, true, 0xff, 0x66));
}

TEST_F(Tree, ATapIsOfWhoLooksMostLikeAGuestAndOfNobodyWhereTwoDo) {
    Strings one = {"x", "-name", "one"}, two = {"x", "-name", "two"},
            card = {"x", "-nic", "tap,ifname=d,mac=2:0:0:0:0:1"};
    struct Holder {
        const char *tap;
        Strings arguments, threads;
    };
    u32 pid = 40;
    for (const Holder &holder : {Holder{"a", {}, {}},
                                 {"a", one, {}},
                                 {"a", {}, {}},
                                 {"b", one, {}},
                                 {"b", two, {}},
                                 {"c", one, {}},
                                 {"c", one, {}},
                                 {"d", card, {}},
                                 {"d", one, {}},
                                 {"d", one, {}},
                                 {"e", one, {"CPU 0/KVM"}},
                                 {"e", one, {"CPU 0/KVM"}},
                                 {"f", one, {}},
                                 {"f", {}, {"CPU 0/KVM"}},
                                 {"g", {}, {}},
                                 {"g", {}, {}}}) {
        PutProcess(std::to_string(pid++), "x", 0, {holder.tap}, holder.arguments, holder.threads);
    }
    Guests guests;
    ASSERT_EQ(GuestsScan(root, &guests), FINE);
    std::vector<u32> holders;
    for (const HeldTap &tap : guests.taps) {
        holders.push_back(tap.guest == NO_GUEST ? 0 : guests.guests[tap.guest].pid);
    }
    EXPECT_EQ(holders, (std::vector<u32>{41, 0, 45, 0, 0, 53, 54}));
    EXPECT_EQ(guests.crowded, 0U);
    std::filesystem::path many =
        "/dev/shm/descriptors-" + std::to_string(getpid());  // in memory, as it is slow on disks
    std::filesystem::create_directory(many);
    for (u32 i = 0; i <= MAX_DESCRIPTORS; i++) {
        std::filesystem::create_symlink("/dev/null", many / std::to_string(i));
    }
    std::filesystem::create_directory(top / "60");
    std::filesystem::create_directory_symlink(many, top / "60/fd");
    ASSERT_EQ(GuestsScan(root, &guests), FINE);
    EXPECT_EQ(guests.crowded, 60U);
    std::filesystem::remove_all(many);
}
