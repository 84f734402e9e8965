// The nodes of the simulated host: what moves in every record, and the instances and lists that each entity of a
// description brings. Callers have checked names and ranges.
#pragma once

#include "corekit/simulated/host.h"

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

void NodesAddHost(Host *host, const HostSpec &spec);  // first of all
void NodesSetPcpu(Host *host, i64 pcpu, i64 busy, i64 worldlet);
void NodesSetStack(Host *host, i64 tx, i64 rx);
void NodesAddSwitch(Host *host, const std::string &name);
void NodesAddVm(Host *host, const VmSpec &spec);
void NodesAddPort(Host *host, const PortSpec &spec);
void NodesAddNic(Host *host, const NicSpec &spec);
void NodesAddWorldlet(Host *host, const WorldletSpec &spec);
void NodesAddVector(Host *host, i64 vector, const Params &names, i64 rate, i64 time);
