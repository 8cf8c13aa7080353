// Part of stage 7b: finds the quiet stretches of the loudness curve. Called by highlight/search.h.
#pragma once

#include <cstdint>

constexpr int32_t kMaxValleys = 15;

extern "C" {

// Finds the last point of each quiet stretch of values[n]. `mean` and `std` are the mean and the
// standard deviation of the values, and hop_s is the time between two values in seconds. Writes at
// most kMaxValleys ascending indexes to `out` and leaves its other entries unchanged. Returns the
// number of indexes written.
int32_t tavo_find_valley(const float *values, int32_t n, int32_t *out, float mean, float std,
                         float hop_s);
}
