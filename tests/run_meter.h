// Runs the real program against a host description, in a directory of its own.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

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

// Lines for counters of a record, each as offset, width, start and what it moves by between seconds 0 and 4.
std::string Steps(const std::string &record, const std::string &counters);
