#include "corekit/recorder/record.h"

#include "corekit/nodes.h"

#include <cstdio>
#include <cstring>

namespace {

constexpr u64 MAX_PCPUS = 65536;  // against a topology record of nonsense

// What has records of its own. Their keys begin with its own.
enum Scope : u64 {
    HOST,
    PCPU,
    EVERY_PORT,
    VCPU,
    NIC,
    PORT_OF_TYPE = 1ULL << 32,  // and the type, and so on
    PORT_OF_SCHEME = 2ULL << 32,
    PORT_OF_MODEL = 3ULL << 32,
};

struct Row {
    u64 scope;
    u32 node;
    Params more = {};  // keys behind those of the scope
};

const std::vector<Row> &Rows() {
    // clang-format off
    static const std::vector<Row> rows = {
        {HOST, NODE_TIME}, {HOST, NODE_TOPOLOGY}, {HOST, NODE_IPV4}, {HOST, NODE_IPV6},
        {HOST, NODE_TCP}, {HOST, NODE_UDP},
        {HOST, NODE_CONFIG_OPTION, {ParamOf("Misc"), ParamOf("HostName")}},
        {PCPU, NODE_PCPU_INFO}, {PCPU, NODE_PCPU_STATS},
        {EVERY_PORT, NODE_PORT_STATUS}, {EVERY_PORT, NODE_PORT_STATS},
        {EVERY_PORT, NODE_CLUSTERS_IN}, {EVERY_PORT, NODE_CLUSTERS_OUT}, {EVERY_PORT, NODE_SIZES_IN},
        {EVERY_PORT, NODE_SIZES_OUT}, {EVERY_PORT, NODE_INTERVALS_IN}, {EVERY_PORT, NODE_INTERVALS_OUT},
        {PORT_OF_TYPE + PORT_VNIC, NODE_COALESCE}, {PORT_OF_TYPE + PORT_VNIC, NODE_TX_WORLDLET},
        {PORT_OF_SCHEME + 1, NODE_COALESCE_RX}, {PORT_OF_SCHEME + 1, NODE_COALESCE_TX},
        {PORT_OF_SCHEME + 1, NODE_COALESCE_TXCOMP}, {PORT_OF_SCHEME + 2, NODE_COALESCE_2},
        {PORT_OF_MODEL + MODEL_PARLAN2, NODE_PARLAN2},
        {PORT_OF_MODEL + MODEL_PARLAN3, NODE_PARLAN3_TX}, {PORT_OF_MODEL + MODEL_PARLAN3, NODE_PARLAN3_RX},
        {PORT_OF_MODEL + MODEL_PARLAN3, NODE_PARLAN3_QUEUE, {ParamOf(int64_t{0})}},
        {VCPU, NODE_VCPU_TIMES}, {VCPU, NODE_VCPU_EVENTS}, {VCPU, NODE_VCPU_MIGRATIONS},
        {VCPU, NODE_VCPU_L3, {ParamOf("L3")}},
        {VCPU, NODE_VCPU_HISTO, {ParamOf("RUN")}}, {VCPU, NODE_VCPU_HISTO, {ParamOf("READY")}},
        {VCPU, NODE_VCPU_HISTO, {ParamOf("COSTOP")}}, {VCPU, NODE_VCPU_HISTO, {ParamOf("WAIT")}},
        {NIC, NODE_NIC_PROPERTIES}, {NIC, NODE_NIC_STATS}, {NIC, NODE_TXQ_INFO},
        {NIC, NODE_RXQ_INFO},
    };
    // clang-format on
    return rows;
}

KnfParamRec Key(u64 number) {
    return ParamOf(static_cast<int64_t>(number));
}

// Keys as the interface takes them: null for a node with a single instance.
struct KeyList {
    KnfParamList list;
    explicit KeyList(const Params &keys)
        : list(keys.empty() ? nullptr : KNF_ParamListCreate(KNF_INSTANCE_LIST, static_cast<u32>(keys.size()))) {
        for (const KnfParamRec &key : keys) {
            key.isText ? KNF_ParamListAddString(list, key.text.c_str()) : KNF_ParamListAddInt(list, key.number);
        }
    }
    KeyList(const KeyList &) = delete;
    KeyList &operator=(const KeyList &) = delete;
    ~KeyList() { KNF_ParamListDestroy(list); }
};

// Whether it was not tried before.
bool Wanted(const Recorder &recorder, const std::string &name) {
    return *recorder.stop == 0 && !recorder.missing.contains(name) && !recorder.draft.entries.contains(name);
}

bool Counted(Recorder *recorder, const std::string &name, bool good, u64 *successes) {
    (good ? *successes : recorder->failed)++;
    if (!good) {
        recorder->missing.insert(name);
    }
    u64 reads = recorder->records + recorder->lists + recorder->failed;
    if (recorder->showProgress && reads % 512 == 0) {
        fprintf(stderr, "\r%llu reads", reads);
    }
    return good;
}

// A record that was read; nothing if it could not be.
std::string_view Known(const Recorder &recorder, u32 node, const Params &keys) {
    auto found = recorder.draft.entries.find(SnapshotName(ENTRY_RECORD, node, keys));
    return found != recorder.draft.entries.end() ? std::string_view(found->second) : std::string_view();
}

// The record, or nothing when it can't be read.
std::string_view Read(Recorder *recorder, u32 node, const Params &keys) {
    std::string name = SnapshotName(ENTRY_RECORD, node, keys);
    if (!Wanted(*recorder, name)) {
        return Known(*recorder, node, keys);
    }
    u32 size = NodeRecordSize(node);
    std::string record(size, '\0');
    KnfStatus status = KNF_Get(node, KeyList(keys).list, record.data(), size);
    if (!Counted(recorder, name, status == 0, &recorder->records)) {
        return {};
    }
    return recorder->draft.entries[name] = std::move(record);
}

// Nothing for a list that was read before, as what it leads to was read then.
Params List(Recorder *recorder, u32 node, const Params &keys) {
    Params entries;
    std::string name = SnapshotName(ENTRY_LIST, node, keys);
    if (!Wanted(*recorder, name)) {
        return entries;
    }
    KnfParamList list = nullptr;
    KnfStatus status = KNF_GetInstanceListAlloc(node, KeyList(keys).list, &list);
    u32 count = status == 0 ? KNF_ParamListUsedCount(list) : 0;
    if (Counted(recorder, name, status == 0 && count <= SNAPSHOT_PARAMS, &recorder->lists)) {
        std::string &body = recorder->draft.entries[name];
        for (u32 i = 0; i < count; i++) {
            KnfParam entry = KNF_ParamListGetParam(list, i);
            entries.push_back(NodeEntries(node) == TEXTS ? ParamOf(std::string(KNF_ParamGetString(entry)))
                                                         : ParamOf(KNF_ParamGetInt(entry)));
            SnapshotAppendParam(&body, entries.back());
        }
    }
    if (status == 0) {
        KNF_ParamListDestroy(list);
    }
    return entries;
}

void ReadScope(Recorder *recorder, u64 scope, const Params &keys) {
    for (const Row &row : Rows()) {
        if (row.scope == scope) {
            Params all = keys;
            all.insert(all.end(), row.more.begin(), row.more.end());
            Read(recorder, row.node, all);
        }
    }
}

// A field of a record; 0 when the record could not be read.
u64 FieldOf(std::string_view record, FieldLayout field) {
    u64 value = 0;
    if (!record.empty()) {
        memcpy(&value, record.data() + field.offset, field.width);
    }
    return value;
}

std::string TextOf(std::string_view record, FieldLayout field) {
    return std::string(Cursor{record.substr(field.offset, field.width)}.Text());
}

// From a world leader by way of its cartel and group to its vcpus.
void RecordVcpus(Recorder *recorder, u64 id) {
    for (const auto &[node, next] : {std::pair<u32, FieldLayout>{NODE_WORLD_CARTEL, vcpu_chain::CARTEL},
                                     {NODE_CARTEL_GROUP, vcpu_chain::GROUP},
                                     {NODE_GROUP_LEADER, vcpu_chain::LEADER}}) {
        std::string_view link = Read(recorder, node, {Key(id)});
        if (link.empty()) {
            return;
        }
        id = FieldOf(link, next);
    }
    for (const KnfParamRec &vcpu : List(recorder, NODE_VCPU_LIST, {Key(id)})) {
        ReadScope(recorder, VCPU, {vcpu});
    }
}

void RecordNic(Recorder *recorder, const KnfParamRec &nic) {
    ReadScope(recorder, NIC, {nic});
    u64 queues = FieldOf(Known(*recorder, NODE_TXQ_INFO, {nic}), queue_info::COUNT);
    for (u64 queue = 0; queue < queues; queue++) {
        Read(recorder, NODE_TXQ_STATS, {nic, Key(queue)});
    }
    queues = FieldOf(Known(*recorder, NODE_RXQ_INFO, {nic}), queue_info::COUNT);
    for (u64 queue = 0; queue < queues; queue++) {
        for (const KnfParamRec &filter : List(recorder, NODE_RXQ_FILTERS, {nic, Key(queue)})) {
            Read(recorder, NODE_RXQ_FILTER, {nic, Key(queue), filter});
        }
    }
}

void RecordPort(Recorder *recorder, const KnfParamRec &port) {
    std::string_view type = Read(recorder, NODE_PORT_TYPE, {port});
    if (type.empty()) {
        return;  // neither its type nor its switch is known
    }
    Params keys = {ParamOf(TextOf(type, port_type::SWITCH_NAME)), port};
    ReadScope(recorder, EVERY_PORT, keys);
    std::string_view status = Known(*recorder, NODE_PORT_STATUS, keys);
    if (u64 leader = FieldOf(status, port_status::WORLD_LEADER)) {
        RecordVcpus(recorder, leader);
    }
    u64 portType = FieldOf(type, port_type::TYPE);
    ReadScope(recorder, PORT_OF_TYPE + portType, keys);
    if (portType == PORT_VNIC) {
        ReadScope(recorder, PORT_OF_SCHEME + FieldOf(Known(*recorder, NODE_COALESCE, keys), coalesce::SCHEME), keys);
        ReadScope(recorder, PORT_OF_MODEL + FieldOf(type, port_type::SUB_TYPE), keys);
    } else if (portType == PORT_UPLINK && !status.empty()) {
        RecordNic(recorder, ParamOf(TextOf(status, port_status::CLIENT_NAME)));
    }
}

}  // namespace

void RecordHost(Recorder *recorder) {
    char signature[KNF_SIGNATURE_SIZE + 1] = {};
    const char *ours = "";
    if (KNF_CheckSig(signature, KNF_SIGNATURE_SIZE, &ours) == 0 && signature[0] == 0) {
        strncpy(signature, ours, KNF_SIGNATURE_SIZE);  // a library that tells the kernel's only when they differ
    }
    recorder->draft.signature = signature;
    ReadScope(recorder, HOST, {});
    std::string_view time = Known(*recorder, NODE_TIME, {});
    recorder->draft.seconds = static_cast<u32>(FieldOf(time, host_time::SECONDS));
    recorder->draft.nanoseconds = static_cast<u32>(FieldOf(time, host_time::NANOSECONDS));
    u64 pcpus = std::min(FieldOf(Known(*recorder, NODE_TOPOLOGY, {}), topology::PCPUS), MAX_PCPUS);
    for (u64 pcpu = 0; pcpu < pcpus; pcpu++) {
        ReadScope(recorder, PCPU, {Key(pcpu)});
    }
    for (const KnfParamRec &name : List(recorder, NODE_SWITCH_LIST, {})) {
        for (const KnfParamRec &port : List(recorder, NODE_SWITCH_PORTS, {name})) {
            RecordPort(recorder, port);
        }
    }
    for (const KnfParamRec &name : List(recorder, NODE_WORLDLET_LIST, {})) {
        Read(recorder, NODE_WORLDLET_STATS, {name});
    }
    for (const KnfParamRec &vector : List(recorder, NODE_VECTOR_LIST, {})) {
        List(recorder, NODE_VECTOR_NAMES, {vector});
        for (u64 pcpu = 0; pcpu < pcpus; pcpu++) {
            Read(recorder, NODE_VECTOR_STATS, {vector, Key(pcpu)});
        }
    }
    if (recorder->showProgress) {
        fputs("\r\x1b[K", stderr);
    }
}
