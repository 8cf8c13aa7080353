// An instance whose decoding the library has planned, for a stream that the fake codec library
// describes and whose bytes the test supplies.
#ifndef TAVO_TESTS_PCM_SONG_PLAN_H
#define TAVO_TESTS_PCM_SONG_PLAN_H

#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <utility>
#include <vector>

#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "pcm/resample.h"
#include "tests/support/bytes.h"
#include "tests/support/scripted_codec.h"

using support::noise, support::slice;
using sample_run = std::vector<int16_t>;
using signal_run = std::vector<double>;

// The n values of a conversion's output and the 64 cleared bytes after them. Frees the output.
inline signal_run taken(double *out, int64_t n) {
    signal_run result(out, out + n + 8);
    free(out);
    return result;
}

// The same, converted from so many bytes of PCM.
inline signal_run converted(const void *pcm, size_t bytes, int32_t rate) {
    int64_t n = -1;
    double *out = nullptr;
    EXPECT_EQ(dorn_resampler_run(static_cast<const int16_t *>(pcm), int64_t(bytes), rate,
                                 kAnalysisRate, &n, &out),
              0);
    EXPECT_TRUE(ext_mutex_resample == nullptr && ext_cond_resample == nullptr);
    return taken(out, n);
}

// The stream that a source delivers once it is planned, and the requests that it received.
struct player {
    std::string stream = {};
    int64_t at = 0;               // next byte
    int64_t fail_at = INT64_MAX;  // byte from which on reads fail
    int empty_replies = 0;        // number of empty reads before the others
    int32_t code = 0;             // of a read within the stream
    int64_t land = -1;            // byte that the next seek reaches, whatever it asks for
    int64_t report = -1;          // units that the next seek reports, whatever it asks for
    bool seek_fails = false;      // the next one, without a report
    std::vector<int64_t> seeks = {};
    int32_t most_wanted = 0;
};
inline std::map<const mtsrc_ctx *, player *> players;

inline int32_t play(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    player *self = players.at(src);
    self->most_wanted = std::max(self->most_wanted, want);
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

inline int32_t move_player(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    player *self = players.at(src);
    self->seeks.push_back(position);
    if (std::exchange(self->seek_fails, false)) return TAVO_ERR_HANDLE;
    const int64_t land = std::exchange(self->land, -1);
    const int64_t report = std::exchange(self->report, -1);
    self->at = land >= 0 ? land : position * src->format.sample_rate / kUnitsPerSecond * 2;
    *reached = report >= 0 ? report : position;
    return 0;
}

class song_plan : public testing::Test {
 protected:
    song_plan() { scripted::all = {}; }
    ~song_plan() override { release(); }
    void release() {
        free(ctx.ana);
        tavo_decode_deinit(&ctx);
        ctx = {};
        players.clear();
        EXPECT_TRUE(ext_mutex_mt == nullptr && ext_cond_mt == nullptr);
        EXPECT_TRUE(scripted::all.alive.empty());
        EXPECT_TRUE(scripted::all.faults.empty());
    }
    // Returns the code of tavo_decode_init. The sources deliver stream from the position of setup.
    int32_t plan(int64_t duration, int32_t rate, const std::string &stream = {}) {
        release();
        std::ofstream(file.path) << head;
        script.channels = 1;
        script.duration = duration;
        script.sample_rate = rate;
        scripted::all.use(script);
        const TAVO_PARAM param = {file.path.c_str(), 0};
        const int32_t code = tavo_decode_init(&ctx, &param);
        for (int32_t i = 0; code == 0 && i < ctx.seg_count; ++i) {
            const TAVO_DECSEG &seg = ctx.seg[i];
            sources[i] = {stream, seg.start * rate / kUnitsPerSecond * 2};
            players[seg.src] = &sources[i];
            seg.src->get_frm = play;
            seg.src->seek = move_player;
        }
        return code;
    }
    std::string pcm(int64_t bytes) {
        return {reinterpret_cast<const char *>(ctx.pcm), static_cast<size_t>(bytes)};
    }
    const support::temporary_file file{"pcm"};
    std::string head = "fLaC and some more";  // what recognition reads
    scripted::script script;
    player sources[4];
    TAVO_CTX ctx = {};
};

#endif
