// What the program tells its user beside its output: one line on standard error, with the program's name in front.
#pragma once

namespace report {

// What a command ends with; also the exit status of the program.
enum Status : int {
    kDone = 0,
    kFailed = 1,   // input or output: told on standard error
    kUsage = 2,    // the command line
    kSerious = 3,  // `summary --exit-code`: there are serious findings
};

// Control characters in the arguments come out escaped, so that a name in a report can't steer a terminal.
__attribute__((format(printf, 1, 2))) void Tell(const char *format, ...);

}  // namespace report
