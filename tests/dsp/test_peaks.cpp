#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <vector>

#include "dsp/peaks.h"

namespace {

using Indexes = std::vector<int32_t>;

Indexes sorted_n(const std::vector<float> &x, uint32_t min_dist, uint32_t max_count) {
    std::vector<uint32_t> out(x.size() / 2 + 1);
    const int32_t n =
        findsortedNPeaks(x.data(), static_cast<int64_t>(x.size()), min_dist, max_count, out.data());
    return Indexes(out.begin(), out.begin() + n);
}

Indexes peaks(const std::vector<double> &x, uint32_t min_dist) {
    Indexes out(x.size() / 2 + 1);
    const int32_t n = findPeaks(x.data(), static_cast<int64_t>(x.size()), min_dist, out.data());
    out.resize(static_cast<size_t>(n));
    return out;
}

Indexes with_priority(const std::vector<double> &x, int32_t min_dist, const Indexes &priority) {
    Indexes out(x.size() / 2 + 1 + priority.size());
    const int32_t n = findPeaksPriority(x.data(), static_cast<int64_t>(x.size()), min_dist,
                                        out.data(), priority.empty() ? nullptr : priority.data(),
                                        static_cast<int32_t>(priority.size()));
    out.resize(static_cast<size_t>(n));
    return out;
}

const std::vector<float> kThree = {0, 4, 0, 9, 0, 7, 0};  // peaks 1, 3, 5
const std::vector<double> kThreeD(kThree.begin(), kThree.end());

TEST(Peaks, OnlyStrictMaximaInside) {
    EXPECT_EQ(peaks({1, 3, 3, 1}, 0), Indexes{});
    EXPECT_EQ(peaks({0, 5, 0, 5, 0}, 0), (Indexes{1, 3}));
    EXPECT_EQ(peaks({9, 1, 2, 9}, 0), Indexes{});
    EXPECT_EQ(peaks({1, 2}, 3), Indexes{});
    EXPECT_EQ(peaks({}, 0), Indexes{});
    EXPECT_EQ(findsortedNPeaks(nullptr, -5, 1, 0, nullptr), 0);
    // What lies beside the range would make peaks of its ends.
    const double wide[] = {0, 9, 1, 5, 1, 9, 0};
    int32_t out[3];
    ASSERT_EQ(findPeaks(wide + 1, 5, 0, out), 1);
    EXPECT_EQ(out[0], 2);
}

TEST(Peaks, LargestFirstUpToACount) {
    EXPECT_EQ(sorted_n(kThree, 0, 2), (Indexes{3, 5}));
    EXPECT_EQ(sorted_n(kThree, 0, 10), (Indexes{3, 5, 1}));
    EXPECT_EQ(sorted_n(kThree, 0, 0), (Indexes{3, 5, 1}));
    EXPECT_EQ(sorted_n({0, 4, 0, 9, 0, 7, 0, 0, 3, 0}, 2, 2), (Indexes{3, 8}));
}

TEST(Peaks, DistanceIsClosedInOneAndOpenInTheOther) {
    EXPECT_EQ(sorted_n(kThree, 2, 0), (Indexes{3}));
    EXPECT_EQ(peaks(kThreeD, 2), (Indexes{3, 5, 1}));
    EXPECT_EQ(peaks(kThreeD, 3), (Indexes{3}));
    EXPECT_EQ(peaks(kThreeD, 0), (Indexes{1, 3, 5}));
    EXPECT_EQ(peaks(kThreeD, UINT32_MAX), (Indexes{3}));
    EXPECT_EQ(sorted_n(kThree, UINT32_MAX, 0), (Indexes{3}));
}

TEST(Peaks, ASuppressedPeakSuppressesNothing) {
    // 9 at 3 suppresses 8 at 5, which therefore leaves 7 at 7.
    EXPECT_EQ(peaks({0, 0, 0, 9, 0, 8, 0, 7, 0}, 3), (Indexes{3, 7}));
}

TEST(Peaks, OfEqualPeaksTheLaterComesFirst) {
    EXPECT_EQ(sorted_n({0, 5, 0, 5, 0, 5, 0}, 0, 0), (Indexes{5, 3, 1}));
    EXPECT_EQ(peaks({0, 5, 0, 5, 0, 5, 0}, 2), (Indexes{5, 3, 1}));
    EXPECT_EQ(peaks({0, 5, 0, 5, 0, 5, 0}, 3), (Indexes{5, 1}));
}

TEST(Peaks, PriorityCandidatesComeFirst) {
    EXPECT_EQ(with_priority(kThreeD, 3, {2}), (Indexes{1, 5}));
    EXPECT_EQ(with_priority(kThreeD, 3, {5}), (Indexes{3}));           // the last peak: nothing
    EXPECT_EQ(with_priority(kThreeD, 3, {0, 1}), (Indexes{1, 1, 5}));  // taken twice
    EXPECT_EQ(with_priority(kThreeD, 1, {4, 0}), (Indexes{3, 1, 5}));  // in the order given
    EXPECT_EQ(with_priority(kThreeD, 3, {99, 0}), (Indexes{1, 5}));    // packed
    EXPECT_EQ(with_priority(kThreeD, 3, {1, 3}), (Indexes{1, 3}));     // too close, yet both kept
    EXPECT_EQ(with_priority({0, 4, 0}, 3, {1}), (Indexes{1}));         // fewer than two peaks
    EXPECT_EQ(with_priority(kThreeD, 3, {}), (Indexes{3}));
}

TEST(Peaks, PriorityWithoutDistanceIsRefused) {
    int32_t out[8] = {-7};
    EXPECT_EQ(findPeaksPriority(kThreeD.data(), 7, 0, out, nullptr, 0), -1);
    EXPECT_EQ(out[0], -7);
}

// A long recording's worth: striking in pairs would take the test's whole time limit.
TEST(Peaks, AQuarterOfAMillionPeaks) {
    std::vector<double> x(500001);
    for (size_t i = 1; i < x.size(); i += 2) x[i] = 1.0 + static_cast<double>(i * 7919 % 500000);
    EXPECT_EQ(peaks(x, 2).size(), 250000u);
    const Indexes priority(100000, 250000);
    const Indexes out = with_priority(x, 200000, priority);
    EXPECT_EQ(std::count(out.begin(), out.end(), 249999), 100000);
    for (size_t k = priority.size(); k < out.size(); k++) {
        EXPECT_GE(std::abs(out[k] - 249999), 200000);
    }
}

TEST(Peaks, NearestIndex) {
    const Indexes list = {10, 20, 30};
    EXPECT_EQ(findNearestIndex(list.data(), 100, 3), 2);
    EXPECT_EQ(findNearestIndex(list.data(), 100, 2), 1);
    EXPECT_EQ(findNearestIndex(list.data(), 100, 1), 0);
    EXPECT_EQ(findNearestIndex(nullptr, 100, 0), 0);
    EXPECT_EQ(findNearestIndex(list.data(), 15, 3), 0);  // equally near: the lower
    EXPECT_EQ(findNearestIndex(list.data(), 16, 3), 1);
    EXPECT_EQ(findNearestIndex(list.data(), -5, 3), 0);
}

TEST(Peaks, FindIndex) {
    const std::vector<double> x = {3, 1, 4, 1};
    EXPECT_EQ(findIndex(x.data(), 4, 1.0), 1);
    EXPECT_EQ(findIndex(x.data(), 4, 4.0), 2);
    EXPECT_EQ(findIndex(x.data(), 4, 9.0), 0);
    EXPECT_EQ(findIndex(x.data(), 2, 4.0), 0);
    EXPECT_EQ(findIndex(nullptr, 0, 4.0), 0);
}

}  // namespace
