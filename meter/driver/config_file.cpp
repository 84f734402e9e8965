#include "meter/driver/config_file.h"

#include "meter/support/termination.h"

#include <cctype>
#include <cerrno>

namespace {

bool IsLineEnd(int letter) {
    return letter == '\n';
}

bool IsBlank(int letter) {
    return std::isspace(letter) != 0;
}

// The next character; EOF also after a termination signal.
int Next(ConfigFile *file) {
    return terminateRequested != 0 ? EOF : std::getc(file->stream);
}

// Reads characters up to one that ends the text, which stays to be read, or to the end of the room.
bool ReadUntil(ConfigFile *file, bool (*ends)(int letter), char (&text)[CONFIG_TEXT]) {
    u32 length = 0;
    while (length < CONFIG_TEXT - 1) {
        int letter = Next(file);
        if (letter == EOF) {
            break;
        }
        if (ends(letter)) {
            std::ungetc(letter, file->stream);
            break;
        }
        text[length++] = static_cast<char>(letter);
    }
    text[length] = '\0';
    return length > 0;
}

}  // namespace

int ConfigOpen(const char *path, ConfigFile *file) {
    file->stream = fopen64(path, "r");
    return file->stream != nullptr ? 0 : errno;
}

void ConfigClose(ConfigFile *file) {
    std::fclose(file->stream);
}

bool ConfigEnded(const ConfigFile &file) {
    return std::feof(file.stream) != 0 || std::ferror(file.stream) != 0;
}

bool ConfigReadWord(ConfigFile *file, char (&word)[CONFIG_TEXT]) {
    int letter = 0;
    do {
        letter = Next(file);
    } while (letter != EOF && IsBlank(letter));
    if (letter == EOF) {
        return false;
    }
    std::ungetc(letter, file->stream);
    return ReadUntil(file, IsBlank, word);
}

bool ConfigReadRest(ConfigFile *file, char (&rest)[CONFIG_TEXT]) {
    return ReadUntil(file, IsLineEnd, rest);
}

void ConfigSkipLine(ConfigFile *file) {
    int letter = 0;
    do {
        letter = Next(file);
    } while (letter != EOF && !IsLineEnd(letter));
}
