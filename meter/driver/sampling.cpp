#include "meter/driver/sampling.h"

#include "meter/cpu/pcpu.h"
#include "meter/cpu/self.h"
#include "meter/driver/source.h"
#include "meter/driver/watched.h"
#include "meter/support/run.h"
#include "meter/support/termination.h"

#include <unistd.h>

namespace {

void ReadPorts(bool first) {
    for (i32 i = 0; i < numPorts; i++) {
        PortRead(port[i], first);
        LeaveIfTerminated();
    }
}

void PrintPorts(ReportBuf *report) {
    ReportPrintf(report, ",\n\"ports\":[");
    for (i32 i = 0; i < numPorts; i++) {
        ReportPrintf(report, i == 0 ? "\n\n{" : ",\n\n{");
        PortPrint(port[i], report);
        ReportPrintf(report, "}");
        LeaveIfTerminated();
    }
    ReportPrintf(report, "]");
}

// Waits for the next sample. False when there is none.
bool NextSample(Settings *settings) {
    if (cacheEnabled != 0) {
        if (settings->cacheSpec == nullptr) {
            return false;
        }
        KNF_CacheCleanup();
        return CacheStep(&settings->cacheSpec, settings->checkVersion) == 0;
    }
    WaitInterval(settings->interval);
    LeaveIfTerminated();
    return true;
}

void FirstPass(ReportBuf *report) {
    SchedStatsPcpuStats(true);
    ReadPorts(true);
    SelfVcpuRead(true);
    ReportPrintf(report, "{ \"sysinfo\": { \"hostname\": \"%s\" }", hostName != nullptr ? hostName : "");
    ReportPrintf(report, ",\n\"stats\": [\n");
}

void Iterate(i32 iteration, i64 lastTime, ReportBuf *report) {
    SchedStatsPcpuStats(false);
    ReadPorts(false);
    i64 now = SampleTime();
    if (iteration != 0) {
        ReportPrintf(report, ",\n");
    }
    ReportPrintf(report, "{ \"time\": %Ld, \"interval\": %Ld, \"iteration\": %d", now, now - lastTime, iteration);
    SchedStatsCpuPrint(report);
    PrintPorts(report);
    SelfVcpuRead(false);
    OverheadPrint(report);
    ReportPrintf(report, " }");
    ReportFlush(report);
    LeaveIfTerminated();
}

}  // namespace

int RunSampling(Settings *settings, ReportBuf *report) {
    i64 lastTime = SampleTime();
    FirstPass(report);
    for (i32 iteration = 0; !report->gaveUp && NextSample(settings); iteration++) {
        Iterate(iteration, lastTime, report);
        lastTime = SampleTime();
        if (iteration + 1 >= settings->iterations) {
            break;
        }
    }
    ReportPrintf(report, "\n] }\n");
    if (ReportFlush(report) != 0) {
        LeaveIfTerminated();
    }
    Teardown();
    if (report->gaveUp) {
        return 1;
    }
    close(report->outFd);
    close(report->closeFd);
    return 0;
}
