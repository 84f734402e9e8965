// The entry point: start-up in its fixed order, then the sampling loop.
#include "driver/options.h"
#include "driver/sampling.h"
#include "driver/selection.h"
#include "driver/signals.h"
#include "driver/source.h"
#include "driver/watched.h"
#include "support/log.h"

namespace {

constexpr i32 FOR_EVER = 0x3fffffff;  // iterations

void Connect(Settings *settings) {
    if (settings->iterations < 1) {
        settings->iterations = FOR_EVER;
    }
    if (settings->cacheSpec != nullptr) {
        settings->iterations = FOR_EVER;
        return;
    }
    HckSyscall_Init(1, 0, 0);
    InstallSignalHandlers();
}

}  // namespace

int main(int argc, char **argv) {
    char buffer[4096];
    ReportBuf report = {1, 0, buffer, sizeof buffer, 0, 0, false};
    nullPrefs = 0;
    Settings settings = ParseOptions(argc, argv);
    if (settings.interval < 0) {
        Panic("Invalid interval %d\n", settings.interval);
    }
    Connect(&settings);
    if (!CheckVersion() && settings.checkVersion) {
        return 1;
    }
    if (settings.outfile != nullptr && OpenReportFile(settings.outfile, &report) < 0) {
        return 1;
    }
    if (settings.listPorts) {
        return ReportFlush(&report) != 0 && report.gaveUp ? 1 : 0;
    }
    SelectPorts(settings);
    return RunSampling(&settings, &report);
}
