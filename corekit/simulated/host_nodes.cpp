#include "corekit/simulated/host_nodes.h"

#include <unistd.h>
#include <utility>

namespace {

using Fields = std::vector<Field>;
using Limits = std::vector<i64>;

// What moves in each record, one row a node: fields, then texts. Factors differ between neighbours that follow one
// rate, so that figures taken from the wrong field show.
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
         {{port_stats::TX_PKTS, COUNT, TX_MAIN}, {port_stats::TX_BYTES, COUNT, TX_BYTES_MAIN},
          {port_stats::TX_DROPPED, COUNT, ERRORS}, {port_stats::TX_PKTS_EXTRA, COUNT, TX_EXTRA},
          {port_stats::TX_BYTES_EXTRA, COUNT, TX_BYTES_EXTRA}, {port_stats::RX_PKTS, COUNT, RX},
          {port_stats::RX_BYTES, COUNT, RX_BYTES}, {port_stats::RX_DROPPED, COUNT, ERRORS, 2}},
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
          {parlan2::QUEUE_STOPS, COUNT, ERRORS, 3}, {parlan2::TX_OVERFLOW, COUNT, ERRORS, 1},
          {parlan2::INTERRUPTS, COUNT, RX, 1, 6}, {parlan2::RX_BUF_UNDERFLOW, COUNT, ERRORS, 2},
          {parlan2::OUT_OF_SLOTS, COUNT, ERRORS, 4}, {parlan2::RX_OVERFLOW, COUNT, ERRORS, 5},
          {parlan2::RX_ERR_A, COUNT, ERRORS, 6}, {parlan2::RING2_ERRORS, COUNT, ERRORS, 7},
          {parlan2::MAX_FRAGS, COUNT, ERRORS, 8}, {parlan2::MAP_FAILURES, COUNT, ERRORS, 9},
          {parlan2::RX_ERR_B, COUNT, ERRORS, 10}, {parlan2::RX_ERR_C, COUNT, ERRORS, 11},
          {parlan2::RX_ERR_D, COUNT, ERRORS, 12}},
         {}},
        {NODE_PARLAN3_TX,
         {{parlan3_tx::PKTS, COUNT, TX}, {parlan3_tx::BYTES, COUNT, TX_BYTES},
          {parlan3_tx::TSO_PKTS, COUNT, TX, 1, 3}, {parlan3_tx::TSO_BYTES, COUNT, TX_BYTES, 4, 5},
          {parlan3_tx::UCAST_PKTS, COUNT, TX, 9, 10}, {parlan3_tx::ERRORS, COUNT, ERRORS, 1},
          {parlan3_tx::DISCARDS, COUNT, ERRORS, 2}, {parlan3_tx::ALLOC_ERRORS, COUNT, ERRORS, 3},
          {parlan3_tx::QUEUE_STOPS, COUNT, ERRORS, 4}, {parlan3_tx::TSO_SPLITS, COUNT, ERRORS, 5}},
         {}},
        {NODE_PARLAN3_RX,
         {{parlan3_rx::LRO_PKTS, COUNT, RX, 2, 5}, {parlan3_rx::LRO_BYTES, COUNT, RX_BYTES, 7, 10},
          {parlan3_rx::PKTS, COUNT, RX}, {parlan3_rx::BYTES, COUNT, RX_BYTES},
          {parlan3_rx::UCAST_PKTS, COUNT, RX, 19, 20}, {parlan3_rx::ERR_A, COUNT, ERRORS, 2},
          {parlan3_rx::ERR_B, COUNT, ERRORS, 3}, {parlan3_rx::RING1_FULL, COUNT, ERRORS, 4},
          {parlan3_rx::RING2_FULL, COUNT, ERRORS, 5}, {parlan3_rx::SG_ERRORS, COUNT, ERRORS, 6}},
         {}},
        {NODE_PARLAN3_QUEUE,
         {{parlan3_queue::RING1_SIZE, LEVEL, ONE, 512}, {parlan3_queue::RING2_SIZE, LEVEL, ONE, 128}},
         {}},
        {NODE_NIC_PROPERTIES, {{nic_properties::PORT, LEVEL, PORT}}, {{nic_properties::DEVICE, NAME}}},
        // Receive errors add up to 2 x ERRORS, transmit errors to ERRORS, in shares that all differ.
        {NODE_NIC_STATS,
         {{nic_stats::RX_PKTS, COUNT, RX}, {nic_stats::TX_PKTS, COUNT, TX}, {nic_stats::RX_BYTES, COUNT, RX_BYTES},
          {nic_stats::TX_BYTES, COUNT, TX_BYTES}, {nic_stats::RX_ERRORS[0], COUNT, ERRORS, 1, 18},
          {nic_stats::TX_ERRORS[0], COUNT, ERRORS, 1, 28}, {nic_stats::RX_ERRORS[1], COUNT, ERRORS, 2, 18},
          {nic_stats::TX_ERRORS[1], COUNT, ERRORS, 2, 28}, {nic_stats::RX_ERRORS[2], COUNT, ERRORS, 3, 18},
          {nic_stats::RX_ERRORS[3], COUNT, ERRORS, 4, 18}, {nic_stats::RX_ERRORS[4], COUNT, ERRORS, 5, 18},
          {nic_stats::RX_ERRORS[5], COUNT, ERRORS, 6, 18}, {nic_stats::RX_ERRORS[6], COUNT, ERRORS, 7, 18},
          {nic_stats::RX_ERRORS[7], COUNT, ERRORS, 8, 18}, {nic_stats::TX_ERRORS[2], COUNT, ERRORS, 3, 28},
          {nic_stats::TX_ERRORS[3], COUNT, ERRORS, 4, 28}, {nic_stats::TX_ERRORS[4], COUNT, ERRORS, 5, 28},
          {nic_stats::TX_ERRORS[5], COUNT, ERRORS, 6, 28}, {nic_stats::TX_ERRORS[6], COUNT, ERRORS, 7, 28}},
         {}},
        {NODE_TXQ_INFO, {{queue_info::COUNT, LEVEL, TX_QUEUES}}, {}},
        {NODE_RXQ_INFO, {{queue_info::COUNT, LEVEL, RX_QUEUES}}, {}},
        {NODE_TXQ_STATS,
         {{txq_stats::PKTS, COUNT, TX}, {txq_stats::ERRORS, COUNT, ERRORS}, {txq_stats::STOPS, COUNT, ERRORS, 2}},
         {}},
        {NODE_RXQ_FILTER, {{rxq_filter::PORT, LEVEL, PORT}}, {}},
        {NODE_TOPOLOGY,
         {{topology::PACKAGES, LEVEL, PACKAGES}, {topology::CORES, LEVEL, CORES}, {topology::PCPUS, LEVEL, PCPUS}},
         {}},
        {NODE_PCPU_INFO, {{pcpu_info::LLC, LEVEL, LLC}}, {}},
        {NODE_PCPU_STATS,
         {{pcpu_stats::BUSY, COUNT, USED, 1000}, {pcpu_stats::WORLDLETS, COUNT, IN_WORLDLETS, 1000},
          {pcpu_stats::ELAPSED, COUNT, ONE, 1000000}},
         {}},
        {NODE_CONFIG_OPTION, {}, {{config_option::VALUE, NAME}}},
        {NODE_WORLD_CARTEL, {{vcpu_chain::CARTEL, LEVEL, CARTEL}}, {}},
        {NODE_CARTEL_GROUP, {{vcpu_chain::GROUP, LEVEL, GROUP}}, {}},
        {NODE_GROUP_LEADER, {{vcpu_chain::LEADER, LEVEL, VCPU_LEADER}}, {}},
        {NODE_VCPU_TIMES,
         {{vcpu_times::ELAPSED, COUNT, ONE, 1000000}, {vcpu_times::USED, COUNT, USED, 1000},
          {vcpu_times::COSTOP, COUNT, COSTOP, 1000}, {vcpu_times::READY, COUNT, READY, 1000}},
         {}},
        {NODE_VCPU_EVENTS, {{vcpu_events::ACT_NOT, COUNT, USED, 7}}, {}},
        {NODE_VCPU_MIGRATIONS, {{vcpu_migrations::COUNT, COUNT, USED, 1, 10}}, {}},
        {NODE_VCPU_L3, {{vcpu_migrations::COUNT, COUNT, USED, 1, 50}}, {}},
        {NODE_WORLDLET_STATS,
         {{worldlet_stats::AFFINE_PCPU, LEVEL, AFFINE_PCPU}, {worldlet_stats::AFFINE_VCPU, LEVEL, AFFINE_VCPU},
          {worldlet_stats::AFFINE_WORLDLET, LEVEL, AFFINE_WORLDLET}, {worldlet_stats::RUNS, COUNT, USED, 50},
          {worldlet_stats::MIGRATIONS, COUNT, USED, 1, 10}, {worldlet_stats::OVERRUNS, COUNT, USED, 1, 5},
          {worldlet_stats::REMOTE_ACTS, COUNT, USED, 20}, {worldlet_stats::USED, COUNT, USED, 1000000},
          {worldlet_stats::READY, COUNT, READY, 1000000}, {worldlet_stats::WAIT, COUNT, WAIT, 1000000}},
         {}},
        {NODE_VECTOR_STATS, {{vector_stats::COUNT, COUNT, RATE}, {vector_stats::TIME, COUNT, TIME}}, {}},
        {NODE_TIME, {{host_time::SECONDS, SECONDS}, {host_time::NANOSECONDS, NANOSECONDS}}, {}},
        {NODE_IPV4,
         {{ipv4::RX_PKTS, COUNT, RX}, {ipv4::RX_ERRORS, COUNT, RX, 1, 1000}, {ipv4::RX_DELIVERED, COUNT, RX, 19, 20},
          {ipv4::TX_PKTS, COUNT, TX}, {ipv4::TX_ERRORS, COUNT, TX, 1, 1000}, {ipv4::RX_REASSEMBLED, COUNT, RX, 1, 50},
          {ipv4::TX_FRAGMENTS, COUNT, TX, 1, 100}},
         {}},
        {NODE_IPV6,
         {{ipv6::RX_PKTS, COUNT, RX, 1, 4}, {ipv6::RX_ERRORS, COUNT, RX, 1, 2000},
          {ipv6::RX_DELIVERED, COUNT, RX, 1, 5}, {ipv6::TX_PKTS, COUNT, TX, 1, 4},
          {ipv6::TX_ERRORS, COUNT, TX, 1, 4000}, {ipv6::RX_REASSEMBLED, COUNT, RX, 1, 200},
          {ipv6::TX_FRAGMENTS, COUNT, TX, 1, 400}},
         {}},
        {NODE_TCP,
         {{tcp::TX_DELAYED_ACKS, COUNT, TX, 3, 20}, {tcp::TX_SEGMENTS, COUNT, TX, 4, 5},
          {tcp::TX_DATA_SEGMENTS, COUNT, TX, 1, 2}, {tcp::TX_DATA_BYTES, COUNT, TX, 700},
          {tcp::TX_RETRANSMITTED, COUNT, TX, 1, 200}, {tcp::TX_ACK_ONLY, COUNT, TX, 1, 4},
          {tcp::TX_WINDOW_PROBES, COUNT, TX, 1, 500}, {tcp::TX_WINDOW_UPDATES, COUNT, TX, 1, 250},
          {tcp::RX_SEGMENTS, COUNT, RX, 3, 4}, {tcp::RX_DATA_SEGMENTS, COUNT, RX, 3, 5},
          {tcp::RX_DATA_BYTES, COUNT, RX, 600}, {tcp::RX_ERRORS[0], COUNT, RX, 1, 1000},
          {tcp::RX_ERRORS[1], COUNT, RX, 2, 1000}, {tcp::RX_ERRORS[2], COUNT, RX, 3, 1000},
          {tcp::RX_ERRORS[3], COUNT, RX, 4, 1000}, {tcp::RX_DUPLICATES, COUNT, RX, 7, 1000},
          {tcp::RX_OUT_OF_ORDER, COUNT, RX, 9, 1000}, {tcp::RX_ERRORS[4], COUNT, RX, 5, 1000},
          {tcp::RX_WINDOW_PROBES, COUNT, RX, 11, 1000}, {tcp::RX_WINDOW_UPDATES, COUNT, RX, 13, 1000},
          {tcp::RX_ERRORS[5], COUNT, RX, 6, 1000}, {tcp::TX_SACK_RETRANSMITTED, COUNT, TX, 1, 400}},
         {}},
        {NODE_UDP,
         {{udp::RX_DATAGRAMS, COUNT, RX, 1, 5}, {udp::RX_ERRORS[0], COUNT, RX, 1, 1000},
          {udp::RX_ERRORS[1], COUNT, RX, 2, 1000}, {udp::RX_ERRORS[2], COUNT, RX, 3, 1000},
          {udp::RX_ERRORS[3], COUNT, RX, 4, 1000}, {udp::RX_ERRORS[4], COUNT, RX, 5, 1000},
          {udp::RX_SOCKET_LOST, COUNT, RX, 7, 1000}, {udp::TX_DATAGRAMS, COUNT, TX, 1, 8}},
         {}},
    };
    // clang-format on
    return kinds;
}

// Appends a bucket for each limit, the share of each its place in the row.
void AppendBuckets(Fields *fields, const Limits &limits, Slot slot) {
    auto buckets = static_cast<i64>(limits.size());
    for (u32 i = 0; i < limits.size(); i++) {
        fields->push_back({histogram::BucketCount(i), COUNT, slot, 2 * (i64{i} + 1), buckets * (buckets + 1)});
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

// Twelve buckets are in use; the limit of 0 behind them says so, and what follows it is noise.
RecordKind VcpuHistogram(Slot slot) {
    RecordKind kind = {NODE_VCPU_HISTO, {}, {}};
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
             {PortHistogram(NODE_CLUSTERS_IN, RX, clusters, 1), PortHistogram(NODE_CLUSTERS_OUT, TX, clusters, 2),
              PortHistogram(NODE_SIZES_IN, RX, sizes, 60), PortHistogram(NODE_SIZES_OUT, TX, sizes, 66),
              PortHistogram(NODE_INTERVALS_IN, RX, intervals, 3),
              PortHistogram(NODE_INTERVALS_OUT, TX, intervals, 4)}) {
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
    return entity;
}

void AppendList(Host *host, std::string key, const KnfParamRec &entry) {
    host->lists[std::move(key)].push_back(entry);
}

// What a port sends is told by two counters: a quarter goes to the second one.
void SetTraffic(Entity *entity, i64 tx, i64 rx, i64 size, i64 errors) {
    entity->value[TX] = tx;
    entity->value[TX_EXTRA] = tx / 4;
    entity->value[TX_MAIN] = tx - tx / 4;
    entity->value[TX_BYTES] = tx * size;
    entity->value[TX_BYTES_EXTRA] = tx / 4 * size;
    entity->value[TX_BYTES_MAIN] = (tx - tx / 4) * size;
    entity->value[RX] = rx;
    entity->value[RX_BYTES] = rx * size;
    entity->value[ERRORS] = errors;
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

}  // namespace

void NodesAddHost(Host *host, const HostSpec &spec) {
    for (u32 node : {NODE_SWITCH_LIST, NODE_VECTOR_LIST, NODE_WORLDLET_LIST}) {
        host->lists[HostKey(node)] = {};
    }
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
        HostAdd(host, HostKey(NODE_PCPU_STATS, pcpu), Kind(NODE_PCPU_STATS), entity);
        HostAdd(host, HostKey(NODE_PCPU_INFO, pcpu), Kind(NODE_PCPU_INFO), general);
    }
    host->self = NewEntity(host);
    host->self->value[USED] = 2;
    AddVcpu(host, getpid(), host->self);
    host->stack = NewEntity(host);
    for (u32 node : {NODE_IPV4, NODE_IPV6, NODE_TCP, NODE_UDP}) {
        HostAdd(host, HostKey(node), Kind(node), host->stack);
    }
}

void NodesSetPcpu(Host *host, i64 pcpu, i64 busy, i64 worldlet) {
    host->pcpus.at(pcpu)->value[USED] = busy;
    host->pcpus.at(pcpu)->value[IN_WORLDLETS] = worldlet;
}

void NodesSetStack(Host *host, i64 tx, i64 rx) {
    SetTraffic(host->stack, tx, rx, 0, 0);
}

void NodesAddSwitch(Host *host, const std::string &name) {
    AppendList(host, HostKey(NODE_SWITCH_LIST), ParamOf(name));
    host->lists[HostKey(NODE_SWITCH_PORTS, name)] = {};
}

// The ids of the chain differ from one another and in every field; vcpu ids stand above all process ids.
void NodesAddVm(Host *host, const VmSpec &spec) {
    Entity *entity = NewEntity(host);
    entity->value[LEADER] = spec.leader;
    entity->value[USED] = spec.used;
    entity->value[READY] = spec.ready;
    entity->value[COSTOP] = spec.costop;
    entity->value[WAIT] = 1000 - spec.used - spec.ready - spec.costop;
    entity->value[CARTEL] = spec.leader + 1;
    entity->value[GROUP] = 0x100000000 + spec.leader;
    entity->value[VCPU_LEADER] = spec.leader + 2;
    HostAdd(host, HostKey(NODE_WORLD_CARTEL, spec.leader), Kind(NODE_WORLD_CARTEL), entity);
    HostAdd(host, HostKey(NODE_CARTEL_GROUP, entity->value[CARTEL]), Kind(NODE_CARTEL_GROUP), entity);
    HostAdd(host, HostKey(NODE_GROUP_LEADER, entity->value[GROUP]), Kind(NODE_GROUP_LEADER), entity);
    Params &vcpus = host->lists[HostKey(NODE_VCPU_LIST, entity->value[VCPU_LEADER])];
    for (i64 i = 0; i < spec.vcpus; i++) {
        i64 id = 10000000 + spec.leader * 1000 + i;
        vcpus.push_back(ParamOf(id));
        AddVcpu(host, id, entity);
    }
    host->vms[spec.name] = entity;
}

void NodesAddPort(Host *host, const PortSpec &spec) {
    Entity *entity = NewEntity(host);
    SetTraffic(entity, spec.tx, spec.rx, spec.size, spec.errors);
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
}

void NodesAddNic(Host *host, const NicSpec &spec) {
    Entity *entity = NewEntity(host);
    SetTraffic(entity, spec.tx, spec.rx, spec.size, spec.errors);
    entity->value[PORT] = spec.port;
    entity->value[TX_QUEUES] = spec.txQueues;
    entity->value[RX_QUEUES] = static_cast<i64>(spec.filters.size());
    entity->text[NAME] = HostText(host, spec.device);
    for (u32 node : {NODE_NIC_PROPERTIES, NODE_NIC_STATS, NODE_TXQ_INFO, NODE_RXQ_INFO}) {
        HostAdd(host, HostKey(node, spec.name), Kind(node), entity);
    }
    // The first queue carries most, each further one half of what is left, and the last one whatever remains.
    i64 left = spec.tx;
    for (i64 queue = 0; queue < spec.txQueues; queue++) {
        Entity *share = NewEntity(host);
        share->value[TX] = queue + 1 < spec.txQueues ? (left + 1) / 2 : left;
        share->value[ERRORS] = queue == 0 ? spec.errors : 0;
        left -= share->value[TX];
        HostAdd(host, HostKey(NODE_TXQ_STATS, spec.name, queue), Kind(NODE_TXQ_STATS), share);
    }
    i64 served = spec.port;
    for (size_t queue = 0; queue < spec.filters.size(); queue++) {
        auto number = static_cast<i64>(queue);
        Params &filters = host->lists[HostKey(NODE_RXQ_FILTERS, spec.name, number)];
        for (i64 i = 0; i < spec.filters[queue]; i++) {
            Entity *filter = NewEntity(host);
            filter->value[PORT] = ++served;
            filters.push_back(ParamOf(10 * (number + 1) + i));
            HostAdd(host, HostKey(NODE_RXQ_FILTER, {ParamOf(spec.name), ParamOf(number), filters.back()}),
                    Kind(NODE_RXQ_FILTER), filter);
        }
    }
}

void NodesAddWorldlet(Host *host, const WorldletSpec &spec) {
    Entity *entity = NewEntity(host);
    entity->value[USED] = spec.used;
    entity->value[READY] = spec.ready;
    entity->value[WAIT] = spec.wait;
    entity->value[AFFINE_PCPU] = spec.pcpu;
    entity->value[AFFINE_VCPU] = spec.vcpu;
    entity->value[AFFINE_WORLDLET] = spec.worldlet;
    AppendList(host, HostKey(NODE_WORLDLET_LIST), ParamOf(spec.name));
    HostAdd(host, HostKey(NODE_WORLDLET_STATS, spec.name), Kind(NODE_WORLDLET_STATS), entity);
}

// Rate and time are spread over the pcpus as evenly as integers allow, the remainder one by one from pcpu 0 on.
void NodesAddVector(Host *host, i64 vector, const Params &names, i64 rate, i64 time) {
    AppendList(host, HostKey(NODE_VECTOR_LIST), ParamOf(vector));
    host->lists[HostKey(NODE_VECTOR_NAMES, vector)] = names;
    auto pcpus = static_cast<i64>(host->pcpus.size());
    for (i64 pcpu = 0; pcpu < pcpus; pcpu++) {
        Entity *entity = NewEntity(host);
        entity->value[RATE] = rate / pcpus + (pcpu < rate % pcpus ? 1 : 0);
        entity->value[TIME] = time / pcpus + (pcpu < time % pcpus ? 1 : 0);
        HostAdd(host, HostKey(NODE_VECTOR_STATS, {ParamOf(vector), ParamOf(pcpu)}), Kind(NODE_VECTOR_STATS), entity);
    }
}
