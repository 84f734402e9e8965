#include "corekit/linuxhost/tracking/tracking.h"

#include <gtest/gtest.h>

namespace {

struct LimitTable {
    const __u64 *limits;
    u32 buckets;
};
constexpr LimitTable TABLES[] = {
    {SIZE_LIMITS, SIZE_BUCKETS}, {INTERVAL_LIMITS, INTERVAL_BUCKETS}, {PERIOD_LIMITS, PERIOD_BUCKETS}};

TEST(Tracking, SampleAtALimitFallsBesideItsBucket) {
    for (const LimitTable &table : TABLES) {
        for (u32 i = 0; i < table.buckets - 1; i++) {
            EXPECT_EQ(BucketOf(table.limits, table.limits[i]), i);
            EXPECT_EQ(BucketOf(table.limits, table.limits[i] + 1), i + 1);
            EXPECT_LT(i == 0 ? 0 : table.limits[i - 1], table.limits[i]);
            EXPECT_TRUE(table.limits == SIZE_LIMITS || table.limits[i] % 1000 == 0);
        }
        EXPECT_EQ(BucketOf(table.limits, 0), 0U);
        EXPECT_EQ(BucketOf(table.limits, NO_LIMIT), table.buckets - 1);
    }
}

}  // namespace
