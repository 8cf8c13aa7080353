// A fixture with an instance that is ready to decode. The fake codec library describes the stream,
// and each test supplies the stream's bytes.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <utility>
#include <vector>

#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "pcm/resample.h"
#include "tests/support/bytes.h"
#include "tests/support/fake_codec.h"

using support::noise, support::slice;
using sample_run = std::vector<int16_t>;
using signal_run = std::vector<double>;

// Returns the `n` values of a conversion's output and the eight zeros after them. Frees the output.
inline signal_run read_output(double *out, int64_t n) {
    signal_run result(out, out + n + 8);
    free(out);
    return result;
}

// Converts `bytes` bytes of PCM to the analysis rate and returns the output as read_output does.
inline signal_run convert_pcm(const void *pcm, size_t bytes, int32_t rate) {
    int64_t n = -1;
    double *out = nullptr;
    EXPECT_EQ(dorn_resampler_run(static_cast<const int16_t *>(pcm), int64_t(bytes), rate,
                                 kAnalysisRate, &n, &out),
              0);
    EXPECT_TRUE(ext_mutex_resample == nullptr && ext_cond_resample == nullptr);
    return read_output(out, n);
}

// Replaces a source's read and seek functions: delivers a stream and records the requests.
struct fake_source {
    std::string stream = {};
    int64_t at = 0;               // offset of the next byte
    int64_t fail_at = INT64_MAX;  // reads that end after this offset fail
    int empty_replies = 0;        // number of reads at the start that deliver nothing
    int32_t code = 0;             // result of a read before the end of the stream
    int64_t seek_target = -1;     // byte that the next seek reaches; -1: the requested one
    int64_t seek_report = -1;     // position that the seek reports, 100 ns; -1: the requested one
    bool seek_fails = false;      // the next seek fails and reports nothing
    std::vector<int64_t> seeks = {};
    int32_t max_request = 0;
};
inline std::map<const mtsrc_ctx *, fake_source *> sources_by_handle;

inline int32_t read_source(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    fake_source *self = sources_by_handle.at(src);
    self->max_request = std::max(self->max_request, want);
    frame->size = want;
    if (self->at + want > self->fail_at) return TAVO_ERR_READ;
    const bool empty = self->empty_replies > 0 && self->empty_replies-- > 0;
    const auto end = static_cast<int64_t>(self->stream.size());
    const int64_t bytes = empty ? 0 : std::clamp<int64_t>(end - self->at, 0, want);
    std::copy_n(self->stream.data() + std::min(self->at, end), bytes,
                static_cast<char *>(frame->data));
    self->at += bytes;
    frame->size = static_cast<int32_t>(bytes);
    return bytes < want && !empty ? 1 : self->code;
}

inline int32_t seek_source(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    fake_source *self = sources_by_handle.at(src);
    self->seeks.push_back(position);
    if (std::exchange(self->seek_fails, false)) return TAVO_ERR_HANDLE;
    const int64_t seek_target = std::exchange(self->seek_target, -1);
    const int64_t seek_report = std::exchange(self->seek_report, -1);
    self->at =
        seek_target >= 0 ? seek_target : position * src->format.sample_rate / kUnitsPerSecond * 2;
    *reached = seek_report >= 0 ? seek_report : position;
    return 0;
}

class song_plan : public testing::Test {
 protected:
    song_plan() { fake_codec::state = {}; }
    ~song_plan() override { release(); }
    void release() {
        free(ctx.ana);
        tavo_decode_deinit(&ctx);
        ctx = {};
        sources_by_handle.clear();
        EXPECT_TRUE(ext_mutex_mt == nullptr && ext_cond_mt == nullptr);
        EXPECT_TRUE(fake_codec::state.objects.empty());
        EXPECT_TRUE(fake_codec::state.misuses.empty());
    }
    // Plans the decoding and returns the code. Each source starts at its segment in `stream`.
    int32_t plan(int64_t duration, int32_t rate, const std::string &stream = {}) {
        release();
        std::ofstream(file.path) << head;
        codec_stream.channels = 1;
        codec_stream.duration = duration;
        codec_stream.sample_rate = rate;
        fake_codec::state.streams.push_back(codec_stream);
        const TAVO_PARAM param = {file.path.c_str(), 0};
        const int32_t code = tavo_decode_init(&ctx, &param);
        for (int32_t i = 0; code == 0 && i < ctx.seg_count; ++i) {
            const TAVO_DECSEG &seg = ctx.seg[i];
            sources[i] = {stream, seg.start * rate / kUnitsPerSecond * 2};
            sources_by_handle[seg.src] = &sources[i];
            seg.src->get_frm = read_source;
            seg.src->seek = seek_source;
        }
        return code;
    }
    std::string pcm(int64_t bytes) {
        return {reinterpret_cast<const char *>(ctx.pcm), static_cast<size_t>(bytes)};
    }
    const support::temporary_file file{"pcm"};
    std::string head = "fLaC and some more";  // the bytes that recognition reads
    fake_codec::stream_spec codec_stream;
    fake_source sources[4];
    TAVO_CTX ctx = {};
};
