// The compiler's vector types, each of which holds several numbers in one register. Each lane is
// rounded as a single number would be. Used where independent data needs the same arithmetic.
#pragma once

#include <cstdint>
#include <cstring>

typedef double double_pair __attribute__((vector_size(16)));
typedef float float_pair __attribute__((vector_size(8)));
typedef int32_t int_pair __attribute__((vector_size(8)));
typedef float float_quad __attribute__((vector_size(16)));
typedef int32_t int_quad __attribute__((vector_size(16)));
typedef int64_t int64_pair __attribute__((vector_size(16)));
typedef int16_t int16_quad __attribute__((vector_size(8)));
typedef int16_t int16_octet __attribute__((vector_size(16)));

// Load and store two adjacent doubles, which need only the alignment of a double.
inline double_pair load_pair(const double *values) {
    double_pair pair;
    memcpy(&pair, values, sizeof pair);
    return pair;
}

inline void store_pair(double *values, double_pair pair) {
    memcpy(values, &pair, sizeof pair);
}
