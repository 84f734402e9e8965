// The nodes of the simulated host: what moves in every record, and the instances and lists that each entity of a
// description brings. Callers have checked names and ranges. What a line leaves out follows from all lines (plan.h).
#pragma once

#include "corekit/simulated/host.h"

#include <optional>

struct HostSpec {
    std::string name;
    i64 pcpus, packages, cores, llc;
    i64 uptime;       // seconds
    LoadCurve *load;  // of what names none
};

struct PortSpec {
    std::string switchName;
    std::string client;
    i64 port, type, subType, leader, flags;
    std::optional<i64> tx, rx;  // packets a second
    std::optional<i64> size;    // bytes a packet
    i64 txErrors, rxErrors;     // a second
    i64 scheme;                 // of coalescing, for type 5
    LoadCurve *load;
};

struct NicSpec {
    std::string name, device;
    i64 txQueues;
    std::optional<i64>
        first;  // per mille of the packets on transmit queue 0; without it each queue has half of the rest
    std::vector<i64> filters;  // how many each receive queue has
};

struct VmSpec {
    std::string name;
    i64 leader, vcpus;
    i64 used, ready, costop;  // per mille of the time
    i64 pcpu;                 // the only one that it runs on; UNSTATED for any
    LoadCurve *load;
};

struct WorldletSpec {
    std::string name;
    i64 used, ready;  // per mille of the time
    std::optional<i64> wait;
    std::optional<i64> pcpu;
    i64 vcpu, worldlet;  // 0, MAX_ID: none
    LoadCurve *load;
};

struct VectorSpec {
    i64 vector;
    Params names;
    i64 rate, time;
    LoadCurve *load;
};

void NodesAddHost(Host *host, const HostSpec &spec);  // first of all
void NodesSetPcpu(Host *host, i64 pcpu, std::optional<i64> busy, std::optional<i64> worldlet);
void NodesSetSelf(Host *host, i64 used);
void NodesSetStack(Host *host, std::optional<i64> tx, std::optional<i64> rx, LoadCurve *load);
void NodesAddSwitch(Host *host, const std::string &name);
void NodesAddVm(Host *host, const VmSpec &spec);
Entity *NodesAddPort(Host *host, const PortSpec &spec);
void NodesAddNic(Host *host, const NicSpec &spec, Entity *port);
void NodesAddWorldlet(Host *host, const WorldletSpec &spec);
void NodesAddVector(Host *host, const VectorSpec &spec);
void NodesSettle(Host *host);  // last of all

i64 NodesVcpuId(i64 leader, i64 number);
// Adds to what an entity does a second, under one of its loads. Harmless for a rate of 0.
void NodesAddRate(Host *host, Entity *entity, LoadCurve *load, Slot slot, i64 rate);
void NodesSetSize(Entity *entity, i64 size);
