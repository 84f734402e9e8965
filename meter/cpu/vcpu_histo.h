// Histograms of virtual CPUs. The kernel collects them only while the host-wide option "TrackHistos" is on, which costs
// the host: it is on exactly while at least one vcpu uses it. A write of it that fails ends vcpu histograms for good; a
// read that fails costs one port's histograms and nothing else. Four node reads a vcpu and pass.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"
#include "meter/support/report.h"

struct Vcpu;

// What one record's histograms are printed with: the vcpu's time differences of this report, in microseconds.
struct VcpuTimes {
    i64 used;
    i64 ready;
    i64 costop;
};

// The lists of this module, made at start-up. All three null: vcpu histograms are out of reach.
extern KnfParamList trackHistoPath;  // holds the option's group; its name is added around a write

// False when one of the lists could not be made.
bool VcpuHistoCreateLists();
void VcpuHistoDropLists();

// Writes the option when `state`, 1 or 0, changes anything; only remembers it in replay. 0, or the status of the step
// that failed: the option is then never written again and later calls give 0.
KnfStatus VcpuHistoTrack(i32 state);

// Gives a new record its histograms. False when it can't have them though it should.
bool VcpuHistoSetUp(Vcpu *vcpu);

// Whether histograms can be had at all.
bool VcpuHistoAvailable();

// Samples one vcpu's histograms, if it has any. A failure, logged, sets *failed, which makes later vcpus skip theirs.
void VcpuHistoRead(Vcpu *vcpu, bool first, bool *failed);

// Writes one vcpu's section, if it has one, and turns its banks over.
void VcpuHistoPrint(Vcpu *vcpu, const VcpuTimes &times, ReportBuf *report);

// Ends an array's histograms and frees their storage.
void VcpuHistoRelease(Vcpu *vcpus, i32 numVcpus);

// Ends an array's use of the tracking; the storage stays. Always 0.
KnfStatus VcpuHistoDisable(Vcpu *vcpus, i32 numVcpus);
