// Stage 7c: moves the coarse start so that a region of the requested length ends at a natural
// boundary.
//
// In and out: indexes into the loudness curve (2 s each). Called by highlight/search.h.
#ifndef TAVO_HIGHLIGHT_REGION_H
#define TAVO_HIGHLIGHT_REGION_H

#include <cstdint>

extern "C" {

// norm: [n] loudness, 0 to 1; mean, std: its mean and population standard deviation. len_pts:
// requested length in points. chosen: the coarse start. valleys: [15] the first nv ascending, the
// rest 0. pairs: [2 nseg] start and end of each loud segment, ascending. Returns the start index.
uint32_t tavo_select_highlight_region(const float *norm, int32_t n, int32_t len_pts, int32_t chosen,
                                      int32_t nv, const int32_t *valleys, const int32_t *pairs,
                                      int32_t nseg, float mean, float std);
}

#endif
