// A clock that stands still but for waits: gettimeofday tells it, ppoll with a time-out moves it on at once, getpid is
// always 4242. In the environment, FIXED_CLOCK_STEP is a number of microseconds that each look at the clock takes.
#pragma once

extern "C" void FixedClockAdvance(long long microseconds);
