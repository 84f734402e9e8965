// The command line: one record of settings, filled once at start-up.
#pragma once

#include "interface/types.h"

struct Settings {
    i32 interval = 10;  // seconds between two passes
    i32 iterations = 1;
    bool checkVersion = true;
    bool listPorts = false;
    bool allPorts = false;
    const char *switchName = nullptr;
    const char *pnicName = nullptr;
    const char *vmname = nullptr;
    u64 portNum = 0;  // 0: no port
    const char *cfgFile = nullptr;
    const char *typeSpec = nullptr;
    const char *outfile = nullptr;
    char *cacheSpec = nullptr;  // paths separated by colons; points at what the replay has not used yet
};

// Fills in the settings, absCounts, cacheEnabled and logLevel. A bad option is logged and dropped. -h ends the process
// with status 0; operands that are left over end it with status 1.
Settings ParseOptions(int argc, char **argv);

// Prints the usage text on standard output.
void Usage();
