// The number rules of the report, each with its widths in the signature. Divisions are in double precision. A quotient
// that is not finite (replay can divide by an elapsed time of 0) is 0, so that the document stays valid JSON.
#pragma once

#include "interface/types.h"

#include <cmath>

// numerator / denominator, or 0.
inline double Quotient(double numerator, double denominator) {
    double value = numerator / denominator;
    return std::isfinite(value) ? value : 0.0;
}

// current - previous of a counter that may have gone backwards and then shows it.
inline i64 SignedDelta(u64 current, u64 previous) {
    return static_cast<i64>(current - previous);
}

// A signed count per second.
inline double SignedRate(i64 count, f32 elapsed) {
    return Quotient(static_cast<double>(count), elapsed);
}

// An unsigned count per second, narrowed to single precision (24 significant bits) ahead of the division. A counter
// that went backwards shows as a rate near 2^64.
inline double Rate(u64 count, f32 elapsed) {
    return Quotient(static_cast<f32>(count), elapsed);
}

// A 32-bit count per second, not narrowed.
inline double Rate32(u32 count, f32 elapsed) {
    return Quotient(count, elapsed);
}

// Bits per second in decimal millions.
inline double Megabits(double bits, f32 elapsed) {
    return Quotient(bits, elapsed * 1000000.0);
}

// part as a percentage of a whole that was raised by 1, so that no traffic gives 0. The 1 is the caller's, who knows
// the width in which it is added.
inline double Percent(u64 part, u64 wholePlusOne) {
    return Quotient(100.0 * static_cast<double>(part), static_cast<double>(wholePlusOne));
}

// The low 32 bits of total / count; 0 when there is nothing to divide by.
inline u32 MeanSize(u64 total, u64 count) {
    return count == 0 ? 0 : static_cast<u32>(total / count);
}

// total / count cut towards zero; 0 when count is 0. The smallest number by -1 wraps to itself.
inline i64 SignedMean(i64 total, i64 count) {
    if (count == 0) {
        return 0;
    }
    return count == -1 ? static_cast<i64>(0 - static_cast<u64>(total)) : total / count;
}

// A 32-bit count per second with its fraction cut off: the low 32 bits of a signed 64-bit quotient, or 0 where the
// quotient is no number or does not fit.
inline u32 WholeRate(u32 count, f32 elapsed) {
    double value = static_cast<double>(count) / elapsed;
    bool fits = value >= -0x1p63 && value < 0x1p63;
    return fits ? static_cast<u32>(static_cast<i64>(value)) : 0;
}
