// What the parts of a pass cost in one process, beside the bare library calls that they are made of.
#include "corekit/entry/control.h"
#include "meter/driver/watched.h"
#include "meter/support/node.h"
#include "meter/support/run.h"

#include <benchmark/benchmark.h>
#include <fcntl.h>

namespace {

constexpr char HOST[] = R"(
host name=bench pcpus=4 packages=1 cores=2 llc=1
switch sw
vm vm leader=1000 vcpus=2
vnic switch=sw port=7 vm=vm model=parlan3 scheme=1 tx=1000 rx=900 size=700
)";
constexpr PortPrefs ALL = PREF_VNIC | PREF_COALESCE | PREF_COALESCE_DETAIL | PREF_WDT;

ReportBuf *NullReport() {
    static char buffer[4096];
    static ReportBuf report = {open("/dev/null", O_WRONLY), 0, buffer, sizeof buffer, 0, 0, false};
    return &report;
}

Port *BenchPort(PortPrefs prefs) {
    CorekitLoad(HOST, nullptr);
    absCounts = 1;
    Port *watched = PortCreate(7, &prefs);
    PortRead(watched, true);
    PortRead(watched, false);
    return watched;
}

void NodeRead(benchmark::State &state) {
    Port *watched = BenchPort(0);
    for (auto _ : state) {
        benchmark::DoNotOptimize(KNF_Get(269, watched->portParams, watched->curStats, 160));
    }
}
BENCHMARK(NodeRead);

void Format(benchmark::State &state) {
    char text[128];
    for (auto _ : state) {
        benchmark::DoNotOptimize(Str_Snprintf(text, sizeof text, "\"rxpps\": %.0f, \"rxeps\": %.2f", 31999.0, 2.25));
    }
}
BENCHMARK(Format);

void ReportText(benchmark::State &state) {
    for (auto _ : state) {
        ReportPrintf(NullReport(), "\"rxpps\": %.0f, \"rxeps\": %.2f", 31999.0, 2.25);
    }
}
BENCHMARK(ReportText);

void ReadPass(benchmark::State &state) {
    Port *watched = BenchPort(static_cast<PortPrefs>(state.range(0)));
    for (auto _ : state) {
        PortRead(watched, false);
    }
}
BENCHMARK(ReadPass)->Arg(0)->Arg(ALL);

void PrintPass(benchmark::State &state) {
    Port *watched = BenchPort(static_cast<PortPrefs>(state.range(0)));
    for (auto _ : state) {
        PortPrint(watched, NullReport());
    }
}
BENCHMARK(PrintPass)->Arg(0)->Arg(ALL);

}  // namespace

BENCHMARK_MAIN();
