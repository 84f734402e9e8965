// Feeds texts to the host description: what loads is walked like a host that is recorded, at once and much later;
// what does not says why and leaves nothing connected.
#include "corekit/entry/control.h"
#include "corekit/recorder/record.h"

#include <regex>
#include <sys/time.h>

static time_t clockSeconds;

extern "C" int __wrap_gettimeofday(timeval *now, void *) {
    *now = {clockSeconds, 999999};
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    // A signal ends the process, and what stands for thousands takes long and tells nothing new.
    static const std::regex excluded("signal|(count|pcpus)=\"*(0x|[0-9]{4})");
    std::string error, text(reinterpret_cast<const char *>(data), size);
    if (std::regex_search(text, excluded)) {
        return -1;
    }
    clockSeconds = 1700000000;
    bool loaded = CorekitLoad(text, &error);
    volatile sig_atomic_t stop = 0;
    for (time_t later : {0, 2000000000}) {
        clockSeconds += later;
        Recorder recorder = {{}, 0, 0, 0, &stop, false};
        RecordHost(&recorder);
        if (!loaded && (error.empty() || recorder.records != 0)) {
            abort();
        }
    }
    return 0;
}
