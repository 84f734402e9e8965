#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"

#include <ctime>
#include <unistd.h>

namespace {

// The topology is read by the first call and stays.
Cpus *OpenCpus(LinuxHost *host) {
    if (!host->cpusOpen) {
        host->cpusOpen = CpusOpen(&host->cpus, host->root) == FINE;
    }
    return host->cpusOpen ? &host->cpus : nullptr;
}

}  // namespace

const CpuTopology *HostTopology(LinuxHost *host) {
    Cpus *cpus = OpenCpus(host);
    return cpus != nullptr ? &cpus->topology : nullptr;
}

KnfStatus TopologyGet(LinuxHost *host, const Params & /*keys*/, char *record) {
    const CpuTopology *topology = HostTopology(host);
    if (topology == nullptr) {
        return STATUS_UNTOLD;
    }
    Put(record, topology::PACKAGES, topology->packages);
    Put(record, topology::CORES, topology->cores);
    Put(record, topology::PCPUS, topology->cpus);
    return STATUS_OK;
}

KnfStatus PcpuInfoGet(LinuxHost *host, const Params &keys, char *record) {
    const CpuTopology *topology = HostTopology(host);
    if (topology == nullptr || keys[0].number < 0 || keys[0].number >= topology->cpus) {
        return STATUS_NOT_FOUND;
    }
    Put(record, pcpu_info::LLC, topology->lastCacheSharers);
    return STATUS_OK;
}

KnfStatus PcpuStatsGet(LinuxHost *host, const Params &keys, char *record) {
    Cpus *cpus = OpenCpus(host);
    if (cpus == nullptr || keys[0].number < 0 || keys[0].number >= cpus->topology.cpus) {
        return STATUS_NOT_FOUND;
    }
    auto cpu = static_cast<size_t>(keys[0].number);
    host->cpuServed.resize(cpus->topology.cpus);
    PassJoin(&host->cpuPass, &host->cpuServed[cpu], host->now());
    // Times that stand still show as no load at all; a failure would be told again each pass.
    if (CpusRead(cpus, host->cpuPass.generation) != FINE && cpus->moment == 0) {
        TellOnce(&host->toldCpus, "corekit: /proc/stat does not tell the load of the CPUs\n");
        return STATUS_OK;
    }
    const CpuRow &row = cpus->rows[cpu];
    Put(record, pcpu_stats::BUSY, row.busy);
    Put(record, pcpu_stats::WORLDLETS, row.interrupts);
    Put(record, pcpu_stats::ELAPSED, row.elapsed);
    return STATUS_OK;
}

KnfStatus OptionGet(LinuxHost * /*host*/, const Params &keys, char *record) {
    char name[256] = {};
    if (keys[0].text != "Misc" || keys[1].text != "HostName") {
        return STATUS_NOT_FOUND;
    }
    gethostname(name, sizeof name - 1);
    PutText(record, config_option::VALUE, name);
    return STATUS_OK;
}

KnfStatus TimeGet(LinuxHost * /*host*/, const Params & /*keys*/, char *record) {
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    Put(record, host_time::SECONDS, static_cast<u64>(now.tv_sec));
    Put(record, host_time::NANOSECONDS, static_cast<u64>(now.tv_nsec));
    return STATUS_OK;
}
