#include "corekit/host_nodes.h"

#include <unistd.h>

namespace {

using Fields = std::vector<Field>;
using Limits = std::vector<i64>;

// The layouts, one row a node: node, record size, fields, texts. Factors differ between neighbours that follow one
// rate, so that figures taken from the wrong field show.
const std::vector<RecordKind> &FixedKinds() {
    // clang-format off
    static const std::vector<RecordKind> kinds = {
        {NODE_PORT_TYPE, 2056, {{0, 4, LEVEL, TYPE}, {4, 4, LEVEL, SUB_TYPE}}, {{1032, 1024, SWITCH_NAME}}},
        {NODE_PORT_STATUS, 3316,
         {{1196, 4, LEVEL, LEADER}, {1200, 4, LEVEL, FLAGS}, {1208, 6, LEVEL, MAC}, {2262, 6, LEVEL, VNIC_MAC},
          {3310, 4, LEVEL, TYPE, 3}},
         {{148, 1048, NAME}}},
        {NODE_PORT_STATS, 160,
         {{0, 8, COUNT, TX_MAIN}, {8, 8, COUNT, TX_BYTES_MAIN}, {16, 8, COUNT, ERRORS}, {24, 8, COUNT, TX_EXTRA},
          {32, 8, COUNT, TX_BYTES_EXTRA}, {72, 8, COUNT, RX}, {80, 8, COUNT, RX_BYTES}, {88, 8, COUNT, ERRORS, 2}},
         {}},
        {NODE_COALESCE, 68, {{0, 4, LEVEL, SCHEME}}, {{4, 32, SCHEME_NAME}, {36, 32, SCHEME_PARAMS}}},
        {NODE_COALESCE_RX, 36,
         {{0, 4, LEVEL, ONE, 64}, {4, 1, LEVEL, ONE, 1}, {6, 4, COUNT, RX, 1, 8}, {10, 4, COUNT, RX, 1, 4}},
         {}},
        {NODE_COALESCE_TX, 32,
         {{0, 4, LEVEL, ONE, 32}, {8, 1, LEVEL, ONE, 1}, {9, 4, COUNT, TX, 2, 5}, {13, 4, COUNT, TX, 3, 10},
          {17, 4, COUNT, TX, 1, 5}, {21, 4, COUNT, TX, 1, 10}},
         {}},
        {NODE_COALESCE_TXCOMP, 24, {{0, 4, LEVEL, ONE, 16}, {4, 1, LEVEL, ONE, 0}}, {}},
        {NODE_COALESCE_2, 68,
         {{8, 1, LEVEL, ONE, 1}, {9, 1, LEVEL, ONE, 0}, {10, 1, LEVEL, ONE, 2}, {12, 4, LEVEL, ONE, 48},
          {16, 4, LEVEL, ONE, 24}, {20, 4, LEVEL, ONE, 96}, {25, 4, COUNT, RX, 1, 10}, {29, 4, COUNT, RX, 1, 5},
          {49, 4, COUNT, TX, 1, 10}, {53, 4, COUNT, TX, 1, 5}, {57, 4, COUNT, TX, 3, 10}, {61, 4, COUNT, TX, 2, 5}},
         {}},
        {NODE_TX_WORLDLET, 20,
         {{0, 4, COUNT, TX, 1, 2}, {4, 4, COUNT, TX, 1, 4}, {8, 4, COUNT, TX, 1, 8}, {12, 4, COUNT, TX, 1, 16},
          {16, 4, COUNT, TX, 1, 32}},
         {}},
        {NODE_PARLAN2, 112,
         {{0, 4, COUNT, TX, 1, 4}, {4, 4, COUNT, TX, 1, 1}, {12, 4, COUNT, TX, 1, 3}, {16, 4, LEVEL, ONE, 37},
          {20, 4, COUNT, ERRORS, 3}, {24, 4, COUNT, ERRORS, 1}, {28, 4, COUNT, RX, 1, 6},
          {36, 4, COUNT, ERRORS, 2}, {40, 8, COUNT, ERRORS, 4}, {48, 8, COUNT, ERRORS, 5},
          {56, 8, COUNT, ERRORS, 6}, {64, 8, COUNT, ERRORS, 7}, {72, 8, COUNT, ERRORS, 8},
          {80, 8, COUNT, ERRORS, 9}, {88, 8, COUNT, ERRORS, 10}, {96, 8, COUNT, ERRORS, 11},
          {104, 8, COUNT, ERRORS, 12}},
         {}},
        {NODE_PARLAN3_TX, 140,
         {{2, 8, COUNT, TX}, {10, 8, COUNT, TX_BYTES}, {18, 8, COUNT, TX, 1, 3}, {26, 8, COUNT, TX_BYTES, 4, 5},
          {34, 8, COUNT, TX, 9, 10}, {82, 8, COUNT, ERRORS, 1}, {90, 8, COUNT, ERRORS, 2},
          {106, 4, COUNT, ERRORS, 3}, {110, 4, COUNT, ERRORS, 4}, {126, 4, COUNT, ERRORS, 5}},
         {}},
        {NODE_PARLAN3_RX, 128,
         {{0, 8, COUNT, RX, 2, 5}, {8, 8, COUNT, RX_BYTES, 7, 10}, {16, 8, COUNT, RX}, {24, 8, COUNT, RX_BYTES},
          {32, 8, COUNT, RX, 19, 20}, {80, 8, COUNT, ERRORS, 2}, {88, 8, COUNT, ERRORS, 3},
          {96, 4, COUNT, ERRORS, 4}, {100, 4, COUNT, ERRORS, 5}, {124, 4, COUNT, ERRORS, 6}},
         {}},
        {NODE_PARLAN3_QUEUE, 16, {{6, 4, LEVEL, ONE, 512}, {10, 4, LEVEL, ONE, 128}}, {}},
        {NODE_NIC_PROPERTIES, 1252, {{193, 4, LEVEL, PORT}}, {{0, 193, NAME}}},
        // Receive errors add up to 2 x ERRORS, transmit errors to ERRORS, in shares that all differ.
        {NODE_NIC_STATS, 4296,
         {{0, 8, COUNT, RX}, {8, 8, COUNT, TX}, {16, 8, COUNT, RX_BYTES}, {24, 8, COUNT, TX_BYTES},
          {32, 8, COUNT, ERRORS, 1, 18}, {40, 8, COUNT, ERRORS, 1, 28}, {48, 8, COUNT, ERRORS, 2, 18},
          {56, 8, COUNT, ERRORS, 2, 28}, {80, 8, COUNT, ERRORS, 3, 18}, {88, 8, COUNT, ERRORS, 4, 18},
          {96, 8, COUNT, ERRORS, 5, 18}, {104, 8, COUNT, ERRORS, 6, 18}, {112, 8, COUNT, ERRORS, 7, 18},
          {120, 8, COUNT, ERRORS, 8, 18}, {128, 8, COUNT, ERRORS, 3, 28}, {136, 8, COUNT, ERRORS, 4, 28},
          {144, 8, COUNT, ERRORS, 5, 28}, {152, 8, COUNT, ERRORS, 6, 28}, {160, 8, COUNT, ERRORS, 7, 28}},
         {}},
        {NODE_TXQ_INFO, 12, {{0, 2, LEVEL, TX_QUEUES}}, {}},
        {NODE_RXQ_INFO, 12, {{0, 2, LEVEL, RX_QUEUES}}, {}},
        {NODE_TXQ_STATS, 20, {{0, 4, COUNT, TX}, {4, 4, COUNT, ERRORS}, {12, 4, COUNT, ERRORS, 2}}, {}},
        {NODE_RXQ_FILTER, 36, {{14, 4, LEVEL, PORT}}, {}},
        {NODE_TOPOLOGY, 36, {{8, 4, LEVEL, PACKAGES}, {12, 4, LEVEL, CORES}, {16, 4, LEVEL, PCPUS}}, {}},
        {NODE_PCPU_INFO, 200, {{196, 4, LEVEL, LLC}}, {}},
        {NODE_PCPU_STATS, 160,
         {{0, 8, COUNT, USED, 1000}, {16, 8, COUNT, IN_WORLDLETS, 1000}, {48, 8, COUNT, ONE, 1000000}},
         {}},
        {NODE_CONFIG_OPTION, 1572, {}, {{544, 1028, NAME}}},
        {NODE_WORLD_CARTEL, 4, {{0, 4, LEVEL, CARTEL}}, {}},
        {NODE_CARTEL_GROUP, 8, {{0, 8, LEVEL, GROUP}}, {}},
        {NODE_GROUP_LEADER, 4, {{0, 4, LEVEL, VCPU_LEADER}}, {}},
        {NODE_VCPU_TIMES, 120,
         {{0, 8, COUNT, ONE, 1000000}, {32, 8, COUNT, USED, 1000}, {48, 8, COUNT, COSTOP, 1000},
          {64, 8, COUNT, READY, 1000}},
         {}},
        {NODE_VCPU_EVENTS, 64, {{36, 4, COUNT, USED, 7}}, {}},
        {NODE_VCPU_MIGRATIONS, 8, {{0, 8, COUNT, USED, 1, 10}}, {}},
        {NODE_VCPU_L3, 8, {{0, 8, COUNT, USED, 1, 50}}, {}},
        {NODE_WORLDLET_STATS, 1460,
         {{0, 4, LEVEL, AFFINE_PCPU}, {4, 4, LEVEL, AFFINE_VCPU}, {8, 4, LEVEL, AFFINE_WORLDLET},
          {12, 8, COUNT, USED, 50}, {44, 8, COUNT, USED, 1, 10}, {140, 8, COUNT, USED, 1, 5},
          {148, 8, COUNT, USED, 20}, {220, 8, COUNT, USED, 1000000}, {516, 8, COUNT, READY, 1000000},
          {812, 8, COUNT, WAIT, 1000000}},
         {}},
        {NODE_VECTOR_STATS, 16, {{0, 8, COUNT, RATE}, {8, 8, COUNT, TIME}}, {}},
        {NODE_TIME, 8, {{0, 4, SECONDS}, {4, 4, NANOSECONDS}}, {}},
        {NODE_IPV4, 240,
         {{0, 8, COUNT, RX}, {56, 8, COUNT, RX, 1, 1000}, {112, 8, COUNT, RX, 19, 20}, {120, 8, COUNT, TX},
          {128, 8, COUNT, TX, 1, 1000}, {136, 8, COUNT, RX, 1, 50}, {144, 8, COUNT, TX, 1, 100}},
         {}},
        {NODE_IPV6, 3328,
         {{0, 8, COUNT, RX, 1, 4}, {32, 8, COUNT, RX, 1, 2000}, {80, 8, COUNT, RX, 1, 5}, {88, 8, COUNT, TX, 1, 4},
          {96, 8, COUNT, TX, 1, 4000}, {104, 8, COUNT, RX, 1, 200}, {112, 8, COUNT, TX, 1, 400}},
         {}},
        {NODE_TCP, 728,
         {{72, 8, COUNT, TX, 3, 20}, {128, 8, COUNT, TX, 4, 5}, {136, 8, COUNT, TX, 1, 2},
          {144, 8, COUNT, TX, 700}, {152, 8, COUNT, TX, 1, 200}, {176, 8, COUNT, TX, 1, 4},
          {184, 8, COUNT, TX, 1, 500}, {200, 8, COUNT, TX, 1, 250}, {216, 8, COUNT, RX, 3, 4},
          {224, 8, COUNT, RX, 3, 5}, {232, 8, COUNT, RX, 600}, {240, 8, COUNT, RX, 1, 1000},
          {248, 8, COUNT, RX, 2, 1000}, {256, 8, COUNT, RX, 3, 1000}, {264, 8, COUNT, RX, 4, 1000},
          {272, 8, COUNT, RX, 7, 1000}, {304, 8, COUNT, RX, 9, 1000}, {320, 8, COUNT, RX, 5, 1000},
          {344, 8, COUNT, RX, 11, 1000}, {384, 8, COUNT, RX, 13, 1000}, {392, 8, COUNT, RX, 6, 1000},
          {664, 8, COUNT, TX, 1, 400}},
         {}},
        {NODE_UDP, 112,
         {{0, 8, COUNT, RX, 1, 5}, {8, 8, COUNT, RX, 1, 1000}, {16, 8, COUNT, RX, 2, 1000},
          {24, 8, COUNT, RX, 3, 1000}, {32, 8, COUNT, RX, 4, 1000}, {40, 8, COUNT, RX, 5, 1000},
          {56, 8, COUNT, RX, 7, 1000}, {80, 8, COUNT, TX, 1, 8}},
         {}},
    };
    // clang-format on
    return kinds;
}

// Appends buckets of (count, limit) from `offset` on: one for each limit, the share of each its place in the row.
void AppendBuckets(Fields *fields, u32 offset, u32 countAt, u32 limitAt, const Limits &limits, Slot slot) {
    auto buckets = static_cast<i64>(limits.size());
    for (i64 i = 0; i < buckets; i++, offset += 16) {
        fields->push_back({offset + countAt, 8, COUNT, slot, 2 * (i + 1), buckets * (buckets + 1)});
        fields->push_back({offset + limitAt, 8, LEVEL, ONE, limits[static_cast<size_t>(i)]});
    }
}

// The limit of a port histogram's last bucket is not told: noise stands there.
RecordKind PortHistogram(u32 node, Slot slot, const Limits &limits, i64 scale) {
    RecordKind kind = {node, static_cast<u32>(32 + 16 * (limits.size() + 1)), {}, {}};
    Limits all = limits;
    all.push_back(0);
    AppendBuckets(&kind.fields, 32, 0, 8, all, slot);
    kind.fields.pop_back();
    kind.fields.push_back({0, 8, SOME, ONE, scale});
    kind.fields.push_back({8, 8, SOME, ONE, limits.back() + scale});
    kind.fields.push_back({16, 8, SOME, ONE, limits[limits.size() / 2] + scale});
    kind.fields.push_back({24, 8, TOTAL});
    return kind;
}

// Twelve buckets are in use; the limit of 0 behind them says so, and what follows it is noise.
RecordKind VcpuHistogram(Slot slot) {
    RecordKind kind = {NODE_VCPU_HISTO, 352, {}, {}};
    AppendBuckets(&kind.fields, 32, 0, 8, {2, 5, 10, 20, 50, 100, 200, 500, 1000, 5000, 20000, 100000}, slot);
    kind.fields.push_back({24, 8, TOTAL});
    kind.fields.push_back({32 + 12 * 16 + 8, 8, LEVEL, ONE, 0});
    return kind;
}

const std::unordered_map<u32, RecordKind> &Kinds() {
    static const auto kinds = [] {
        std::unordered_map<u32, RecordKind> all;
        for (const RecordKind &kind : FixedKinds()) {
            all.emplace(kind.node, kind);
        }
        const Limits clusters = {1, 2, 3, 4, 6, 8, 12, 16, 24, 32, 48, 64, 96, 128};
        const Limits sizes = {64, 128, 256, 512, 768, 1024, 1280, 1514, 4096, 9014, 32768};
        const Limits intervals = {1,    2,    5,    10,    20,    50,    100,    200,    500,
                                  1000, 2000, 5000, 10000, 20000, 50000, 100000, 200000, 500000};
        for (const RecordKind &kind : {PortHistogram(327, RX, clusters, 1), PortHistogram(328, TX, clusters, 2),
                                       PortHistogram(332, RX, sizes, 60), PortHistogram(333, TX, sizes, 66),
                                       PortHistogram(337, RX, intervals, 3), PortHistogram(338, TX, intervals, 4)}) {
            all.emplace(kind.node, kind);
        }
        all.emplace(NODE_VCPU_HISTO, VcpuHistogram(USED));
        return all;
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
    static const std::pair<const char *, RecordKind> histograms[] = {{"RUN", VcpuHistogram(USED)},
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

u32 NodeRecordSize(u32 node) {
    auto kind = Kinds().find(node);
    return kind != Kinds().end() ? kind->second.size : 0;
}

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
