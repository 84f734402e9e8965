// Runs the real program against a host description, in a directory of its own.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

// The head of a message about a failure that a fault line asked for.
inline const std::string SIMULATED = "Log0 Status: Simulated failure. Message: ";

// Counters of port 7 on switch sw0, each at a rate of its own.
inline const std::string TRAFFIC = R"(
field 269 "sw0" 7 at=0 width=8 start=1000 rate=1000
field 269 "sw0" 7 at=8 width=8 start=5000 rate=600000
field 269 "sw0" 7 at=16 width=8 start=70 rate=3
field 269 "sw0" 7 at=24 width=8 start=18446744073709551615 rate=500
field 269 "sw0" 7 at=32 width=8 start=9 rate=150000
field 269 "sw0" 7 at=72 width=8 start=90000 rate=20
field 269 "sw0" 7 at=80 width=8 start=80000 rate=30020
field 269 "sw0" 7 at=88 width=8 start=5 rate=0
)";

struct MeterRun {
    int status;  // exit status; 128 + n for a signal
    std::string out;
    std::string err;
    std::string trace;    // the library calls, a line each
    std::string journal;  // the writes to the kernel, a line each

    // The document, parsed by an independent reader; fails the test if it is none.
    nlohmann::json Document() const;
    // The ports of an iteration, keyed by port number.
    nlohmann::json Port(unsigned long long number, std::size_t iteration = 0) const;
};

struct RunOptions {
    std::string environment;  // shell assignments ahead of the command
    bool realClock = false;   // otherwise waits take no time and all figures are exact
};

// `host` is a description, or empty for the built-in one; `arguments` is shell text, so it may redirect. Files named
// without a directory lie in the run's own.
MeterRun RunMeter(const std::string &host, const std::string &arguments, const RunOptions &options = {});

// The same for a shell script that starts the program itself, as $METER; the script's own output goes nowhere, and its
// exit status is the run's. Output and messages of the program are what the script puts into `out` and `err`.
MeterRun RunScript(const std::string &host, const std::string &script, const RunOptions &options = {});

// The text of a file in the directory of the latest run; empty if there is none.
std::string RunFile(const std::string &name);

// Puts a file there for the next run.
void WriteRunFile(const std::string &name, const std::string &text);

std::size_t Count(const std::string &text, const std::string &part);

// Lines for counters of a record, each as offset, width, start and what it moves by between seconds 0 and 4. An 8-byte
// one that moves starts far above that, so that a sum of two samples, or a sample alone, is never taken for their
// difference.
std::string Steps(const std::string &record, const std::string &counters);
