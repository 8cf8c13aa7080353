// Any file as a media source: a stream is as long as it states, and reads of any size from any
// position return the same bytes.
#include "common/tavo_ctx.h"
#include "fuzz/fuzz.h"
#include "media_source/mtsrc_ctx.h"

namespace {

using fuzz::must;

constexpr int32_t kBuffer = 2 * kQueueBytes;
constexpr int32_t kNeverWritten = INT32_MIN;
constexpr int64_t kUnknownOffset = -1;  // after a failure

struct stream {
    mtsrc_ctx *src = nullptr;
    mtsrc_format format = {};
    int64_t total = 0;  // bytes of the whole
    int64_t at = 0;     // of them, before the next
};

int64_t bytes_at(const stream &of, int64_t units) {
    const int64_t rate = of.format.sample_rate;
    return 2 * (units / kUnitsPerSecond * rate + units % kUnitsPerSecond * rate / kUnitsPerSecond);
}

// Reads want bytes and appends what was delivered to out.
int32_t read(stream *of, int32_t want, std::vector<uint8_t> *out) {
    std::vector<uint8_t> buffer(static_cast<size_t>(std::clamp(want, 1, kBuffer)));
    mtsrc_frame frame = {buffer.data(), kNeverWritten};
    const int32_t code = mtsrc_getstream(of->src, want, &frame);
    if (code != 0 && code != 1) {
        must(code == -6 || (code == -4 && (want < 0 || want > kQueueBytes / 8)),
             "a read fails with one of its codes");
        must(frame.size == kNeverWritten, "a failed read delivers nothing");
        of->at = kUnknownOffset;
        return code;
    }
    must(code == 0 ? frame.size == want : frame.size >= 0 && frame.size < want,
         "a read at the end is short");
    out->insert(out->end(), buffer.begin(), buffer.begin() + frame.size);
    if (of->at == kUnknownOffset) return code;
    of->at += frame.size;
    must(of->at <= of->total && (code == 0 || of->at == of->total),
         "a stream is as long as its duration");
    return code;
}

bool seek(stream *of, int64_t position, int64_t *reached) {
    const int32_t code = mtsrc_seekstream(of->src, position, reached);
    must(code == 0 || code == -4, "a seek succeeds or fails");
    of->at = kUnknownOffset;
    if (code != 0) return false;
    must(*reached >= 0 && *reached <= of->format.duration,
         "a seek reaches a position in the stream");
    of->at = bytes_at(*of, *reached);
    return true;
}

// Reads from one position twice: at once, and in pieces.
void read_twice(stream *of, fuzz::input *in) {
    const int64_t end = of->format.duration;
    const int64_t places[] = {INT64_MIN, -1, 0, 1, end - 1, end, end + 1, INT64_MAX};
    const int64_t position = in->ConsumeBool() ? in->PickValueInArray(places)
                                               : end / 255 * in->ConsumeIntegral<uint8_t>();
    const int32_t bytes = in->ConsumeIntegralInRange(1, 16'384);
    int64_t first = 0, second = 0;
    std::vector<uint8_t> whole, pieces;
    if (!seek(of, position, &first)) return;
    const int32_t code = read(of, bytes, &whole);
    if (code < 0 || !seek(of, position, &second)) return;
    must(first == second, "seeks to one position reach the same position");
    int32_t again = 0;
    for (int32_t left = bytes; left > 0 && again == 0;) {
        const int32_t piece = in->ConsumeIntegralInRange(std::max(left / 8, 1), left);
        again = read(of, piece, &pieces);
        left -= piece;
    }
    must(again == code && whole == pieces, "the same bytes come again");
}

void operate(stream *of, fuzz::input *in) {
    constexpr int32_t kOddWants[] = {-1,          0,         1,        3, kQueueBytes / 8,
                                     kQueueBytes, INT32_MAX, INT32_MIN};
    std::vector<uint8_t> ignored;
    const int operation = in->ConsumeIntegralInRange(0, 4);
    if (operation == 0) read(of, in->PickValueInArray(kOddWants), &ignored);
    if (operation == 1) read(of, in->ConsumeIntegralInRange(1, 8192), &ignored);
    if (operation == 2) must(mtsrc_reset(of->src) == -5, "a reset is done");
    if (operation == 2) of->at = kUnknownOffset;
    if (operation > 2) read_twice(of, in);
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    // Bytes at the end are read twice: as choices, and as part of the file.
    constexpr size_t kChoices = 64;
    fuzz::input in(data + size - std::min(size, kChoices), std::min(size, kChoices));
    const std::string path = fuzz::file_of({data, data + size});
    const mtsrc_param param = {path.c_str()};
    int32_t err = INT32_MIN;
    stream of;
    of.src = mtsrc_init(&param, &err);
    const bool is_code = err == -2 || err == -3 || err == -6 || err == -7 || err == -255;
    must(of.src == nullptr ? is_code : err == 0, "an open fails with one of its codes");
    if (of.src == nullptr) return 0;
    must(mtsrc_getstream_format(of.src, &of.format) == 0, "an open source has a format");
    must(of.format.bits == 16 && of.format.channels > 0, "a format is whole");
    must(of.format.sample_rate > 0 && of.format.sample_rate <= 192'000, "a rate is usable");
    must(of.format.duration >= 0, "a duration is none or some");
    of.total = bytes_at(of, of.format.duration);
    for (int i = in.ConsumeIntegralInRange(1, 5); i > 0; --i) operate(&of, &in);
    must(mtsrc_deinit(of.src) == -5, "a release is done");
    return 0;
}
