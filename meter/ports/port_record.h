// The record of one watched switch port: its identity, its client counters and whatever stands behind it. The global
// port array of the driver owns every Port for the whole run; a Port owns all that it points to, but for `hostNic`, a
// counted reference to one record that all host NIC ports share. Companions are named by forward declaration alone, so
// that a companion may read this record.
#pragma once

#include "interface/types.h"
#include "meter/support/node.h"
#include "meter/support/prefs.h"

#include <sys/time.h>

struct HostNicStats;
struct PhysNic;
template <u32 Limits>
struct PortHistogram;
struct Vcpu;
struct Vnic;
struct Wdt;

constexpr u32 PORT_TYPE_HOST_NIC = 3;
constexpr u32 PORT_TYPE_UPLINK = 4;
constexpr u32 PORT_TYPE_VNIC = 5;
constexpr u32 PORT_STATUS_UPLINK = 0x40;

struct __attribute__((packed)) PortTypeRecord {
    u32 type;
    u32 subType;  // NIC model of a virtual NIC port: 8 parlan2, 9 parlan3
    u8 reserved8[1024];
    char switchName[1024];

    void EndTexts() { EndText(switchName); }
};
static_assert(sizeof(PortTypeRecord) == 2056 && offsetof(PortTypeRecord, switchName) == 1032);

struct __attribute__((packed)) PortStatusRecord {
    u8 reserved0[148];
    char clientName[1048];  // what is attached; for an uplink the physical NIC's name
    u32 worldLeader;        // of the virtual machine behind the port; 0 if there is none
    u32 statusFlags;
    u8 reserved1204[4];
    u8 mac[6];  // of every port type but a virtual NIC
    u8 reserved1214[1048];
    u8 vnicMac[6];  // of a virtual NIC port
    u8 reserved2268[1042];
    u32 rxMode;
    u8 reserved3314[2];

    void EndTexts() { EndText(clientName); }
};
static_assert(sizeof(PortStatusRecord) == 3316 && offsetof(PortStatusRecord, clientName) == 148 &&
              offsetof(PortStatusRecord, worldLeader) == 1196 && offsetof(PortStatusRecord, statusFlags) == 1200 &&
              offsetof(PortStatusRecord, mac) == 1208 && offsetof(PortStatusRecord, vnicMac) == 2262 &&
              offsetof(PortStatusRecord, rxMode) == 3310);

// Cumulative counters, unsigned.
struct __attribute__((packed)) PortClientStats {
    u64 txPkts;
    u64 txBytes;
    u64 txDropped;
    u64 txPktsExtra;   // transmitted packets that txPkts leaves out
    u64 txBytesExtra;  // transmitted bytes that txBytes leaves out
    u8 reserved40[32];
    u64 rxPkts;
    u64 rxBytes;
    u64 rxDropped;
    u8 reserved96[64];
};
static_assert(sizeof(PortClientStats) == 160 && offsetof(PortClientStats, txBytesExtra) == 32 &&
              offsetof(PortClientStats, rxPkts) == 72 && offsetof(PortClientStats, rxDropped) == 88);

// The identity of a port as its records tell it. Of use for a while: a port keeps an extract, as the records are large
// rooms for short texts.
struct PortInfo {
    u64 portNum;
    PortTypeRecord type;
    PortStatusRecord status;
    char macText[18];  // six octets in lower-case hexadecimal
};

struct PortIdentity {
    u64 portNum;
    u32 type;
    u32 subType;
    char *switchName;  // owned, like clientName
    char macText[18];  // this and what is above: as of creation
    char *clientName;  // this and what is below: as of the last pass
    u32 clientRoom;    // bytes at clientName
    u32 statusFlags;
    u32 rxMode;
};

struct Port {
    u8 active;  // 0 after a failed read that disabled the port, for good
    PortIdentity info;
    f32 elapsed;               // seconds, the divisor of the latest report
    KnfParamList portParams;   // switch name, port number
    KnfParamList queueParams;  // the same, with room for a queue number
    PortPrefs *prefs;          // the port's own copy
    KnfParamList histoParams;  // input of the histogram operations; null if the port has none
    i32 numVcpus;
    Vcpu *vcpus;                // null if none
    PortClientStats *curStats;  // sample pair
    PortClientStats *prevStats;
    timeval prevTime;  // when prevStats was filled
    timeval curTime;
    u8 histoStarted;               // the kernel was asked to start the port's histograms
    PortHistogram<11> *pktSizeIn;  // the six histogram records, null unless the prefs ask for them
    PortHistogram<11> *pktSizeOut;
    PortHistogram<14> *clusterIn;
    PortHistogram<14> *clusterOut;
    PortHistogram<18> *pktIntervalIn;
    PortHistogram<18> *pktIntervalOut;
    Wdt *wdt;  // the companions, null if absent; at most one of the NIC companions is set
    Vnic *vnic;
    PhysNic *physnic;
    HostNicStats *hostNic;
};
