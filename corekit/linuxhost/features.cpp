#include "corekit/linuxhost/features.h"

#include "corekit/linuxhost/proc/cpu.h"

#include <algorithm>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <linux/genetlink.h>
#include <linux/if_link.h>
#include <linux/netlink.h>
#include <linux/perf_event.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

constexpr u32 LIMIT = 65536;
constexpr char NETDEV_FAMILY[] = "netdev";
constexpr u32 NETDEV_QUEUE_GET = 10;   // 6.8
constexpr u32 NETDEV_QSTATS_GET = 12;  // 6.9

Answer OfOutcome(Outcome outcome) {
    return outcome == FINE                               ? ANSWER_YES
           : outcome == REFUSED                          ? ANSWER_NOT_ALLOWED
           : outcome == BROKEN || outcome == INTERRUPTED ? ANSWER_CANT_TELL
                                                         : ANSWER_NO;
}

struct Text {
    ProcBuffer buffer{};
    std::string_view text{};
    Outcome outcome;
    Text(const ProcRoot &root, const char *path) { outcome = ProcReadOnce(root.proc, path, LIMIT, &buffer, &text); }
};

// Processes that hidepid hides look as if they did not exist; the first one always does.
Answer AskProcesses(const ProcRoot &root) {
    bool any = Text(root, "self/comm").outcome == FINE;
    Outcome first = Text(root, "1/comm").outcome;
    return first == FINE ? ANSWER_YES : any ? ANSWER_NOT_ALLOWED : ANSWER_NO;
}

// Asked of processes of other users; where there are none, nobody is refused. The first process of all may be guarded
// better than the rest.
Answer AskTapHolders(const ProcRoot &root) {
    if (Answer seen = AskProcesses(root); seen != ANSWER_YES) {
        return seen;
    }
    Answer answer = ANSWER_YES;
    int descriptor = openat(root.proc, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    DIR *processes = descriptor >= 0 ? fdopendir(descriptor) : nullptr;
    while (const dirent *entry = processes != nullptr ? readdir(processes) : nullptr) {
        u64 pid = 0;
        struct stat owner = {};
        if (!ProcNumber(entry->d_name, &pid) || fstatat(root.proc, entry->d_name, &owner, 0) != 0 ||
            owner.st_uid == geteuid()) {
            continue;
        }
        if (fstatat(root.proc, (std::string(entry->d_name) + "/ns/net").c_str(), &owner, 0) == 0) {
            answer = ANSWER_YES;
            break;
        }
        answer = errno == EACCES || errno == EPERM ? ANSWER_NOT_ALLOWED : answer;
    }
    if (processes != nullptr) {
        closedir(processes);
    }
    return answer;
}

// A kernel that does not account shows three zeros. We have run at least once, though a young thread's time may be 0.
Answer AskSchedstat(const ProcRoot &root) {
    Text file(root, "thread-self/schedstat");
    bool counted = file.text.find_first_of("123456789") != std::string_view::npos;
    return AskProcesses(root) == ANSWER_NO    ? ANSWER_CANT_TELL
           : file.outcome == FINE && !counted ? ANSWER_NO
                                              : OfOutcome(file.outcome);
}

Answer AskPerf(const ProcRoot &) {
    perf_event_attr attributes = {};
    attributes.size = sizeof attributes;
    attributes.type = PERF_TYPE_SOFTWARE;
    attributes.config = PERF_COUNT_SW_CPU_MIGRATIONS;
    long descriptor = syscall(SYS_perf_event_open, &attributes, 1, -1, -1, PERF_FLAG_FD_CLOEXEC);
    int error = descriptor < 0 ? errno : 0;
    if (descriptor >= 0) {
        close(static_cast<int>(descriptor));
    }
    return error == ESRCH ? ANSWER_CANT_TELL : OfOutcome(ErrnoOutcome(error));
}

// In text, else by an event.
Answer AskMigrations(const ProcRoot &root) {
    Text file(root, "thread-self/sched");
    return file.text.find("nr_migrations") != std::string_view::npos ? ANSWER_YES : AskPerf(root);
}

Answer AskRemoteWakeups(const ProcRoot &root) {
    Text file(root, "sys/kernel/sched_schedstats");
    return file.outcome == FINE && file.text.substr(0, 1) == "1" ? ANSWER_YES : ANSWER_NO;
}

// CPUs that are off tell of no cache.
Answer AskOneCache(const ProcRoot &root) {
    Cpus cpus;
    u32 first = NO_CPU;
    bool one = true;
    if (CpusOpen(&cpus, root) == FINE) {
        for (u32 cache : cpus.topology.lastCache) {
            one = one && (cache == NO_CPU || first == NO_CPU || cache == first);
            first = cache != NO_CPU ? cache : first;
        }
    }
    CpusClose(&cpus);
    return first == NO_CPU ? ANSWER_CANT_TELL : one ? ANSWER_YES : ANSWER_NO;
}

// A request of one question, and the answer to it. The kernel answers before send returns.
struct Question {
    alignas(nlmsghdr) char request[256] = {};
    alignas(nlmsghdr) char reply[16384] = {};

    nlmsghdr *Header() { return reinterpret_cast<nlmsghdr *>(request); }
    void Append(const void *data, size_t size) {
        memcpy(request + Header()->nlmsg_len, data, size);
        Header()->nlmsg_len += static_cast<u32>(NLMSG_ALIGN(size));
    }
    Question(u16 type, const void *head, size_t size) {
        *Header() = {NLMSG_HDRLEN, type, NLM_F_REQUEST, 1, 0};
        Append(head, size);
    }
    // The bytes of the reply, its header first; or what it says instead.
    Outcome Ask(int protocol, std::string_view *answer) {
        int descriptor = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, protocol);
        if (descriptor < 0) {
            return ErrnoOutcome(errno);
        }
        sockaddr_nl kernel = {};
        kernel.nl_family = AF_NETLINK;
        ssize_t got = sendto(descriptor, request, Header()->nlmsg_len, 0, reinterpret_cast<sockaddr *>(&kernel),
                             sizeof kernel) < 0
                          ? -1
                          : recv(descriptor, reply, sizeof reply, MSG_DONTWAIT);
        int error = got < 0 ? errno : 0;
        close(descriptor);
        auto *header = reinterpret_cast<nlmsghdr *>(reply);
        if (error == 0 && (static_cast<size_t>(got) < sizeof *header || header->nlmsg_len > static_cast<size_t>(got) ||
                           header->nlmsg_len < NLMSG_HDRLEN)) {
            error = EIO;
        }
        if (error == 0 && header->nlmsg_type == NLMSG_ERROR) {
            int code = 0;
            if (header->nlmsg_len >= NLMSG_HDRLEN + sizeof code) {
                memcpy(&code, reply + NLMSG_HDRLEN, sizeof code);
            }
            error = code < 0 ? -code : EIO;
        }
        *answer = error == 0 ? std::string_view(reply, header->nlmsg_len) : std::string_view();
        return ErrnoOutcome(error);
    }
};

// Of the first interface, which is lo in each namespace.
Answer AskLinkCounters(const ProcRoot &) {
    if_stats_msg message = {};
    message.ifindex = 1;
    message.filter_mask = IFLA_STATS_FILTER_BIT(IFLA_STATS_LINK_64);
    std::string_view answer;
    return OfOutcome(Question(RTM_GETSTATS, &message, sizeof message).Ask(NETLINK_ROUTE, &answer));
}

struct Attribute {
    u32 type = 0;
    std::string_view payload{};
};

bool TakeAttribute(std::string_view *rest, Attribute *attribute) {
    nlattr head = {};
    if (rest->size() < sizeof head) {
        return false;
    }
    memcpy(&head, rest->data(), sizeof head);
    if (head.nla_len < NLA_HDRLEN || head.nla_len > rest->size()) {
        return false;
    }
    *attribute = {head.nla_type & static_cast<u32>(NLA_TYPE_MASK),
                  rest->substr(NLA_HDRLEN, head.nla_len - static_cast<size_t>(NLA_HDRLEN))};
    rest->remove_prefix(std::min(rest->size(), static_cast<size_t>(NLA_ALIGN(head.nla_len))));
    return true;
}

// The family lists its operations.
Answer AskOperation(u32 operation) {
    genlmsghdr message = {CTRL_CMD_GETFAMILY, 1, 0};
    nlattr name = {NLA_HDRLEN + sizeof NETDEV_FAMILY, CTRL_ATTR_FAMILY_NAME};
    Question question(GENL_ID_CTRL, &message, sizeof message);
    question.Append(&name, sizeof name);
    question.Append(NETDEV_FAMILY, sizeof NETDEV_FAMILY);
    std::string_view answer;
    Outcome outcome = question.Ask(NETLINK_GENERIC, &answer);
    if (outcome != FINE) {
        return OfOutcome(outcome);
    }
    answer.remove_prefix(std::min(answer.size(), size_t{NLMSG_HDRLEN + GENL_HDRLEN}));
    Attribute attribute;
    while (TakeAttribute(&answer, &attribute)) {
        Attribute entry;
        while (attribute.type == CTRL_ATTR_OPS && TakeAttribute(&attribute.payload, &entry)) {
            Attribute field;
            u32 id = 0;
            while (TakeAttribute(&entry.payload, &field)) {
                if (field.type == CTRL_ATTR_OP_ID && field.payload.size() == sizeof id) {
                    memcpy(&id, field.payload.data(), sizeof id);
                }
            }
            if (id == operation) {
                return ANSWER_YES;
            }
        }
    }
    return ANSWER_NO;
}

Answer AskQueues(const ProcRoot &) {
    return AskOperation(NETDEV_QUEUE_GET);
}

Answer AskQueueCounters(const ProcRoot &) {
    return AskOperation(NETDEV_QSTATS_GET);
}

// A question would make the kernel load a module, so this looks only whether it is there already.
Answer AskTcpSockets(const ProcRoot &root) {
    int descriptor = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_SOCK_DIAG);
    if (descriptor < 0) {
        return OfOutcome(ErrnoOutcome(errno));
    }
    close(descriptor);
    return faccessat(root.sys, "module/tcp_diag", F_OK, 0) == 0 ? ANSWER_YES : ANSWER_CANT_TELL;
}

Answer AskIpv6(const ProcRoot &root) {
    return OfOutcome(Text(root, "net/snmp6").outcome);
}

// clang-format off
constexpr Feature TABLE[] = {
    {"processes of other users", "", AskProcesses,
     "guests and threads of this user alone",
     "root, or /proc mounted without hidepid"},
    {"holders of taps", "", AskTapHolders,
     "guests of this user alone; other taps are plain ports with the name of the interface, without vcpus",
     "root, or CAP_SYS_PTRACE and CAP_DAC_READ_SEARCH"},
    {"times of threads", "", AskSchedstat,
     "no vcpus and no worldlets",
     "a kernel with CONFIG_SCHED_INFO"},
    {"migrations of threads", "", AskMigrations,
     "0, which nobody measured",
     "a kernel that has /proc/PID/sched, or what allows perf events"},
    {"migrations by perf event", "", AskPerf,
     "migrations from /proc/PID/task/TID/sched, which takes about 10 us more a thread",
     "root, CAP_PERFMON and CAP_SYS_PTRACE, or for guests of this user kernel.perf_event_paranoid=1"},
    {"remote wake-ups", "", AskRemoteWakeups,
     "0, which nobody measured",
     "sysctl kernel.sched_schedstats=1, on a kernel with CONFIG_SCHEDSTATS"},
    {"one last-level cache", "", AskOneCache,
     "migrations between caches only of vcpus that are bound inside one",
     "vcpus bound to the CPUs of one last-level cache"},
    {"link counters alone", "4.7", AskLinkCounters,
     "no counters of interfaces, and so no port that can be watched",
     "a newer kernel"},
    {"queues of NICs", "6.8", AskQueues,
     "the count of channels that the driver tells",
     "a newer kernel"},
    {"counters of queues", "6.9", AskQueueCounters,
     "counters of the NIC's queue disciplines, or of the NIC where it has one queue",
     "a newer kernel, and a driver that keeps them"},
    {"TCP sockets", "4.19", AskTcpSockets,
     "no counts of TCP bytes and of received data segments",
     "a kernel with CONFIG_INET_DIAG; the module tcp_diag is loaded when a report first needs it"},
    {"IPv6 counters", "", AskIpv6,
     "0",
     "IPv6"},
};
// clang-format on
static_assert(sizeof TABLE / sizeof *TABLE == FEATURES);

constexpr int UNASKED = -1;
struct Answers {
    int known[FEATURES];
    Answers() { std::fill(std::begin(known), std::end(known), UNASKED); }
} answers;

}  // namespace

const Feature &FeatureOf(FeatureId id) {
    return TABLE[id];
}

Answer FeatureAsk(const ProcRoot &root, FeatureId id) {
    if (answers.known[id] == UNASKED) {
        answers.known[id] = TABLE[id].ask(root);
    }
    return static_cast<Answer>(answers.known[id]);
}

void FeatureForce(FeatureId id, Answer answer) {
    answers.known[id] = answer;
}

const char *AnswerText(Answer answer) {
    constexpr const char *TEXTS[] = {"no", "yes", "not allowed", "can't tell"};
    return TEXTS[answer];
}
