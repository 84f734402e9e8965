#include "report/support/message.h"

#include "report/support/cells.h"

#include <cstdarg>
#include <cstdio>
#include <string>

namespace report {

void Tell(const char *format, ...) {
    char text[1024];
    va_list arguments;
    va_start(arguments, format);
    vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    std::string line = "lan-report: ";
    AppendClean(&line, text);
    line += '\n';
    fputs(line.c_str(), stderr);
}

}  // namespace report
