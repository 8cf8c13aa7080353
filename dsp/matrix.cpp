#include "dsp/matrix.h"

#include <cstdlib>

namespace {

// The columns of one row of b outside which it holds only zeros.
struct SPAN {
    int32_t begin;
    int32_t end;
    int32_t known;
};

SPAN find_span(const float *row, int32_t cols) {
    SPAN span = {0, cols, 1};
    while (span.end > 0 && row[span.end - 1] == 0.0f) span.end--;
    while (span.begin < span.end && row[span.begin] == 0.0f) span.begin++;
    return span;
}

}  // namespace

int32_t MultiplyMtxs(int32_t rows, int32_t cols, int32_t inner, const float *const *a,
                     const float *const *b, double *const *d) {
    if (rows < 1 || cols < 1) return rows;
    // A row of b is scanned for its span when it is first needed and serves every row of a: mel
    // bands are narrow. Without the memory the whole row counts.
    SPAN *spans = nullptr;
    if (rows > 1 && inner > 0) {
        spans = static_cast<SPAN *>(calloc(static_cast<size_t>(inner), sizeof(SPAN)));
    }
    for (int32_t i = 0; i < rows; i++) {
        double *out = d[i];
        for (int32_t j = 0; j < cols; j++) out[j] = 0.0;
        for (int32_t k = 0; k < inner; k++) {
            if (a[i][k] == 0.0f) continue;
            const double weight = static_cast<double>(a[i][k]);
            const float *row = b[k];
            SPAN span = {0, cols, 1};
            if (spans != nullptr) {
                if (spans[k].known == 0) spans[k] = find_span(row, cols);
                span = spans[k];
            }
            for (int32_t j = span.begin; j < span.end; j++) {
                if (row[j] != 0.0f) out[j] += weight * static_cast<double>(row[j]);
            }
        }
    }
    free(spans);
    return rows;
}
