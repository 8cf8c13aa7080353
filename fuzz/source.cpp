// Fuzzes media sources with arbitrary files. A stream must be as long as its stated duration, and
// requests of different sizes from one position must return the same bytes.
#include "common/tavo_ctx.h"
#include "fuzz/fuzz.h"
#include "media_source/mtsrc_ctx.h"

namespace {

using fuzz::must;

constexpr int32_t kBuffer = 2 * kQueueBytes;
constexpr int32_t kNeverWritten = INT32_MIN;
constexpr int64_t kUnknownOffset = -1;  // value of stream.at after a failure or a reset

struct stream {
    mtsrc_ctx *src = nullptr;
    mtsrc_format format = {};
    int64_t total = 0;  // bytes of the whole stream
    int64_t at = 0;     // offset of the next byte
};

int64_t bytes_at(const stream &source, int64_t units) {
    const int64_t rate = source.format.sample_rate;
    return 2 * (units / kUnitsPerSecond * rate + units % kUnitsPerSecond * rate / kUnitsPerSecond);
}

// Requests `want` bytes and appends the delivered bytes to `out`.
int32_t read(stream *source, int32_t want, std::vector<uint8_t> *out) {
    std::vector<uint8_t> buffer(static_cast<size_t>(std::clamp(want, 1, kBuffer)));
    mtsrc_frame frame = {buffer.data(), kNeverWritten};
    const int32_t code = mtsrc_getstream(source->src, want, &frame);
    if (code != 0 && code != 1) {
        must(code == -6 || (code == -4 && (want < 0 || want > kQueueBytes / 8)),
             "a read fails with one of its codes");
        must(frame.size == kNeverWritten, "a failed read delivers nothing");
        source->at = kUnknownOffset;
        return code;
    }
    must(code == 0 ? frame.size == want : frame.size >= 0 && frame.size < want,
         "a read at the end is short");
    out->insert(out->end(), buffer.begin(), buffer.begin() + frame.size);
    if (source->at == kUnknownOffset) return code;
    source->at += frame.size;
    must(source->at <= source->total && (code == 0 || source->at == source->total),
         "a stream is as long as its duration");
    return code;
}

bool seek(stream *source, int64_t position, int64_t *reached) {
    const int32_t code = mtsrc_seekstream(source->src, position, reached);
    must(code == 0 || code == -4, "a seek succeeds or fails");
    source->at = kUnknownOffset;
    if (code != 0) return false;
    must(*reached >= 0 && *reached <= source->format.duration,
         "a seek reaches a position in the stream");
    source->at = bytes_at(*source, *reached);
    return true;
}

// Reads twice from the same position, first in one request, then in several.
void read_twice(stream *source, fuzz::input *in) {
    const int64_t end = source->format.duration;
    const int64_t positions[] = {INT64_MIN, -1, 0, 1, end - 1, end, end + 1, INT64_MAX};
    const int64_t position = in->ConsumeBool() ? in->PickValueInArray(positions)
                                               : end / 255 * in->ConsumeIntegral<uint8_t>();
    const int32_t bytes = in->ConsumeIntegralInRange(1, 16'384);
    int64_t first = 0, second = 0;
    std::vector<uint8_t> whole, parts;
    if (!seek(source, position, &first)) return;
    const int32_t code = read(source, bytes, &whole);
    if (code < 0 || !seek(source, position, &second)) return;
    must(first == second, "seeks to one position reach the same position");
    int32_t again = 0;
    for (int32_t left = bytes; left > 0 && again == 0;) {
        const int32_t request = in->ConsumeIntegralInRange(std::max(left / 8, 1), left);
        again = read(source, request, &parts);
        left -= request;
    }
    must(again == code && whole == parts, "the same bytes are read again");
}

void operate(stream *source, fuzz::input *in) {
    constexpr int32_t kOddWants[] = {-1,          0,         1,        3, kQueueBytes / 8,
                                     kQueueBytes, INT32_MAX, INT32_MIN};
    std::vector<uint8_t> ignored;
    const int operation = in->ConsumeIntegralInRange(0, 4);
    if (operation == 0) read(source, in->PickValueInArray(kOddWants), &ignored);
    if (operation == 1) read(source, in->ConsumeIntegralInRange(1, 8192), &ignored);
    if (operation == 2) must(mtsrc_reset(source->src) == -5, "a reset succeeds");
    if (operation == 2) source->at = kUnknownOffset;
    if (operation > 2) read_twice(source, in);
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    // The last bytes are used twice: as choices, and as part of the file.
    constexpr size_t kChoices = 64;
    fuzz::input in(data + size - std::min(size, kChoices), std::min(size, kChoices));
    const std::string path = fuzz::write_file({data, data + size});
    const mtsrc_param param = {path.c_str()};
    int32_t err = INT32_MIN;
    stream source;
    source.src = mtsrc_init(&param, &err);
    const bool is_code = err == -2 || err == -3 || err == -6 || err == -7 || err == -255;
    must(source.src == nullptr ? is_code : err == 0, "an open fails with one of its codes");
    if (source.src == nullptr) return 0;
    must(mtsrc_getstream_format(source.src, &source.format) == 0, "an open source has a format");
    must(source.format.bits == 16 && source.format.channels > 0, "a format is complete");
    must(source.format.sample_rate > 0 && source.format.sample_rate <= 192'000, "a rate is usable");
    must(source.format.duration >= 0, "a duration is not negative");
    source.total = bytes_at(source, source.format.duration);
    for (int i = in.ConsumeIntegralInRange(1, 5); i > 0; --i) operate(&source, &in);
    must(mtsrc_deinit(source.src) == -5, "a release succeeds");
    return 0;
}
