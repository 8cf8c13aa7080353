// Every allocation of the decoding and the conversion is made to fail in turn, once and from there
// on, and every thread start. Leaks show under AddressSanitizer.
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <string>

#include "pcm/from_highlight.h"
#include "pcm/resample.h"
#include "tests/pcm/plan_builder.h"
#include "tests/support/scripted_codec.h"

namespace {

// Counts down to the failing request; 0 or less: none fails. Set on the thread under test.
thread_local int failing_allocation = 0;
thread_local bool keep_failing = false;
thread_local bool failure_met = false;
int refused_threads = 0;  // bit i: the i-th start of the next four
int thread_starts = 0;

bool allocation_fails() {
    if (failing_allocation < 1) return false;
    if (--failing_allocation > 0) return false;
    if (keep_failing) failing_allocation = 1;
    failure_met = true;
    return true;
}

}  // namespace

extern "C" {
// The folder's globals exist in this program and in libtavo.so, which serves as media source only.
const char *__asan_default_options() {
    return "detect_odr_violation=0";
}

void *__real_malloc(size_t size);
void *__real_calloc(size_t count, size_t size);
int __real_pthread_create(pthread_t *, const pthread_attr_t *, void *(*)(void *), void *);

void *__wrap_malloc(size_t size) {
    return allocation_fails() ? nullptr : __real_malloc(size);
}
void *__wrap_calloc(size_t count, size_t size) {
    return allocation_fails() ? nullptr : __real_calloc(count, size);
}
int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attr, void *(*entry)(void *),
                          void *arg) {
    const int start = thread_starts++;
    if (start < 4 && (refused_threads >> start & 1) != 0) return EAGAIN;
    return __real_pthread_create(thread, attr, entry, arg);
}
}

namespace {

// Runs work(nth) with allocation nth failing, for 1, 2, ... until a run needs fewer; first with
// that one failing alone, then with all later ones too. Returns the runs that met a failure.
int with_failing_allocations(const std::function<void(int nth)> &work) {
    int met = 0;
    for (const bool keep : {false, true}) {
        failure_met = true;
        for (int nth = 1; failure_met && !testing::Test::HasFatalFailure(); ++nth) {
            SCOPED_TRACE(testing::Message() << "allocation " << nth << (keep ? " and on" : ""));
            keep_failing = keep;
            failure_met = false;
            work(nth);
            failing_allocation = 0;
            met += failure_met ? 1 : 0;
        }
    }
    return met;
}

void refuse_threads(int mask) {
    refused_threads = mask;
    thread_starts = 0;
}

TEST(pcm_faults, setup) {
    scripted::reset();
    scripted::script script;
    script.duration = 100'000'000;
    script.sample_rate = 8000;
    scripted::use(script);
    const std::string path =
        (std::filesystem::temp_directory_path() / ("tavo_fault_" + std::to_string(getpid())))
            .string();
    FILE *file = fopen(path.c_str(), "wb");
    ASSERT_NE(file, nullptr);
    fwrite("RIFF\0\0\0\0WAVEfmt ", 1, 16, file);
    fclose(file);
    const TAVO_PARAM param = {path.c_str(), 0};

    // Lock, condition, table, flags, four buffers, PCM.
    EXPECT_EQ(with_failing_allocations([&](int nth) {
                  TAVO_CTX ctx = {};
                  failing_allocation = nth;
                  const int32_t code = tavo_decode_init(&ctx, &param);
                  if (nth > 9) {
                      EXPECT_EQ(code, 0);
                  } else {
                      EXPECT_EQ(code, -2);
                      EXPECT_EQ(ctx.seg, nullptr);
                      EXPECT_EQ(ctx.pcm, nullptr);
                      EXPECT_EQ(ext_mutex_mt, nullptr);
                      EXPECT_EQ(scripted::live_objects(), 0);
                  }
                  tavo_decode_deinit(&ctx);
              }),
              18);
    EXPECT_EQ(scripted::live_objects(), 0);
    remove(path.c_str());
}

TEST(pcm_faults, second_plan) {
    EXPECT_EQ(with_failing_allocations([](int nth) {
                  std::vector<fake_audio> audio(4);
                  TAVO_CTX ctx;
                  lay_plan(&ctx, &audio, {1, 1, 1, 1}, 100'000'000);
                  for (int i = 0; i < 4; ++i) free(ctx.seg[i].buf);
                  free(ctx.pcm);
                  failing_allocation = nth;
                  EXPECT_EQ(construct_decbuf(&ctx, 20'000'000), nth > 5 ? 0 : -2);
                  for (int i = 0; i < 4 && nth <= 5; ++i) EXPECT_EQ(ctx.seg[i].buf, nullptr);
                  tavo_decode_deinit(&ctx);
              }),
              10);
}

TEST(pcm_faults, from_the_highlight) {
    // The probe, then (not found) four buffers and the PCM, then the conversion's three arrays.
    with_failing_allocations([](int nth) {
        std::vector<fake_audio> audio(4);
        TAVO_HL_CTX hl = {};
        TAVO_CTX ctx;
        for (auto &each : audio) each.stream = noise(160'000, 1);
        lay_plan(&ctx, &audio, {72'000, 72'000, 72'000, 40'000}, 100'000'000);
        ctx.hl = &hl;
        ctx.ana_rate = kAnalysisRate;
        ctx.pcm_bytes = DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes);
        audio[0].land = 150'000;
        failing_allocation = nth;
        const int32_t code = tavo_get_from_here(&ctx, 3000);
        const bool failed_probe_only = nth == 1 && !keep_failing;
        EXPECT_EQ(code, nth > 9 || failed_probe_only ? 0 : -2);
        EXPECT_EQ(hl.hl_pos, 3000U);
        EXPECT_EQ(ctx.pcm, nullptr);
        if (code == 0) {
            EXPECT_EQ(ctx.ana_len, int64_t{112'000 / 2} * 11025 / 8000);
        } else {
            EXPECT_EQ(ctx.ana, nullptr);
            EXPECT_EQ(ctx.ana_len, 0);
        }
        free(ctx.ana);
        tavo_decode_deinit(&ctx);
    });
}

TEST(pcm_faults, comparison) {
    TAVO_DECSEG seg = {};
    int64_t off = 0;
    failing_allocation = 1;
    const int32_t code = _compare_decoded(&seg, nullptr, &off);
    failing_allocation = 0;
    EXPECT_EQ(code, -1);
}

TEST(pcm_faults, conversion) {
    const std::vector<int16_t> in(4000, 1000);
    const struct {
        int32_t rate;
        int allocations;  // that end in -2; two more of the block average leave silence
    } cases[] = {{48000, 3}, {44100, 3}};
    for (const auto &each : cases) {
        SCOPED_TRACE(each.rate);
        with_failing_allocations([&](int nth) {
            int64_t n = -1;
            double *out = nullptr;
            failing_allocation = nth;
            const int32_t code =
                dorn_resampler_run(in.data(), 8000, each.rate, kAnalysisRate, &n, &out);
            EXPECT_EQ(code, nth <= each.allocations ? -2 : 0);
            EXPECT_EQ(out == nullptr, code != 0);
            EXPECT_EQ(n, code != 0 ? 0 : 4000LL * 11025 / each.rate);
            const bool silent = each.rate == 44100 && (nth == 4 || nth == 5);
            if (code == 0) {
                EXPECT_EQ(out[100] == 0.0, silent);
            }
            EXPECT_EQ(ext_mutex_resample, nullptr);
            free(out);
        });
    }
}

TEST(pcm_faults, threads_that_cannot_be_started) {
    const byte_run stream = noise(160'000, 1);
    std::vector<int16_t> in(4000);
    memcpy(in.data(), stream.data(), 8000);
    int64_t n = 0;
    double *want = nullptr;
    ASSERT_EQ(dorn_resampler_run(in.data(), 8000, 44100, kAnalysisRate, &n, &want), 0);

    for (const int mask : {1, 2, 4, 8, 6, 15}) {
        SCOPED_TRACE(mask);
        std::vector<fake_audio> audio(4);
        TAVO_CTX ctx;
        for (auto &each : audio) each.stream = stream;
        lay_plan(&ctx, &audio, {72'000, 72'000, 72'000, 40'000}, 100'000'000);
        refuse_threads(mask);
        ASSERT_EQ(DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes), 160'000);
        EXPECT_EQ(thread_starts, 4);
        EXPECT_EQ(memcmp(ctx.pcm, stream.data(), 160'000), 0);
        tavo_decode_deinit(&ctx);

        double *out = nullptr;
        refuse_threads(mask);
        ASSERT_EQ(dorn_resampler_run(in.data(), 8000, 44100, kAnalysisRate, &n, &out), 0);
        EXPECT_EQ(thread_starts, 4);
        EXPECT_TRUE(std::equal(want, want + n, out));
        free(out);
    }
    refuse_threads(0);
    free(want);
}

}  // namespace
