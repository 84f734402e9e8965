// What the programs in the kernel and their loader share: the records of the maps, and how a sample finds its bucket.
// Plain structs of fixed integers, in the C that both compilers read. Counters only grow.
#pragma once

#ifdef __cplusplus
#include <linux/types.h>
#else
#include "corekit/linuxhost/tracking/kernel_types.h"
#endif

// A sample lies in the first bucket whose limit it doesn't exceed, and in the one behind the last limit when it exceeds
// all. Tables are filled up to one length, so that one search of five steps serves all of them.
enum { LIMITS = 31 };
enum { SIZE_BUCKETS = 12, INTERVAL_BUCKETS = 19, PERIOD_BUCKETS = 20, BUCKETS = 20 };  // the last one has no limit
#define NO_LIMIT 0xffffffffffffffffULL
#define NO_LIMITS_4 NO_LIMIT, NO_LIMIT, NO_LIMIT, NO_LIMIT

// Bytes, Ethernet header included, check sum not.
static const __u64 SIZE_LIMITS[LIMITS] = {
    64,    128,         256,         512,         768,         1024,     1280,     1514,     4096,    9014,
    32768, NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4, NO_LIMIT, NO_LIMIT, NO_LIMIT, NO_LIMIT};

// Nanoseconds, all of them whole microseconds: of the time between two packets, and of a thread's periods.
static const __u64 INTERVAL_LIMITS[LIMITS] = {1000,        2000,        5000,        10000,     20000,     50000,
                                              100000,      200000,      500000,      1000000,   2000000,   5000000,
                                              10000000,    20000000,    50000000,    100000000, 200000000, 500000000,
                                              NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4, NO_LIMIT};
static const __u64 PERIOD_LIMITS[LIMITS] = {1000,       2000,        5000,        10000,      20000,     50000,
                                            100000,     200000,      500000,      1000000,    2000000,   5000000,
                                            10000000,   20000000,    50000000,    100000000,  200000000, 500000000,
                                            1000000000, NO_LIMITS_4, NO_LIMITS_4, NO_LIMITS_4};

static inline __u32 BucketOf(const __u64 limits[LIMITS], __u64 sample) {
    __u32 bucket = sample > limits[15] ? 16 : 0;
    bucket += sample > limits[bucket + 7] ? 8 : 0;
    bucket += sample > limits[bucket + 3] ? 4 : 0;
    bucket += sample > limits[bucket + 1] ? 2 : 0;
    return bucket + (sample > limits[bucket] ? 1 : 0);
}
