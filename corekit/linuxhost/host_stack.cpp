#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"

#include <algorithm>

namespace {

Outcome ReadStack(LinuxHost *host, StackRecord which) {
    if (!host->stackOpen) {
        if (Outcome outcome = StackOpen(&host->stack, host->root); outcome != FINE) {
            return outcome;
        }
        host->stackOpen = true;
    }
    PassJoin(&host->stackPass, &host->stackServed[which], host->now());
    return StackRead(&host->stack, host->stackPass.generation);
}

struct StackField {
    FieldLayout field;
    StackCounter counters[8];  // their sum
    u32 count;
};

// clang-format off
constexpr StackField IPV4_FIELDS[] = {
    {ipv4::RX_PKTS, {IP4_IN}, 1},
    {ipv4::RX_ERRORS, {IP4_IN_HEADER_ERRORS, IP4_IN_ADDRESS_ERRORS, IP4_IN_UNKNOWN_PROTOCOLS, IP4_IN_DISCARDS,
                       IP4_IN_TRUNCATED}, 5},
    {ipv4::RX_DELIVERED, {IP4_IN_DELIVERS}, 1},
    {ipv4::TX_ERRORS, {IP4_OUT_DISCARDS, IP4_OUT_NO_ROUTES}, 2},
    {ipv4::RX_REASSEMBLED, {IP4_REASSEMBLED}, 1},
    {ipv4::TX_FRAGMENTS, {IP4_FRAGMENTS_MADE}, 1}};
constexpr StackField IPV6_FIELDS[] = {
    {ipv6::RX_PKTS, {IP6_IN}, 1},
    {ipv6::RX_ERRORS, {IP6_IN_HEADER_ERRORS, IP6_IN_TOO_BIG, IP6_IN_NO_ROUTES, IP6_IN_ADDRESS_ERRORS,
                       IP6_IN_UNKNOWN_PROTOCOLS, IP6_IN_TRUNCATED, IP6_IN_DISCARDS}, 7},
    {ipv6::RX_DELIVERED, {IP6_IN_DELIVERS}, 1},
    {ipv6::TX_ERRORS, {IP6_OUT_DISCARDS, IP6_OUT_NO_ROUTES}, 2},
    {ipv6::RX_REASSEMBLED, {IP6_REASSEMBLED}, 1},
    {ipv6::TX_FRAGMENTS, {IP6_FRAGMENTS_MADE}, 1}};
// The kernel's OutSegs leaves out what is sent again.
constexpr StackField TCP_FIELDS[] = {
    {tcp::TX_DELAYED_ACKS, {TCP_DELAYED_ACKS}, 1},
    {tcp::TX_SEGMENTS, {TCP_OUT_SEGMENTS, TCP_RETRANSMITTED}, 2},
    {tcp::TX_DATA_SEGMENTS, {TCP_DATA_SENT, TCP_RETRANSMITTED}, 2},
    {tcp::TX_RETRANSMITTED, {TCP_RETRANSMITTED}, 1},
    {tcp::TX_WINDOW_PROBES, {TCP_WINDOW_PROBES}, 1},
    {tcp::RX_SEGMENTS, {TCP_IN_SEGMENTS}, 1},
    {tcp::RX_DUPLICATES, {TCP_DELAYED_ACKS_LOST}, 1},
    {tcp::RX_OUT_OF_ORDER, {TCP_OUT_OF_ORDER}, 1},
    {tcp::TX_SACK_RETRANSMITTED, {TCP_FAST_RETRANSMITTED}, 1},
    {tcp::RX_ERRORS[0], {TCP_IN_ERRORS}, 1},
    {tcp::RX_ERRORS[1], {TCP_LISTEN_DROPS, TCP_BACKLOG_DROPS, TCP_MEMORY_DROPS, TCP_TTL_DROPS, TCP_ORDER_DROPS,
                         TCP_QUEUE_DROPS, TCP_ZERO_WINDOW_DROPS}, 7}};
constexpr StackField UDP_FIELDS[] = {
    {udp::RX_DATAGRAMS, {UDP4_IN, UDP6_IN}, 2},
    {udp::TX_DATAGRAMS, {UDP4_OUT, UDP6_OUT}, 2},
    {udp::RX_SOCKET_LOST, {UDP4_RCVBUF_ERRORS, UDP6_RCVBUF_ERRORS}, 2},
    {udp::RX_ERRORS[0], {UDP4_NO_PORTS, UDP6_NO_PORTS}, 2}};
// clang-format on

template <size_t Count>
KnfStatus Fill(LinuxHost *host, StackRecord which, const StackField (&fields)[Count], char *record) {
    Outcome outcome = ReadStack(host, which);
    for (size_t i = 0; outcome == FINE && i < Count; i++) {
        u64 sum = 0;
        for (u32 counter = 0; counter < fields[i].count; counter++) {
            sum += StackValue(host->stack.row, fields[i].counters[counter]);
        }
        Put(record, fields[i].field, sum);
    }
    return StatusOf(outcome);
}

}  // namespace

KnfStatus Ipv4Get(LinuxHost *host, const Params & /*keys*/, char *record) {
    KnfStatus status = Fill(host, STACK_IPV4, IPV4_FIELDS, record);
    Put(record, ipv4::TX_PKTS, StackIp4Sent(host->stack.row));
    return status;
}

KnfStatus Ipv6Get(LinuxHost *host, const Params & /*keys*/, char *record) {
    KnfStatus status = Fill(host, STACK_IPV6, IPV6_FIELDS, record);
    Put(record, ipv6::TX_PKTS, StackIp6Sent(host->stack.row));
    return status;
}

// No counter of the host tells bytes; its sockets do. Where they may not be asked, bytes stay what they were, 0 at
// first: the rest of the record is measured all the same, and a total must not step back.
KnfStatus TcpGet(LinuxHost *host, const Params & /*keys*/, char *record) {
    KnfStatus status = Fill(host, STACK_TCP, TCP_FIELDS, record);
    const StackRow &row = host->stack.row;
    Put(record, tcp::TX_ACK_ONLY, StackValue(row, TCP_OUT_SEGMENTS) - StackValue(row, TCP_DATA_SENT));
    if (status != STATUS_OK) {
        return status;
    }
    TcpTotals totals = {};
    if (TcpSocketsRead(&host->sockets, &totals) == FINE) {
        host->tcp = totals;
    } else {
        TellOnce(&host->toldSockets, "corekit: the kernel does not tell the bytes of its TCP connections\n");
    }
    Put(record, tcp::TX_DATA_BYTES, host->tcp.bytesSent);
    Put(record, tcp::RX_DATA_BYTES, host->tcp.bytesReceived);
    Put(record, tcp::RX_DATA_SEGMENTS, host->tcp.segmentsReceived);
    return STATUS_OK;
}

// What a full socket lost is among the errors, too.
KnfStatus UdpGet(LinuxHost *host, const Params & /*keys*/, char *record) {
    KnfStatus status = Fill(host, STACK_UDP, UDP_FIELDS, record);
    const StackRow &row = host->stack.row;
    u64 lost = StackValue(row, UDP4_RCVBUF_ERRORS) + StackValue(row, UDP6_RCVBUF_ERRORS);
    u64 errors = StackValue(row, UDP4_IN_ERRORS) + StackValue(row, UDP6_IN_ERRORS);
    Put(record, udp::RX_ERRORS[1], errors - std::min(errors, lost));
    return status;
}
