#include "meter/cpu/self.h"

#include "meter/cpu/vcpu.h"
#include "meter/support/number.h"
#include "meter/support/run.h"

#include <unistd.h>

namespace {

Vcpu selfVcpu = {};

}  // namespace

void SelfVcpuInit() {
    selfVcpu = {};
    if (cacheEnabled == 0) {
        selfVcpu.id = static_cast<u64>(i64{getpid()});
    }
}

KnfStatus SelfVcpuRead(bool first) {
    return cacheEnabled != 0 ? 0 : VcpusRead(&selfVcpu, 1, first);
}

void OverheadPrint(ReportBuf *report) {
    double used = 0.0;
    if (cacheEnabled == 0) {
        const VcpuStateTimes &cur = selfVcpu.curStateTimes;
        const VcpuStateTimes &prev = selfVcpu.prevStateTimes;
        used = Rate(cur.usedTime - prev.usedTime, static_cast<f32>(cur.elapsedTime - prev.elapsedTime)) * 100.0;
        selfVcpu.prevStateTimes = selfVcpu.curStateTimes;
    }
    ReportPrintf(report, ",\n\n\"overhead\": {\"used\": %.2f }", used);
}
