// The nodes: their numbers, and the layout of every record, told once for all sources and for the recorder. A program
// that reads nodes has a view of its own, so that a mistake here shows there.
#pragma once

#include "interface/types.h"

// clang-format off
enum Node : u32 {
    NODE_IPV4 = 32, NODE_TCP = 33, NODE_UDP = 34, NODE_IPV6 = 37, NODE_NIC_PROPERTIES = 72, NODE_NIC_STATS = 73,
    NODE_RXQ_INFO = 121, NODE_RXQ_FILTERS = 123, NODE_RXQ_FILTER = 126, NODE_TXQ_INFO = 131, NODE_TXQ_STATS = 132,
    NODE_SWITCH_LIST = 245, NODE_SWITCH_PORTS = 264, NODE_PORT_STATUS = 266, NODE_PORT_STATS = 269,
    NODE_PARLAN2 = 270, NODE_TX_WORLDLET = 275, NODE_COALESCE = 278, NODE_COALESCE_2 = 279, NODE_COALESCE_RX = 280,
    NODE_COALESCE_TX = 281, NODE_COALESCE_TXCOMP = 282, NODE_CLUSTERS = 326, NODE_CLUSTERS_IN = 327,
    NODE_CLUSTERS_OUT = 328, NODE_SIZES = 331, NODE_SIZES_IN = 332, NODE_SIZES_OUT = 333, NODE_INTERVALS = 336,
    NODE_INTERVALS_IN = 337, NODE_INTERVALS_OUT = 338, NODE_PARLAN3_TX = 341, NODE_PARLAN3_RX = 342,
    NODE_PARLAN3_QUEUE = 354, NODE_PORT_TYPE = 368, NODE_WORLD_CARTEL = 457, NODE_CONFIG_OPTION = 519,
    NODE_CONFIG_OPTION_SET = 520, NODE_TOPOLOGY = 603, NODE_PCPU_INFO = 605, NODE_VECTOR_LIST = 639,
    NODE_VECTOR_NAMES = 641, NODE_GROUP_LEADER = 658, NODE_CARTEL_GROUP = 738, NODE_VCPU_LIST = 753,
    NODE_VCPU_TIMES = 770, NODE_VCPU_EVENTS = 772, NODE_VCPU_HISTO = 776, NODE_VCPU_MIGRATIONS = 793,
    NODE_VCPU_L3 = 795, NODE_PCPU_STATS = 797, NODE_VECTOR_STATS = 840, NODE_TIME = 1419,
    NODE_WORLDLET_LIST = 1476, NODE_WORLDLET_STATS = 1478,
};
// clang-format on

// Bytes of a node's record; 0 for a node that has none.
u32 NodeRecordSize(u32 node);

// What the entries of a node's instance lists are. The interface does not tell: who lists a node knows.
enum EntryType : u8 { ENTRIES_UNKNOWN, NUMBERS, TEXTS };
EntryType NodeEntries(u32 node);

constexpr i64 PORT_HOST_STACK = 3;  // types of port
constexpr i64 PORT_UPLINK = 4;
constexpr i64 PORT_VNIC = 5;
constexpr i64 MODEL_PARLAN2 = 8;  // sub-types of a virtual NIC
constexpr i64 MODEL_PARLAN3 = 9;
constexpr i64 PORT_FLAG_UPLINK = 0x40;

// A number of 1, 2, 4, 6 or 8 bytes, little-endian; or a text, whose terminator lies in its width too.
struct FieldLayout {
    u32 offset;
    u32 width;
};

namespace port_type {
constexpr FieldLayout TYPE{0, 4}, SUB_TYPE{4, 4}, SWITCH_NAME{1032, 1024};
}
namespace port_status {
constexpr FieldLayout CLIENT_NAME{148, 1048}, WORLD_LEADER{1196, 4}, FLAGS{1200, 4}, MAC{1208, 6}, VNIC_MAC{2262, 6},
    RX_MODE{3310, 4};
}
namespace port_stats {
constexpr FieldLayout TX_PKTS{0, 8}, TX_BYTES{8, 8}, TX_DROPPED{16, 8}, TX_PKTS_EXTRA{24, 8}, TX_BYTES_EXTRA{32, 8},
    RX_PKTS{72, 8}, RX_BYTES{80, 8}, RX_DROPPED{88, 8};
}
namespace coalesce {
constexpr FieldLayout SCHEME{0, 4}, SCHEME_NAME{4, 32}, SCHEME_PARAMS{36, 32};
}
namespace coalesce_rx {
constexpr FieldLayout DEPTH{0, 4}, DYN{4, 1}, INTR_POST{6, 4}, INTR_REQ{10, 4};
}
namespace coalesce_tx {
constexpr FieldLayout DEPTH{0, 4}, DYN{8, 1}, SPLIT_CALL{9, 4}, SPLIT_OPPOR{13, 4}, SPLIT_TO{17, 4}, SPLIT_HC{21, 4};
}
namespace coalesce_txcomp {
constexpr FieldLayout DEPTH{0, 4}, DYN{4, 1};
}
namespace coalesce_2 {
constexpr FieldLayout TX_DYN{8, 1}, TXCOMP_DYN{9, 1}, RX_DYN{10, 1}, TX_DEPTH{12, 4}, TXCOMP_DEPTH{16, 4},
    RX_DEPTH{20, 4}, INTR_POST{25, 4}, INTR_REQ{29, 4}, SPLIT_CALL{49, 4}, SPLIT_OPPOR{53, 4}, SPLIT_TO{57, 4},
    SPLIT_HC{61, 4};
}
namespace tx_worldlet {
constexpr FieldLayout POLLS{0, 4}, CALLS{4, 4}, TIMEOUTS{8, 4}, HIGH_COUNTS{12, 4}, OTHERS{16, 4};
}
namespace parlan2 {
constexpr FieldLayout TX_CALLS{0, 4}, COPY_BASE{4, 4}, COPY_COUNT{12, 4}, MAX_PENDING{16, 4}, QUEUE_STOPS{20, 4},
    TX_OVERFLOW{24, 4}, INTERRUPTS{28, 4}, RX_BUF_UNDERFLOW{36, 4}, OUT_OF_SLOTS{40, 8}, RX_OVERFLOW{48, 8},
    RX_ERR_A{56, 8}, RING2_ERRORS{64, 8}, MAX_FRAGS{72, 8}, MAP_FAILURES{80, 8}, RX_ERR_B{88, 8}, RX_ERR_C{96, 8},
    RX_ERR_D{104, 8};
}
namespace parlan3_tx {
constexpr FieldLayout PKTS{2, 8}, BYTES{10, 8}, TSO_PKTS{18, 8}, TSO_BYTES{26, 8}, UCAST_PKTS{34, 8}, ERRORS{82, 8},
    DISCARDS{90, 8}, ALLOC_ERRORS{106, 4}, QUEUE_STOPS{110, 4}, TSO_SPLITS{126, 4};
}
namespace parlan3_rx {
constexpr FieldLayout LRO_PKTS{0, 8}, LRO_BYTES{8, 8}, PKTS{16, 8}, BYTES{24, 8}, UCAST_PKTS{32, 8}, ERR_A{80, 8},
    ERR_B{88, 8}, RING1_FULL{96, 4}, RING2_FULL{100, 4}, SG_ERRORS{124, 4};
}
namespace parlan3_queue {
constexpr FieldLayout RING1_SIZE{6, 4}, RING2_SIZE{10, 4};
}
namespace nic_properties {
constexpr FieldLayout DEVICE{0, 193}, PORT{193, 4};
}
namespace nic_stats {
constexpr FieldLayout RX_PKTS{0, 8}, TX_PKTS{8, 8}, RX_BYTES{16, 8}, TX_BYTES{24, 8};
// Only the sums of these are ever shown.
constexpr FieldLayout RX_ERRORS[] = {{32, 8}, {48, 8}, {80, 8}, {88, 8}, {96, 8}, {104, 8}, {112, 8}, {120, 8}};
constexpr FieldLayout TX_ERRORS[] = {{40, 8}, {56, 8}, {128, 8}, {136, 8}, {144, 8}, {152, 8}, {160, 8}};
}  // namespace nic_stats
namespace queue_info {  // of the transmit queues as of the receive queues
constexpr FieldLayout COUNT{0, 2};
}
namespace txq_stats {
constexpr FieldLayout PKTS{0, 4}, ERRORS{4, 4}, STOPS{12, 4};
}
namespace rxq_filter {
constexpr FieldLayout PORT{14, 4};
}
namespace topology {
constexpr FieldLayout PACKAGES{8, 4}, CORES{12, 4}, PCPUS{16, 4};
}
namespace pcpu_info {
constexpr FieldLayout LLC{196, 4};
}
namespace pcpu_stats {
constexpr FieldLayout BUSY{0, 8}, WORLDLETS{16, 8}, ELAPSED{48, 8};
}
namespace config_option {
constexpr FieldLayout VALUE{544, 1028};
}
namespace vcpu_chain {  // from a world leader by way of its cartel and group to the leader of its vcpus
constexpr FieldLayout CARTEL{0, 4}, GROUP{0, 8}, LEADER{0, 4};
}
namespace vcpu_times {  // microseconds
constexpr FieldLayout ELAPSED{0, 8}, USED{32, 8}, COSTOP{48, 8}, READY{64, 8};
}
namespace vcpu_events {
constexpr FieldLayout ACT_NOT{36, 4};
}
namespace vcpu_migrations {  // in all, and of those between last-level caches
constexpr FieldLayout COUNT{0, 8};
}
namespace worldlet_stats {  // times in nanoseconds
constexpr FieldLayout AFFINE_PCPU{0, 4}, AFFINE_VCPU{4, 4}, AFFINE_WORLDLET{8, 4}, RUNS{12, 8}, MIGRATIONS{44, 8},
    OVERRUNS{140, 8}, REMOTE_ACTS{148, 8}, USED{220, 8}, READY{516, 8}, WAIT{812, 8};
}
namespace vector_stats {  // of one vector on one pcpu; the time in microseconds
constexpr FieldLayout COUNT{0, 8}, TIME{8, 8};
}
namespace host_time {
constexpr FieldLayout SECONDS{0, 4}, NANOSECONDS{4, 4};
}
namespace ipv4 {
constexpr FieldLayout RX_PKTS{0, 8}, RX_ERRORS{56, 8}, RX_DELIVERED{112, 8}, TX_PKTS{120, 8}, TX_ERRORS{128, 8},
    RX_REASSEMBLED{136, 8}, TX_FRAGMENTS{144, 8};
}
namespace ipv6 {
constexpr FieldLayout RX_PKTS{0, 8}, RX_ERRORS{32, 8}, RX_DELIVERED{80, 8}, TX_PKTS{88, 8}, TX_ERRORS{96, 8},
    RX_REASSEMBLED{104, 8}, TX_FRAGMENTS{112, 8};
}
namespace tcp {
constexpr FieldLayout TX_DELAYED_ACKS{72, 8}, TX_SEGMENTS{128, 8}, TX_DATA_SEGMENTS{136, 8}, TX_DATA_BYTES{144, 8},
    TX_RETRANSMITTED{152, 8}, TX_ACK_ONLY{176, 8}, TX_WINDOW_PROBES{184, 8}, TX_WINDOW_UPDATES{200, 8},
    RX_SEGMENTS{216, 8}, RX_DATA_SEGMENTS{224, 8}, RX_DATA_BYTES{232, 8}, RX_DUPLICATES{272, 8},
    RX_OUT_OF_ORDER{304, 8}, RX_WINDOW_PROBES{344, 8}, RX_WINDOW_UPDATES{384, 8}, TX_SACK_RETRANSMITTED{664, 8};
constexpr FieldLayout RX_ERRORS[] = {{240, 8}, {248, 8}, {256, 8}, {264, 8}, {320, 8}, {392, 8}};  // shown as a sum
}  // namespace tcp
namespace udp {
constexpr FieldLayout RX_DATAGRAMS{0, 8}, RX_SOCKET_LOST{56, 8}, TX_DATAGRAMS{80, 8};
constexpr FieldLayout RX_ERRORS[] = {{8, 8}, {16, 8}, {24, 8}, {32, 8}, {40, 8}};  // shown as a sum
}  // namespace udp

// Histograms: totals, then buckets of a count and its upper limit.
namespace histogram {
constexpr FieldLayout MIN{0, 8}, MAX{8, 8}, MEAN{16, 8}, COUNT{24, 8};
constexpr FieldLayout BucketCount(u32 bucket) {
    return {32 + 16 * bucket, 8};
}
constexpr FieldLayout BucketLimit(u32 bucket) {
    return {40 + 16 * bucket, 8};
}
}  // namespace histogram

// A family of port histograms: where it is started and stopped, where its two directions are read, and how many of its
// buckets have a limit; one more follows them. The histograms of a vcpu have 20 buckets.
struct HistogramNodes {
    Node control;
    Node input;
    Node output;
    u32 limits;
};
constexpr HistogramNodes HISTOGRAM_NODES[] = {{NODE_CLUSTERS, NODE_CLUSTERS_IN, NODE_CLUSTERS_OUT, 14},
                                              {NODE_SIZES, NODE_SIZES_IN, NODE_SIZES_OUT, 11},
                                              {NODE_INTERVALS, NODE_INTERVALS_IN, NODE_INTERVALS_OUT, 18}};
