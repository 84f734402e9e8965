// How much of its full load a part of the host carries as time passes: what it does up to a moment is worth a certain
// time at full load, its work. Work is a whole number of microseconds that follows from the clock alone and never goes
// back, so that counters are exact integrals of a rate that varies, and two reads of one moment agree.
#pragma once

#include "interface/types.h"

enum class LoadKind : u8 {
    CONSTANT,  // always full
    WAVE,      // a day of 24 hours, UTC: a third at night, full ahead of noon
    BURST,     // a quarter, and full for 25 seconds at a random place of every two minutes
};

struct Work {
    i64 seconds;
    i64 micros;  // below a second
};

struct LoadCurve {
    LoadKind kind;
    u64 seed;  // of bursts: others come at other places
    // The latest answer: many counters are read at one moment.
    i64 clock = -1;
    Work work = {};
};

constexpr i64 MAX_LOAD_SEED = 63;  // an uplink adds up each load of its ports at every read

inline u64 Hashed(u64 value) {
    value += 0x9e3779b97f4a7c15;
    value = (value ^ value >> 30) * 0xbf58476d1ce4e5b9;
    value = (value ^ value >> 27) * 0x94d049bb133111eb;
    return value ^ value >> 31;
}

Work WorkOf(i64 micros);
// The work from one moment of the clock to a later one, both in microseconds since 1970.
const Work &LoadWork(LoadCurve *load, i64 from, i64 clock);
