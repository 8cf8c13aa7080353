// Vector types: several numbers side by side in one register, by the compiler's vector extension.
// Each lane is rounded as it would be alone. Used where independent runs of the same arithmetic can
// go side by side.
#ifndef TAVO_COMMON_LANES_H
#define TAVO_COMMON_LANES_H

#include <cstdint>
#include <cstring>

typedef double double_pair __attribute__((vector_size(16)));
typedef float float_pair __attribute__((vector_size(8)));
typedef int32_t int_pair __attribute__((vector_size(8)));
typedef float float_quad __attribute__((vector_size(16)));
typedef int32_t int_quad __attribute__((vector_size(16)));
typedef int64_t int64_pair __attribute__((vector_size(16)));
typedef int16_t int16_octet __attribute__((vector_size(16)));

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
