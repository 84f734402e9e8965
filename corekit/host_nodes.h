// The nodes of the simulated host: the layout of every record, and the instances and lists that each entity of a
// description brings. Callers have checked names and ranges.
#pragma once

#include "corekit/host.h"

// clang-format off
enum Node : u32 {
    NODE_IPV4 = 32, NODE_TCP = 33, NODE_UDP = 34, NODE_IPV6 = 37, NODE_NIC_PROPERTIES = 72, NODE_NIC_STATS = 73,
    NODE_RXQ_INFO = 121, NODE_RXQ_FILTERS = 123, NODE_RXQ_FILTER = 126, NODE_TXQ_INFO = 131, NODE_TXQ_STATS = 132,
    NODE_SWITCH_LIST = 245, NODE_SWITCH_PORTS = 264, NODE_PORT_STATUS = 266, NODE_PORT_STATS = 269,
    NODE_PARLAN2 = 270, NODE_TX_WORLDLET = 275, NODE_COALESCE = 278, NODE_COALESCE_2 = 279, NODE_COALESCE_RX = 280,
    NODE_COALESCE_TX = 281, NODE_COALESCE_TXCOMP = 282, NODE_PARLAN3_TX = 341, NODE_PARLAN3_RX = 342,
    NODE_PARLAN3_QUEUE = 354, NODE_PORT_TYPE = 368, NODE_WORLD_CARTEL = 457, NODE_CONFIG_OPTION = 519,
    NODE_CONFIG_OPTION_SET = 520, NODE_TOPOLOGY = 603, NODE_PCPU_INFO = 605, NODE_VECTOR_LIST = 639,
    NODE_VECTOR_NAMES = 641, NODE_GROUP_LEADER = 658, NODE_CARTEL_GROUP = 738, NODE_VCPU_LIST = 753,
    NODE_VCPU_TIMES = 770, NODE_VCPU_EVENTS = 772, NODE_VCPU_HISTO = 776, NODE_VCPU_MIGRATIONS = 793,
    NODE_VCPU_L3 = 795, NODE_PCPU_STATS = 797, NODE_VECTOR_STATS = 840, NODE_TIME = 1419,
    NODE_WORLDLET_LIST = 1476, NODE_WORLDLET_STATS = 1478,
};
// clang-format on

// A family of port histograms: where it is started and stopped, and where its two directions are read.
struct HistogramNodes {
    u32 control;
    u32 input;
    u32 output;
};
constexpr HistogramNodes HISTOGRAM_NODES[] = {{326, 327, 328}, {331, 332, 333}, {336, 337, 338}};

struct HostSpec {
    std::string name;
    i64 pcpus, packages, cores, llc;
};

struct PortSpec {
    std::string switchName;
    std::string client;
    i64 port, type, subType, leader, flags;
    i64 tx, rx;  // packets a second
    i64 size;    // bytes a packet
    i64 errors;  // transmit errors a second; receive errors come twice as fast
    i64 scheme;  // of coalescing, for type 5
};

struct NicSpec {
    std::string name, device;
    i64 port, txQueues;
    i64 tx, rx, size, errors;  // as of its port
    std::vector<i64> filters;  // how many each receive queue has
};

struct VmSpec {
    std::string name;
    i64 leader, vcpus;
    i64 used, ready, costop;  // per mille of the time
};

struct WorldletSpec {
    std::string name;
    i64 used, ready, wait;  // per mille of the time
    i64 pcpu, vcpu, worldlet;
};

constexpr i64 PORT_HOST_STACK = 3;
constexpr i64 PORT_UPLINK = 4;
constexpr i64 PORT_VNIC = 5;
constexpr i64 MODEL_PARLAN2 = 8;
constexpr i64 MODEL_PARLAN3 = 9;

u32 NodeRecordSize(u32 node);  // 0 for a node without records

void NodesAddHost(Host *host, const HostSpec &spec);  // first of all
void NodesSetPcpu(Host *host, i64 pcpu, i64 busy, i64 worldlet);
void NodesSetStack(Host *host, i64 tx, i64 rx);
void NodesAddSwitch(Host *host, const std::string &name);
void NodesAddVm(Host *host, const VmSpec &spec);
void NodesAddPort(Host *host, const PortSpec &spec);
void NodesAddNic(Host *host, const NicSpec &spec);
void NodesAddWorldlet(Host *host, const WorldletSpec &spec);
void NodesAddVector(Host *host, i64 vector, const Params &names, i64 rate, i64 time);
