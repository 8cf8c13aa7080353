// Recognition of a file's format. With zeros in the middle the scan's limits, 32 KiB away, come
// into a short input's reach.
#include "fuzz/memory_io.h"
#include "media_source/mtsrc.h"

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr int32_t kTypes[] = {kMtsrcTypeMp4,        kMtsrcTypeAsf,        kMtsrcTypeOgg,
                                  kMtsrcTypeWav,        kMtsrcTypeAac,        kMtsrcTypeMpegLayer1,
                                  kMtsrcTypeMpegLayer2, kMtsrcTypeMpegLayer3, kMtsrcTypeFlac,
                                  kMtsrcTypeUnknown};
    fuzz::input in(data, size);
    const bool far = in.ConsumeIntegralInRange(0, 31) == 31;  // a hundred times slower
    const auto gap = static_cast<ptrdiff_t>(far ? in.ConsumeIntegralInRange(32'000, 32'764) : 0);
    const int32_t failing = in.ConsumeIntegralInRange(0, 31);
    const int64_t start = in.ConsumeBool() ? 3 : 0;  // recognition begins where the file stands
    fuzz::file = {};
    fuzz::file.bytes = in.ConsumeRemainingBytes<uint8_t>();
    auto &bytes = fuzz::file.bytes;
    const size_t inputs = bytes.size();
    bytes.insert(bytes.begin() + static_cast<ptrdiff_t>(inputs / 2), static_cast<size_t>(gap), 0);

    const mtsrc_io io = fuzz::memory_io();
    mtsrc_file *file = io.open(&io, 0);
    io.seek(file, &start);
    if (failing > 24) fuzz::file.fail_at = fuzz::file.calls + failing - 24;
    int32_t type = 0;
    const int32_t code = mtsrc_get_file_type(&io, file, &type);
    // A scan restarts at each tag, which has 10 bytes.
    fuzz::must(fuzz::file.calls < 64 + static_cast<int64_t>(inputs), "recognition ends");
    if (fuzz::file.fail_at == 0) {
        const bool enough = static_cast<int64_t>(bytes.size()) - start >= 16;
        fuzz::must(code == (enough ? 0 : -6), "16 bytes are recognised, fewer are not read");
        int64_t at = -1;
        fuzz::must(io.tell(file, &at) == 0 && (at == start || !enough),
                   "the offset is where it was");
    }
    const bool known = std::find(std::begin(kTypes), std::end(kTypes), type) != std::end(kTypes);
    fuzz::must(code == 0 ? known : code == -6, "the answer is a type or a read failure");
    io.close(file);
    return 0;
}
