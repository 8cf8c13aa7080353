// One format's source over the codec library's stand-in. FUZZ_TYPE: the type code of recognition; a
// file that is recognised as another is left to that one's program.
//
// Input: four operations of two bytes, then the file.
#include <sanitizer/asan_interface.h>

#include <algorithm>

#include "fuzz/fuzz.h"
#include "fuzz/memory_io.h"
#include "media_source/mtsrc_ctx.h"

namespace {

constexpr int32_t kOperations = 4;
constexpr int32_t kQueue = kQueueBytes;
constexpr int64_t kUnitsPerSecond = 10'000'000;
constexpr int64_t kUnknownPlace = -1;
constexpr int32_t kNeverWritten = INT32_MIN;

uint8_t pcm[kQueue];

// What is known of an open source.
struct source {
    mtsrc_ctx *src;
    mtsrc_format format;
    int64_t total;  // bytes of PCM in the whole stream
    int64_t at;     // of them, before the next one read; kUnknownPlace after a failure
};

bool is_served(int32_t type) {
    return type == FUZZ_TYPE || (FUZZ_TYPE == kMtsrcTypeMpegLayer3 &&
                                 (type == kMtsrcTypeMpegLayer1 || type == kMtsrcTypeMpegLayer2));
}

// Samples before a time that the source reported.
int64_t samples_at(const source &of, int64_t units) {
    const int64_t rate = of.format.sample_rate;
    return units / kUnitsPerSecond * rate + units % kUnitsPerSecond * rate / kUnitsPerSecond;
}

// Reads want bytes to to, of which no more may be written.
int32_t read(source *of, uint8_t *to, int32_t want, int32_t *code) {
    const int32_t room = std::clamp<int32_t>(want, 0, kQueue);
    const int64_t behind = pcm + kQueue - (to + room);
    __asan_poison_memory_region(to + room, static_cast<size_t>(std::max<int64_t>(behind, 0)));
    mtsrc_frame frame = {to, kNeverWritten};
    *code = mtsrc_getstream(of->src, want, &frame);
    __asan_unpoison_memory_region(pcm, kQueue);
    switch (*code) {
        case 0:
            fuzz::must(frame.size == want, "0 means all that was wanted");
            break;
        case 1:
            fuzz::must(frame.size >= 0 && frame.size < want, "the end means less");
            break;
        default:
            fuzz::must(*code == -6 || (*code == -4 && (want < 0 || want > kQueue / 8)),
                       "a read fails as it may");
            fuzz::must(frame.size == kNeverWritten, "a failed read delivers nothing");
            of->at = kUnknownPlace;
            return 0;
    }
    if (of->at != kUnknownPlace) {
        of->at += frame.size;
        fuzz::must(of->at <= of->total, "a stream is no longer than its duration");
        fuzz::must(*code == 0 || of->at == of->total, "a stream is as long as its duration");
    }
    return frame.size;
}

bool seek(source *of, int64_t position, int64_t *reached) {
    *reached = INT64_MIN;
    const int32_t code = mtsrc_seekstream(of->src, position, reached);
    fuzz::must(code == 0 || code == -4, "a seek succeeds or fails");
    of->at = kUnknownPlace;
    if (code != 0) return false;
    fuzz::must(*reached >= 0 && *reached <= of->format.duration, "a seek lands in the stream");
    of->at = 2 * samples_at(*of, *reached);
    return true;
}

// After a seek to the same place come the same bytes, however they are asked for.
void read_twice(source *of, int64_t position, uint8_t shape) {
    constexpr int32_t kBytes = 4096;
    int64_t first = 0;
    int64_t second = 0;
    int32_t code = 0;
    if (!seek(of, position, &first)) return;
    const int32_t got = read(of, pcm, kBytes, &code);
    if (code < 0 || !seek(of, position, &second)) return;
    fuzz::must(first == second, "a seek to one place lands on one place");
    const int32_t part = 1 + shape * 16;
    int32_t again = read(of, pcm + kBytes, part, &code);
    if (code == 0) again += read(of, pcm + kBytes + again, kBytes - part, &code);
    fuzz::must(code >= 0 && again == got, "the same length comes again");
    fuzz::must(memcmp(pcm, pcm + kBytes, static_cast<size_t>(got)) == 0,
               "the same bytes come again");
}

void operate(source *of, uint8_t what, uint8_t how) {
    constexpr int32_t kOddWants[8] = {-1, 0, 1, 3, kQueue - 1, kQueue, INT32_MAX, INT32_MIN};
    const int64_t end = of->format.duration;
    const int64_t places[8] = {INT64_MIN, -1, 0, 1, end - 1, end, end + 1, INT64_MAX};
    const int64_t share = end / 255 * how;
    int32_t code = 0;
    int64_t reached = 0;
    switch (what % 8) {
        case 0:
        case 1:
            read(of, pcm, how * 32, &code);
            break;
        case 2:
            read(of, pcm, kOddWants[how % 8], &code);
            break;
        case 3:
        case 4:
            seek(of, share, &reached);
            break;
        case 5:
            seek(of, places[how % 8], &reached);
            break;
        case 6:
            fuzz::must(mtsrc_reset(of->src) == -5, "a reset is done");
            of->at = kUnknownPlace;
            break;
        default:
            read_twice(of, share, how);
    }
}

bool learn_format(source *of) {
    fuzz::must(mtsrc_getstream_format(of->src, &of->format) == 0, "an open source has a format");
    const mtsrc_format &format = of->format;
    fuzz::must(format.bits == 16 && format.channels > 0, "a format is whole");
    fuzz::must(format.sample_rate > 0 && format.sample_rate <= 192'000, "a rate is usable");
    fuzz::must(format.duration >= 0, "a duration is none or some");
    of->total = 2 * samples_at(*of, format.duration);
    of->at = 0;
    return true;
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    fuzz::input in = {data, size};
    uint8_t operations[kOperations][2];
    for (auto &operation : operations) {
        operation[0] = in.take<uint8_t>();
        operation[1] = in.take<uint8_t>();
    }
    const fuzz::memory_file *file = fuzz::set_memory_file(in.at, in.left);
    const mtsrc_io io = fuzz::memory_io();
    mtsrc_file *probe = io.open(&io, 0);
    int32_t type = kMtsrcTypeUnknown;
    mtsrc_get_file_type(&io, probe, &type);
    io.close(probe);
    if (!is_served(type)) return 0;

    int32_t err = INT32_MIN;
    source of = {};
    of.src = mtsrc_open_mfal(&io, 0, &err);
    if (of.src == nullptr) {
        fuzz::must(err == -2 || err == -3 || err == -7 || err == -255, "an open fails as it may");
    } else {
        fuzz::must(err == 0, "an open source has no error");
        learn_format(&of);
        for (const auto &operation : operations) operate(&of, operation[0], operation[1]);
        fuzz::must(mtsrc_deinit(of.src) == -5, "a release is done");
    }
    fuzz::must(file->open == 0, "every file that was opened is closed");
    return 0;
}
