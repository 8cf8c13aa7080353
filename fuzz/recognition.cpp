// Fuzzes the recognition of a file's format. In some inputs, zeros are inserted in the middle to
// move the second half close to the scan's limit of 32 KiB.
#include "fuzz/fuzz.h"
#include "media_source/mtsrc.h"

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr int32_t kTypes[] = {kMtsrcTypeMp4,        kMtsrcTypeAsf,        kMtsrcTypeOgg,
                                  kMtsrcTypeWav,        kMtsrcTypeAac,        kMtsrcTypeMpegLayer1,
                                  kMtsrcTypeMpegLayer2, kMtsrcTypeMpegLayer3, kMtsrcTypeFlac,
                                  kMtsrcTypeUnknown};
    fuzz::input in(data, size);
    const bool far = in.ConsumeIntegralInRange(0, 31) == 31;  // rare: 100 times slower
    const auto gap = far ? in.ConsumeIntegralInRange<size_t>(32'000, 32'764) : 0;
    // Recognition starts at the current file offset.
    const int64_t start = in.ConsumeBool() ? 3 : 0;
    auto bytes = in.ConsumeRemainingBytes<uint8_t>();
    bytes.insert(bytes.begin() + static_cast<ptrdiff_t>(bytes.size() / 2), gap, 0);
    std::string path = fuzz::write_file(bytes);
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.path = path.data();
    mtsrc_file *file = io.open(&io, 0);
    io.seek(file, &start);
    int32_t type = 0;
    const int32_t code = mtsrc_get_file_type(&io, file, &type);
    const bool enough = static_cast<int64_t>(bytes.size()) - start >= 16;
    fuzz::must(code == (enough ? 0 : -6), "16 bytes are recognised, fewer are not read");
    const bool known = std::find(std::begin(kTypes), std::end(kTypes), type) != std::end(kTypes);
    fuzz::must(code != 0 || known, "the answer is a type");
    int64_t at = -1;
    fuzz::must(io.tell(file, &at) == 0 && (at == start || !enough), "the offset is where it was");
    io.close(file);
    return 0;
}
