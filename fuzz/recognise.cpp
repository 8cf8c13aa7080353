// Recognition of a file's format.
//
// Input: a byte that says which call of the file fails or, with FUZZ_FAR, how many zeros stand in
// the middle, so that the scan's limits, 32 KiB away, come into a short input's reach; then the
// file. FUZZ_FAR is a program of its own since walking through the zeros takes a hundred times
// longer.
#include "fuzz/fuzz.h"
#include "fuzz/memory_io.h"
#include "media_source/mtsrc.h"

namespace {

#ifdef FUZZ_FAR
constexpr bool kFar = true;
#else
constexpr bool kFar = false;
#endif
constexpr uint8_t kPlain = 0xF0;  // below: no call fails, as nearly always
constexpr int64_t kScanLimit = 32'764;
constexpr int64_t kStart = 3;  // the probes begin where the file stands, which need not be 0

// Callbacks that one recognition may take: a scan restarts at each tag, which has 10 bytes.
int64_t most_calls(size_t bytes) {
    return 64 + static_cast<int64_t>(bytes);
}

bool is_type(int32_t type) {
    switch (type) {
        case kMtsrcTypeMp4:
        case kMtsrcTypeAsf:
        case kMtsrcTypeOgg:
        case kMtsrcTypeWav:
        case kMtsrcTypeAac:
        case kMtsrcTypeMpegLayer1:
        case kMtsrcTypeMpegLayer2:
        case kMtsrcTypeMpegLayer3:
        case kMtsrcTypeFlac:
        case kMtsrcTypeUnknown:
            return true;
        default:
            return false;
    }
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    fuzz::input in = {data, size};
    const uint8_t control = in.take<uint8_t>();
    fuzz::memory_file *of = fuzz::set_memory_file(in.at, in.left);
    const mtsrc_io io = fuzz::memory_io();
    mtsrc_file *file = io.open(&io, 0);
    const int64_t start = in.left > 64 && (control & 1) != 0 ? kStart : 0;
    io.seek(file, &start);
    if (kFar) {
        of->gap_at = of->bytes / 2;
        of->gap = kScanLimit - 2 * control;
    } else if (control >= kPlain) {
        of->fail_at = of->calls + control - kPlain + 1;
    }
    int32_t type = 0;
    const int32_t code = mtsrc_get_file_type(&io, file, &type);
    fuzz::must(of->calls < most_calls(in.left), "recognition ends");
    if (of->fail_at == 0) {
        const bool enough = of->bytes + of->gap - start >= 16;
        fuzz::must(code == (enough ? 0 : -6), "16 bytes are recognised, fewer are not read");
        int64_t at = -1;
        fuzz::must(io.tell(file, &at) == 0, "the offset can be asked for");
        fuzz::must(at == start || !enough, "the offset is where it was");
    }
    fuzz::must(code == 0 ? is_type(type) : code == -6, "the answer is a type or a read failure");
    io.close(file);
    return 0;
}
