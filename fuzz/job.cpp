// Fuzzes a complete job with all its threads, for any file and any mode. Some jobs are stopped at a
// random moment. Some inputs are followed by generated samples, which make a short song longer.
#include "fuzz/fuzz.h"
#include "tests/support/job_harness.h"

namespace {

using fuzz::must;

// Appends 16-bit samples: clicks over quiet noise. In formats other than WAV they are junk bytes.
void pad(std::vector<uint8_t> *song, size_t bytes) {
    uint32_t noise = 1;
    for (size_t i = 0; i < bytes; i += 2) {
        noise = noise * 1664525u + 1013904223u;
        const bool loud = i / 8192 % 5 >= 2 && i % 8192 < 600;
        song->push_back(static_cast<uint8_t>(noise >> 24));
        song->push_back(static_cast<uint8_t>(loud ? noise >> 16 : 0));
    }
}

void analyse(TAVO_CTX *tavo, int32_t mode, fuzz::input *in) {
    const bool stop = in->ConsumeIntegralInRange(0, 7) == 7;
    const int32_t length = in->ConsumeIntegral<int8_t>();
    const int32_t max_beats = in->ConsumeIntegral<int8_t>();
    const uint32_t moment = in->ConsumeIntegral<uint8_t>();  // time of the stop, in 0.1 ms
    const bool without_callback = stop && moment % 8 == 0;
    if (without_callback) tavo_setcallback(tavo, nullptr);
    must(tavo_analyze(tavo, length, max_beats, 0) == TAVO_OK, "a job starts");
    if (stop) usleep(100 * moment);
    if (!stop) job::wait();
    const int64_t duration_ms = tavo->duration / kUnitsPerMs;
    must(tavo_deinit(tavo) == TAVO_OK, "a release succeeds");
    must(job::last.calls == (without_callback ? 0 : 1), "a job reports once");
    if (without_callback) return;
    const char *problem = job::find_inconsistency(job::last, mode);
    must(problem == nullptr, problem);
    must(job::last.hl_pos >= 0 && job::last.hl_pos <= duration_ms, "a highlight is in the song");
    must(job::last.beats.empty() || job::last.beats[0] >= 0.0f, "a beat has a time");
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    // The last bytes are used twice: as choices, and as part of the file.
    constexpr size_t kChoices = 7;
    fuzz::input in(data + size - std::min(size, kChoices), std::min(size, kChoices));
    const int32_t mode = in.ConsumeIntegralInRange(0, 2);
    const auto pads = in.ConsumeBool() ? in.ConsumeIntegralInRange<size_t>(0, 255) : 0;
    std::vector<uint8_t> song(data, data + size);
    pad(&song, 1024 * pads);
    const std::string path = fuzz::write_file(song);
    int32_t err = INT32_MIN;
    TAVO_CTX *tavo = job::create(path, mode, &err);
    must(err == (tavo == nullptr ? TAVO_ERR_HANDLE : TAVO_OK), "a file is opened or refused");
    if (tavo != nullptr) analyse(tavo, mode, &in);
    return 0;
}
