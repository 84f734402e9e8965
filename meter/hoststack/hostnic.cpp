#include "meter/hoststack/hostnic.h"

#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/number.h"

#include <type_traits>

namespace {

constexpr u32 KNF_NODE_IPV4_STATS = 32;
constexpr u32 KNF_NODE_TCP_STATS = 33;
constexpr u32 KNF_NODE_UDP_STATS = 34;
constexpr u32 KNF_NODE_IPV6_STATS = 37;

HostNicStats *hostNicForStats = nullptr;  // null until the first reference
i32 hostNicRefCnt = 0;

// One read and one report out of many ports. All ports read before any reports, so the resets can't overtake.
bool resetUpdated = false;  // the first pass was read; cleared by a report
bool updated = false;       // this iteration was read; cleared by a report
bool printed = false;       // this iteration was reported; cleared by a read

template <typename Record>
KnfStatus ReadStack(u32 node, Record *record, const char *label) {
    KnfStatus status = NodeGet(node, nullptr, record);
    if (status != 0) {
        LogStatus(0, status, "hostnic stats read error (node:%s)\n", label);
    }
    return status;
}

KnfStatus ReadAll(HostNicStats *stats, bool first) {
    KnfStatus status = ReadStack(KNF_NODE_IPV4_STATS, first ? &stats->ipv4Prev : &stats->ipv4Curr, "IPv4 Stats");
    if (status == 0) {
        status = ReadStack(KNF_NODE_IPV6_STATS, first ? &stats->ipv6Prev : &stats->ipv6Curr, "IPv6 Stats");
    }
    if (status == 0) {
        status = ReadStack(KNF_NODE_TCP_STATS, first ? &stats->tcpPrev : &stats->tcpCurr, "TCP Stats");
    }
    if (status == 0) {
        status = ReadStack(KNF_NODE_UDP_STATS, first ? &stats->udpPrev : &stats->udpCurr, "UDP Stats");
    }
    return status;
}

// Both versions report the same figures from records of their own.
template <typename IpStats>
void PrintIp(const IpStats &c, const IpStats &p, f32 elapsed, ReportBuf *report) {
    constexpr bool V4 = std::is_same_v<IpStats, Ipv4Stats>;
    ReportPrintf(report,
                 V4 ? ",\n  \"ipv4\": { \"txpps\": %.0f, \"txeps\": %.0f, \"txfrags\": %.0f, \"rxpps\": %.0f, "
                      "\"rxdeliv\": %.0f, \"rxeps\": %.0f, \"rxreass\": %.0f }"
                    : ",\n  \"ipv6\": { \"txpps\": %.0f, \"txeps\": %.0f, \"txfrags\": %.0f, \"rxpps\": %.0f, "
                      "\"rxdeliv\": %.0f, \"rxeps\": %.0f, \"rxreass\": %.0f }",
                 Rate(c.txPkts - p.txPkts, elapsed), Rate(c.txErrors - p.txErrors, elapsed),
                 Rate(c.txFragments - p.txFragments, elapsed), Rate(c.rxPkts - p.rxPkts, elapsed),
                 Rate(c.rxDelivered - p.rxDelivered, elapsed), Rate(c.rxErrors - p.rxErrors, elapsed),
                 Rate(c.rxReassembled - p.rxReassembled, elapsed));
}

// The mean size divides by a count raised by 1, like the percentages, and is printed as a signed number.
i32 SegmentSize(u64 bytes, u64 segments) {
    return static_cast<i32>(MeanSize(bytes, segments + 1));
}

double DataMegabits(u64 bytes, f32 elapsed) {
    return Megabits(static_cast<double>(bytes) * 8.0, elapsed);
}

void PrintTcpTx(const TcpStats &c, const TcpStats &p, f32 elapsed, ReportBuf *report) {
    u64 segments = c.txSegments - p.txSegments;
    u64 bytes = c.txDataBytes - p.txDataBytes;
    ReportPrintf(report,
                 ",\n  \"tcptx\": { \"pps\": %.0f, \"datapct\": %.1f, \"mbps\": %.1f, \"size\": %d, "
                 "\"delackpct\": %.1f, \"rexmit\": %.1f, \"sackrexmit\": %.1f, \"winprb\": %.1f, \"winupd\": %.1f }",
                 Rate(segments, elapsed), Percent(c.txDataSegments - p.txDataSegments, segments + 1),
                 DataMegabits(bytes, elapsed), SegmentSize(bytes, segments),
                 Percent(c.txDelayedAcks - p.txDelayedAcks, c.txAckOnly - p.txAckOnly + 1),
                 Rate(c.txRetransmitted - p.txRetransmitted, elapsed),
                 Rate(c.txSackRetransmitted - p.txSackRetransmitted, elapsed),
                 Rate(c.txWindowProbes - p.txWindowProbes, elapsed),
                 Rate(c.txWindowUpdates - p.txWindowUpdates, elapsed));
}

void PrintTcpRx(const TcpStats &c, const TcpStats &p, f32 elapsed, ReportBuf *report) {
    u64 segments = c.rxSegments - p.rxSegments;
    u64 bytes = c.rxDataBytes - p.rxDataBytes;
    u64 otherErrors = (c.rxErrors240 - p.rxErrors240) + (c.rxErrors248 - p.rxErrors248) +
                      (c.rxErrors256 - p.rxErrors256) + (c.rxErrors264 - p.rxErrors264) +
                      (c.rxErrors320 - p.rxErrors320) + (c.rxErrors392 - p.rxErrors392);
    ReportPrintf(report,
                 ",\n  \"tcprx\": { \"pps\": %.0f, \"datapct\": %.1f, \"mbps\": %.1f, \"size\": %d, \"dups\": %.1f, "
                 "\"oo\": %.1f, \"winprb\": %.1f, \"winupd\": %.1f, \"othereps\": %.1f}",
                 Rate(segments, elapsed), Percent(c.rxDataSegments - p.rxDataSegments, segments + 1),
                 DataMegabits(bytes, elapsed), SegmentSize(bytes, segments),
                 Rate(c.rxDuplicates - p.rxDuplicates, elapsed), Rate(c.rxOutOfOrder - p.rxOutOfOrder, elapsed),
                 Rate(c.rxWindowProbes - p.rxWindowProbes, elapsed),
                 Rate(c.rxWindowUpdates - p.rxWindowUpdates, elapsed), Rate(otherErrors, elapsed));
}

void PrintUdp(const UdpStats &c, const UdpStats &p, f32 elapsed, ReportBuf *report) {
    u64 otherErrors = 0;
    for (std::size_t i = 0; i < 5; i++) {
        otherErrors += c.rxErrors8[i] - p.rxErrors8[i];
    }
    ReportPrintf(report, ",\n  \"udp\": {\"txpps\": %.0f, \"rxpps\": %.0f, \"rxsockeps\": %.1f, \"rxothereps\": %.1f}",
                 Rate(c.txDatagrams - p.txDatagrams, elapsed), Rate(c.rxDatagrams - p.rxDatagrams, elapsed),
                 Rate(c.rxSocketLost - p.rxSocketLost, elapsed), Rate(otherErrors, elapsed));
}

}  // namespace

HostNicStats *HostNicCreate() {
    if (hostNicForStats == nullptr) {
        hostNicForStats = AllocRecord<HostNicStats>("hostnic for stats");
    }
    hostNicRefCnt++;
    return hostNicForStats;
}

KnfStatus HostNicRead(HostNicStats *stats, bool first) {
    if ((first && resetUpdated) || updated) {
        return 0;
    }
    if (KnfStatus status = ReadAll(stats, first)) {
        return status;
    }
    printed = false;
    (first ? resetUpdated : updated) = true;
    return 0;
}

KnfStatus HostNicPrint(HostNicStats *stats, f32 elapsed, ReportBuf *report) {
    if (printed) {
        return 0;
    }
    PrintIp(stats->ipv4Curr, stats->ipv4Prev, elapsed, report);
    PrintIp(stats->ipv6Curr, stats->ipv6Prev, elapsed, report);
    PrintTcpTx(stats->tcpCurr, stats->tcpPrev, elapsed, report);
    PrintTcpRx(stats->tcpCurr, stats->tcpPrev, elapsed, report);
    PrintUdp(stats->udpCurr, stats->udpPrev, elapsed, report);
    updated = false;
    printed = true;
    resetUpdated = false;
    stats->ipv4Prev = stats->ipv4Curr;
    stats->ipv6Prev = stats->ipv6Curr;
    stats->tcpPrev = stats->tcpCurr;
    stats->udpPrev = stats->udpCurr;
    return 0;
}

void HostNicCleanup(HostNicStats *stats) {
    if (stats != nullptr) {
        hostNicRefCnt--;
    }
}
