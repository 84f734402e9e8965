// The program's declarations of the library, with the visibility that exports them. The library is built with hidden
// visibility, so that nothing else of it can clash with a program's names.
#pragma once

#include <cstdarg>
#include <cstddef>
#include <cstdint>

#pragma GCC visibility push(default)
#include "support/corekit.h"
#pragma GCC visibility pop
