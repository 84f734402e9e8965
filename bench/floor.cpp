// The least that a report of virtual NIC ports can cost: the same node reads in the same order, the same number of
// texts formatted and written, and nothing else. floor PORTS ITERATIONS client|all, for the host of bench/cost.
#include "interface/types.h"
#include "meter/support/report.h"

#include <cstdlib>
#include <cstring>
#include <unistd.h>
#include <vector>

namespace {

struct Read {
    u32 node;
    u32 size;
};
constexpr Read CLIENT[] = {{266, 3316}, {269, 160}};
constexpr Read COMPANIONS[] = {{278, 68}, {280, 36}, {281, 32}, {282, 24}, {275, 20}};
constexpr Read SUMMARIES[] = {{342, 128}, {341, 140}};
constexpr Read VCPU[] = {{770, 120}, {772, 64}, {793, 8}};
constexpr u64 FIRST_PORT = 100000;
constexpr i64 FIRST_VCPU = 10000000 + 1000 * 1000;  // the stand-in's ids: 1000 apart for each world leader from 1000 on

char record[4096];
ReportBuf report;

KnfParamList PortList(const char *name, u64 port, u32 capacity) {
    KnfParamList list = KNF_ParamListCreate(KNF_INSTANCE_LIST, capacity);
    KNF_ParamListAddString(list, name);
    KNF_ParamListAddInt(list, static_cast<i64>(port));
    return list;
}

template <std::size_t Size>
void Get(const Read (&reads)[Size], KnfParamList list) {
    for (const Read &read : reads) {
        if (KNF_Get(read.node, list, record, read.size) != 0) {
            std::abort();
        }
    }
}

void ReadVcpus(i64 first, i32 count) {
    KnfParamList args = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2);
    for (i64 id = first; id < first + count; id++) {
        KNF_ParamListAddInt(args, id);
        Get(VCPU, args);
        KNF_ParamListAddString(args, "L3");
        Get({{795, 8}}, args);
        KNF_ParamListRemoveLastParam(args);
        KNF_ParamListRemoveLastParam(args);
    }
    KNF_ParamListDestroy(args);
}

void ReadPcpus(KnfParamList list, i32 count) {
    for (i32 i = 0; i < count; i++) {
        KNF_ParamListAddInt(list, i);
        Get({{797, 160}}, list);
        KNF_ParamListRemoveLastParam(list);
    }
}

// Texts of the lengths and conversions of the report's own.
void PrintPcpus(i32 count) {
    ReportPrintf(&report, ",\n\"cpu\": { \"topology\": { \"core\": %d, \"llc\": %d, \"package\": %d}", 2, 2, 8);
    ReportPrintf(&report, ",\n\"used\": [");
    for (i32 i = 0; i < 2 * count; i++) {
        ReportPrintf(&report, "%6.2f, ", 12.25);
    }
    ReportPrintf(&report, "%7.2f],\n\"wdt\": [", 196.0);
    ReportPrintf(&report, "%7.2f] }", 196.0);
}

void PrintClient(u64 port) {
    ReportPrintf(&report,
                 "\"name\": \"%s\", \"switch\": \"%s\", \"id\": %Ld, \"mac\": \"%s\", \"rxmode\": %d, \"uplink\": "
                 "\"%s\"",
                 "vm1000", "load10", static_cast<i64>(port), "02:0b:00:01:86:a0", 15, "false");
    for (const char *format : {",\n  \"txpps\": %.0f, \"txmbps\": %.1f, \"txsize\": %u, \"txeps\": %.2f, ",
                               "\"rxpps\": %.0f, \"rxmbps\": %.1f, \"rxsize\": %u, \"rxeps\": %.2f"}) {
        ReportPrintf(&report, format, 1000.0, 5.6, 700U, 1.0);
    }
}

void PrintAll() {
    ReportPrintf(&report, ",\n  \"coalesce\": { \"scheme\": \"%s\", \"params\": \"%s\"", "scheme1", "params of it");
    ReportPrintf(&report, ",\n    \"tx\": { \"dyn\": %d, \"depth\": %d", 1, 32);
    ReportPrintf(&report, ", \"split\": {\"hckcall\": %.0f, \"oppor\": %.0f, \"to\": %.0f, \"hc\": %.0f} }", 40.0, 30.0,
                 20.0, 10.0);
    ReportPrintf(&report, ",\n    \"txcomp\": { \"dyn\": %d, \"depth\": %d}", 1, 16);
    ReportPrintf(&report, ",\n    \"rx\": { \"dyn\": %d, \"depth\": %d, ", 1, 64);
    ReportPrintf(&report, "\"intrreq\": %.0f, \"intrpost\": %.0f}", 225000.0, 112500.0);
    ReportPrintf(&report, "}");
    ReportPrintf(&report,
                 ",\n  \"txwdt\": { \"total\": %.0f, \"hckcall\": %.1f, \"poll\": %.1f, \"to\": %.1f, \"hc\": %.1f, "
                 "\"other\": %.1f }",
                 968000.0, 25.8, 51.6, 12.9, 6.5, 3.2);
    ReportPrintf(&report,
                 ",\n  \"vnic\": { \"type\": \"parlan3\", \"ring1sz\": %d, \"ring2sz\": %d, \"tsopct\": %.1f, "
                 "\"tsotputpct\": %.1f, \"txucastpct\": %.1f, \"txeps\": %.1f,",
                 512, 128, 33.3, 80.0, 90.0, 1.0);
    ReportPrintf(&report, "\n    \"lropct\": %.1f, \"lrotputpct\": %.1f, \"rxucastpct\": %.1f, \"rxeps\": %.1f", 40.0,
                 70.0, 95.0, 5.0);
    ReportPrintf(&report,
                 ",\n    \"txdisc\": %.1f, \"qstop\": %.1f, \"txallocerr\": %.1f, \"txtsosplit\": %.1f, \"r1full\": "
                 "%.1f, \"r2full\": %.1f, \"sgerr\": %.1f}",
                 2.0, 4.0, 3.0, 5.0, 4.0, 5.0, 6.0);
}

void PrintVcpus(i64 vcpu) {
    ReportPrintf(&report, ",\n  \"vcpu\": [");
    for (i64 id = vcpu; id < vcpu + 2; id++) {
        ReportPrintf(&report, id == vcpu ? "\n    {" : ",\n    {");
        ReportPrintf(&report,
                     "\"id\": %Lu, \"used\": %.2f, \"ready\": %.2f, \"cstp\": %.2f, \"actnot\": %.2f, \"migtot\": "
                     "%.0f, \"migl3\": %.0f",
                     static_cast<u64>(id), 31.0, 2.1, 0.3, 2170.46, 31.0, 6.0);
        ReportPrintf(&report, " }");
    }
    ReportPrintf(&report, " ]");
}

}  // namespace

int main(int argc, char **argv) {
    if (argc != 4) {
        return 2;
    }
    i64 ports = std::atoll(argv[1]);
    i32 iterations = std::atoi(argv[2]);
    bool all = std::strcmp(argv[3], "all") == 0;
    constexpr i32 PCPUS = 16;
    char buffer[4096];
    report = {1, 0, buffer, sizeof buffer, 0, 0, false};
    HckSyscall_Init(1, 0, 0);
    std::vector<KnfParamList> lists;
    std::vector<KnfParamList> queues;
    for (i64 i = 0; i < ports; i++) {
        char name[32];
        Str_Snprintf(name, sizeof name, "load%d", static_cast<i32>(i / 100));
        lists.push_back(PortList(name, FIRST_PORT + static_cast<u64>(i), 2));
        queues.push_back(PortList(name, FIRST_PORT + static_cast<u64>(i), 3));
        KNF_ParamListAddInt(queues.back(), 0);
    }
    KnfParamList pcpuList = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2);
    for (i32 pass = 0; pass <= iterations; pass++) {
        ReadPcpus(pcpuList, PCPUS);
        for (i64 i = 0; i < ports; i++) {
            auto index = static_cast<std::size_t>(i);
            ReadVcpus(FIRST_VCPU + 1000 * i, 2);
            Get(CLIENT, lists[index]);
            if (all) {
                Get(COMPANIONS, lists[index]);
                Get({{354, 16}}, queues[index]);
                Get(SUMMARIES, lists[index]);
            }
        }
        PrintPcpus(pass == 0 ? 0 : PCPUS);
        for (i64 i = 0; pass != 0 && i < ports; i++) {
            ReportPrintf(&report, ",\n\n{");
            PrintClient(FIRST_PORT + static_cast<u64>(i));
            if (all) {
                PrintAll();
            }
            PrintVcpus(FIRST_VCPU + 1000 * i);
            ReportPrintf(&report, "}");
        }
        ReadVcpus(getpid(), 1);
        ReportFlush(&report);
    }
    return 0;
}
