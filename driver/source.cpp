#include "driver/source.h"

#include <cstdio>
#include <sys/time.h>

bool CheckVersion() {
    char kernelSig[21] = {};
    const char *programSig = "";
    KnfStatus status = KNF_CheckSig(kernelSig, sizeof kernelSig, &programSig);
    if (status == 0) {
        return true;
    }
    kernelSig[20] = '\0';
    std::fprintf(stderr, "%#x: md5 signature mismatch with running hostcore built on %s. (vs %s for app sysinfo)\n",
                 status, kernelSig, programSig);
    return false;
}

i64 SampleTime() {
    timeval now = {};
    gettimeofday(&now, nullptr);
    return now.tv_sec;
}
