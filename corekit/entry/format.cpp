#include "corekit/entry/format.h"

#include "interface/types.h"

#include <algorithm>
#include <bit>
#include <cstdio>
#include <cstring>
#include <iterator>

namespace {

constexpr u32 DIGITS_MAX = 3;  // behind the point
constexpr u32 WIDTH_MAX = 99;
constexpr u64 POWERS[] = {1, 10, 100, 1000};

// One form: %[0][width][.digits][l|ll|L]conversion
struct Form {
    char fill = ' ';
    u32 width = 0;
    u32 digits = 6;  // of a floating-point number, as told
    bool dotted = false;
    bool wide = false;  // 8 bytes
    char conversion = 0;
};

// What has been written, and where it must end.
struct Sink {
    char *at;
    char *end;  // the terminator has room there
};

bool IsDigit(char c) {
    return c >= '0' && c <= '9';
}

// Reads the form behind a percent sign; false for one that is not made here.
bool TakeForm(const char **format, Form *form) {
    const char *at = *format;
    if (*at == '0') {
        form->fill = *at++;
    }
    for (; IsDigit(*at) && form->width <= WIDTH_MAX; at++) {
        form->width = 10 * form->width + static_cast<u32>(*at - '0');
    }
    if (*at == '.') {
        form->dotted = true;
        if (!IsDigit(*++at)) {
            return false;
        }
        form->digits = static_cast<u32>(*at++ - '0');
    }
    for (; *at == 'l' || *at == 'L'; at++) {
        form->wide = true;
    }
    form->conversion = *at;
    *format = at + 1;
    return form->width <= WIDTH_MAX && (!form->dotted || form->digits <= DIGITS_MAX);
}

bool Write(Sink *sink, const char *text, size_t length) {
    if (length > static_cast<size_t>(sink->end - sink->at)) {
        return false;
    }
    memcpy(sink->at, text, length);
    sink->at += length;
    return true;
}

bool WriteFilled(Sink *sink, const Form &form, bool negative, const char *text, size_t length) {
    size_t signs = negative ? 1 : 0;
    size_t missing = form.width > length + signs ? form.width - length - signs : 0;
    if (missing + signs + length > static_cast<size_t>(sink->end - sink->at)) {
        return false;
    }
    if (negative && form.fill == '0') {
        *sink->at++ = '-';
    }
    memset(sink->at, form.fill, missing);
    sink->at += missing;
    if (negative && form.fill != '0') {
        *sink->at++ = '-';
    }
    return Write(sink, text, length);
}

// A number of `base`, with a point ahead of its last `digits` digits.
bool WriteNumber(Sink *sink, const Form &form, bool negative, u64 value, u32 base, u32 digits) {
    char text[24];
    char *begin = std::end(text);
    for (u32 i = 0; value != 0 || i <= digits; i++, value /= base) {
        if (i == digits && digits != 0) {
            *--begin = '.';
        }
        *--begin = "0123456789abcdef"[value % base];
    }
    return WriteFilled(sink, form, negative, begin, static_cast<size_t>(std::end(text) - begin));
}

// A double is a whole number of up to 53 bits times a power of two, so that its decimal digits, and the half that goes
// to the even neighbour, can be had exactly in 64 bits.
bool WriteDouble(Sink *sink, const Form &form, double number) {
    auto bits = std::bit_cast<u64>(number);
    auto exponent = static_cast<int>(bits >> 52 & 0x7ff);
    u64 value = (bits & ((u64{1} << 52) - 1)) | (exponent != 0 ? u64{1} << 52 : 0);
    int shift = 1075 - std::max(exponent, 1);
    if (!form.dotted || shift < 0) {  // infinite ones too, and what is none
        return false;
    }
    value *= POWERS[form.digits];
    if (shift >= 64) {
        value = 0;
    } else if (shift > 0) {
        u64 rest = value & ((u64{1} << shift) - 1);
        u64 half = u64{1} << (shift - 1);
        value >>= shift;
        value += rest > half || (rest == half && value % 2 != 0) ? 1 : 0;
    }
    return WriteNumber(sink, form, bits >> 63 != 0, value, 10, form.digits);
}

bool WriteInteger(Sink *sink, const Form &form, u64 value) {
    if (form.dotted) {
        return false;
    }
    bool isSigned = form.conversion == 'd';
    value = form.wide  ? value
            : isSigned ? static_cast<u64>(i64{static_cast<i32>(value)})
                       : u64{static_cast<u32>(value)};
    bool negative = isSigned && static_cast<i64>(value) < 0;
    return WriteNumber(sink, form, negative, negative ? 0 - value : value, form.conversion == 'x' ? 16 : 10, 0);
}

bool WriteText(Sink *sink, const Form &form, const char *text) {
    return text != nullptr && form.width == 0 && !form.dotted && Write(sink, text, strlen(text));
}

// False when something here is not made here, or does not fit.
bool WriteAll(Sink *sink, const char *format, va_list arguments) {
    while (true) {
        const char *percent = strchrnul(format, '%');
        if (!Write(sink, format, static_cast<size_t>(percent - format))) {
            return false;
        }
        if (*percent == 0) {
            return true;
        }
        format = percent + 1;
        Form form;
        if (!TakeForm(&format, &form)) {
            return false;
        }
        bool written = false;
        switch (form.conversion) {
        case 's':
            written = !form.wide && WriteText(sink, form, va_arg(arguments, const char *));
            break;
        case 'd':
        case 'u':
        case 'x':
            written = WriteInteger(sink, form, form.wide ? va_arg(arguments, u64) : va_arg(arguments, u32));
            break;
        case 'f':
            written = !form.wide && WriteDouble(sink, form, va_arg(arguments, double));
            break;
        default:
            break;
        }
        if (!written) {
            return false;
        }
    }
}

}  // namespace

int FormatText(char *buffer, size_t size, const char *format, va_list arguments) {
    if (buffer != nullptr && size > 0) {
        va_list copy;
        va_copy(copy, arguments);
        Sink sink = {buffer, buffer + size - 1};
        bool written = WriteAll(&sink, format, copy);
        va_end(copy);
        if (written) {
            *sink.at = 0;
            return static_cast<int>(sink.at - buffer);
        }
    }
    return vsnprintf(buffer, size, format, arguments);
}
