#include "corekit/linuxhost/proc/stack.h"

#include <cstring>
#include <iterator>
#include <optional>

namespace {

constexpr u32 LIMIT = 1 << 20;
constexpr const char *FILES[] = {"snmp", "netstat", "snmp6"};  // the last has a key and its value on each line

struct Key {
    StackCounter counter;
    std::string_view group;  // before the colon of a line of keys; empty in snmp6
    std::string_view key;
};

// clang-format off
constexpr Key KEYS[] = {
    {IP4_IN, "Ip", "InReceives"}, {IP4_IN_HEADER_ERRORS, "Ip", "InHdrErrors"},
    {IP4_IN_ADDRESS_ERRORS, "Ip", "InAddrErrors"}, {IP4_IN_UNKNOWN_PROTOCOLS, "Ip", "InUnknownProtos"},
    {IP4_IN_DISCARDS, "Ip", "InDiscards"}, {IP4_IN_DELIVERS, "Ip", "InDelivers"},
    {IP4_OUT_REQUESTS, "Ip", "OutRequests"}, {IP4_OUT_TRANSMITS, "Ip", "OutTransmits"},
    {IP4_OUT_DISCARDS, "Ip", "OutDiscards"}, {IP4_OUT_NO_ROUTES, "Ip", "OutNoRoutes"},
    {IP4_REASSEMBLED, "Ip", "ReasmOKs"}, {IP4_FRAGMENTS_MADE, "Ip", "FragCreates"},
    {IP4_IN_TRUNCATED, "IpExt", "InTruncatedPkts"},
    {IP6_IN, "", "Ip6InReceives"}, {IP6_IN_HEADER_ERRORS, "", "Ip6InHdrErrors"},
    {IP6_IN_TOO_BIG, "", "Ip6InTooBigErrors"}, {IP6_IN_NO_ROUTES, "", "Ip6InNoRoutes"},
    {IP6_IN_ADDRESS_ERRORS, "", "Ip6InAddrErrors"}, {IP6_IN_UNKNOWN_PROTOCOLS, "", "Ip6InUnknownProtos"},
    {IP6_IN_TRUNCATED, "", "Ip6InTruncatedPkts"}, {IP6_IN_DISCARDS, "", "Ip6InDiscards"},
    {IP6_IN_DELIVERS, "", "Ip6InDelivers"},
    {IP6_OUT_REQUESTS, "", "Ip6OutRequests"}, {IP6_OUT_TRANSMITS, "", "Ip6OutTransmits"},
    {IP6_OUT_DISCARDS, "", "Ip6OutDiscards"}, {IP6_OUT_NO_ROUTES, "", "Ip6OutNoRoutes"},
    {IP6_REASSEMBLED, "", "Ip6ReasmOKs"}, {IP6_FRAGMENTS_MADE, "", "Ip6FragCreates"},
    {TCP_IN_SEGMENTS, "Tcp", "InSegs"}, {TCP_OUT_SEGMENTS, "Tcp", "OutSegs"},
    {TCP_RETRANSMITTED, "Tcp", "RetransSegs"}, {TCP_IN_ERRORS, "Tcp", "InErrs"},
    {TCP_IN_CHECKSUM_ERRORS, "Tcp", "InCsumErrors"},
    {TCP_DATA_SENT, "TcpExt", "TCPOrigDataSent"},
    {TCP_WINDOW_PROBES, "TcpExt", "TCPWinProbe"}, {TCP_DELAYED_ACKS, "TcpExt", "DelayedACKs"},
    {TCP_DELAYED_ACKS_LOST, "TcpExt", "DelayedACKLost"}, {TCP_OUT_OF_ORDER, "TcpExt", "TCPOFOQueue"},
    {TCP_FAST_RETRANSMITTED, "TcpExt", "TCPFastRetrans"},
    {TCP_LISTEN_DROPS, "TcpExt", "ListenDrops"}, {TCP_BACKLOG_DROPS, "TcpExt", "TCPBacklogDrop"},
    {TCP_MEMORY_DROPS, "TcpExt", "PFMemallocDrop"}, {TCP_TTL_DROPS, "TcpExt", "TCPMinTTLDrop"},
    {TCP_ORDER_DROPS, "TcpExt", "TCPOFODrop"}, {TCP_QUEUE_DROPS, "TcpExt", "TCPRcvQDrop"},
    {TCP_ZERO_WINDOW_DROPS, "TcpExt", "TCPZeroWindowDrop"},
    {UDP4_IN, "Udp", "InDatagrams"}, {UDP4_NO_PORTS, "Udp", "NoPorts"}, {UDP4_IN_ERRORS, "Udp", "InErrors"},
    {UDP4_OUT, "Udp", "OutDatagrams"}, {UDP4_RCVBUF_ERRORS, "Udp", "RcvbufErrors"},
    {UDP4_CHECKSUM_ERRORS, "Udp", "InCsumErrors"}, {UDP4_MEMORY_ERRORS, "Udp", "MemErrors"},
    {UDP6_IN, "", "Udp6InDatagrams"}, {UDP6_NO_PORTS, "", "Udp6NoPorts"}, {UDP6_IN_ERRORS, "", "Udp6InErrors"},
    {UDP6_OUT, "", "Udp6OutDatagrams"}, {UDP6_RCVBUF_ERRORS, "", "Udp6RcvbufErrors"},
    {UDP6_CHECKSUM_ERRORS, "", "Udp6InCsumErrors"}, {UDP6_MEMORY_ERRORS, "", "Udp6MemErrors"},
};
// clang-format on
static_assert(std::size(KEYS) == STACK_COUNTERS);

constexpr bool InOrder() {
    for (u32 i = 0; i < STACK_COUNTERS; i++) {
        if (KEYS[i].counter != i) {
            return false;
        }
    }
    return true;
}
static_assert(InOrder());

void Set(StackRow *row, std::string_view group, std::string_view key, u64 value) {
    for (const Key &known : KEYS) {
        if (key == known.key && group == known.group) {
            row->values[known.counter] = value;
            row->known |= u64{1} << known.counter;
            return;
        }
    }
}

// A number of the kernel's; a few old limits are shown as -1, which no counter here is.
bool TakeValue(std::string_view *values, u64 *value) {
    return ProcNumber(ProcTakeWord(values), value);
}

// Pairs of lines, "Ip: KEY KEY ..." and "Ip: VALUE VALUE ...". A value belongs to the key of its place.
void ParsePairs(std::string_view text, StackRow *row) {
    while (!text.empty()) {
        std::string_view keys = ProcTakeLine(&text);
        std::string_view values = ProcTakeLine(&text);
        std::string_view group = ProcTakeWord(&keys);
        if (group.empty() || group.back() != ':' || ProcTakeWord(&values) != group) {
            return;
        }
        group.remove_suffix(1);
        while (!keys.empty() && !values.empty()) {
            std::string_view key = ProcTakeWord(&keys);
            u64 value = 0;
            if (TakeValue(&values, &value)) {
                Set(row, group, key, value);
            }
        }
    }
}

void ParseLines(std::string_view text, StackRow *row) {
    while (!text.empty()) {
        std::string_view line = ProcTakeLine(&text);
        std::string_view key = ProcTakeWord(&line);
        u64 value = 0;
        if (TakeValue(&line, &value)) {
            Set(row, "", key, value);
        }
    }
}

}  // namespace

u64 StackValue(const StackRow &row, StackCounter counter) {
    return StackKnows(row, counter) ? row.values[counter] : 0;
}

bool StackKnows(const StackRow &row, StackCounter counter) {
    return (row.known >> counter & 1) != 0;
}

u64 StackIp4Sent(const StackRow &row) {
    return StackValue(row, StackKnows(row, IP4_OUT_TRANSMITS) ? IP4_OUT_TRANSMITS : IP4_OUT_REQUESTS);
}

u64 StackIp6Sent(const StackRow &row) {
    return StackValue(row, StackKnows(row, IP6_OUT_TRANSMITS) ? IP6_OUT_TRANSMITS : IP6_OUT_REQUESTS);
}

// "net" alone would be that of the process, whose other threads may live in another namespace.
Outcome StackOpen(Stack *stack, const ProcRoot &root) {
    Outcome outcome = GONE;
    for (size_t i = 0; i < std::size(FILES); i++) {
        Outcome opened = GONE;
        for (const char *directory : {"thread-self/net/", "net/"}) {
            opened =
                opened == FINE ? FINE : ProcOpen(&stack->files[i], root.proc, std::string(directory) + FILES[i], LIMIT);
        }
        outcome = i == 0 || opened == FINE ? opened : outcome;
    }
    return outcome;
}

Outcome StackRead(Stack *stack, u64 generation) {
    if (stack->generation == generation && stack->row.known != 0) {
        return FINE;
    }
    StackRow row = stack->row;  // a file that fails once keeps what it told: a total must not fall to 0
    Outcome outcome = GONE;
    for (ProcFile &file : stack->files) {
        std::string_view text;
        Outcome got = ProcRead(&file, &stack->buffer, &text);
        if (got == FINE) {
            &file == &stack->files[2] ? ParseLines(text, &row) : ParsePairs(text, &row);
        }
        outcome = &file == stack->files || got == FINE ? got : outcome;
    }
    if (row.known != 0) {
        stack->row = row;
        stack->generation = generation;
        return FINE;
    }
    return outcome == FINE ? BROKEN : outcome;
}

void StackClose(Stack *stack) {
    for (ProcFile &file : stack->files) {
        ProcClose(&file);
    }
    *stack = Stack();
}
