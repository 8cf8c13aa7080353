// The WAV reader itself, without the source before it: rates and channel counts that the source
// refuses are read here.
//
// Input: eight operations of two bytes, then the file.
#include <algorithm>

#include "fuzz/fuzz.h"
#include "fuzz/memory_io.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kOperations = 8;
constexpr int32_t kChunk = 4096;  // as the source asks for, but for one byte
constexpr int64_t kUnitsPerSecond = 10'000'000;

uint8_t chunk[kChunk];

int64_t samples_at(const xwav_info &info, int64_t units) {
    const int64_t rate = info.sample_rate;
    return units / kUnitsPerSecond * rate + units % kUnitsPerSecond * rate / kUnitsPerSecond;
}

// Reads size bytes at most; *at: sample frames before the next.
void read(void *reader, const xwav_info &info, int32_t size, int64_t *at) {
    const int32_t block = info.channels * 2;
    int32_t bytes = -1;
    int64_t first = -1;
    int64_t length = -1;
    const int32_t code = xwavd_get_frm(reader, chunk, size, &bytes, &first, &length);
    if (size < block) {
        fuzz::must(code == -1, "less than a sample frame is refused");
        return;
    }
    const int64_t total = samples_at(info, info.duration);
    fuzz::must(code == (*at < total ? 0 : 1), "there is data up to the duration");
    if (code != 0) return;
    const int64_t whole = std::min<int64_t>(size / block, total - *at);
    fuzz::must(bytes == whole * block, "as many whole sample frames as there is room for");
    fuzz::must(samples_at(info, first) == *at, "a chunk says where it lies");
    fuzz::must(samples_at(info, length) == whole, "a chunk says how long it is");
    *at += whole;
}

void read_any(void *reader, int32_t size) {
    int32_t bytes = 0;
    int64_t first = 0;
    int64_t length = 0;
    const int32_t code = xwavd_get_frm(reader, chunk, size, &bytes, &first, &length);
    fuzz::must(code != 0 || (bytes > 0 && bytes <= size), "a chunk fits its buffer");
}

void seek(void *reader, const xwav_info &info, int64_t seconds, int64_t *at) {
    int64_t reached = -1;
    fuzz::must(xwavd_seek(reader, &seconds, &reached, 0) == 0, "a seek succeeds");
    const int64_t total = samples_at(info, info.duration);
    const int64_t wanted = std::clamp<int64_t>(seconds, 0, total / info.sample_rate + 1);
    *at = std::min(wanted * info.sample_rate, total);
    fuzz::must(samples_at(info, reached) == *at, "a seek lands on its second, or at the end");
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    fuzz::input in = {data, size};
    uint8_t operations[kOperations][2];
    for (auto &operation : operations) {
        operation[0] = in.take<uint8_t>();
        operation[1] = in.take<uint8_t>();
    }
    fuzz::memory_file *file = fuzz::set_memory_file(in.at, in.left);
    const mtsrc_io io = fuzz::memory_io();
    xwav_info info = {};
    int32_t word = 0;
    void *reader = xwavd_create(&io, &info, &word);
    if (reader != nullptr) {
        fuzz::must(info.codec == kWexaPcm && info.bits == 16, "what is read is 16-bit PCM");
        fuzz::must(info.sample_rate > 0 && info.channels > 0, "a stream has a rate and channels");
        // Above, samples are shorter than what a duration is rounded up by: only the bounds hold.
        const bool countable = info.sample_rate < kUnitsPerSecond / 5;
        int64_t at = 0;
        for (const auto &[what, how] : operations) {
            constexpr int64_t kSeconds[4] = {INT64_MIN, -1, INT64_MAX, INT32_MAX};
            if (!countable) {
                read_any(reader, how * 16);
                continue;
            }
            if (what % 4 == 0) seek(reader, info, how, &at);
            if (what % 4 == 1) seek(reader, info, kSeconds[how % 4], &at);
            if (what % 4 >= 2) read(reader, info, how * 16, &at);
        }
        xwavd_delete(reader);
    }
    fuzz::must(file->open == 0, "every file that was opened is closed");
    return 0;
}
