#include "report/input/layout_steps.h"

namespace report::layout {

#define WORLDLET                                                                                                        \
    "\n    {\"used\": #, \"ready\": #, \"wait\": #, \"runct\": #, \"remoteactct\": #, \"migct\": #, \"overrunct\": #, " \
    "\"afftype\": \"*\", \"affval\": #, \"name\": \""
#define IP "\"txpps\": #, \"txeps\": #, \"txfrags\": #, \"rxpps\": #, \"rxdeliv\": #, \"rxeps\": #, \"rxreass\": # }"
#define TXQUEUE "\n    {\"pps\": #, \"eps\": #, \"qstops\": #}"
#define VCPU_HISTO(name) "\n        { \"name\": \"" name "\", \"count\": #, \"mean\": #, \"values\": ["
#define PORT_HISTO(name)                                                                                               \
    "\n    { \"name\": \"" name "\", \"min\": #, \"max\": # ,\"mean\": #, \"count\": #,\n      \"values\":["

constexpr Step kSteps[kPlaces] = {
    {Head, Run, "{ \"sysinfo\": { \"hostname\": \"", HostName},
    {HostName, Text, "\" },\n\"stats\": [\n", NoRecord, {}, kHostBound},
    {NoRecord, Try, "\n] }", Finished, Record},
    {Next, Try, ",\n", Record, Close},
    {Close, Run, "\n] }", Finished},
    {Finished, Finish},
    {Record, Body, "{ \"time\": #, \"interval\": #, \"iteration\": ", RecordIteration},
    {RecordIteration, Iteration, "#", Topology},
    {Topology, Run, ",\n\"cpu\": { \"topology\": { \"core\": #, \"llc\": #, \"package\": #}", Still},
    {Still, Try, ",\n\"used\":[0.00 ], \"wdt\": [0.00 ] }", Ports, Loads},
    {Loads, Run, ",\n\"used\": [", UsedLoads},
    {UsedLoads, Numbers, "#", LoadsMiddle},
    {LoadsMiddle, Run, "],\n\"wdt\": [", WdtLoads},
    {WdtLoads, Numbers, "#", LoadsEnd},
    {LoadsEnd, Run, "] }", Ports},
    {Ports, Run, ",\n\"ports\":[", FirstPort},
    {FirstPort, Try, "\n\n{", Port, NoMorePorts},
    {Port, Try, "}", GonePort, Name},
    {GonePort, Gone, "", MorePorts},
    {Name, Run, "\"name\": \"", NameText},
    {NameText, Text, "\", \"id\": ", PortId, {}, kPortBound},
    {PortId, Id, "#", Client},
    {Client, Run,
     ", \"mac\": \"@\", \"rxmode\": #, \"uplink\": \"?\",\n  \"txpps\": #, \"txmbps\": #, \"txsize\": #, \"txeps\": #, "
     "\"rxpps\": #, \"rxmbps\": #, \"rxsize\": #, \"rxeps\": #",
     Coalesce},
    {Coalesce, Try, ",\n  \"coalesce\": { \"scheme\": \"", Scheme, TxWdt},
    {Scheme, Text, "\", \"params\": \"", Params, {}, kSchemeBound},
    {Params, Text, "\"", CoalesceDetails, {}, kSchemeBound},
    {CoalesceDetails, Try, ",\n    \"tx\": { \"dyn\": #, \"depth\": #, \"split\": {\"", Split1, CoalesceEnd},
    {Split1, Try, "hckcall\"", SplitRest, Split2},
    {Split2, Run, "hck\"", SplitRest},
    {SplitRest, Run,
     ": #, \"oppor\": #, \"to\": #, \"hc\": #} },\n    \"txcomp\": { \"dyn\": #, \"depth\": #},\n"
     "    \"rx\": { \"dyn\": #, \"depth\": #, \"intrreq\": #, \"intrpost\": #}",
     CoalesceEnd},
    {CoalesceEnd, Run, "}", TxWdt},
    {TxWdt, Try, ",\n  \"txwdt\": { \"total\": #, \"hckcall\": #, \"poll\": #, \"to\": #, \"hc\": #, \"other\": # }",
     Parlan2, Parlan2},
    {Parlan2, Try,
     ",\n  \"vnic\": { \"type\": \"parlan2\", \"txcalls\": #, \"copypct\": #, \"maxpend\": #, \"intr\": #, "
     "\"qstop\": #, \"txeps\": #, \"rxeps\": #,\n    \"txoflow\": #, \"rxbuflow\": #, \"ooslots\": #, "
     "\"rxoflow\": #, \"ring2err\": #, \"maxfrags\": #, \"mapfail\": #}",
     PhysNic, Parlan3},
    {Parlan3, Try,
     ",\n  \"vnic\": { \"type\": \"parlan3\", \"ring1sz\": #, \"ring2sz\": #, \"tsopct\": #, \"tsotputpct\": #, "
     "\"txucastpct\": #, \"txeps\": #,\n    \"lropct\": #, \"lrotputpct\": #, \"rxucastpct\": #, \"rxeps\": #,\n"
     "    \"txdisc\": #, \"qstop\": #, \"txallocerr\": #, \"txtsosplit\": #, \"r1full\": #, \"r2full\": #, "
     "\"sgerr\": #}",
     PhysNic, PhysNic},
    {PhysNic, Try, ",\n  \"physnic\": {\"devname\": \"", Device, TxQueue},
    {Device, Text, "\",\n    \"txpps\": ", Link, {}, kDeviceBound},
    {Link, Run,
     "#, \"txmbps\": #, \"txsize\": #, \"txeps\": #, \"rxpps\": #, \"rxmbps\": #, \"rxsize\": #, \"rxeps\": # }",
     TxQueue},
    {TxQueue, Try, ",\n  \"txqueue\": { \"count\": #, \"details\": [", FirstTxQueue, RxQueue},
    {FirstTxQueue, Try, TXQUEUE, MoreTxQueues, TxQueueEnd},
    {MoreTxQueues, Try, "," TXQUEUE, MoreTxQueues, TxQueueEnd},
    {TxQueueEnd, Run, "],\n    \"active\": # }", RxQueue},
    {RxQueue, Try, ",\n  \"rxqueue\": { \"count\": #, \"details\": [", FirstRxQueue, Intr},
    {FirstRxQueue, Try, "\n    [", RxFilters, RxQueueEnd},
    {RxFilters, Try, "]", MoreRxQueues, NoFilters},
    {NoFilters, Try, " ]", MoreRxQueues, FilterPorts},
    {FilterPorts, Numbers, "#", FiltersEnd},
    {FiltersEnd, Run, " ]", MoreRxQueues},
    {MoreRxQueues, Try, ",\n    [", RxFilters, RxQueueEnd},
    {RxQueueEnd, Run, "],\n    \"active\": #, \"filters\": #, \"ports\": # }", Intr},
    {Intr, Try, ",\n  \"intr\": {\"count\": #, \"used\": #}", Stack, Stack},
    {Stack, Try,
     ",\n  \"ipv4\": { " IP ",\n  \"ipv6\": { " IP ",\n  \"tcptx\": { \"pps\": #, \"datapct\": #, \"mbps\": #, "
     "\"size\": #, \"delackpct\": #, \"rexmit\": #, \"sackrexmit\": #, \"winprb\": #, \"winupd\": # },\n"
     "  \"tcprx\": { \"pps\": #, \"datapct\": #, \"mbps\": #, \"size\": #, \"dups\": #, \"oo\": #, \"winprb\": #, "
     "\"winupd\": #, \"othereps\": #},\n  \"udp\": {\"txpps\": #, \"rxpps\": #, \"rxsockeps\": #, \"rxothereps\": #}",
     Wdt, Wdt},
    {Wdt, Try, ",\n  \"wdt\": [", Worldlet, Vcpus},
    {Worldlet, Run, WORLDLET, WorldletName},
    {WorldletName, Text, "\"}", MoreWorldlets, {}, kWorldletBound},
    {MoreWorldlets, Try, "," WORLDLET, WorldletName, WdtEnd},
    {WdtEnd, Run, " ]", Vcpus},
    {Vcpus, Try, ",\n  \"vcpu\": [", Vcpu, Histos},
    {Vcpu, Run, "\n    {\"id\": #, \"used\": #, \"ready\": #, \"cstp\": #, \"actnot\": #, \"migtot\": #, \"migl3\": #",
     VcpuHistos},
    {VcpuHistos, Try, ",\n    \"histos\":{\"buckets\": [ ", Buckets, VcpuEnd},
    {Buckets, Numbers, "#", RunHisto},
    {RunHisto, Run, "],\n      \"values\":[" VCPU_HISTO("run"), RunValues},
    {RunValues, Numbers, "#", ReadyHisto},
    {ReadyHisto, Run, "] }," VCPU_HISTO("ready"), ReadyValues},
    {ReadyValues, Numbers, "#", CostopHisto},
    {CostopHisto, Run, "] }," VCPU_HISTO("cstp"), CostopValues},
    {CostopValues, Numbers, "#", WaitHisto},
    {WaitHisto, Run, "] }," VCPU_HISTO("wait"), WaitValues},
    {WaitValues, Numbers, "#", VcpuHistosEnd},
    {VcpuHistosEnd, Run, "] }] }", VcpuEnd},
    {VcpuEnd, Run, " }", MoreVcpus},
    {MoreVcpus, Try, ",", Vcpu, VcpusEnd},
    {VcpusEnd, Run, " ]", Histos},
    {Histos, Try, ",\n  \"histos\":[" PORT_HISTO("pktsizein"), SizeIn, PortEnd},
    {SizeIn, Pairs, "#", SizeOutHead},
    {SizeOutHead, Run, "] }," PORT_HISTO("pktsizeout"), SizeOut},
    {SizeOut, Pairs, "#", ClusterInHead},
    {ClusterInHead, Run, "] }," PORT_HISTO("clusterin"), ClusterIn},
    {ClusterIn, Pairs, "#", ClusterOutHead},
    {ClusterOutHead, Run, "] }," PORT_HISTO("clusterout"), ClusterOut},
    {ClusterOut, Pairs, "#", IntervalInHead},
    {IntervalInHead, Run, "] }," PORT_HISTO("pktintervalin"), IntervalIn},
    {IntervalIn, Pairs, "#", IntervalOutHead},
    {IntervalOutHead, Run, "] }," PORT_HISTO("pktintervalout"), IntervalOut},
    {IntervalOut, Pairs, "#", HistosEnd},
    {HistosEnd, Run, "] } ]", PortEnd},
    {PortEnd, Run, "}", MorePorts},
    {MorePorts, Try, ",\n\n{", Port, NoMorePorts},
    {NoMorePorts, Count, "", Overhead},
    {Overhead, Run, "],\n\n\"overhead\": {\"used\": # } }", RecordEnd},
    {RecordEnd, End},
};
#undef WORLDLET
#undef IP
#undef TXQUEUE
#undef VCPU_HISTO
#undef PORT_HISTO

namespace {

constexpr bool InOrder() {
    for (size_t i = 0; i < kPlaces; i++) {
        if (kSteps[i].place != i) {
            return false;
        }
    }
    return true;
}
static_assert(InOrder());

}  // namespace
}  // namespace report::layout
