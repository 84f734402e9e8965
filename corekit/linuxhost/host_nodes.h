// The nodes of the Linux host, a function each, which the table in source.cpp joins to their numbers and keys. A
// function gets keys of the right number and kinds. A record has its node's size and is all zeros.
#pragma once

#include "corekit/node_source.h"

struct LinuxHost;

// host_ports.cpp: switches and their ports.
KnfStatus PortTypeGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus PortStatusGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus SwitchList(LinuxHost *host, const Params &keys, Params *entries);
KnfStatus SwitchPorts(LinuxHost *host, const Params &keys, Params *entries);

// host_counters.cpp: counters of ports, NICs and their queues.
KnfStatus PortStatsGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus NicPropertiesGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus NicStatsGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus RxqInfoGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus TxqInfoGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus TxqStatsGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus RxqFilters(LinuxHost *host, const Params &keys, Params *entries);

// host_cpus.cpp: CPUs, and what there is once.
KnfStatus TopologyGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus PcpuInfoGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus PcpuStatsGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus OptionGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus TimeGet(LinuxHost *host, const Params &keys, char *record);

// host_threads.cpp: virtual CPUs and worldlets.
KnfStatus CartelGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus GroupGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus LeaderGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus VcpuTimesGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus VcpuEventsGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus VcpuMigrationsGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus VcpuCacheMigrationsGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus VcpuList(LinuxHost *host, const Params &keys, Params *entries);
KnfStatus WorldletGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus WorldletList(LinuxHost *host, const Params &keys, Params *entries);

// host_stack.cpp: the host's own IP stack.
KnfStatus Ipv4Get(LinuxHost *host, const Params &keys, char *record);
KnfStatus Ipv6Get(LinuxHost *host, const Params &keys, char *record);
KnfStatus TcpGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus UdpGet(LinuxHost *host, const Params &keys, char *record);

// host_histograms.cpp: histograms of ports. A write's input may be anything.
KnfStatus ClustersSet(LinuxHost *host, const Params &keys, const Params &input);
KnfStatus SizesSet(LinuxHost *host, const Params &keys, const Params &input);
KnfStatus IntervalsSet(LinuxHost *host, const Params &keys, const Params &input);
KnfStatus ClustersGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus SizesInGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus SizesOutGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus IntervalsInGet(LinuxHost *host, const Params &keys, char *record);
KnfStatus IntervalsOutGet(LinuxHost *host, const Params &keys, char *record);

// host_demand.cpp: histograms of vcpus.
KnfStatus OptionSet(LinuxHost *host, const Params &keys, const Params &input);
KnfStatus VcpuHistoGet(LinuxHost *host, const Params &keys, char *record);

// host_vectors.cpp: interrupts of NICs.
KnfStatus VectorList(LinuxHost *host, const Params &keys, Params *entries);
KnfStatus VectorNames(LinuxHost *host, const Params &keys, Params *entries);
KnfStatus VectorStatsGet(LinuxHost *host, const Params &keys, char *record);
