// Numbers side by side in one vector register, by the compiler's vector extension. Sums and
// products are bit-identical to those of single numbers.
#ifndef TAVO_DSP_LANES_H
#define TAVO_DSP_LANES_H

#include <cstring>

typedef double double_pair __attribute__((vector_size(16)));
typedef float float_pair __attribute__((vector_size(8)));

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
