// Counters of the host's IP stack, of the network namespace that the calling thread was in when the files were opened:
// /proc/net/snmp, netstat and snmp6, found by key. One read of the three a generation, about 80 us, kept open.
#pragma once

#include "corekit/linuxhost/file.h"

// In the order of the table in stack.cpp, which has the kernel's name of each.
// clang-format off
enum StackCounter : u32 {
    IP4_IN, IP4_IN_HEADER_ERRORS, IP4_IN_ADDRESS_ERRORS, IP4_IN_UNKNOWN_PROTOCOLS, IP4_IN_DISCARDS, IP4_IN_DELIVERS,
    IP4_OUT_REQUESTS, IP4_OUT_TRANSMITS, IP4_OUT_DISCARDS, IP4_OUT_NO_ROUTES, IP4_REASSEMBLED, IP4_FRAGMENTS_MADE,
    IP4_IN_TRUNCATED,
    IP6_IN, IP6_IN_HEADER_ERRORS, IP6_IN_TOO_BIG, IP6_IN_NO_ROUTES, IP6_IN_ADDRESS_ERRORS, IP6_IN_UNKNOWN_PROTOCOLS,
    IP6_IN_TRUNCATED, IP6_IN_DISCARDS, IP6_IN_DELIVERS,
    IP6_OUT_REQUESTS, IP6_OUT_TRANSMITS, IP6_OUT_DISCARDS, IP6_OUT_NO_ROUTES, IP6_REASSEMBLED, IP6_FRAGMENTS_MADE,
    TCP_IN_SEGMENTS, TCP_OUT_SEGMENTS, TCP_RETRANSMITTED, TCP_IN_ERRORS, TCP_IN_CHECKSUM_ERRORS,
    TCP_DATA_SENT,           // segments with data, first transmissions alone
    TCP_WINDOW_PROBES, TCP_DELAYED_ACKS, TCP_DELAYED_ACKS_LOST, TCP_OUT_OF_ORDER, TCP_FAST_RETRANSMITTED,
    TCP_LISTEN_DROPS, TCP_BACKLOG_DROPS, TCP_MEMORY_DROPS, TCP_TTL_DROPS, TCP_ORDER_DROPS, TCP_QUEUE_DROPS,
    TCP_ZERO_WINDOW_DROPS,
    UDP4_IN, UDP4_NO_PORTS, UDP4_IN_ERRORS, UDP4_OUT, UDP4_RCVBUF_ERRORS, UDP4_CHECKSUM_ERRORS, UDP4_MEMORY_ERRORS,
    UDP6_IN, UDP6_NO_PORTS, UDP6_IN_ERRORS, UDP6_OUT, UDP6_RCVBUF_ERRORS, UDP6_CHECKSUM_ERRORS, UDP6_MEMORY_ERRORS,
    STACK_COUNTERS
};
// clang-format on
static_assert(STACK_COUNTERS <= 64);

struct StackRow {
    u64 known;  // bit n: the kernel told counter n
    u64 values[STACK_COUNTERS];
};

// 0 for a counter that this kernel does not tell. Ask StackKnows where that would lie.
u64 StackValue(const StackRow &row, StackCounter counter);
bool StackKnows(const StackRow &row, StackCounter counter);
// Packets handed to devices, forwarded ones too. Kernels up to 6.5 tell them as OutRequests, later ones as
// OutTransmits.
u64 StackIp4Sent(const StackRow &row);
u64 StackIp6Sent(const StackRow &row);

struct Stack {
    StackRow row{};
    u64 generation = 0;  // of the row; 0 before the first read
    ProcFile files[3]{};
    ProcBuffer buffer;
};

Outcome StackOpen(Stack *stack, const ProcRoot &root);
// Reads the row, unless it is of this generation (not 0) already. A file that is missing, as without IPv6, leaves its
// counters unknown; without any it fails.
Outcome StackRead(Stack *stack, u64 generation);
void StackClose(Stack *stack);
