// Files of /proc and /sys, read again and again. A kept file costs a pread, about 1 us instead of 8 for opening it each
// time, and one that belongs to a thread answers GONE for good once that thread ended, even when its number is used
// again. Descriptors are shared with the program that loaded us: past its limit, less a reserve, a file is opened for
// each read, and that is said once.
#pragma once

#include "corekit/linuxhost/rows.h"

#include <string>
#include <string_view>
#include <vector>

// Where every path starts. A test gives trees of its own.
struct ProcRoot {
    int proc = -1;
    int sys = -1;
};

// FINE when both are there. A host without one of them still has the other.
Outcome ProcRootOpen(ProcRoot *root, const char *proc = "/proc", const char *sys = "/sys");
void ProcRootClose(ProcRoot *root);

struct ProcFile {
    int directory = -1;  // not owned, must outlive the file
    int descriptor = -1;
    bool kept = false;   // counts against the shared limit
    bool line = false;   // one line that is written at once: whole when its end is read, which saves a call
    u32 limit = 0;       // bytes; a longer file is BROKEN, never cut
    std::string path{};  // under the directory
};

// What files are read into. It grows up to the limit of the longest file read, and is reused.
struct ProcBuffer {
    std::vector<char> bytes;
};

// FINE also when out of descriptors: the file is then opened by each read.
Outcome ProcOpen(ProcFile *file, int directory, const std::string &path, u32 limit);
// The whole file; `text` lives in `buffer` until the next read into it.
Outcome ProcRead(ProcFile *file, ProcBuffer *buffer, std::string_view *text);
void ProcClose(ProcFile *file);

// A file that is read once.
Outcome ProcReadOnce(int directory, const std::string &path, u32 limit, ProcBuffer *buffer, std::string_view *text);

// Files kept open from now on, for all rooms together; what is kept stays. A test sets a low one.
void ProcLimitKept(u32 files);
// For a descriptor of another kind that its owner wants to keep: false when there is no room, which is said once.
bool ProcKeepOne();
void ProcReleaseOne();

// Steps through text that may be anything. Each takes what it returns off the front of `rest`.
std::string_view ProcTakeLine(std::string_view *rest);  // without its end
std::string_view ProcTakeWord(std::string_view *rest);  // between blanks and tabs; empty when there is none
// The decimal number at the front; false, with `rest` as it was, when there is none or it exceeds 64 bits.
bool ProcTakeNumber(std::string_view *rest, u64 *number);
// All of the text is one decimal number that fits.
bool ProcNumber(std::string_view text, u64 *number);
// The text behind `key`, blanks and a colon, where the key begins a line. False when no line has it.
bool ProcFindKey(std::string_view text, std::string_view key, std::string_view *value);
