#include "report/rows/columns.h"

#include <cstring>
#include <iterator>

namespace report {
namespace {

constexpr Column kLead[] = {
    {"time", "", "moment of the record, taken after all ports were read", Kind::Text},
    {"host", "", "name of the host", Kind::Text},
    {"interval", "s", "span that the record covers, for the reader's eye", Kind::Number},
    {"iteration", "", "number of the record, from 0", Kind::Number},
    {"switch", "", "the virtual switch of the port", Kind::Text},
    {"name", "", "what is attached to the port: the VM, the host interface, or the physical NIC of an uplink",
     Kind::Text},
    {"id", "", "the port number, as -p and -l know it", Kind::Number},
};
constexpr Column kPorts[] = {
    {"mac", "", "MAC address, six octets of two lower-case hexadecimal digits", Kind::Text},
    {"rxmode", "", "receive mode of the port", Kind::Number},
    {"uplink", "", "\"true\" for an uplink, \"false\" for any other port", Kind::Text},
    {"txpps", "packets/s", "packets that the client sent", Kind::Number},
    {"txmbps", "Mbit/s", "bits that the client sent, in decimal millions", Kind::Number},
    {"txsize", "bytes", "mean size of a sent packet", Kind::Number},
    {"txeps", "errors/s", "transmit errors: packets of the client that were dropped", Kind::Number},
    {"rxpps", "packets/s", "packets that the client received", Kind::Number},
    {"rxmbps", "Mbit/s", "bits that the client received, in decimal millions", Kind::Number},
    {"rxsize", "bytes", "mean size of a received packet", Kind::Number},
    {"rxeps", "errors/s", "receive errors: packets for the client that were dropped", Kind::Number},
};
constexpr Column kVnic[] = {
    {"coalesce.scheme", "", "name of the coalescing scheme", Kind::Text},
    {"coalesce.params", "", "parameters of the scheme", Kind::Text},
    {"coalesce.tx.dyn", "", "whether the depth of transmit coalescing adapts itself", Kind::Number},
    {"coalesce.tx.depth", "", "depth of transmit coalescing", Kind::Number},
    {"coalesce.tx.split.hckcall", "%", "share of the split class \"hckcall\"", Kind::Number},
    {"coalesce.tx.split.oppor", "%", "share of the split class \"oppor\"", Kind::Number},
    {"coalesce.tx.split.to", "%", "share of the split class \"to\"", Kind::Number},
    {"coalesce.tx.split.hc", "%", "share of the split class \"hc\"", Kind::Number},
    {"coalesce.tx.split.hck", "%", "share of the split class \"hck\"", Kind::Number},
    {"coalesce.txcomp.dyn", "", "whether the depth of transmit completions adapts itself", Kind::Number},
    {"coalesce.txcomp.depth", "", "depth of transmit completions", Kind::Number},
    {"coalesce.rx.dyn", "", "whether the depth of receive coalescing adapts itself", Kind::Number},
    {"coalesce.rx.depth", "", "depth of receive coalescing", Kind::Number},
    {"coalesce.rx.intrreq", "1/s", "interrupts requested", Kind::Number},
    {"coalesce.rx.intrpost", "1/s", "interrupts posted", Kind::Number},
    {"txwdt.total", "1/s", "activations of the transmit worldlet, all classes", Kind::Number},
    {"txwdt.hckcall", "%", "share of the class \"hckcall\"", Kind::Number},
    {"txwdt.poll", "%", "share of the class \"poll\"", Kind::Number},
    {"txwdt.to", "%", "share of the class \"to\"", Kind::Number},
    {"txwdt.hc", "%", "share of the class \"hc\"", Kind::Number},
    {"txwdt.other", "%", "share of the class \"other\"", Kind::Number},
    {"vnic.type", "", "NIC model, \"parlan2\" or \"parlan3\"", Kind::Text},
    // parlan2, what it shares with parlan3 among it
    {"vnic.txcalls", "1/s", "transmit calls", Kind::Number},
    {"vnic.copypct", "%", "share of the base count that was copied", Kind::Number},
    {"vnic.maxpend", "", "largest number of pending transmits", Kind::Number},
    {"vnic.intr", "1/s", "interrupts", Kind::Number},
    {"vnic.qstop", "1/s; parlan2: count", "times that a transmit queue was stopped", Kind::Number},
    {"vnic.txeps", "errors/s", "transmit errors; parlan2: transmit overflows", Kind::Number},
    {"vnic.rxeps", "errors/s", "receive errors of all kinds", Kind::Number},
    {"vnic.txoflow", "1/s", "transmit overflows", Kind::Number},
    {"vnic.rxbuflow", "1/s", "receive buffer underflows", Kind::Number},
    {"vnic.ooslots", "1/s", "receive errors for want of slots", Kind::Number},
    {"vnic.rxoflow", "1/s", "receive overflows", Kind::Number},
    {"vnic.ring2err", "1/s", "errors of the second receive ring", Kind::Number},
    {"vnic.maxfrags", "1/s", "receive errors by the limit of fragments", Kind::Number},
    {"vnic.mapfail", "1/s", "receive errors by failed mappings", Kind::Number},
    // parlan3 alone
    {"vnic.ring1sz", "entries", "size of the first ring of receive queue 0", Kind::Number},
    {"vnic.ring2sz", "entries", "size of the second ring of receive queue 0", Kind::Number},
    {"vnic.tsopct", "%", "share of sent packets that used segmentation offload (TSO)", Kind::Number},
    {"vnic.tsotputpct", "%", "share of sent bytes that used segmentation offload", Kind::Number},
    {"vnic.txucastpct", "%", "share of sent packets that were unicast", Kind::Number},
    {"vnic.lropct", "%", "share of received packets that came by large receive offload (LRO)", Kind::Number},
    {"vnic.lrotputpct", "%", "share of received bytes that came by large receive offload", Kind::Number},
    {"vnic.rxucastpct", "%", "share of received packets that were unicast", Kind::Number},
    {"vnic.txdisc", "1/s", "transmits that were discarded", Kind::Number},
    {"vnic.txallocerr", "1/s", "allocation errors on transmit", Kind::Number},
    {"vnic.txtsosplit", "1/s", "TSO packets that were split", Kind::Number},
    {"vnic.r1full", "1/s", "times that the first receive ring was full", Kind::Number},
    {"vnic.r2full", "1/s", "times that the second receive ring was full", Kind::Number},
    {"vnic.sgerr", "1/s", "scatter-gather errors", Kind::Number},
};
constexpr Column kPhysnic[] = {
    {"physnic.devname", "", "NIC name, a point, and the device text of the NIC", Kind::Text},
    {"physnic.txpps", "packets/s", "packets sent on the link", Kind::Number},
    {"physnic.txmbps", "Mbit/s", "bits sent on the link, in decimal millions", Kind::Number},
    {"physnic.txsize", "bytes", "mean size of a sent packet", Kind::Number},
    {"physnic.txeps", "errors/s", "transmit errors of all seven kinds", Kind::Number},
    {"physnic.rxpps", "packets/s", "packets received from the link", Kind::Number},
    {"physnic.rxmbps", "Mbit/s", "bits received from the link, in decimal millions", Kind::Number},
    {"physnic.rxsize", "bytes", "mean size of a received packet", Kind::Number},
    {"physnic.rxeps", "errors/s", "receive errors of all eight kinds", Kind::Number},
};
constexpr Column kTxqueue[] = {
    {"txqueue.count", "queues", "transmit queues of the NIC, as of this record", Kind::Number},
    {"txqueue.queue", "", "number of the queue, from 0", Kind::Number},
    {"txqueue.pps", "packets/s", "packets of the queue", Kind::Number},
    {"txqueue.eps", "errors/s", "errors of the queue", Kind::Number},
    {"txqueue.qstops", "1/s", "times that the queue was stopped", Kind::Number},
    {"txqueue.active", "queues", "transmit queues with more than 100 packets/s", Kind::Number},
};
constexpr Column kRxqueue[] = {
    {"rxqueue.count", "queues", "receive queues of the NIC, as of this record", Kind::Number},
    {"rxqueue.queue", "", "number of the queue, from 0", Kind::Number},
    {"rxqueue.details", "", "numbers of the ports that the queue's filters serve, blanks between them", Kind::Text},
    {"rxqueue.active", "queues", "receive queues with at least one filter", Kind::Number},
    {"rxqueue.filters", "filters", "filters of all queues but queue 0", Kind::Number},
    {"rxqueue.ports", "filters", "filters of all queues", Kind::Number},
};
constexpr Column kIntr[] = {
    {"intr.count", "1/s", "interrupts of all vectors that bear the NIC's name, on all pcpus", Kind::Number},
    {"intr.used", "% of a pcpu", "time that those interrupts took", Kind::Number},
};
constexpr Column kVcpu[] = {
    {"vcpu.id", "", "id of the vcpu", Kind::Id},
    {"vcpu.used", "% of the time", "time that the vcpu ran", Kind::Number},
    {"vcpu.ready", "% of the time", "time that it was ready and waited for a pcpu", Kind::Number},
    {"vcpu.cstp", "% of the time", "time that it was co-stopped", Kind::Number},
    {"vcpu.actnot", "1/s", "the kernel's event count actNot", Kind::Number},
    {"vcpu.migtot", "1/s", "migrations", Kind::Number},
    {"vcpu.migl3", "1/s", "L3 migrations, as the kernel counts them", Kind::Number},
};
constexpr Column kWdt[] = {
    {"wdt.used", "% of the time", "time that the worldlet ran", Kind::Number},
    {"wdt.ready", "% of the time", "time that it was ready and waited for a pcpu", Kind::Number},
    {"wdt.wait", "% of the time", "time that it waited", Kind::Number},
    {"wdt.runct", "1/s", "runs", Kind::Number},
    {"wdt.remoteactct", "1/s", "remote activations", Kind::Number},
    {"wdt.migct", "1/s", "migrations", Kind::Number},
    {"wdt.overrunct", "1/s", "overruns", Kind::Number},
    {"wdt.afftype", "", "what the worldlet is bound to: \"vcpu\", another worldlet (\"wdt\") or a \"pcpu\"",
     Kind::Text},
    {"wdt.affval", "", "the id of that vcpu or worldlet, or the number of that pcpu", Kind::Number},
    {"wdt.name", "", "name of the worldlet", Kind::Text},
};
constexpr Column kPcpu[] = {
    {"cpu.topology.core", "pcpus", "physical CPUs of a core", Kind::Number},
    {"cpu.topology.llc", "", "last-level-cache figure of physical CPU 0", Kind::Number},
    {"cpu.topology.package", "pcpus", "physical CPUs of a package", Kind::Number},
    {"cpu.pcpu", "", "number of the physical CPU, from 0; \"sum\" for the sum of all", Kind::Text},
    {"cpu.used", "% of a pcpu", "time in which the physical CPU was busy", Kind::Number},
    {"cpu.wdt", "% of a pcpu", "time that the physical CPU spent in worldlets", Kind::Number},
};
constexpr Column kHistograms[] = {
    {"vcpu.id", "", "the vcpu, for histograms of vcpus", Kind::Id},
    {"histos.name", "", "which histogram", Kind::Text},
    {"histos.min", "of the kernel", "smallest sample since the reset", Kind::Number},
    {"histos.max", "of the kernel", "largest sample since the reset", Kind::Number},
    {"histos.mean", "of the kernel; vcpus: microseconds",
     "mean of the samples since the reset, or mean length of a period", Kind::Number},
    {"histos.count", "samples/s; vcpus: periods", "samples since the reset, or periods in the interval", Kind::Number},
    {"histos.limit", "of the kernel",
     "upper limit of the bucket; the last one is the limit before it plus 1 and stands for all larger samples",
     Kind::Number},
    {"histos.value", "%; vcpus: periods", "share of the samples, or periods, in the bucket", Kind::Number},
};
constexpr Column kHoststack[] = {
    {"ipv4.txpps", "packets/s", "packets sent", Kind::Number},
    {"ipv4.txeps", "errors/s", "transmit errors", Kind::Number},
    {"ipv4.txfrags", "1/s", "fragments sent", Kind::Number},
    {"ipv4.rxpps", "packets/s", "packets received", Kind::Number},
    {"ipv4.rxdeliv", "packets/s", "packets delivered upward", Kind::Number},
    {"ipv4.rxeps", "errors/s", "receive errors", Kind::Number},
    {"ipv4.rxreass", "packets/s", "packets reassembled", Kind::Number},
    {"ipv6.txpps", "packets/s", "packets sent", Kind::Number},
    {"ipv6.txeps", "errors/s", "transmit errors", Kind::Number},
    {"ipv6.txfrags", "1/s", "fragments sent", Kind::Number},
    {"ipv6.rxpps", "packets/s", "packets received", Kind::Number},
    {"ipv6.rxdeliv", "packets/s", "packets delivered upward", Kind::Number},
    {"ipv6.rxeps", "errors/s", "receive errors", Kind::Number},
    {"ipv6.rxreass", "packets/s", "packets reassembled", Kind::Number},
    {"tcptx.pps", "segments/s", "segments sent, of all kinds", Kind::Number},
    {"tcptx.datapct", "%", "share of segments that carried data", Kind::Number},
    {"tcptx.mbps", "Mbit/s", "data bits sent, in decimal millions", Kind::Number},
    {"tcptx.size", "bytes", "mean data bytes of a segment", Kind::Number},
    {"tcptx.delackpct", "%", "delayed acknowledgements as a share of pure acknowledgements", Kind::Number},
    {"tcptx.rexmit", "segments/s", "segments retransmitted", Kind::Number},
    {"tcptx.sackrexmit", "segments/s", "segments retransmitted through selective acknowledgement", Kind::Number},
    {"tcptx.winprb", "1/s", "window probes sent", Kind::Number},
    {"tcptx.winupd", "1/s", "window updates sent", Kind::Number},
    {"tcprx.pps", "segments/s", "segments received, of all kinds", Kind::Number},
    {"tcprx.datapct", "%", "share of segments that carried data", Kind::Number},
    {"tcprx.mbps", "Mbit/s", "data bits received, in decimal millions", Kind::Number},
    {"tcprx.size", "bytes", "mean data bytes of a segment", Kind::Number},
    {"tcprx.dups", "segments/s", "duplicate segments", Kind::Number},
    {"tcprx.oo", "segments/s", "segments out of order", Kind::Number},
    {"tcprx.winprb", "1/s", "window probes received", Kind::Number},
    {"tcprx.winupd", "1/s", "window updates received", Kind::Number},
    {"tcprx.othereps", "errors/s", "receive errors of all six kinds", Kind::Number},
    {"udp.txpps", "datagrams/s", "datagrams sent", Kind::Number},
    {"udp.rxpps", "datagrams/s", "datagrams received", Kind::Number},
    {"udp.rxsockeps", "datagrams/s", "datagrams lost at the socket", Kind::Number},
    {"udp.rxothereps", "errors/s", "receive errors of all five other kinds", Kind::Number},
};
constexpr Column kOverhead[] = {
    {"overhead.used", "% of a pcpu", "time that lan-meter itself ran, reading and printing included", Kind::Number},
};

struct Table {
    const char *name;
    bool hasPorts;
    std::span<const Column> columns;
};

// In the order of Section.
constexpr Table kTables[kSections] = {
    {"ports", true, kPorts},         {"vnic", true, kVnic},
    {"physnic", true, kPhysnic},     {"txqueue", true, kTxqueue},
    {"rxqueue", true, kRxqueue},     {"intr", true, kIntr},
    {"vcpu", true, kVcpu},           {"wdt", true, kWdt},
    {"pcpu", false, kPcpu},          {"histograms", true, kHistograms},
    {"hoststack", true, kHoststack}, {"overhead", false, kOverhead},
};
static_assert(std::size(kVnic) <= kMostColumns && std::size(kHoststack) <= kMostColumns);  // the widest

const Table &TableOf(Section section) {
    return kTables[static_cast<size_t>(section)];
}

}  // namespace

std::string_view SectionName(Section section) {
    return TableOf(section).name;
}

bool SectionFind(std::string_view name, Section *section) {
    for (size_t i = 0; i < kSections; i++) {
        if (name == kTables[i].name) {
            *section = static_cast<Section>(i);
            return true;
        }
    }
    return false;
}

bool SectionHasPorts(Section section) {
    return TableOf(section).hasPorts;
}

std::span<const Column> LeadColumns(Section section) {
    return std::span(kLead).first(TableOf(section).hasPorts ? kLeads : static_cast<size_t>(Lead::Switch));
}

std::span<const Column> SectionColumns(Section section) {
    return TableOf(section).columns;
}

int ColumnFind(Section section, std::string_view key) {
    std::span<const Column> columns = SectionColumns(section);
    for (size_t i = 0; i < columns.size(); i++) {
        if (key == columns[i].key) {
            return static_cast<int>(i);
        }
    }
    return -1;
}

int ColumnGuess(Section section, std::string_view key) {
    int found = ColumnFind(section, key);
    if (found >= 0) {
        return found;
    }
    std::span<const Column> columns = SectionColumns(section);
    for (size_t i = 0; i < columns.size(); i++) {
        const char *point = strrchr(columns[i].key, '.');
        if (point != nullptr && key == point + 1) {
            if (found >= 0) {
                return -1;
            }
            found = static_cast<int>(i);
        }
    }
    return found;
}

}  // namespace report
