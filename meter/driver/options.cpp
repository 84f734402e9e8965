#include "meter/driver/options.h"

#include "meter/support/log.h"
#include "meter/support/run.h"

#include <cstdio>
#include <cstdlib>
#include <getopt.h>

namespace {

// A long name returns its short letter.
constexpr option LONG_OPTIONS[] = {
    {"all", no_argument, nullptr, 'A'},          {"abs", no_argument, nullptr, 'a'},
    {"cache", required_argument, nullptr, 'c'},  {"cfg", required_argument, nullptr, 'C'},
    {"debug", required_argument, nullptr, 'd'},  {"help", no_argument, nullptr, 'h'},
    {"pnic", required_argument, nullptr, 'N'},   {"port", required_argument, nullptr, 'p'},
    {"switch", required_argument, nullptr, 'S'}, {"type", required_argument, nullptr, 't'},
    {"vm", required_argument, nullptr, 'V'},     {nullptr, 0, nullptr, 0},
};

constexpr const char *USAGE[] = {
    "Usage:",
    "\t -l                 : List ports in system",
    "\t -a                 : Print absolute counts instead of per second counts",
    "\t -c <start>:<end>   : specify knf-cache files instead of live kernel",
    "\t -d <level>         : verbose/debug level",
    "\t -f                 : ignore version check",
    "\t -h                 : this message",
    "\t -i <interval>      : Interval for stats collection (default=30 seconds)",
    "\t -n <iterations>    : number of iterations to run (default = 1)",
    "\t -o <outfile>       : output file",
    "\n Specify ports of interest as one of (Prioritized List of options)",
    "\t -A                 : Get stats for all ports on host",
    "\t -S <switchName>    : switch name",
    "\t\t Lists stats for all non mgmt/test ports",
    "\t -N <pnicName>      : pnic name",
    "\t\t List stats for all ports on switch that contains 'N'",
    "\t -V <vmname>        : VM name",
    "\t\t Find switches that contains the VM's ports. Print stats for VM's ports and uplinks",
    " OR specify port spec on command line",
    "\t -p <portid>        : portNum",
    "\t -t <type>          : specify a string with types of stats needed",
    " OR specify port spec in a config file",
    "\t -C <cfgFile>       : config file to read stats from",
    "\t\t File Format: <portNum/switchName> <StatsSpec>",
    "\nStats Spec can contain one or more of these characters",
    "\t\t c : Coalesce Stats: Only for vnics",
    "\t\t i : Interrupt stats: Only for physnics",
    "\t\t h : Cluster and Packet size histograms",
    "\t\t v : virtual nic stats",
    "\t\t e : Detailed error stats ",
    "\t\t q : Queue Stats for port/nic",
    "\t\t Q : Detailed Queue stats for the port/nic/wdt",
    "\t\t W : worldlet stats for the txwdt, physnic/hostnic wdts",
    "\t\t V : vcpu histograms",
    "\nNote:",
    "\tlan-meter reads multiple knf nodes, one at a time, using system calls",
    "\tAs data in the knf nodes are continuously updated, there is going to",
    "\tbe some inconsistency in numbers, hopefully, not a lot",
};

// The low 32 bits of the number; 0 for a text that is none.
i32 Number(const char *text) {
    return static_cast<i32>(std::strtol(text, nullptr, 10));
}

void Apply(int letter, Settings *settings) {
    switch (letter) {
    case 'A':
        settings->allPorts = true;
        break;
    case 'a':
        absCounts = 1;
        break;
    case 'c':
        settings->cacheSpec = optarg;
        cacheEnabled = 1;
        break;
    case 'C':
        settings->cfgFile = optarg;
        break;
    case 'd':
        logLevel = Number(optarg);
        break;
    case 'f':
        settings->checkVersion = false;
        break;
    case 'h':
        Usage();
        std::exit(0);
    case 'i':
        settings->interval = Number(optarg);
        break;
    case 'l':
        settings->listPorts = true;
        break;
    case 'n':
        settings->iterations = Number(optarg);
        break;
    case 'N':
        settings->pnicName = optarg;
        break;
    case 'o':
        settings->outfile = optarg;
        break;
    case 'p':
        settings->portNum = static_cast<u64>(static_cast<i64>(Number(optarg)));
        break;
    case 'S':
        settings->switchName = optarg;
        break;
    case 't':
        settings->typeSpec = optarg;
        break;
    case 'V':
        settings->vmname = optarg;
        break;
    case 'x':
        LogMsg(0, "xmlformat is now deprecated\n");
        break;
    default:
        LogMsg(2, "Discarding bad Option (%c:%x)\n", letter, static_cast<u32>(letter));
        break;
    }
}

}  // namespace

Settings ParseOptions(int argc, char **argv) {
    Settings settings;
    int letter = 0;
    while ((letter = getopt_long(argc, argv, "Aac:C:d:fi:n:N:o:p:S:t:V:lhx", LONG_OPTIONS, nullptr)) != -1) {
        Apply(letter, &settings);
    }
    if (optind != argc) {
        Usage();
        std::exit(1);
    }
    return settings;
}

void Usage() {
    for (const char *line : USAGE) {
        std::puts(line);
    }
}
