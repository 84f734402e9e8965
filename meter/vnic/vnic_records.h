// The kernel's records of a virtual NIC. They are packed: several fields lie at odd offsets. Counters are cumulative
// unless said otherwise.
#pragma once

#include "interface/types.h"
#include "meter/support/node.h"

struct __attribute__((packed)) VnicCoalesceInfo {
    u32 scheme;  // 1: rx, tx and txcomp records hold the details; 2: the scheme 2 record; any other: none
    char schemeName[32];
    char schemeParams[32];

    void EndTexts() {
        EndText(schemeName);
        EndText(schemeParams);
    }
};
static_assert(sizeof(VnicCoalesceInfo) == 68);

struct __attribute__((packed)) VnicTxWdtStats {
    u32 pollCount;
    u32 callCount;
    u32 toCount;
    u32 hcCount;
    u32 otherCount;
};
static_assert(sizeof(VnicTxWdtStats) == 20);

struct __attribute__((packed)) VnicCoalesceRx {
    u32 depth;
    u8 dyn;
    u8 reserved5[1];
    u32 intrPost;
    u32 intrReq;
    u8 reserved14[22];
};
static_assert(sizeof(VnicCoalesceRx) == 36 && offsetof(VnicCoalesceRx, intrPost) == 6);

struct __attribute__((packed)) VnicCoalesceTx {
    u32 depth;
    u8 reserved4[4];
    u8 dyn;
    u32 splitCall;
    u32 splitOppor;
    u32 splitTo;
    u32 splitHc;
    u8 reserved25[7];
};
static_assert(sizeof(VnicCoalesceTx) == 32 && offsetof(VnicCoalesceTx, splitCall) == 9);

struct __attribute__((packed)) VnicCoalesceTxComp {
    u32 depth;
    u8 dyn;
    u8 reserved5[19];
};
static_assert(sizeof(VnicCoalesceTxComp) == 24);

struct __attribute__((packed)) VnicCoalesceScheme2 {
    u8 reserved0[8];
    u8 txDyn;
    u8 txCompDyn;
    u8 rxDyn;
    u8 reserved11[1];
    u32 txDepth;
    u32 txCompDepth;
    u32 rxDepth;
    u8 reserved24[1];
    u32 intrPost;
    u32 intrReq;
    u8 reserved33[16];
    u32 splitCall;
    u32 splitOppor;
    u32 splitTo;
    u32 splitHc;
    u8 reserved65[3];
};
static_assert(sizeof(VnicCoalesceScheme2) == 68 && offsetof(VnicCoalesceScheme2, txDepth) == 12 &&
              offsetof(VnicCoalesceScheme2, intrPost) == 25 && offsetof(VnicCoalesceScheme2, splitCall) == 49);

struct __attribute__((packed)) Parlan2Sample {
    u32 txCalls;
    u32 copyBase;
    u8 reserved8[4];
    u32 copyCount;
    u32 maxPending;  // a current value
    u32 queueStops;
    u32 txOverflow;
    u32 interrupts;
    u8 reserved32[4];
    u32 rxBufUnderflow;
    u64 outOfSlots;
    u64 rxOverflow;
    u64 rxErrA;  // the lettered error counters are known to the kernel alone; they are only added up
    u64 ring2Errors;
    u64 maxFrags;
    u64 mapFailures;
    u64 rxErrB;
    u64 rxErrC;
    u64 rxErrD;
};
static_assert(sizeof(Parlan2Sample) == 112 && offsetof(Parlan2Sample, copyCount) == 12 &&
              offsetof(Parlan2Sample, rxBufUnderflow) == 36 && offsetof(Parlan2Sample, rxErrD) == 104);

struct __attribute__((packed)) Parlan3TxSummary {
    u8 reserved0[2];
    u64 txPkts;
    u64 txBytes;
    u64 tsoPkts;
    u64 tsoBytes;
    u64 ucastPkts;
    u8 reserved42[40];
    u64 txErrors;
    u64 txDiscards;
    u8 reserved98[8];
    u32 txAllocErrors;
    u32 queueStops;
    u8 reserved114[12];
    u32 txTsoSplits;
    u8 reserved130[10];
};
static_assert(sizeof(Parlan3TxSummary) == 140 && offsetof(Parlan3TxSummary, txErrors) == 82 &&
              offsetof(Parlan3TxSummary, txAllocErrors) == 106 && offsetof(Parlan3TxSummary, txTsoSplits) == 126);

struct __attribute__((packed)) Parlan3RxSummary {
    u64 lroPkts;
    u64 lroBytes;
    u64 rxPkts;
    u64 rxBytes;
    u64 ucastPkts;
    u8 reserved40[40];
    u64 rxErrA;
    u64 rxErrB;
    u32 ring1Full;
    u32 ring2Full;
    u8 reserved104[20];
    u32 sgErrors;
};
static_assert(sizeof(Parlan3RxSummary) == 128 && offsetof(Parlan3RxSummary, rxErrA) == 80 &&
              offsetof(Parlan3RxSummary, ring1Full) == 96 && offsetof(Parlan3RxSummary, sgErrors) == 124);

// State of receive queue 0; current values.
struct __attribute__((packed)) Parlan3RxQueueStatus {
    u8 reserved0[6];
    u32 ring1Size;
    u32 ring2Size;
    u8 reserved14[2];
};
static_assert(sizeof(Parlan3RxQueueStatus) == 16 && offsetof(Parlan3RxQueueStatus, ring2Size) == 10);
