#include "beat/beat_ctx.h"

#include "common/lanes.h"
#include "common/worker_group.h"
#include "dsp/mel.h"

pthread_mutex_t *feat_mutex_mt = nullptr;
pthread_cond_t *feat_cond_mt = nullptr;

namespace {

// Returns the number of whole analysis frames. Also returns 1 for a signal that is shorter than a
// frame by less than one hop, because the division truncates toward zero. That frame is never read.
int64_t count_frames(int64_t samples, int32_t frame_size, int32_t hop_size) {
    if (frame_size < 1 || hop_size < 1) return 0;
    return (samples - frame_size) / hop_size + 1;
}

float **allocate_rows(int32_t rows, int32_t columns) {
    auto **matrix = zeroed_items<float *>(rows);
    if (matrix == nullptr) return nullptr;
    for (int32_t i = 0; i < rows; ++i) matrix[i] = zeroed_items<float>(columns);
    return matrix;
}

bool has_all_rows(float *const *matrix, int32_t rows) {
    for (int32_t i = 0; i < rows; ++i) {
        if (matrix[i] == nullptr) return false;
    }
    return true;
}

template <typename T>
void release(T **items) {
    free(*items);
    *items = nullptr;
}

// Returns the lower edge of band `k` in Hz, which is also the centre of the previous band. Every
// step is rounded to single precision.
float band_edge(float top_mel, uint64_t k, uint32_t nbands) {
    const float fraction = static_cast<float>(k) / static_cast<float>(uint64_t{nbands} + 1);
    return Mel2Hz(top_mel * fraction + 0.0f);
}

}  // namespace

void fft2melmtx(int32_t sr, int32_t nfft, int32_t fmax, uint32_t nbands, float **matrix) {
    const int32_t bins = nfft / 2;
    const float bin_width = static_cast<float>(sr) / static_cast<float>(nfft);
    const float top_mel = Hz2Mel(static_cast<float>(fmax));

    for (uint32_t band = 0; band < nbands; ++band) {
        const float lo = band_edge(top_mel, band, nbands);
        const float centre = band_edge(top_mel, uint64_t{band} + 1, nbands);
        const float hi = band_edge(top_mel, uint64_t{band} + 2, nbands);
        for (int32_t bin = 0; bin < bins; ++bin) {
            const float hz = bin_width * static_cast<float>(bin);
            const float rising = (hz - lo) / (centre - lo);
            const float falling = (hi - hz) / (hi - centre);
            const float inside = falling < rising ? falling : rising;
            const float height = inside > 0.0f ? inside : 0.0f;
            matrix[bin][band] = height * 2.0f / (hi - lo);
        }
    }
}

void __beat_init(TAVO_CTX *ctx, TAVO_BEAT_CTX *beat) {
    init_beat_ctx(ctx, true, beat);
}

bool init_beat_ctx(const TAVO_CTX *ctx, bool with_signal, TAVO_BEAT_CTX *beat) {
    worker_lock_create(&feat_mutex_mt, &feat_cond_mt);

    const int64_t n = analysis_length(ctx);
    const int32_t frame_size = ctx->onset->frame_size;
    const int32_t hop_size = ctx->onset->hop_size;
    beat->band_count = kMelBands;
    beat->hop_seconds = static_cast<double>(hop_size) / ctx->ana_rate;
    beat->half_frame = frame_size > 0 ? frame_size / 2 : 0;
    beat->frame_count = count_frames(n, frame_size, hop_size);

    beat->frame_times = zeroed_items<float>(beat->frame_count);
    beat->onset_env = zeroed_items<double>(beat->frame_count);
    beat->mel_matrix = allocate_rows(beat->half_frame, kMelBands);
    beat->threshold = zeroed_items<double>(beat->frame_count);
    if (with_signal) {
        beat->signal = zeroed_items<double>(n);
        beat->rise_flags = zeroed_items<int32_t>(n);
    }
    if (beat->signal != nullptr) scale_samples({ctx->ana, kFullScale}, n, beat->signal);
    const bool ready = feat_mutex_mt != nullptr && feat_cond_mt != nullptr &&
                       beat->frame_times != nullptr && beat->onset_env != nullptr &&
                       beat->threshold != nullptr && beat->mel_matrix != nullptr &&
                       has_all_rows(beat->mel_matrix, beat->half_frame);
    if (!ready) return false;

    const auto hop = static_cast<float>(beat->hop_seconds);
    for (int64_t k = 0; k < beat->frame_count; ++k) {
        beat->frame_times[k] = hop * static_cast<float>(k + 1);
    }
    fft2melmtx(ctx->ana_rate, frame_size, ctx->ana_rate / 2, kMelBands, beat->mel_matrix);
    return true;
}

void scale_samples(sample_view view, int64_t count, double *scaled) {
    const double_pair full_scale = {view.full_scale, view.full_scale};
    int64_t i = 0;
    for (; i + 1 < count; i += 2) store_pair(scaled + i, load_pair(view.samples + i) / full_scale);
    if (i < count) scaled[i] = view.samples[i] / view.full_scale;
}

void __tavo_deinit(TAVO_BEAT_CTX *beat) {
    if (beat->mel_matrix != nullptr) {
        for (int32_t i = 0; i < beat->half_frame; ++i) free(beat->mel_matrix[i]);
    }
    release(&beat->mel_matrix);
    release(&beat->onset_env);
    release(&beat->frame_times);
    release(&beat->signal);
    release(&beat->threshold);
    release(&beat->rise_flags);
    release(&beat->rise_frames);
    worker_lock_release(&feat_mutex_mt, &feat_cond_mt);
}
