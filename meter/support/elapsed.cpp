#include "meter/support/elapsed.h"

#include "meter/support/log.h"

namespace {

// Both members count in 32 bits, so that the difference wraps there too.
i32 Difference(i64 later, i64 earlier) {
    return static_cast<i32>(static_cast<u32>(later) - static_cast<u32>(earlier));
}

}  // namespace

f32 ElapsedSecs(const timeval &earlier, const timeval &later) {
    i32 sec = Difference(later.tv_sec, earlier.tv_sec);
    i32 usec = Difference(later.tv_usec, earlier.tv_usec);
    auto value = static_cast<f32>(sec + usec / 1000000.0);
    if (value > 0) {
        return value;
    }
    LogMsg(0, "Time going backwards?: Diff is %.6f\n", static_cast<double>(value));
    return 0.000001F;
}
