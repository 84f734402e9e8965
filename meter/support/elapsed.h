// The seconds between two time stamps.
#pragma once

#include "interface/types.h"

#include <sys/time.h>

// Always above 0, so that callers divide without a test: a clock that stood still or went backwards is reported at
// level 0 and gives a millionth of a second.
f32 ElapsedSecs(const timeval &earlier, const timeval &later);
