// Stage 7c: moves the coarse start so that a region of the requested length ends at a natural
// boundary.
//
// Input and output: indexes into the loudness curve, whose points are 2 s apart. Called by
// highlight/search.h.
#pragma once

#include <cstdint>

extern "C" {

// Returns the index at which the region should start. norm[n] is the loudness, 0 to 1; `mean` and
// `std` are its mean and population standard deviation. len_pts is the requested length in points
// and `chosen` the coarse start. valleys[15] has `nv` ascending indexes, followed by zeros. `pairs`
// has the start and the end of each of the `nseg` loud segments, ascending.
uint32_t tavo_select_highlight_region(const float *norm, int32_t n, int32_t len_pts, int32_t chosen,
                                      int32_t nv, const int32_t *valleys, const int32_t *pairs,
                                      int32_t nseg, float mean, float std);
}
