// The counters of the host's IP stack: one record for all host NIC ports of the run, which hold counted references to
// it. It is read once a pass and reported once an iteration, by the first such port that comes along. Four node reads a
// pass, however many ports. Never freed.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"
#include "meter/support/report.h"

// All counters are running totals, unsigned.
struct __attribute__((packed)) Ipv4Stats {
    u64 rxPkts;
    u8 reserved8[48];
    u64 rxErrors;
    u8 reserved64[48];
    u64 rxDelivered;
    u64 txPkts;
    u64 txErrors;
    u64 rxReassembled;
    u64 txFragments;
    u8 reserved152[88];
};
static_assert(sizeof(Ipv4Stats) == 240 && offsetof(Ipv4Stats, rxErrors) == 56 &&
              offsetof(Ipv4Stats, rxDelivered) == 112);

struct __attribute__((packed)) Ipv6Stats {
    u64 rxPkts;
    u8 reserved8[24];
    u64 rxErrors;
    u8 reserved40[40];
    u64 rxDelivered;
    u64 txPkts;
    u64 txErrors;
    u64 rxReassembled;
    u64 txFragments;
    u8 reserved120[3208];
};
static_assert(sizeof(Ipv6Stats) == 3328 && offsetof(Ipv6Stats, rxErrors) == 32 &&
              offsetof(Ipv6Stats, rxDelivered) == 80);

struct __attribute__((packed)) TcpStats {
    u8 reserved0[72];
    u64 txDelayedAcks;
    u8 reserved80[48];
    u64 txSegments;
    u64 txDataSegments;
    u64 txDataBytes;
    u64 txRetransmitted;
    u8 reserved160[16];
    u64 txAckOnly;
    u64 txWindowProbes;
    u8 reserved192[8];
    u64 txWindowUpdates;
    u8 reserved208[8];
    u64 rxSegments;
    u64 rxDataSegments;
    u64 rxDataBytes;
    u64 rxErrors240;  // error counters are told apart by their offset alone
    u64 rxErrors248;
    u64 rxErrors256;
    u64 rxErrors264;
    u64 rxDuplicates;
    u8 reserved280[24];
    u64 rxOutOfOrder;
    u8 reserved312[8];
    u64 rxErrors320;
    u8 reserved328[16];
    u64 rxWindowProbes;
    u8 reserved352[32];
    u64 rxWindowUpdates;
    u64 rxErrors392;
    u8 reserved400[264];
    u64 txSackRetransmitted;
    u8 reserved672[56];
};
static_assert(sizeof(TcpStats) == 728 && offsetof(TcpStats, txDelayedAcks) == 72 &&
              offsetof(TcpStats, txSegments) == 128 && offsetof(TcpStats, txAckOnly) == 176 &&
              offsetof(TcpStats, txWindowUpdates) == 200 && offsetof(TcpStats, rxSegments) == 216 &&
              offsetof(TcpStats, rxErrors240) == 240 && offsetof(TcpStats, rxDuplicates) == 272 &&
              offsetof(TcpStats, rxOutOfOrder) == 304 && offsetof(TcpStats, rxErrors320) == 320 &&
              offsetof(TcpStats, rxWindowProbes) == 344 && offsetof(TcpStats, rxWindowUpdates) == 384 &&
              offsetof(TcpStats, rxErrors392) == 392 && offsetof(TcpStats, txSackRetransmitted) == 664);

struct __attribute__((packed)) UdpStats {
    u64 rxDatagrams;
    u64 rxErrors8[5];
    u8 reserved48[8];
    u64 rxSocketLost;
    u8 reserved64[16];
    u64 txDatagrams;
    u8 reserved88[24];
};
static_assert(sizeof(UdpStats) == 112 && offsetof(UdpStats, rxSocketLost) == 56 &&
              offsetof(UdpStats, txDatagrams) == 80);

struct HostNicStats {
    Ipv4Stats ipv4Curr;  // latest read
    Ipv4Stats ipv4Prev;  // first read, later the last reported
    Ipv6Stats ipv6Curr;
    Ipv6Stats ipv6Prev;
    TcpStats tcpCurr;
    TcpStats tcpPrev;
    UdpStats udpCurr;
    UdpStats udpPrev;
};

// A reference to the one record.
HostNicStats *HostNicCreate();

// Reads the record unless another port of this pass has. 0, or the logged status that costs the port its reference;
// the next port of the same pass then tries again.
KnfStatus HostNicRead(HostNicStats *stats, bool first);

// Writes the sections "ipv4", "ipv6", "tcptx", "tcprx" and "udp" unless another port of this iteration has, and turns
// the record over. Always 0.
KnfStatus HostNicPrint(HostNicStats *stats, f32 elapsed, ReportBuf *report);

// Gives a reference back. Null does nothing.
void HostNicCleanup(HostNicStats *stats);
