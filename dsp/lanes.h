// Two doubles side by side in one vector register, by the compiler's vector extension: every sum
// and product has the bits that it would have alone. Used where two independent runs of the same
// arithmetic can go side by side.
#ifndef TAVO_DSP_LANES_H
#define TAVO_DSP_LANES_H

#include <cstring>

typedef double double_pair __attribute__((vector_size(16)));

// from, to: any two neighbouring doubles, aligned as doubles are.
inline double_pair load_pair(const double *from) {
    double_pair pair;
    memcpy(&pair, from, sizeof pair);
    return pair;
}

inline void store_pair(double *to, double_pair pair) {
    memcpy(to, &pair, sizeof pair);
}

#endif
