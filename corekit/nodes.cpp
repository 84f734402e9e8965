#include "corekit/nodes.h"

#include <array>

namespace {

constexpr u16 HistogramSize(u32 limits) {
    return static_cast<u16>(histogram::BucketCount(limits + 1).offset);
}

struct RecordSize {
    u32 node;
    u16 size;
};
// clang-format off
constexpr RecordSize SIZES[] = {
    {NODE_IPV4, 240}, {NODE_TCP, 728}, {NODE_UDP, 112}, {NODE_IPV6, 3328}, {NODE_NIC_PROPERTIES, 1252},
    {NODE_NIC_STATS, 4296}, {NODE_RXQ_INFO, 12}, {NODE_RXQ_FILTER, 36}, {NODE_TXQ_INFO, 12}, {NODE_TXQ_STATS, 20},
    {NODE_PORT_STATUS, 3316}, {NODE_PORT_STATS, 160}, {NODE_PARLAN2, 112}, {NODE_TX_WORLDLET, 20}, {NODE_COALESCE, 68},
    {NODE_COALESCE_2, 68}, {NODE_COALESCE_RX, 36}, {NODE_COALESCE_TX, 32}, {NODE_COALESCE_TXCOMP, 24},
    {NODE_PARLAN3_TX, 140}, {NODE_PARLAN3_RX, 128}, {NODE_PARLAN3_QUEUE, 16},
    {NODE_PORT_TYPE, 2056}, {NODE_WORLD_CARTEL, 4}, {NODE_CONFIG_OPTION, 1572}, {NODE_TOPOLOGY, 36},
    {NODE_PCPU_INFO, 200}, {NODE_GROUP_LEADER, 4}, {NODE_CARTEL_GROUP, 8}, {NODE_VCPU_TIMES, 120},
    {NODE_VCPU_EVENTS, 64}, {NODE_VCPU_HISTO, 352}, {NODE_VCPU_MIGRATIONS, 8}, {NODE_VCPU_L3, 8},
    {NODE_PCPU_STATS, 160}, {NODE_VECTOR_STATS, 16}, {NODE_TIME, 8}, {NODE_WORLDLET_STATS, 1460},
};
// clang-format on

// By number, as each read asks.
constexpr auto SIZE_OF = [] {
    std::array<u16, NODE_WORLDLET_STATS + 1> sizes = {};
    for (const RecordSize &record : SIZES) {
        sizes[record.node] = record.size;
    }
    for (const HistogramNodes &histogram : HISTOGRAM_NODES) {
        sizes[histogram.input] = sizes[histogram.output] = HistogramSize(histogram.limits);
    }
    return sizes;
}();

}  // namespace

u32 NodeRecordSize(u32 node) {
    return node < SIZE_OF.size() ? SIZE_OF[node] : 0;
}

EntryType NodeEntries(u32 node) {
    switch (node) {
    case NODE_SWITCH_LIST:
    case NODE_VECTOR_NAMES:
    case NODE_WORLDLET_LIST:
        return TEXTS;
    case NODE_SWITCH_PORTS:
    case NODE_VECTOR_LIST:
    case NODE_VCPU_LIST:
    case NODE_RXQ_FILTERS:
        return NUMBERS;
    default:
        return ENTRIES_UNKNOWN;
    }
}
