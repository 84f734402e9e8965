// The text of a configuration file, one entry a line: a first word, and the rest of its line. It may come from a pipe,
// a terminal or a source without end: every read gives up as soon as a termination signal came, and what it says then
// does not matter. Texts are cut to their room; what is left over stays to be read.
#pragma once

#include "interface/types.h"

#include <cstdio>

constexpr u32 CONFIG_TEXT = 128 + 1;

struct ConfigFile {
    std::FILE *stream;
};

// 0, or an errno.
int ConfigOpen(const char *path, ConfigFile *file);
void ConfigClose(ConfigFile *file);

// True once a read met the end of the file, or failed.
bool ConfigEnded(const ConfigFile &file);

// The next word, wherever it stands. False when there is none.
bool ConfigReadWord(ConfigFile *file, char (&word)[CONFIG_TEXT]);

// What follows up to the end of the line, or of the room. False when that is nothing.
bool ConfigReadRest(ConfigFile *file, char (&rest)[CONFIG_TEXT]);

// Passes over the rest of the line and its end.
void ConfigSkipLine(ConfigFile *file);
