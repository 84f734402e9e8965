// Feeds the first line as the statistics of -t and the rest as the file of -C to the choice of ports, on a host whose
// ports can't be watched, so that each run ends in Panic and nothing stays.
#include "corekit/entry/control.h"
#include "meter/driver/selection.h"
#include "meter/support/log.h"

#include <cstdio>
#include <string>

static std::string cfg;
static std::FILE *cfgFile;

extern "C" std::FILE *__wrap_fopen64(const char *, const char *mode) {
    return cfgFile = fmemopen(cfg.data(), cfg.size(), mode);
}

extern "C" [[noreturn]] void __wrap__Z5PanicPKcz(const char *format, ...) {
    if (std::string(format).starts_with("Bad switch name provided")) {
        std::fclose(cfgFile);  // a Panic amid the file leaves it open
    }
    throw 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    static const bool loaded = CorekitLoad("host\nswitch s\nplain switch=s port={1+i} type={i} count=2\n", nullptr);
    logLevel = loaded ? -1 : 0;
    std::string text(reinterpret_cast<const char *>(data), size);
    std::string spec = text.substr(0, text.find('\n'));
    cfg = text.substr(spec.size()) + "\n";
    Settings settings;
    settings.typeSpec = spec.c_str();
    settings.cfgFile = "cfg";
    try {
        SelectPorts(settings);
    } catch (int) {
        return 0;
    }
    abort();
}
