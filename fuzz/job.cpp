// A whole job: any file, any mode, with all its threads. Bytes made up behind the input let a short
// one be a song of minutes.
#include <semaphore.h>

#include <atomic>

#include "common/tavo_ctx.h"
#include "fuzz/fuzz.h"

namespace {

using fuzz::must;

std::atomic<int> calls;
sem_t called;
TAVO_INFO last;

void on_result(TAVO_INFO *info) {
    ++calls;
    last = *info;
    for (int32_t i = 0; i < info->beat_count; ++i) {
        must(info->beat_times[i] >= 0.0f, "a beat has a time");
        must(i == 0 || info->beat_times[i - 1] <= info->beat_times[i], "beats ascend");
    }
    sem_post(&called);
}

// Clicks over a quiet noise, as 16-bit samples and as any other bytes.
std::vector<uint8_t> padding(size_t bytes) {
    std::vector<uint8_t> pad(bytes);
    uint32_t noise = 1;
    for (size_t i = 0; i + 1 < bytes; i += 2) {
        noise = noise * 1664525u + 1013904223u;
        const bool loud = i / 8192 % 5 >= 2 && i % 8192 < 600;
        pad[i] = static_cast<uint8_t>(noise >> 24);
        pad[i + 1] = static_cast<uint8_t>(loud ? noise >> 16 : 0);
    }
    return pad;
}

void analyse(TAVO_CTX *tavo, int32_t mode, fuzz::input *in) {
    const bool stop = in->ConsumeIntegralInRange(0, 7) == 7;
    const int32_t length = in->ConsumeIntegral<int8_t>();
    const int32_t max_beats = in->ConsumeIntegral<int8_t>();
    calls = 0;
    last = {};
    sem_init(&called, 0, 0);
    tavo_setcallback(tavo, on_result);
    must(tavo_analyze(tavo, length, max_beats, 0) == TAVO_OK, "a job starts");
    if (!stop) {
        while (sem_wait(&called) != 0) continue;  // interrupted
        const bool complete = last.status == 0;
        must(complete || (last.status == -1 && mode != TAVO_MODE_HIGHLIGHT),
             "a result or a failure");
        must((last.beat_count > 0) == (complete && mode != TAVO_MODE_HIGHLIGHT),
             "only a result has beats");
        must((last.beat_times == nullptr) == (last.beat_count == 0), "no beats, no list");
    }
    const int64_t duration_ms = tavo->duration / kUnitsPerMs;
    must(tavo_deinit(tavo) == TAVO_OK, "a release is done");
    must(last.hl_pos >= 0 && last.hl_pos <= duration_ms, "a highlight starts in the song");
    must(calls == 1, "a job reports once");
    sem_destroy(&called);
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr size_t kChoices =
        6;  // bytes at the end, read twice: as choices, and as part of the file
    fuzz::input in(data + size - std::min(size, kChoices), std::min(size, kChoices));
    const int32_t mode = in.ConsumeIntegralInRange(0, 2);
    const auto pads = in.ConsumeBool() ? in.ConsumeIntegralInRange<size_t>(0, 255) : 0;
    std::vector<uint8_t> song(data, data + size);
    const std::vector<uint8_t> pad = padding(1024 * pads);
    song.insert(song.end(), pad.begin(), pad.end());
    const std::string path = fuzz::file_of(song);
    fnamedec = "";
    int32_t err = INT32_MIN;
    const TAVO_PARAM param = {path.c_str(), mode};
    TAVO_CTX *tavo = tavo_init(&param, &err);
    must(err == (tavo == nullptr ? TAVO_ERR_HANDLE : TAVO_OK), "a file is taken or refused");
    if (tavo != nullptr) analyse(tavo, mode, &in);
    return 0;
}
