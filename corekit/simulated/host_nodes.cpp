#include "corekit/simulated/host_nodes.h"

#include "corekit/simulated/line.h"

#include <algorithm>
#include <unistd.h>
#include <utility>

namespace {

constexpr i64 PER_MILLE = 1000;              // microseconds of a second
constexpr i64 WORLDLET_PER_MILLE = 1000000;  // nanoseconds
constexpr i64 DEFAULT_SIZE = 512;
constexpr i64 HALVED_QUEUES = 60;  // what is left behind so many halves is nothing

using Fields = std::vector<Field>;
using Limits = std::vector<i64>;

// What moves in each record, one row a node: fields, then texts. Factors differ between neighbours that follow one
// rate, so that figures taken from the wrong field show. The errors of a NIC are those of its port: kinds that a reader
// adds up are shares of one count.
const std::vector<RecordKind> &FixedKinds() {
    // clang-format off
    static const auto &kinds = *new std::vector<RecordKind>{
        {NODE_PORT_TYPE,
         {{port_type::TYPE, LEVEL, TYPE}, {port_type::SUB_TYPE, LEVEL, SUB_TYPE}},
         {{port_type::SWITCH_NAME, SWITCH_NAME}}},
        {NODE_PORT_STATUS,
         {{port_status::WORLD_LEADER, LEVEL, LEADER}, {port_status::FLAGS, LEVEL, FLAGS},
          {port_status::MAC, LEVEL, MAC}, {port_status::VNIC_MAC, LEVEL, VNIC_MAC},
          {port_status::RX_MODE, LEVEL, TYPE, 3}},
         {{port_status::CLIENT_NAME, NAME}}},
        {NODE_PORT_STATS,
         {{port_stats::TX_PKTS, COUNT, TX, 3, 4}, {port_stats::TX_BYTES, COUNT, TX, 3, 4, 0, SIZE},
          {port_stats::TX_PKTS_EXTRA, COUNT, TX, 1, 4, 3}, {port_stats::TX_BYTES_EXTRA, COUNT, TX, 1, 4, 3, SIZE},
          {port_stats::TX_DROPPED, COUNT, TX_ERRORS}, {port_stats::RX_PKTS, COUNT, RX},
          {port_stats::RX_BYTES, COUNT, RX, 1, 1, 0, SIZE}, {port_stats::RX_DROPPED, COUNT, RX_ERRORS}},
         {}},
        {NODE_COALESCE,
         {{coalesce::SCHEME, LEVEL, SCHEME}},
         {{coalesce::SCHEME_NAME, SCHEME_NAME}, {coalesce::SCHEME_PARAMS, SCHEME_PARAMS}}},
        {NODE_COALESCE_RX,
         {{coalesce_rx::DEPTH, LEVEL, ONE, 64}, {coalesce_rx::DYN, LEVEL, ONE, 1},
          {coalesce_rx::INTR_POST, COUNT, RX, 1, 8}, {coalesce_rx::INTR_REQ, COUNT, RX, 1, 4}},
         {}},
        {NODE_COALESCE_TX,
         {{coalesce_tx::DEPTH, LEVEL, ONE, 32}, {coalesce_tx::DYN, LEVEL, ONE, 1},
          {coalesce_tx::SPLIT_CALL, COUNT, TX, 2, 5}, {coalesce_tx::SPLIT_OPPOR, COUNT, TX, 3, 10},
          {coalesce_tx::SPLIT_TO, COUNT, TX, 1, 5}, {coalesce_tx::SPLIT_HC, COUNT, TX, 1, 10}},
         {}},
        {NODE_COALESCE_TXCOMP, {{coalesce_txcomp::DEPTH, LEVEL, ONE, 16}, {coalesce_txcomp::DYN, LEVEL, ONE, 0}}, {}},
        {NODE_COALESCE_2,
         {{coalesce_2::TX_DYN, LEVEL, ONE, 1}, {coalesce_2::TXCOMP_DYN, LEVEL, ONE, 0},
          {coalesce_2::RX_DYN, LEVEL, ONE, 2}, {coalesce_2::TX_DEPTH, LEVEL, ONE, 48},
          {coalesce_2::TXCOMP_DEPTH, LEVEL, ONE, 24}, {coalesce_2::RX_DEPTH, LEVEL, ONE, 96},
          {coalesce_2::INTR_POST, COUNT, RX, 1, 10}, {coalesce_2::INTR_REQ, COUNT, RX, 1, 5},
          {coalesce_2::SPLIT_CALL, COUNT, TX, 1, 10}, {coalesce_2::SPLIT_OPPOR, COUNT, TX, 1, 5},
          {coalesce_2::SPLIT_TO, COUNT, TX, 3, 10}, {coalesce_2::SPLIT_HC, COUNT, TX, 2, 5}},
         {}},
        {NODE_TX_WORLDLET,
         {{tx_worldlet::POLLS, COUNT, TX, 1, 2}, {tx_worldlet::CALLS, COUNT, TX, 1, 4},
          {tx_worldlet::TIMEOUTS, COUNT, TX, 1, 8}, {tx_worldlet::HIGH_COUNTS, COUNT, TX, 1, 16},
          {tx_worldlet::OTHERS, COUNT, TX, 1, 32}},
         {}},
        {NODE_PARLAN2,
         {{parlan2::TX_CALLS, COUNT, TX, 1, 4}, {parlan2::COPY_BASE, COUNT, TX, 1, 1},
          {parlan2::COPY_COUNT, COUNT, TX, 1, 3}, {parlan2::MAX_PENDING, LEVEL, ONE, 37},
          {parlan2::QUEUE_STOPS, COUNT, TX_ERRORS, 3}, {parlan2::TX_OVERFLOW, COUNT, TX_ERRORS},
          {parlan2::INTERRUPTS, COUNT, RX, 1, 6}, {parlan2::RX_BUF_UNDERFLOW, COUNT, RX_ERRORS, 1, 55, 0},
          {parlan2::OUT_OF_SLOTS, COUNT, RX_ERRORS, 2, 55, 1}, {parlan2::RX_OVERFLOW, COUNT, RX_ERRORS, 3, 55, 3},
          {parlan2::RX_ERR_A, COUNT, RX_ERRORS, 4, 55, 6}, {parlan2::RING2_ERRORS, COUNT, RX_ERRORS, 5, 55, 10},
          {parlan2::MAX_FRAGS, COUNT, RX_ERRORS, 6, 55, 15}, {parlan2::MAP_FAILURES, COUNT, RX_ERRORS, 7, 55, 21},
          {parlan2::RX_ERR_B, COUNT, RX_ERRORS, 8, 55, 28}, {parlan2::RX_ERR_C, COUNT, RX_ERRORS, 9, 55, 36},
          {parlan2::RX_ERR_D, COUNT, RX_ERRORS, 10, 55, 45}},
         {}},
        {NODE_PARLAN3_TX,
         {{parlan3_tx::PKTS, COUNT, TX}, {parlan3_tx::BYTES, COUNT, TX, 1, 1, 0, SIZE},
          {parlan3_tx::TSO_PKTS, COUNT, TX, 1, 3}, {parlan3_tx::TSO_BYTES, COUNT, TX, 1, 3, 0, TSO_SIZE},
          {parlan3_tx::UCAST_PKTS, COUNT, TX, 9, 10}, {parlan3_tx::ERRORS, COUNT, TX_ERRORS},
          {parlan3_tx::DISCARDS, COUNT, TX_ERRORS, 3, 4}, {parlan3_tx::ALLOC_ERRORS, COUNT, TX_ERRORS, 2, 3},
          {parlan3_tx::QUEUE_STOPS, COUNT, TX_ERRORS, 4}, {parlan3_tx::TSO_SPLITS, COUNT, TX_ERRORS, 5}},
         {}},
        {NODE_PARLAN3_RX,
         {{parlan3_rx::LRO_PKTS, COUNT, RX, 2, 5}, {parlan3_rx::LRO_BYTES, COUNT, RX, 2, 5, 0, LRO_SIZE},
          {parlan3_rx::PKTS, COUNT, RX}, {parlan3_rx::BYTES, COUNT, RX, 1, 1, 0, SIZE},
          {parlan3_rx::UCAST_PKTS, COUNT, RX, 19, 20}, {parlan3_rx::ERR_A, COUNT, RX_ERRORS, 2, 5, 0},
          {parlan3_rx::ERR_B, COUNT, RX_ERRORS, 3, 5, 2}, {parlan3_rx::RING1_FULL, COUNT, RX_ERRORS, 4, 5},
          {parlan3_rx::RING2_FULL, COUNT, RX_ERRORS, 1, 4}, {parlan3_rx::SG_ERRORS, COUNT, RX_ERRORS, 1, 6}},
         {}},
        {NODE_PARLAN3_QUEUE,
         {{parlan3_queue::RING1_SIZE, LEVEL, ONE, 512}, {parlan3_queue::RING2_SIZE, LEVEL, ONE, 128}},
         {}},
        {NODE_NIC_PROPERTIES, {{nic_properties::PORT, LEVEL, PORT}}, {{nic_properties::DEVICE, DEVICE}}},
        {NODE_NIC_STATS,
         {{nic_stats::RX_PKTS, COUNT, RX}, {nic_stats::RX_BYTES, COUNT, RX, 1, 1, 0, SIZE},
          {nic_stats::TX_PKTS, COUNT, TX}, {nic_stats::TX_BYTES, COUNT, TX, 1, 1, 0, SIZE},
          {nic_stats::RX_ERRORS[0], COUNT, RX_ERRORS, 1, 36, 0}, {nic_stats::RX_ERRORS[1], COUNT, RX_ERRORS, 2, 36, 1},
          {nic_stats::RX_ERRORS[2], COUNT, RX_ERRORS, 3, 36, 3}, {nic_stats::RX_ERRORS[3], COUNT, RX_ERRORS, 4, 36, 6},
          {nic_stats::RX_ERRORS[4], COUNT, RX_ERRORS, 5, 36, 10}, {nic_stats::RX_ERRORS[5], COUNT, RX_ERRORS, 6, 36, 15},
          {nic_stats::RX_ERRORS[6], COUNT, RX_ERRORS, 7, 36, 21}, {nic_stats::RX_ERRORS[7], COUNT, RX_ERRORS, 8, 36, 28},
          {nic_stats::TX_ERRORS[0], COUNT, TX_ERRORS, 1, 28, 0}, {nic_stats::TX_ERRORS[1], COUNT, TX_ERRORS, 2, 28, 1},
          {nic_stats::TX_ERRORS[2], COUNT, TX_ERRORS, 3, 28, 3}, {nic_stats::TX_ERRORS[3], COUNT, TX_ERRORS, 4, 28, 6},
          {nic_stats::TX_ERRORS[4], COUNT, TX_ERRORS, 5, 28, 10}, {nic_stats::TX_ERRORS[5], COUNT, TX_ERRORS, 6, 28, 15},
          {nic_stats::TX_ERRORS[6], COUNT, TX_ERRORS, 7, 28, 21}},
         {}},
        {NODE_TXQ_INFO, {{queue_info::COUNT, LEVEL, TX_QUEUES}}, {}},
        {NODE_RXQ_INFO, {{queue_info::COUNT, LEVEL, RX_QUEUES}}, {}},
        {NODE_TXQ_STATS,
         {{txq_stats::PKTS, QUEUED, TX}, {txq_stats::ERRORS, COUNT, TX_ERRORS, 1, 1, 0, HAS_ERRORS},
          {txq_stats::STOPS, COUNT, TX_ERRORS, 2, 1, 0, HAS_ERRORS}},
         {}},
        {NODE_RXQ_FILTER, {{rxq_filter::PORT, LEVEL, PORT}}, {}},
        {NODE_TOPOLOGY,
         {{topology::PACKAGES, LEVEL, PACKAGES}, {topology::CORES, LEVEL, CORES}, {topology::PCPUS, LEVEL, PCPUS}},
         {}},
        {NODE_PCPU_INFO, {{pcpu_info::LLC, LEVEL, LLC}}, {}},
        {NODE_PCPU_STATS,
         {{pcpu_stats::BUSY, COUNT, USED}, {pcpu_stats::WORLDLETS, COUNT, IN_WORLDLETS},
          {pcpu_stats::ELAPSED, LIFETIME}},
         {}},
        {NODE_CONFIG_OPTION, {}, {{config_option::VALUE, NAME}}},
        {NODE_WORLD_CARTEL, {{vcpu_chain::CARTEL, LEVEL, CARTEL}}, {}},
        {NODE_CARTEL_GROUP, {{vcpu_chain::GROUP, LEVEL, GROUP}}, {}},
        {NODE_GROUP_LEADER, {{vcpu_chain::LEADER, LEVEL, VCPU_LEADER}}, {}},
        {NODE_VCPU_TIMES,
         {{vcpu_times::ELAPSED, LIFETIME}, {vcpu_times::USED, COUNT, USED}, {vcpu_times::COSTOP, COUNT, COSTOP},
          {vcpu_times::READY, COUNT, READY}},
         {}},
        {NODE_VCPU_EVENTS, {{vcpu_events::ACT_NOT, COUNT, USED, 7, 1000}}, {}},
        {NODE_VCPU_MIGRATIONS, {{vcpu_migrations::COUNT, COUNT, USED, 1, 10000}}, {}},
        {NODE_VCPU_L3, {{vcpu_migrations::COUNT, COUNT, USED, 1, 50000}}, {}},
        {NODE_WORLDLET_STATS,
         {{worldlet_stats::AFFINE_PCPU, LEVEL, AFFINE_PCPU}, {worldlet_stats::AFFINE_VCPU, LEVEL, AFFINE_VCPU},
          {worldlet_stats::AFFINE_WORLDLET, LEVEL, AFFINE_WORLDLET}, {worldlet_stats::RUNS, COUNT, USED, 1, 20000},
          {worldlet_stats::MIGRATIONS, COUNT, USED, 1, 10000000}, {worldlet_stats::OVERRUNS, COUNT, USED, 1, 5000000},
          {worldlet_stats::REMOTE_ACTS, COUNT, USED, 1, 50000}, {worldlet_stats::USED, COUNT, USED},
          {worldlet_stats::READY, COUNT, READY}, {worldlet_stats::WAIT, COUNT, WAIT}},
         {}},
        {NODE_VECTOR_STATS, {{vector_stats::COUNT, COUNT, RATE}, {vector_stats::TIME, COUNT, TIME}}, {}},
        {NODE_TIME, {{host_time::SECONDS, SECONDS}, {host_time::NANOSECONDS, NANOSECONDS}}, {}},
        {NODE_IPV4,
         {{ipv4::RX_PKTS, COUNT, RX}, {ipv4::RX_ERRORS, COUNT, RX, 1, 100000}, {ipv4::RX_DELIVERED, COUNT, RX, 19, 20},
          {ipv4::TX_PKTS, COUNT, TX}, {ipv4::TX_ERRORS, COUNT, TX, 1, 100000}, {ipv4::RX_REASSEMBLED, COUNT, RX, 1, 50},
          {ipv4::TX_FRAGMENTS, COUNT, TX, 1, 100}},
         {}},
        {NODE_IPV6,
         {{ipv6::RX_PKTS, COUNT, RX, 1, 4}, {ipv6::RX_ERRORS, COUNT, RX, 1, 200000},
          {ipv6::RX_DELIVERED, COUNT, RX, 1, 5}, {ipv6::TX_PKTS, COUNT, TX, 1, 4},
          {ipv6::TX_ERRORS, COUNT, TX, 1, 400000}, {ipv6::RX_REASSEMBLED, COUNT, RX, 1, 200},
          {ipv6::TX_FRAGMENTS, COUNT, TX, 1, 400}},
         {}},
        {NODE_TCP,
         {{tcp::TX_DELAYED_ACKS, COUNT, TX, 3, 20}, {tcp::TX_SEGMENTS, COUNT, TX, 4, 5},
          {tcp::TX_DATA_SEGMENTS, COUNT, TX, 1, 2}, {tcp::TX_DATA_BYTES, COUNT, TX, 1, 2, 0, SIZE},
          {tcp::TX_RETRANSMITTED, COUNT, TX, 1, 200}, {tcp::TX_ACK_ONLY, COUNT, TX, 1, 4},
          {tcp::TX_WINDOW_PROBES, COUNT, TX, 1, 500}, {tcp::TX_WINDOW_UPDATES, COUNT, TX, 1, 250},
          {tcp::RX_SEGMENTS, COUNT, RX, 3, 4}, {tcp::RX_DATA_SEGMENTS, COUNT, RX, 3, 5},
          {tcp::RX_DATA_BYTES, COUNT, RX, 3, 5, 0, LRO_SIZE}, {tcp::RX_ERRORS[0], COUNT, RX, 1, 100000},
          {tcp::RX_ERRORS[1], COUNT, RX, 2, 100000}, {tcp::RX_ERRORS[2], COUNT, RX, 3, 100000},
          {tcp::RX_ERRORS[3], COUNT, RX, 4, 100000}, {tcp::RX_DUPLICATES, COUNT, RX, 7, 100000},
          {tcp::RX_OUT_OF_ORDER, COUNT, RX, 9, 100000}, {tcp::RX_ERRORS[4], COUNT, RX, 5, 100000},
          {tcp::RX_WINDOW_PROBES, COUNT, RX, 11, 100000}, {tcp::RX_WINDOW_UPDATES, COUNT, RX, 13, 100000},
          {tcp::RX_ERRORS[5], COUNT, RX, 6, 100000}, {tcp::TX_SACK_RETRANSMITTED, COUNT, TX, 1, 400}},
         {}},
        {NODE_UDP,
         {{udp::RX_DATAGRAMS, COUNT, RX, 1, 5}, {udp::RX_ERRORS[0], COUNT, RX, 1, 100000},
          {udp::RX_ERRORS[1], COUNT, RX, 2, 100000}, {udp::RX_ERRORS[2], COUNT, RX, 3, 100000},
          {udp::RX_ERRORS[3], COUNT, RX, 4, 100000}, {udp::RX_ERRORS[4], COUNT, RX, 5, 100000},
          {udp::RX_SOCKET_LOST, COUNT, RX, 7, 100000}, {udp::TX_DATAGRAMS, COUNT, TX, 1, 8}},
         {}},
    };
    // clang-format on
    return kinds;
}

// Appends a bucket for each limit, the share of each its place in the row.
void AppendBuckets(Fields *fields, const Limits &limits, Slot slot) {
    auto buckets = static_cast<i64>(limits.size());
    for (u32 i = 0; i < limits.size(); i++) {
        i64 place = i64{i} + 1;
        fields->push_back(
            {histogram::BucketCount(i), COUNT, slot, place, buckets * (buckets + 1) / 2, place * (place - 1) / 2});
        fields->push_back({histogram::BucketLimit(i), LEVEL, ONE, limits[i]});
    }
}

// The limit of a port histogram's last bucket is not told: noise stands there.
RecordKind PortHistogram(u32 node, Slot slot, const Limits &limits, i64 scale) {
    RecordKind kind = {node, {}, {}};
    Limits all = limits;
    all.push_back(0);
    AppendBuckets(&kind.fields, all, slot);
    kind.fields.pop_back();
    kind.fields.push_back({histogram::MIN, SOME, ONE, scale});
    kind.fields.push_back({histogram::MAX, SOME, ONE, limits.back() + scale});
    kind.fields.push_back({histogram::MEAN, SOME, ONE, limits[limits.size() / 2] + scale});
    kind.fields.push_back({histogram::COUNT, TOTAL});
    return kind;
}

// A period a millisecond. Twelve buckets are in use; the limit of 0 behind them says so, and what follows it is noise.
RecordKind VcpuHistogram(Slot slot) {
    RecordKind kind = {NODE_VCPU_HISTO, {}, {}, 1000};
    const Limits limits = {2, 5, 10, 20, 50, 100, 200, 500, 1000, 5000, 20000, 100000};
    AppendBuckets(&kind.fields, limits, slot);
    kind.fields.push_back({histogram::COUNT, TOTAL});
    kind.fields.push_back({histogram::BucketLimit(static_cast<u32>(limits.size())), LEVEL, ONE, 0});
    return kind;
}

const std::unordered_map<u32, RecordKind> &Kinds() {
    static const auto &kinds = *[] {
        std::unordered_map<u32, RecordKind> all;
        for (const RecordKind &kind : FixedKinds()) {
            all.emplace(kind.node, kind);
        }
        const Limits clusters = {1, 2, 3, 4, 6, 8, 12, 16, 24, 32, 48, 64, 96, 128};
        const Limits sizes = {64, 128, 256, 512, 768, 1024, 1280, 1514, 4096, 9014, 32768};
        const Limits intervals = {1,    2,    5,    10,    20,    50,    100,    200,    500,
                                  1000, 2000, 5000, 10000, 20000, 50000, 100000, 200000, 500000};
        for (const RecordKind &kind :
             {PortHistogram(NODE_CLUSTERS_IN, TX, clusters, 1), PortHistogram(NODE_CLUSTERS_OUT, RX, clusters, 2),
              PortHistogram(NODE_SIZES_IN, TX, sizes, 60), PortHistogram(NODE_SIZES_OUT, RX, sizes, 66),
              PortHistogram(NODE_INTERVALS_IN, TX, intervals, 3),
              PortHistogram(NODE_INTERVALS_OUT, RX, intervals, 4)}) {
            all.emplace(kind.node, kind);
        }
        all.emplace(NODE_VCPU_HISTO, VcpuHistogram(USED));
        return new auto(std::move(all));  // never destroyed: reads may come at the very end
    }();
    return kinds;
}

const RecordKind *Kind(u32 node) {
    return &Kinds().at(node);
}

Entity *NewEntity(Host *host) {
    Entity *entity = &host->entities.emplace_back();
    entity->value[ONE] = 1;
    entity->phase = static_cast<u32>(Hashed(host->entities.size()));
    return entity;
}

void AppendList(Host *host, std::string key, const KnfParamRec &entry) {
    host->lists[std::move(key)].push_back(entry);
}

// A locally administered address that tells kind and port; least significant byte first, as it lies in the record.
i64 MacOf(i64 kind, i64 port) {
    return 0x02 | kind << 8 | (port >> 24 & 255) << 16 | (port >> 16 & 255) << 24 | (port >> 8 & 255) << 32 |
           (port & 255) << 40;
}

void AddVcpu(Host *host, i64 id, const Entity *times) {
    static const auto &histograms =
        *new std::vector<std::pair<const char *, RecordKind>>{{"RUN", VcpuHistogram(USED)},
                                                              {"READY", VcpuHistogram(READY)},
                                                              {"COSTOP", VcpuHistogram(COSTOP)},
                                                              {"WAIT", VcpuHistogram(WAIT)}};
    for (u32 node : {NODE_VCPU_TIMES, NODE_VCPU_EVENTS, NODE_VCPU_MIGRATIONS}) {
        HostAdd(host, HostKey(node, id), Kind(node), times);
    }
    HostAdd(host, HostKey(NODE_VCPU_L3, {ParamOf(id), ParamOf("L3")}), Kind(NODE_VCPU_L3), times);
    for (const auto &[name, kind] : histograms) {
        HostAdd(host, HostKey(NODE_VCPU_HISTO, {ParamOf(id), ParamOf(name)}), &kind, times, &host->vcpuHistos);
    }
}

void SetScheme(Host *host, Entity *entity, i64 scheme) {
    const char *names[] = {"off", "fixed", "adaptive"};
    bool known = scheme >= 0 && scheme <= 2;
    entity->value[SCHEME] = scheme;
    entity->text[SCHEME_NAME] = HostText(host, known ? names[scheme] : "scheme-" + std::to_string(scheme));
    entity->text[SCHEME_PARAMS] = HostText(host, scheme == 1   ? "rxdepth=64,txdepth=32"
                                                 : scheme == 2 ? "rate=4000"
                                                               : "");
}

void AddVnic(Host *host, const PortSpec &spec, Entity *entity) {
    SetScheme(host, entity, spec.scheme);
    std::vector<u32> nodes = {NODE_TX_WORLDLET, NODE_COALESCE};
    if (spec.scheme == 1) {
        nodes.insert(nodes.end(), {NODE_COALESCE_RX, NODE_COALESCE_TX, NODE_COALESCE_TXCOMP});
    } else if (spec.scheme == 2) {
        nodes.push_back(NODE_COALESCE_2);
    }
    if (spec.subType == MODEL_PARLAN2) {
        nodes.push_back(NODE_PARLAN2);
    } else if (spec.subType == MODEL_PARLAN3) {
        nodes.insert(nodes.end(), {NODE_PARLAN3_TX, NODE_PARLAN3_RX});
        Params queue = {ParamOf(spec.switchName), ParamOf(spec.port), ParamOf(int64_t{0})};
        HostAdd(host, HostKey(NODE_PARLAN3_QUEUE, queue), Kind(NODE_PARLAN3_QUEUE), entity);
    }
    for (u32 node : nodes) {
        HostAdd(host, HostKey(node, spec.switchName, spec.port), Kind(node), entity);
    }
}

// Of the packets, the first queue carries most, each further one half of what is left, and the last one whatever
// remains: those whose number ends in so many zeros in binary. Or the first one its per mille, and the others the rest
// alike.
void SetShare(Entity *queue, i64 number, const NicSpec &spec) {
    i64 last = spec.txQueues - 1;
    i64 *value = queue->value;
    if (spec.first && last > 0) {
        i64 others = (1000 - *spec.first) * (number == 0 ? 0 : 1);
        value[SHARE] = number == 0 ? *spec.first * last : others;
        value[SHARE_OF] = 1000 * last;
        value[SHARE_FROM] = number == 0 ? 0 : *spec.first * last + others * (number - 1);
    } else {
        i64 halved = std::min(number, HALVED_QUEUES);
        bool takesRest = number == std::min(last, HALVED_QUEUES);
        value[SHARE] = number <= HALVED_QUEUES ? 1 : 0;
        value[SHARE_OF] = i64{1} << (takesRest ? halved : halved + 1);
        value[SHARE_FROM] = takesRest ? value[SHARE_OF] - 1 : (i64{1} << halved) - 1;
    }
}

}  // namespace

void NodesAddHost(Host *host, const HostSpec &spec) {
    for (u32 node : {NODE_SWITCH_LIST, NODE_VECTOR_LIST, NODE_WORLDLET_LIST}) {
        host->lists[HostKey(node)] = {};
    }
    host->load = spec.load;
    host->age = spec.uptime * 1000000 + static_cast<i64>(Hashed(static_cast<u64>(spec.uptime)) % 1000000);
    Entity *general = NewEntity(host);
    general->value[PCPUS] = spec.pcpus;
    general->value[PACKAGES] = spec.packages;
    general->value[CORES] = spec.cores;
    general->value[LLC] = spec.llc;
    general->text[NAME] = HostText(host, spec.name);
    HostAdd(host, HostKey(NODE_TOPOLOGY), Kind(NODE_TOPOLOGY), general);
    HostAdd(host, HostKey(NODE_TIME), Kind(NODE_TIME), general);
    const RecordKind *option = Kind(NODE_CONFIG_OPTION);
    HostAdd(host, HostKey(NODE_CONFIG_OPTION, {ParamOf("Misc"), ParamOf("HostName")}), option, general);
    host->trackOption = NewEntity(host);
    host->trackOption->text[NAME] = HostText(host, "0");
    HostAdd(host, HostKey(NODE_CONFIG_OPTION, {ParamOf("Cpu"), ParamOf("TrackHistos")}), option, host->trackOption);
    for (i64 pcpu = 0; pcpu < spec.pcpus; pcpu++) {
        Entity *entity = host->pcpus[pcpu] = NewEntity(host);
        entity->value[USED] = entity->value[IN_WORLDLETS] = UNSTATED;
        HostAdd(host, HostKey(NODE_PCPU_STATS, pcpu), Kind(NODE_PCPU_STATS), entity);
        HostAdd(host, HostKey(NODE_PCPU_INFO, pcpu), Kind(NODE_PCPU_INFO), general);
    }
    host->self = NewEntity(host);
    NodesSetSelf(host, 2);
    host->plan.runs.push_back({host->self, 1, UNSTATED, false, true});
    AddVcpu(host, getpid(), host->self);
    host->stack = NewEntity(host);
    host->stack->load = host->load;
    host->stack->value[SIZE] = 1400;
    host->stack->value[LRO_SIZE] = 1000;
    for (u32 node : {NODE_IPV4, NODE_IPV6, NODE_TCP, NODE_UDP}) {
        HostAdd(host, HostKey(node), Kind(node), host->stack);
    }
}

void NodesSetPcpu(Host *host, i64 pcpu, std::optional<i64> busy, std::optional<i64> worldlet) {
    Entity *entity = host->pcpus.at(pcpu);
    entity->value[USED] = busy ? *busy * PER_MILLE : UNSTATED;
    entity->value[IN_WORLDLETS] = worldlet ? *worldlet * PER_MILLE : UNSTATED;
}

void NodesSetSelf(Host *host, i64 used) {
    host->self->value[USED] = used * PER_MILLE;
}

void NodesSetStack(Host *host, std::optional<i64> tx, std::optional<i64> rx, LoadCurve *load) {
    host->stack->load = load;
    host->stack->value[TX] = tx.value_or(0);
    host->stack->value[RX] = rx.value_or(0);
    host->plan.stackTxStated = tx.has_value();
    host->plan.stackRxStated = rx.has_value();
}

void NodesAddSwitch(Host *host, const std::string &name) {
    AppendList(host, HostKey(NODE_SWITCH_LIST), ParamOf(name));
    host->lists[HostKey(NODE_SWITCH_PORTS, name)] = {};
}

// The ids of the chain differ from one another and in every field; vcpu ids stand above all process ids.
void NodesAddVm(Host *host, const VmSpec &spec) {
    Entity *entity = NewEntity(host);
    entity->load = spec.load;
    entity->value[LEADER] = spec.leader;
    entity->value[VCPUS] = spec.vcpus;
    entity->value[USED] = spec.used * PER_MILLE;
    entity->value[READY] = spec.ready * PER_MILLE;
    entity->value[COSTOP] = spec.costop * PER_MILLE;
    entity->value[WAIT] = (1000 - spec.used - spec.ready - spec.costop) * PER_MILLE;
    entity->value[CARTEL] = spec.leader + 1;
    entity->value[GROUP] = 0x100000000 + spec.leader;
    entity->value[VCPU_LEADER] = spec.leader + 2;
    HostAdd(host, HostKey(NODE_WORLD_CARTEL, spec.leader), Kind(NODE_WORLD_CARTEL), entity);
    HostAdd(host, HostKey(NODE_CARTEL_GROUP, entity->value[CARTEL]), Kind(NODE_CARTEL_GROUP), entity);
    HostAdd(host, HostKey(NODE_GROUP_LEADER, entity->value[GROUP]), Kind(NODE_GROUP_LEADER), entity);
    Params &vcpus = host->lists[HostKey(NODE_VCPU_LIST, entity->value[VCPU_LEADER])];
    for (i64 i = 0; i < spec.vcpus; i++) {
        i64 id = NodesVcpuId(spec.leader, i);
        vcpus.push_back(ParamOf(id));
        AddVcpu(host, id, entity);
    }
    host->plan.runs.push_back({entity, spec.vcpus, spec.pcpu, false, true});
    host->vms[spec.name] = entity;
}

Entity *NodesAddPort(Host *host, const PortSpec &spec) {
    Entity *entity = NewEntity(host);
    entity->load = spec.load;
    entity->value[TX] = spec.tx.value_or(0);
    entity->value[RX] = spec.rx.value_or(0);
    entity->value[TX_ERRORS] = spec.txErrors;
    entity->value[RX_ERRORS] = spec.rxErrors;
    NodesSetSize(entity, spec.size.value_or(DEFAULT_SIZE));
    entity->value[PORT] = spec.port;
    entity->value[TYPE] = spec.type;
    entity->value[SUB_TYPE] = spec.subType;
    entity->value[LEADER] = spec.leader;
    entity->value[FLAGS] = spec.flags;
    entity->value[MAC] = MacOf(0x0a, spec.port);
    entity->value[VNIC_MAC] = MacOf(0x0b, spec.port);
    entity->text[NAME] = HostText(host, spec.client);
    entity->text[SWITCH_NAME] = HostText(host, spec.switchName);
    HostAdd(host, HostKey(NODE_PORT_TYPE, spec.port), Kind(NODE_PORT_TYPE), entity);
    for (u32 node : {NODE_PORT_STATUS, NODE_PORT_STATS}) {
        HostAdd(host, HostKey(node, spec.switchName, spec.port), Kind(node), entity);
    }
    for (const HistogramNodes &nodes : HISTOGRAM_NODES) {
        for (u32 node : {nodes.input, nodes.output}) {
            Tracker *tracker = &host->trackers.emplace_back(Tracker{true});
            HostAdd(host, HostKey(node, spec.switchName, spec.port), Kind(node), entity, tracker);
        }
    }
    if (spec.type == PORT_VNIC) {
        AddVnic(host, spec, entity);
    }
    AppendList(host, HostKey(NODE_SWITCH_PORTS, spec.switchName), ParamOf(spec.port));
    host->plan.ports.push_back({entity, entity->text[SWITCH_NAME], spec.type, spec.tx.has_value(), spec.rx.has_value(),
                                spec.size.has_value()});
    return entity;
}

// The NIC has the counters of its port, and its queues have shares of them.
void NodesAddNic(Host *host, const NicSpec &spec, Entity *port) {
    auto rxQueues = static_cast<i64>(spec.filters.size());
    port->value[TX_QUEUES] = spec.txQueues;
    port->value[RX_QUEUES] = rxQueues;
    port->text[DEVICE] = HostText(host, spec.device);
    for (u32 node : {NODE_NIC_PROPERTIES, NODE_NIC_STATS, NODE_TXQ_INFO, NODE_RXQ_INFO}) {
        HostAdd(host, HostKey(node, spec.name), Kind(node), port);
    }
    for (i64 number = 0; number < spec.txQueues; number++) {
        Entity *queue = NewEntity(host);
        queue->more = port;
        queue->phase = port->phase;
        queue->value[HAS_ERRORS] = number == 0 ? 1 : 0;
        SetShare(queue, number, spec);
        HostAdd(host, HostKey(NODE_TXQ_STATS, spec.name, number), Kind(NODE_TXQ_STATS), queue);
    }
    for (i64 number = 0; number < rxQueues; number++) {
        Params &filters = host->lists[HostKey(NODE_RXQ_FILTERS, spec.name, number)];
        for (i64 i = 0; i < spec.filters[static_cast<size_t>(number)]; i++) {
            Entity *filter = NewEntity(host);
            filters.push_back(ParamOf(10 * (number + 1) + i));
            HostAdd(host, HostKey(NODE_RXQ_FILTER, {ParamOf(spec.name), ParamOf(number), filters.back()}),
                    Kind(NODE_RXQ_FILTER), filter);
            host->plan.filters.push_back({filter, port->value[PORT], port->text[SWITCH_NAME]});
        }
    }
}

// One that states no affinity is bound to a pcpu, each to the next.
void NodesAddWorldlet(Host *host, const WorldletSpec &spec) {
    Params &names = host->lists[HostKey(NODE_WORLDLET_LIST)];
    auto id = static_cast<i64>(names.size());
    auto pcpus = static_cast<i64>(host->pcpus.size());
    bool bound = spec.vcpu == 0 && spec.worldlet == MAX_ID;
    Entity *entity = NewEntity(host);
    entity->load = spec.load;
    entity->value[USED] = spec.used * WORLDLET_PER_MILLE;
    entity->value[READY] = spec.ready * WORLDLET_PER_MILLE;
    entity->value[WAIT] = spec.wait.value_or(0) * WORLDLET_PER_MILLE;
    entity->value[WORLDLET_ID] = id;
    entity->value[AFFINE_PCPU] = spec.pcpu.value_or(pcpus > 0 ? id % pcpus : 0);
    entity->value[AFFINE_VCPU] = spec.vcpu;
    entity->value[AFFINE_WORLDLET] = spec.worldlet;
    names.push_back(ParamOf(spec.name));
    HostAdd(host, HostKey(NODE_WORLDLET_STATS, spec.name), Kind(NODE_WORLDLET_STATS), entity);
    host->plan.runs.push_back({entity, 1, bound ? entity->value[AFFINE_PCPU] : UNSTATED, true, spec.wait.has_value()});
}

// Rate and time are spread over the pcpus as evenly as integers allow, the remainder one by one from pcpu 0 on.
void NodesAddVector(Host *host, const VectorSpec &spec) {
    AppendList(host, HostKey(NODE_VECTOR_LIST), ParamOf(spec.vector));
    host->lists[HostKey(NODE_VECTOR_NAMES, spec.vector)] = spec.names;
    auto pcpus = static_cast<i64>(host->pcpus.size());
    for (i64 pcpu = 0; pcpu < pcpus; pcpu++) {
        Entity *entity = NewEntity(host);
        entity->load = spec.load;
        entity->value[RATE] = spec.rate / pcpus + (pcpu < spec.rate % pcpus ? 1 : 0);
        entity->value[TIME] = spec.time / pcpus + (pcpu < spec.time % pcpus ? 1 : 0);
        HostAdd(host, HostKey(NODE_VECTOR_STATS, {ParamOf(spec.vector), ParamOf(pcpu)}), Kind(NODE_VECTOR_STATS),
                entity);
    }
}

void NodesSettle(Host *host) {
    TrafficSettle(host);
    ScheduleSettle(host);
    host->plan = {};
}

i64 NodesVcpuId(i64 leader, i64 number) {
    return 10000000 + leader * 1000 + number;
}

void NodesAddRate(Host *host, Entity *entity, LoadCurve *load, Slot slot, i64 rate) {
    if (rate == 0) {
        return;
    }
    Entity *part = entity;
    while (part->load != load && part->more != nullptr) {
        part = part->more;
    }
    if (part->load != load) {
        part->more = NewEntity(host);
        part = part->more;
        part->load = load;
    }
    part->value[slot] = std::clamp(part->value[slot] + rate, -MAX_RATE, MAX_RATE);
}

// Segments that the NIC cuts or joins are larger than packets: a third of the packets has four fifths of the bytes, two
// fifths have seven tenths.
void NodesSetSize(Entity *entity, i64 size) {
    entity->value[SIZE] = size;
    entity->value[TSO_SIZE] = size * 12 / 5;
    entity->value[LRO_SIZE] = size * 7 / 4;
}
