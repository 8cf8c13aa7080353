#include <gtest/gtest.h>

#include "dsp/mel.h"

namespace {

TEST(Mel, FromHz) {
    EXPECT_EQ(Hz2Mel(0.0f), 0.0f);
    EXPECT_FLOAT_EQ(Hz2Mel(500.0f), 7.499996f);
    EXPECT_FLOAT_EQ(Hz2Mel(999.9f), 14.998492f);
    EXPECT_EQ(Hz2Mel(1000.0f), 15.0f);
    EXPECT_FLOAT_EQ(Hz2Mel(2000.0f), 25.077812f);
    EXPECT_FLOAT_EQ(Hz2Mel(5512.0f), 39.817379f);
    EXPECT_FLOAT_EQ(Hz2Mel(11025.0f), 49.896507f);
}

TEST(Mel, ToHz) {
    EXPECT_FLOAT_EQ(Mel2Hz(7.5f), 500.00027f);
    EXPECT_EQ(Mel2Hz(15.0f), 1000.0f);
    EXPECT_FLOAT_EQ(Mel2Hz(20.0f), 1410.4342f);
    EXPECT_FLOAT_EQ(Mel2Hz(39.8174f), 5512.0093f);
}

// The neighbouring float is what an unrounded logarithm or exponential would give.
TEST(Mel, RoundsToSinglePrecisionHalfWay) {
    EXPECT_EQ(Hz2Mel(2333.0f), 27.3169632f);
    EXPECT_EQ(Hz2Mel(2703.0f), 29.457243f);
    EXPECT_EQ(Mel2Hz(17.85f), 1216.55334f);
}

// One float step beside 5512: what the two roundings to single precision leave.
TEST(Mel, ThereAndBackIsNotExact) {
    EXPECT_EQ(Mel2Hz(Hz2Mel(5512.0f)), 5512.0005f);
}

}  // namespace
