#include "desktop/wexaaudio/ogg/vorbis_setup.h"

#include <cstdlib>
#include <cstring>

namespace {

constexpr int32_t kNameBytes = 7;           // packet type and "vorbis"
constexpr int64_t kMaxCodebooks = 1 << 20;  // bytes; usual ones have 3 to 10 thousand
constexpr int32_t kChannelsAt = 11;         // in the identification packet
constexpr int32_t kRateAt = 12;             // 32-bit, little endian
constexpr uint8_t kNoComments[] = {3, 'v', 'o', 'r', 'b', 'i', 's', 0, 0, 0, 0, 0, 0, 0, 0, 1};

}  // namespace

bool vorbis_is_header(const uint8_t *packet, int64_t bytes, int32_t number) {
    return bytes >= kNameBytes && packet[0] == 2 * number + 1 &&
           memcmp(packet + 1, "vorbis", kNameBytes - 1) == 0;
}

bool vorbis_setup_pack(vorbis_setup *setup, const uint8_t *id, int64_t id_bytes,
                       const uint8_t *codebooks, int64_t codebooks_bytes) {
    *setup = {};
    if (id_bytes != kVorbisIdBytes || !vorbis_is_header(id, id_bytes, 0) ||
        !vorbis_is_header(codebooks, codebooks_bytes, 2) || codebooks_bytes > kMaxCodebooks) {
        return false;
    }
    uint32_t rate = 0;
    for (int32_t i = 3; i >= 0; --i) {
        rate = rate << 8 | id[kRateAt + i];
    }
    setup->channels = id[kChannelsAt];
    if (rate == 0 || rate > INT32_MAX || setup->channels == 0) {
        return false;
    }
    setup->sample_rate = static_cast<int32_t>(rate);
    // Xiph's packing: the count less one, the lengths of all but the last (each below 255), the
    // packets.
    const size_t head = 3;
    const size_t total =
        head + kVorbisIdBytes + sizeof kNoComments + static_cast<size_t>(codebooks_bytes);
    setup->data = static_cast<uint8_t *>(malloc(total));
    if (setup->data == nullptr) {
        return false;
    }
    setup->bytes = static_cast<int32_t>(total);
    uint8_t *p = setup->data;
    p[0] = kVorbisSetupMark;
    p[1] = kVorbisIdBytes;
    p[2] = sizeof kNoComments;
    memcpy(p + head, id, kVorbisIdBytes);
    memcpy(p + head + kVorbisIdBytes, kNoComments, sizeof kNoComments);
    memcpy(p + head + kVorbisIdBytes + sizeof kNoComments, codebooks,
           static_cast<size_t>(codebooks_bytes));
    return true;
}

void vorbis_setup_free(vorbis_setup *setup) {
    free(setup->data);
    *setup = {};
}
