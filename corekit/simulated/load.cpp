#include "corekit/simulated/load.h"

#include <algorithm>

namespace {

constexpr i64 SECOND = 1000000;
constexpr i64 HOUR = 3600 * SECOND;
constexpr i64 DAY = 24 * HOUR;
constexpr i64 FULL = 1000;

// Per mille at the start of each hour; in between the load changes evenly.
constexpr i64 WAVE[] = {420, 370, 340, 330, 340, 380, 470, 600, 760, 900, 980, 1000,
                        940, 930, 980, 990, 960, 900, 820, 760, 700, 630, 560, 490};

constexpr i64 PERIOD = 120 * SECOND;
constexpr i64 BURST = 25 * SECOND;
constexpr i64 CALM = 250;  // per mille between bursts

// Per mille x microseconds of a day up to a moment of it: a trapezoid an hour.
i64 WaveOfDay(i64 micros) {
    i64 sum = 0;
    for (i64 hour = 0;; hour++) {
        i64 level = WAVE[hour % 24];
        i64 rise = WAVE[(hour + 1) % 24] - level;
        i64 span = std::min(micros - hour * HOUR, HOUR);
        __int128 risen = static_cast<__int128>(rise) * span * span / static_cast<__int128>(2 * HOUR);
        sum += level * span + static_cast<i64>(risen);
        if (span < HOUR) {
            return sum;
        }
    }
}

i64 WaveWork(i64 clock) {
    static const i64 day = WaveOfDay(DAY) / FULL;
    return clock / DAY * day + WaveOfDay(clock % DAY) / FULL;
}

i64 BurstWork(u64 seed, i64 clock) {
    i64 period = clock / PERIOD;
    i64 within = clock % PERIOD;
    auto start = static_cast<i64>(Hashed(seed << 48 ^ static_cast<u64>(period)) % (PERIOD - BURST));
    i64 full = std::clamp<i64>(within - start, 0, BURST);
    i64 before = (PERIOD * CALM + BURST * (FULL - CALM)) / FULL;
    return period * before + (within * CALM + full * (FULL - CALM)) / FULL;
}

}  // namespace

Work WorkOf(i64 micros) {
    micros = std::max<i64>(micros, 0);
    return {micros / SECOND, micros % SECOND};
}

const Work &LoadWork(LoadCurve *load, i64 from, i64 clock) {
    if (load->clock != clock) {
        i64 start = std::max<i64>(from, 0);
        i64 end = std::max(clock, start);
        i64 work = load->kind == LoadKind::WAVE    ? WaveWork(end) - WaveWork(start)
                   : load->kind == LoadKind::BURST ? BurstWork(load->seed, end) - BurstWork(load->seed, start)
                                                   : end - start;
        load->work = WorkOf(std::min(work, end - start));  // each end is cut to whole microseconds
        load->clock = clock;
    }
    return load->work;
}
