// Where a command's text goes: standard output, or a file that is written beside its place and renamed when it is
// whole; a named pipe or a device is written directly. Owned by the command that opened it. Buffers up to 64 KiB;
// OutputFlush after each record keeps streams alive. SIGINT, SIGTERM and SIGHUP leave no unfinished file behind.
#pragma once

#include <string>
#include <string_view>

namespace report {

enum class OutputState {
    Fine,
    Closed,  // the reader of the pipe went away: nobody wants more, and that is no error
    Failed,  // told on standard error when it happened
};

struct Output {
    std::string path;     // empty: standard output
    std::string beside;   // the file being written, until it is renamed; empty for standard output
    std::string pending;  // not yet written
    int fd = -1;
    OutputState state = OutputState::Fine;
};

// Opens standard output ("" or "-"), a pipe or device, or a file. After a failure state is Failed and later calls do
// nothing.
void OutputOpen(Output *output, const std::string &path);
// Makes a file that is not there yet, and writes it in its place. False, with errno and nothing told, when it can't.
bool OutputCreate(Output *output, const std::string &path);
void OutputWrite(Output *output, std::string_view text);
OutputState OutputFlush(Output *output);
// Flushes, and puts a file into its place. With keep false a file that was not finished is removed instead.
OutputState OutputClose(Output *output, bool keep = true);

// Handler of the signals that end the program: removes the file that is not finished, and lets the signal end it.
void OutputEnd(int number);
// Another handler for the first of these signals, unless they are ignored. It goes on with OutputEnd for the next one:
// signal(number, OutputEnd).
void OutputFirstSignal(void (*handler)(int));

}  // namespace report
