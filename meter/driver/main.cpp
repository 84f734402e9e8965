// The entry point: start-up in its fixed order, then the sampling loop.
#include "meter/cpu/pcpu.h"
#include "meter/cpu/self.h"
#include "meter/driver/options.h"
#include "meter/driver/sampling.h"
#include "meter/driver/selection.h"
#include "meter/driver/source.h"
#include "meter/driver/watched.h"
#include "meter/ports/enumerate.h"
#include "meter/support/log.h"
#include "meter/support/run.h"
#include "meter/support/termination.h"

#include <fcntl.h>
#include <unistd.h>

namespace {

constexpr i32 FOR_EVER = 0x3fffffff;  // iterations

// A standard descriptor that was closed at start would be given to the next file that the process or its library
// opens, and the report would go there. A descriptor that can only be read makes each write to it fail instead.
void ReserveStandardDescriptors() {
    int fd = 0;
    do {
        fd = open64("/dev/null", O_RDONLY);
    } while (fd >= 0 && fd <= STDERR_FILENO);
    if (fd >= 0) {
        close(fd);
    }
}

// Where samples come from, and how many: a replay goes on as long as there are snapshots.
void OpenSource(Settings *settings) {
    if (cacheEnabled == 0) {
        HckSyscall_Init(1, 0, 0);
        InstallTerminationHandlers(Teardown);
        return;
    }
    CacheStep(&settings->cacheSpec, settings->checkVersion);
    settings->iterations = FOR_EVER;
}

}  // namespace

int main(int argc, char **argv) {
    char buffer[4096];
    ReportBuf report = {1, 0, buffer, sizeof buffer, 0, 0, false};
    nullPrefs = 0;
    ReserveStandardDescriptors();
    Settings settings = ParseOptions(argc, argv);
    if (settings.interval < 0) {
        Panic("Invalid interval %d\n", settings.interval);
    }
    if (settings.iterations < 1) {
        settings.iterations = FOR_EVER;
    }
    OpenSource(&settings);
    if (!CheckVersion() && settings.checkVersion) {
        return 1;
    }
    if (settings.outfile != nullptr && OpenReportFile(settings.outfile, &report) < 0) {
        return 1;
    }
    LeaveIfTerminated();
    if (settings.listPorts) {
        ListPorts(&report);
        ReportFlush(&report);
        LeaveIfTerminated();
        return report.gaveUp ? 1 : 0;
    }
    if (SchedStatsCpuGlobalInfoInit() != 0) {
        LogMsg(0, "SchedStatsCpuGlobalInfoInit failed\n");
        KNF_ParamListDestroy(instanceParams);
        return 1;
    }
    SelfVcpuInit();
    SelectPorts(settings);
    return RunSampling(&settings, &report);
}
