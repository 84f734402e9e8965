// The kernel's records of a physical NIC. Counters are running totals, unsigned.
#pragma once

#include "interface/types.h"
#include "meter/support/node.h"

struct __attribute__((packed)) PnicProperties {
    char device[193];  // an opaque label
    u32 portNum;       // of the NIC's uplink port
    u8 reserved197[1055];

    void EndTexts() { EndText(device); }
};
static_assert(sizeof(PnicProperties) == 1252 && offsetof(PnicProperties, portNum) == 193);

constexpr u32 PNIC_RX_ERRORS = 6;  // further error counters, in a row
constexpr u32 PNIC_TX_ERRORS = 5;

struct __attribute__((packed)) PnicStats {
    u64 rxPkts;
    u64 txPkts;
    u64 rxBytes;
    u64 txBytes;
    u64 rxErrors32;  // error counters are told apart by their offset alone
    u64 txErrors40;
    u64 rxErrors48;
    u64 txErrors56;
    u8 reserved64[16];
    u64 rxErrors80[PNIC_RX_ERRORS];
    u64 txErrors128[PNIC_TX_ERRORS];
    u8 reserved168[4128];
};
static_assert(sizeof(PnicStats) == 4296 && offsetof(PnicStats, txErrors56) == 56 &&
              offsetof(PnicStats, rxErrors80) == 80 && offsetof(PnicStats, txErrors128) == 128);

// Of the receive queues as of the transmit queues.
struct __attribute__((packed)) PnicQueueInfo {
    u16 count;
    u8 reserved2[10];
};
static_assert(sizeof(PnicQueueInfo) == 12);

struct __attribute__((packed)) TxqSample {
    u32 packets;
    u32 errors;
    u8 reserved8[4];
    u32 stops;
    u8 reserved16[4];
};
static_assert(sizeof(TxqSample) == 20 && offsetof(TxqSample, stops) == 12);

struct __attribute__((packed)) PnicRxFilter {
    u8 reserved0[14];
    u32 portId;  // the port that the filter serves
    u8 reserved18[18];
};
static_assert(sizeof(PnicRxFilter) == 36 && offsetof(PnicRxFilter, portId) == 14);
