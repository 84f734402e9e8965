// The layout of a report as a table: each step has the words that the collector prints there, and says what may come
// next. Texts are the only places where more than one way can be right. For layout.cpp alone; costs nothing.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace report::layout {

// The collector's rooms for texts, without their terminators.
constexpr uint32_t kHostBound = 1027;
constexpr uint32_t kNameBound = 1047;
constexpr uint32_t kSwitchBound = 1023;
constexpr uint32_t kSchemeBound = 31;
constexpr uint32_t kDeviceBound = kNameBound + 1 + 192;
constexpr uint32_t kWorldletBound = 4095;  // one print of the collector
constexpr std::string_view kSwitch = "\", \"switch\": \"";
constexpr uint32_t kPortBound = kNameBound + kSwitch.size() + kSwitchBound;

enum Op : uint8_t {
    Run,        // the layout's words and numbers have to stand here
    Try,        // likewise, unless its first words don't: then the other way
    Text,       // anything up to these words
    Numbers,    // one or more, divided by ", "
    Pairs,      // [n, n], likewise
    Body,       // as Run, and the record begins here
    Iteration,  // a number
    Id,         // a port's number
    Gone,       // a port that is {}
    Count,      // no more ports
    End,        // of a record
    Finish,     // of a document
};

// clang-format off
enum Place : uint8_t {
    Head, HostName, NoRecord, Next, Close, Finished, Record, RecordIteration, Topology, Still, Loads, UsedLoads,
    LoadsMiddle, WdtLoads, LoadsEnd, Ports, FirstPort, Port, GonePort, Name, NameText, PortId, Client, Coalesce,
    Scheme, Params, CoalesceDetails, Split1, Split2, SplitRest, CoalesceEnd, TxWdt, Parlan2, Parlan3, PhysNic,
    Device, Link, TxQueue, FirstTxQueue, MoreTxQueues, TxQueueEnd, RxQueue, FirstRxQueue, RxFilters, NoFilters,
    FilterPorts, FiltersEnd, MoreRxQueues, RxQueueEnd, Intr, Stack, Wdt, Worldlet, WorldletName, MoreWorldlets,
    WdtEnd, Vcpus, Vcpu, VcpuHistos, Buckets, RunHisto, RunValues, ReadyHisto, ReadyValues, CostopHisto,
    CostopValues, WaitHisto, WaitValues, VcpuHistosEnd, VcpuEnd, MoreVcpus, VcpusEnd, Histos, SizeIn, SizeOutHead,
    SizeOut, ClusterInHead, ClusterIn, ClusterOutHead, ClusterOut, IntervalInHead, IntervalIn, IntervalOutHead,
    IntervalOut, HistosEnd, PortEnd, MorePorts, NoMorePorts, Overhead, RecordEnd
};
// clang-format on
constexpr size_t kPlaces = RecordEnd + 1;

struct Step {
    Place place;  // its own place in the table
    Op op;
    // # stands for a number, @ for a MAC address, ? for true or false, * for a kind of affinity.
    const char *words = "";
    Place next = {};
    Place other = {};
    uint32_t bound = 0;  // of a text
};

extern const Step kSteps[kPlaces];

}  // namespace report::layout
