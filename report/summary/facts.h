// The figures of one port in one record that the rules look at, and which figures of a record can't be true. Knows
// nothing of a series. Texts in the facts are views into the rows. A record costs one look at each of its cells.
#pragma once

#include "report/rows/rows.h"

#include <string_view>
#include <vector>

namespace report {

enum class Fact : uint8_t {
    RxPps,
    RxEps,
    RxSize,
    TxPps,
    TxEps,
    Ring1Size,
    R1Full,
    R2Full,
    RxBufLow,
    OoSlots,
    RxOflow,
    Ring2Err,
    MaxFrags,
    MapFail,
    SgErr,
    VnicStops,  // a second, for both models
    TxDisc,
    TxAllocErr,
    TxOflow,
    Ready,       // of the vcpu that waits most
    CoStop,      // of the vcpu that is stopped most
    Used,        // of the busiest vcpu
    UsedOthers,  // mean of the other vcpus; absent where there are none
    WdtUsed,     // of the port's worker that is shortest of CPU
    WdtReady,
    Pcpu,  // that this worker is bound to; absent where it is bound to none
    PcpuUsed,
    NicRxPps,
    NicRxEps,
    NicTxPps,
    NicTxMbps,
    NicStops,      // of all transmit queues
    TxQueues,      // that have figures
    TxQueueAll,    // packets/s of all of them
    TxQueue,       // the busiest one, by number
    TxQueueShare,  // per cent that it has of all packets
    RxQueues,
    RxActive,
    IntrUsed,
    TcpPps,
    TcpRexmit,
    UdpRxPps,
    UdpRxSockEps,
};
constexpr size_t kFacts = static_cast<size_t>(Fact::UdpRxSockEps) + 1;

// The key of the column that a fact comes from, or one like it where it was worked out of several.
const char *FactKey(Fact fact);

struct PortFacts {
    double values[kFacts];     // NaN: absent, or can't be true
    std::string_view vm;       // lowest vcpu id; empty: no vcpus
    std::string_view waiting;  // id of the vcpu that waits most
    std::string_view stopped;  // that is stopped most
    std::string_view busiest;  // that is used most
    std::string_view worker;   // whose figures stand in WdtUsed and WdtReady
    uint32_t sections;         // that the port has in this record, as bits

    double at(Fact fact) const { return values[static_cast<size_t>(fact)]; }
};

// A figure that can't be true.
struct Suspect {
    uint32_t place;   // of its port; ~0u: none
    uint16_t series;  // its section and column as one number
    bool share;       // shares of the time that together exceed it, not one figure
    const char *key;
    double value;
};

struct FactReader {
    std::vector<Suspect> suspects;  // of the record; those of a port's shares come by FactsOfPort
    std::vector<double> pcpuUsed;   // by number; the sum is left out
    double span = 1;                // seconds of the record
    double divisor = 1;             // of rates, so that they are by second

    struct Check {
        uint16_t column;
        uint8_t kind;
        uint8_t length;  // shorter cells without a sign pass unread
    };
    std::vector<Check> checks[kSections];
    std::vector<uint8_t> kinds[kSections];   // by column
    std::vector<uint32_t> first[kSections];  // by place: its first row, ~0u for none; a port's rows stand together
    int columns[kFacts];                     // of facts that are a figure of the report
    int vcpuId, afftype, affval, worker, wait, vnicType;  // other columns
};

void FactsInit(FactReader *reader);
// Indexes the rows and finds what can't be true. counts: rates in it are counts over the span.
void FactsBegin(FactReader *reader, const Rows &rows, double span, bool counts);
void FactsOfPort(FactReader *reader, const Rows &rows, uint32_t place, PortFacts *facts);
double FactsOverhead(const FactReader &reader, const Rows &rows);

}  // namespace report
