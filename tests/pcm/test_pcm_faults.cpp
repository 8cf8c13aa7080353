// What the stages answer when there is no memory: each of their allocations fails in turn. Leaks
// show under AddressSanitizer.
#include <functional>

#include "pcm/from_highlight.h"
#include "tests/pcm/plan_builder.h"

namespace {

// Counts down to the failing request; 0: none fails. Set on the thread under test.
thread_local int failing_allocation = 0;

bool allocation_fails() {
    return failing_allocation > 0 && --failing_allocation == 0;
}

}  // namespace

extern "C" {
// The folder's globals exist in this program and in libtavo.so, which serves as media source only.
const char *__asan_default_options() {
    return "detect_odr_violation=0";
}

void *__real_malloc(size_t size);
void *__real_calloc(size_t count, size_t size);
void *__real_realloc(void *block, size_t size);

void *__wrap_malloc(size_t size) {
    return allocation_fails() ? nullptr : __real_malloc(size);
}
void *__wrap_realloc(void *block, size_t size) {
    return allocation_fails() ? nullptr : __real_realloc(block, size);
}
void *__wrap_calloc(size_t count, size_t size) {
    return allocation_fails() ? nullptr : __real_calloc(count, size);
}
}

namespace {

constexpr int64_t kTenSeconds = 100'000'000;  // units

int32_t with_failing(int nth, const std::function<int32_t()> &work) {
    failing_allocation = nth;
    const int32_t code = work();
    failing_allocation = 0;
    return code;
}

TEST(pcm_faults, comparison) {
    TAVO_DECSEG seg = {};
    int64_t off = 0;
    EXPECT_EQ(with_failing(1, [&] { return _compare_decoded(&seg, nullptr, &off); }), -1);
}

TEST(pcm_faults, second_plan) {
    // Four buffers and the PCM.
    for (int nth = 1; nth <= 6; ++nth) {
        SCOPED_TRACE(nth);
        std::vector<fake_audio> audio(4);
        TAVO_CTX ctx;
        lay_plan(&ctx, &audio, {1, 1, 1, 1}, kTenSeconds);
        drop_buffers(&ctx);
        EXPECT_EQ(with_failing(nth, [&] { return construct_decbuf(&ctx, 20'000'000); }),
                  nth < 6 ? -2 : 0);
        for (int i = 0; i < 4 && nth < 6; ++i) EXPECT_EQ(ctx.seg[i].buf, nullptr);
        tavo_decode_deinit(&ctx);
    }
}

TEST(pcm_faults, conversion) {
    const std::vector<int16_t> in(4000, 1000);
    for (const int32_t rate : {48000, 44100}) {
        // Three end the conversion; two more of the block average leave silence.
        for (int nth = 1; nth <= 6; ++nth) {
            SCOPED_TRACE(testing::Message() << rate << ", allocation " << nth);
            int64_t n = -1;
            double *out = nullptr;
            const int32_t code = with_failing(nth, [&] {
                return dorn_resampler_run(in.data(), 8000, rate, kAnalysisRate, &n, &out);
            });
            EXPECT_EQ(code, nth <= 3 ? -2 : 0);
            EXPECT_EQ(out == nullptr, code != 0);
            EXPECT_EQ(n, code != 0 ? 0 : 4000LL * 11025 / rate);
            const bool silent = rate == 44100 && nth < 6;
            if (code == 0) {
                EXPECT_EQ(out[100] == 0.0, silent);
            }
            EXPECT_EQ(ext_mutex_resample, nullptr);
            free(out);
        }
    }
}

}  // namespace
