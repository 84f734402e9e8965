#include "corekit/telling/keys.h"

#include <iterator>

namespace {

constexpr char PROGRAM[] = "of the program itself";
constexpr char OFFLOAD[] =
    "packets as they are handed over: where segmentation is offloaded, one stands for many on the "
    "wire; on a NIC that is no virtual one, those of the wire";
constexpr char DROPS[] = "dropped packets and errors of the interface";
constexpr char STACK[] = "/proc/net/snmp of the network namespace";
constexpr char STACK6[] = "/proc/net/snmp6 of the network namespace";
constexpr char SOCKETS[] = "sum over the TCP sockets, those that ended since the start too";
constexpr char SOCKETS_HEARD[] =
    "sum over the TCP sockets, those that ended since the start too; the end of a connection counts as one byte";

}  // namespace

// clang-format off
const KeyRow KEY_ROWS[] = {
    {"sysinfo.hostname", EXACT, "gethostname"},
    {"time", EXACT, PROGRAM},
    {"interval", EXACT, PROGRAM},
    {"iteration", EXACT, PROGRAM},
    {"cpu.topology.core", EXACT, "CPUs, those that are off too, by cores of those that are on"},
    {"cpu.topology.llc", EXACT, "CPUs that share the last-level cache of CPU 0; 0 when the kernel does not tell"},
    {"cpu.topology.package", EXACT, "as \"core\""},
    {"cpu.used", EXACT, "/proc/stat, all but idle and iowait; grain 10 ms, so 1 % of a second",
     FEATURE_CPU_TIMES},
    {"cpu.wdt", CLOSE, "irq and softirq of /proc/stat: what the kernel does for interrupts; most kernels sample it by the "
                       "tick and miss short bursts", FEATURE_CPU_TIMES},
    {"ports.name", EXACT, "name of the guest (-name of its command line) that holds the tap; else of the interface",
     FEATURE_TAP_HOLDERS, CLOSE},
    {"ports.switch", EXACT, "bridge, or the interface below a macvtap or macvlan; a stand-in for interfaces on none"},
    {"ports.id", EXACT, "interface index"},
    {"ports.mac", CLOSE, "of the interface; of a guest behind a tap what its command line says, or what the bridge learned, "
                         "which ages out after 300 s of silence; else zeros"},
    {"ports.rxmode", EXACT, "as set on the interface: 1 promiscuous, 2 all multicast; not what a sniffer or a bridge asks for"},
    {"ports.uplink", EXACT, "an interface with a device behind it"},
    {"ports.txpps", CLOSE, OFFLOAD},
    {"ports.txmbps", EXACT, "bytes of the interface, from its client's side"},
    {"ports.txsize", CLOSE, "of packets as they are handed over"},
    {"ports.txeps", EXACT, DROPS},
    {"ports.rxpps", CLOSE, OFFLOAD},
    {"ports.rxmbps", EXACT, "bytes of the interface, from its client's side"},
    {"ports.rxsize", CLOSE, "of packets as they are handed over"},
    {"ports.rxeps", EXACT, DROPS},
    {"ports.coalesce.*", ABSENT, "a tap has none, and that of virtio lies inside the guest"},
    {"ports.txwdt.*", ABSENT, "a vhost worker does not count why it woke"},
    {"ports.vnic.*", ABSENT, "virtio is neither of the two models, and its own counters lie inside the guest"},
    {"ports.physnic.devname", EXACT, "interface, driver and bus address"},
    {"ports.physnic.txpps", EXACT, "packets of the NIC", FEATURE_WIRE_PACKETS, CLOSE},
    {"ports.physnic.txmbps", EXACT, "bytes of the NIC"},
    {"ports.physnic.txsize", EXACT, "bytes by packets", FEATURE_WIRE_PACKETS, CLOSE},
    {"ports.physnic.txeps", EXACT, "tx_errors and tx_dropped, as far as the driver counts"},
    {"ports.physnic.rxpps", EXACT, "packets of the NIC", FEATURE_WIRE_PACKETS, CLOSE},
    {"ports.physnic.rxmbps", EXACT, "bytes of the NIC"},
    {"ports.physnic.rxsize", EXACT, "bytes by packets", FEATURE_WIRE_PACKETS, CLOSE},
    {"ports.physnic.rxeps", EXACT, "rx_errors, rx_dropped and rx_missed, as far as the driver counts"},
    {"ports.txqueue.count", EXACT, "queues of the NIC; 0 when it has several and nobody counts them one by one", FEATURE_QUEUES, CLOSE},
    {"ports.txqueue.details.pps", EXACT, "packets that the driver counts of the queue; those of the NIC where it has but one",
     FEATURE_QUEUE_COUNTERS, CLOSE},
    {"ports.txqueue.details.eps", EXACT, "drops that the driver counts of the queue; drops and errors of the NIC where it has but one; "
     "drops of its queue discipline, which is close", FEATURE_QUEUE_ERRORS},
    {"ports.txqueue.details.qstops", EXACT, "where the driver tells the kernel, from 6.10 on, how often it stopped each queue",
     FEATURE_QUEUE_STOPS},
    {"ports.txqueue.active", EXACT, "by \"pps\"", FEATURE_QUEUE_COUNTERS, CLOSE},
    {"ports.rxqueue.count", EXACT, "queues of the NIC", FEATURE_QUEUES, CLOSE},
    {"ports.rxqueue.details", ZERO, "empty lists: no filter of a NIC serves a port of a bridge"},
    {"ports.rxqueue.active", ZERO, "no filters"},
    {"ports.rxqueue.filters", ZERO, "no filters"},
    {"ports.rxqueue.ports", ZERO, "no filters"},
    {"ports.intr.count", EXACT, "interrupts of the NIC's vectors; those of a device with several NICs are told apart by the "
     "names of their handlers, if they can be", FEATURE_INTERRUPTS, ABSENT},
    {"ports.intr.used", EXACT, "time in their handlers; what those leave to softirqs is in \"wdt\" of the CPUs",
     FEATURE_INTERRUPTS, ABSENT},
    {"ports.ipv4.txpps", EXACT, STACK},
    {"ports.ipv4.txeps", EXACT, "OutDiscards and OutNoRoutes"},
    {"ports.ipv4.txfrags", EXACT, STACK},
    {"ports.ipv4.rxpps", EXACT, STACK},
    {"ports.ipv4.rxdeliv", EXACT, STACK},
    {"ports.ipv4.rxeps", EXACT, "errors of headers, addresses and protocols, discards"},
    {"ports.ipv4.rxreass", EXACT, STACK},
    {"ports.ipv6.txpps", EXACT, STACK6, FEATURE_IPV6, ZERO},
    {"ports.ipv6.txeps", EXACT, "OutDiscards and OutNoRoutes", FEATURE_IPV6, ZERO},
    {"ports.ipv6.txfrags", EXACT, STACK6, FEATURE_IPV6, ZERO},
    {"ports.ipv6.rxpps", EXACT, STACK6, FEATURE_IPV6, ZERO},
    {"ports.ipv6.rxdeliv", EXACT, STACK6, FEATURE_IPV6, ZERO},
    {"ports.ipv6.rxeps", EXACT, "errors of headers, addresses and protocols, discards", FEATURE_IPV6, ZERO},
    {"ports.ipv6.rxreass", EXACT, STACK6, FEATURE_IPV6, ZERO},
    {"ports.tcptx.pps", EXACT, "OutSegs and RetransSegs"},
    {"ports.tcptx.datapct", CLOSE, "TCPOrigDataSent and RetransSegs; the end of a connection counts as data"},
    {"ports.tcptx.mbps", EXACT, SOCKETS, FEATURE_TCP_SOCKETS},
    {"ports.tcptx.size", EXACT, SOCKETS, FEATURE_TCP_SOCKETS},
    {"ports.tcptx.delackpct", CLOSE, "acknowledgements alone are taken as segments without data, SYN and FIN too"},
    {"ports.tcptx.rexmit", EXACT, "RetransSegs"},
    {"ports.tcptx.sackrexmit", CLOSE, "TCPFastRetrans: fast retransmissions, by whatever they were found"},
    {"ports.tcptx.winprb", EXACT, "TCPWinProbe"},
    {"ports.tcptx.winupd", UNMEASURED, "the kernel does not count them"},
    {"ports.tcprx.pps", EXACT, "InSegs"},
    {"ports.tcprx.datapct", EXACT, SOCKETS, FEATURE_TCP_SOCKETS},
    {"ports.tcprx.mbps", CLOSE, SOCKETS_HEARD, FEATURE_TCP_SOCKETS},
    {"ports.tcprx.size", CLOSE, SOCKETS_HEARD, FEATURE_TCP_SOCKETS},
    {"ports.tcprx.dups", CLOSE, "DelayedACKLost: segments whose data had come before"},
    {"ports.tcprx.oo", EXACT, "TCPOFOQueue"},
    {"ports.tcprx.winprb", UNMEASURED, "the kernel does not count them"},
    {"ports.tcprx.winupd", UNMEASURED, "the kernel does not count them"},
    {"ports.tcprx.othereps", CLOSE, "InErrs and the drops that TcpExt tells"},
    {"ports.udp.txpps", EXACT, "OutDatagrams of IPv4 and IPv6"},
    {"ports.udp.rxpps", CLOSE, "InDatagrams: what programs have read, not what has come"},
    {"ports.udp.rxsockeps", EXACT, "datagrams for which a socket had no room"},
    {"ports.udp.rxothereps", EXACT, "NoPorts and the other errors"},
    {"ports.wdt.used", EXACT, "schedstat of the thread; up to a tick old while it runs", FEATURE_SCHEDSTAT, ABSENT},
    {"ports.wdt.ready", EXACT, "schedstat of the thread", FEATURE_SCHEDSTAT, ABSENT},
    {"ports.wdt.wait", CLOSE, "time since the thread's start less used and ready", FEATURE_SCHEDSTAT, ABSENT},
    {"ports.wdt.runct", EXACT, "schedstat of the thread", FEATURE_SCHEDSTAT, ABSENT},
    {"ports.wdt.remoteactct", EXACT, "wake-ups by another CPU", FEATURE_REMOTE_WAKEUPS},
    {"ports.wdt.migct", EXACT, "migrations of the thread", FEATURE_MIGRATIONS},
    {"ports.wdt.overrunct", UNMEASURED, "Linux has no such thing to count"},
    {"ports.wdt.afftype", EXACT, "always \"pcpu\""},
    {"ports.wdt.affval", EXACT, "the CPU that the thread is bound to, as of the last 10 s; -1 when it may run on several"},
    {"ports.wdt.name", EXACT, "a vhost worker (NetWdt-Async-PID-vhost-TID), or the kernel's own name of a NIC's thread"},
    {"ports.vcpu.id", EXACT, "thread", FEATURE_TAP_HOLDERS, ABSENT},
    {"ports.vcpu.used", EXACT, "schedstat of the thread; up to a tick old while it runs", FEATURE_SCHEDSTAT, ABSENT},
    {"ports.vcpu.ready", EXACT, "schedstat of the thread", FEATURE_SCHEDSTAT, ABSENT},
    {"ports.vcpu.cstp", ZERO, "Linux schedules each vcpu for itself"},
    {"ports.vcpu.actnot", UNMEASURED, "an event of another kernel"},
    {"ports.vcpu.migtot", EXACT, "migrations of the thread", FEATURE_MIGRATIONS},
    {"ports.vcpu.migl3", EXACT, "migrations between last-level caches; none where there is but one",
     FEATURE_CACHE_MOVES},
    {"ports.vcpu.histos.*", EXACT, "by the scheduler's switches of the thread; no periods of \"cstp\", as Linux schedules "
     "each vcpu for itself", FEATURE_VCPU_HISTOS, ABSENT},
    {"ports.histos.*", CLOSE, "bytes and microseconds of packets as they are handed over, input from the port's client; "
     "Linux has no clusters: no samples of them", FEATURE_PORT_HISTOS, ABSENT},
    {"overhead.used", EXACT, "clock of the process"},
};
// clang-format on
const size_t KEY_ROW_COUNT = std::size(KEY_ROWS);

const char *WorthText(Worth worth) {
    constexpr const char *TEXTS[] = {"exact", "close", "zero", "not measured", "never there"};
    return TEXTS[worth];
}

std::string KeySection(const KeyRow &row) {
    std::string_view path = row.path;
    size_t point = path.rfind('.');
    std::string section(path.substr(0, point == std::string_view::npos ? 0 : point));
    for (const char *part : {".topology", ".details"}) {  // of one object each, no sections of their own
        if (section.ends_with(part)) {
            section.resize(section.size() - std::string_view(part).size());
        }
    }
    return section;
}

const KeyRow *KeyFind(std::string_view path) {
    for (const KeyRow &row : KEY_ROWS) {
        std::string_view covered = row.path;
        bool all = covered.ends_with(".*");
        covered.remove_suffix(all ? 1 : 0);
        if (all ? path.starts_with(covered) : path == covered) {
            return &row;
        }
    }
    return nullptr;
}
