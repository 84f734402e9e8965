// The library's environment. A process with rights that its caller lacks is not steered by that caller's variables.
#pragma once

#include <cstdlib>

// Null when it is not set, or empty.
inline const char *Setting(const char *variable) {
    const char *text = secure_getenv(variable);
    return text != nullptr && *text != 0 ? text : nullptr;
}
