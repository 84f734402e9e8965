// The virtual CPUs of a port's virtual machine: found once through a chain of nodes, one record each, in an array that
// the Port owns until a failed read costs the port all of it. Four node reads a vcpu and pass. The same record and read
// serve for the program's own process.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"
#include "meter/support/report.h"

struct VcpuHisto;

// Running counters of microseconds.
struct __attribute__((packed)) VcpuStateTimes {
    u64 elapsedTime;
    u8 reserved8[24];
    u64 usedTime;
    u8 reserved40[8];
    u64 costopTime;
    u8 reserved56[8];
    u64 readyTime;  // waited for a pcpu
    u8 reserved72[48];
};
static_assert(sizeof(VcpuStateTimes) == 120 && offsetof(VcpuStateTimes, usedTime) == 32 &&
              offsetof(VcpuStateTimes, costopTime) == 48 && offsetof(VcpuStateTimes, readyTime) == 64);

struct Vcpu {
    u64 id;
    u8 histoEnabled;  // counts as one user of the host-wide histogram tracking
    VcpuStateTimes prevStateTimes;
    VcpuStateTimes curStateTimes;
    u64 prevActNot;
    u64 curActNot;
    u64 prevMigTotal;
    u64 curMigTotal;
    u64 prevMigL3;
    u64 curMigL3;
    VcpuHisto *histos;      // two banks of four; null if the vcpu has none
    VcpuHisto *prevHistos;  // the bank of the older sample
    VcpuHisto *curHistos;
};

// Finds the vcpus of a world leader. The number of records in the new array, or 0 with *vcpus left alone; failures are
// logged. With `vcpuHisto` each record gets histograms, if they can be had.
i32 VcpusCreate(u32 worldLeader, bool vcpuHisto, Vcpu **vcpus);

// Samples all records, up to the first that can't be read, whose status is the result.
KnfStatus VcpusRead(Vcpu *vcpus, i32 numVcpus, bool first);

// Writes the "vcpu" array and turns the samples over. Always 0.
KnfStatus VcpusPrint(Vcpu *vcpus, i32 numVcpus, f32 elapsed, ReportBuf *report);

// Frees the array and ends its histograms. Null does nothing.
void VcpusCleanup(Vcpu *vcpus, i32 numVcpus);
