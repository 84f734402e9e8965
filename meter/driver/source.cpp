#include "meter/driver/source.h"

#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/run.h"

#include <cstring>
#include <sys/time.h>

namespace {

constexpr u32 KNF_NODE_NTP_TIME = 1419;

struct __attribute__((packed)) NtpTime {
    u32 seconds;
    u32 nanoseconds;
};
static_assert(sizeof(NtpTime) == 8);

NtpTime lastCache = {};  // time of the previous snapshot; 0 seconds: there is none

// The step from the previous snapshot to this one. Worked out in double precision and rounded once.
void StepElapsedTime(const NtpTime &time) {
    if (lastCache.seconds == 0) {
        cacheElapsedTime = -1.0F;
        return;
    }
    double nanoseconds = static_cast<double>(i64{time.nanoseconds} - i64{lastCache.nanoseconds});
    cacheElapsedTime = static_cast<f32>(nanoseconds / 1000000000.0 + time.seconds - lastCache.seconds);
    auto shown = static_cast<double>(cacheElapsedTime);
    LogMsg(1, "Cache Elapsed Time: %.6f sec\n", shown);
    if (shown < 0.0) {
        Panic("Time goes backward in the cache files!!!\nStart: %u sec %u nsec End: %u sec %u nsec Diff: %.6f sec\n",
              lastCache.seconds, lastCache.nanoseconds, time.seconds, time.nanoseconds, shown);
    }
}

// Cuts the first path off the list.
const char *TakePath(char **cacheSpec) {
    char *path = *cacheSpec;
    char *colon = std::strchr(path, ':');
    *cacheSpec = nullptr;
    if (colon != nullptr) {
        *colon = '\0';
        *cacheSpec = colon + 1;
    }
    return path;
}

}  // namespace

bool CheckVersion() {
    char kernelSig[21] = {};
    const char *programSig = "";
    KnfStatus status = KNF_CheckSig(kernelSig, sizeof kernelSig, &programSig);
    if (status == 0) {
        return true;
    }
    kernelSig[20] = '\0';
    LogDirect("%#x: md5 signature mismatch with running hostcore built on %s. (vs %s for app sysinfo)\n", status,
              kernelSig, programSig);
    return false;
}

i64 SampleTime() {
    if (cacheEnabled != 0) {
        NtpTime time = {};
        if (KnfStatus status = NodeGet(KNF_NODE_NTP_TIME, nullptr, &time)) {
            Panic("Unable to read ntp time from knf node:%s\n", HCK_ReturnStatusToString(status));
        }
        return time.seconds;
    }
    timeval now = {};
    gettimeofday(&now, nullptr);
    return now.tv_sec;
}

KnfStatus CacheStep(char **cacheSpec, bool checkVersion) {
    if (*cacheSpec == nullptr) {
        return 0;
    }
    const char *path = TakePath(cacheSpec);
    if (KnfStatus status = KNF_UseCache(path, 0)) {
        LogStatus(0, status, "Couldn't open cache file %s\n", path);
    }
    if (checkVersion && !CheckVersion()) {
        return KNF_FAILURE;
    }
    NtpTime time = {};
    if (KnfStatus status = NodeGet(KNF_NODE_NTP_TIME, nullptr, &time)) {
        LogStatus(0, status, "unable to read time from cache file %s\n", path);
        return status;
    }
    StepElapsedTime(time);
    lastCache = time;
    return 0;
}
