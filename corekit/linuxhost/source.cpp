#include "corekit/linuxhost/source.h"

#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"

#include <algorithm>
#include <ctime>

namespace {

// Keys of a node: s for a text, i for a number.
struct GetRow {
    u32 node;
    const char *keys;
    KnfStatus (*get)(LinuxHost *host, const Params &keys, char *record);
};
struct ListRow {
    u32 node;
    const char *keys;
    KnfStatus (*list)(LinuxHost *host, const Params &keys, Params *entries);
};

struct SetRow {
    u32 node;
    const char *keys;
    KnfStatus (*set)(LinuxHost *host, const Params &keys, const Params &input);
};

// The nodes that a Linux host has. All others fail, which is how a caller learns to do without: models of virtual NICs
// and their coalescing.
// clang-format off
constexpr GetRow GETS[] = {
    {NODE_PORT_STATUS, "si", PortStatusGet}, {NODE_PORT_STATS, "si", PortStatsGet},
    {NODE_PCPU_STATS, "i", PcpuStatsGet}, {NODE_VCPU_TIMES, "i", VcpuTimesGet},
    {NODE_VCPU_EVENTS, "i", VcpuEventsGet}, {NODE_VCPU_MIGRATIONS, "i", VcpuMigrationsGet},
    {NODE_VCPU_L3, "is", VcpuCacheMigrationsGet}, {NODE_WORLDLET_STATS, "s", WorldletGet},
    {NODE_NIC_STATS, "s", NicStatsGet}, {NODE_TXQ_STATS, "si", TxqStatsGet}, {NODE_TXQ_INFO, "s", TxqInfoGet},
    {NODE_RXQ_INFO, "s", RxqInfoGet}, {NODE_IPV4, "", Ipv4Get}, {NODE_IPV6, "", Ipv6Get}, {NODE_TCP, "", TcpGet},
    {NODE_UDP, "", UdpGet}, {NODE_PORT_TYPE, "i", PortTypeGet}, {NODE_NIC_PROPERTIES, "s", NicPropertiesGet},
    {NODE_TOPOLOGY, "", TopologyGet}, {NODE_PCPU_INFO, "i", PcpuInfoGet}, {NODE_CONFIG_OPTION, "ss", OptionGet},
    {NODE_WORLD_CARTEL, "i", CartelGet}, {NODE_CARTEL_GROUP, "i", GroupGet}, {NODE_GROUP_LEADER, "i", LeaderGet},
    {NODE_TIME, "", TimeGet}, {NODE_VECTOR_STATS, "ii", VectorStatsGet}, {NODE_SIZES_IN, "si", SizesInGet},
    {NODE_SIZES_OUT, "si", SizesOutGet}, {NODE_CLUSTERS_IN, "si", ClustersGet},
    {NODE_CLUSTERS_OUT, "si", ClustersGet}, {NODE_INTERVALS_IN, "si", IntervalsInGet},
    {NODE_INTERVALS_OUT, "si", IntervalsOutGet}, {NODE_VCPU_HISTO, "is", VcpuHistoGet}};
constexpr ListRow LISTS[] = {
    {NODE_SWITCH_LIST, "", SwitchList}, {NODE_SWITCH_PORTS, "s", SwitchPorts}, {NODE_VCPU_LIST, "i", VcpuList},
    {NODE_WORLDLET_LIST, "", WorldletList}, {NODE_RXQ_FILTERS, "si", RxqFilters}, {NODE_VECTOR_LIST, "", VectorList},
    {NODE_VECTOR_NAMES, "i", VectorNames}};
constexpr SetRow SETS[] = {
    {NODE_CLUSTERS, "si", ClustersSet}, {NODE_SIZES, "si", SizesSet}, {NODE_INTERVALS, "si", IntervalsSet},
    {NODE_CONFIG_OPTION_SET, "ss", OptionSet}};
// clang-format on

bool Fit(const Params &keys, const char *kinds) {
    for (const KnfParamRec &key : keys) {
        if (*kinds++ != (key.isText ? 's' : 'i')) {
            return false;
        }
    }
    return *kinds == 0;
}

KnfStatus Get(void *context, u32 node, const Params &keys, void *buffer, u32 size) {
    auto row = std::find_if(std::begin(GETS), std::end(GETS), [node](const GetRow &one) { return one.node == node; });
    if (row == std::end(GETS) || !Fit(keys, row->keys)) {
        return STATUS_NOT_FOUND;
    }
    if (size != NodeRecordSize(node)) {
        return STATUS_BAD_SIZE;
    }
    memset(buffer, 0, size);
    return row->get(static_cast<LinuxHost *>(context), keys, static_cast<char *>(buffer));
}

KnfStatus List(void *context, u32 node, const Params &keys, Params *entries) {
    for (const ListRow &row : LISTS) {
        if (row.node == node && Fit(keys, row.keys)) {
            return row.list(static_cast<LinuxHost *>(context), keys, entries);
        }
    }
    return STATUS_NOT_FOUND;
}

KnfStatus Set(void *context, u32 node, const Params &keys, const Params &input, void *result, u32 size) {
    for (const SetRow &row : SETS) {
        if (row.node == node && Fit(keys, row.keys)) {
            if (result != nullptr) {
                memset(result, 0, size);
            }
            return row.set(static_cast<LinuxHost *>(context), keys, input);
        }
    }
    return STATUS_NOT_WRITABLE;
}

bool TakesText(void *context) {
    return HostTakesHistograms(static_cast<LinuxHost *>(context));
}

const char *Signature(void * /*context*/) {
    return HOST_SIGNATURE;
}

u64 Now() {
    timespec now = {};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<u64>(now.tv_sec) * 1000000000 + static_cast<u64>(now.tv_nsec);
}

}  // namespace

void PutText(char *record, FieldLayout field, const char *text) {
    size_t length = std::min<size_t>(strlen(text), field.width - 1);
    memcpy(record + field.offset, text, length);
    record[field.offset + length] = 0;
}

KnfStatus StatusOf(Outcome outcome) {
    return outcome == FINE ? STATUS_OK : outcome == GONE ? STATUS_NOT_FOUND : STATUS_UNTOLD;
}

LinuxHost *LinuxHostOpen() {
    auto *host = new LinuxHost;
    host->now = Now;
    ProcRootOpen(&host->root);
    return host;
}

void LinuxHostClose(LinuxHost *host) {
    if (host != nullptr) {
        HostTrackingClose(host);
        ThreadsClose(&host->threads);
        CpusClose(&host->cpus);
        StackClose(&host->stack);
        ProcRootClose(&host->root);
        delete host;
    }
}

NodeSource LinuxHostSource(LinuxHost *host) {
    return {host, Get, List, Set, Signature, TakesText};
}
