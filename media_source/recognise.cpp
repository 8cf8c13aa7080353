#include <cstring>

#include "common/limits.h"
#include "include/tavo.h"
#include "media_source/id3v2.h"
#include "media_source/mtsrc.h"

namespace {

using probe = int32_t (*)(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);

// The probes in calling order: the quick tests of the head come first, the scan of a large block
// last.
constexpr probe kProbes[] = {mtsrc_probe_asf, mtsrc_probe_mp4, mtsrc_probe_flac, mtsrc_probe_ogg,
                             mtsrc_probe_wav, mtsrc_probe_aac, mtsrc_probe_mpeg};

bool is_at(const uint8_t *head, size_t at, const char *name) {
    return memcmp(head + at, name, 4) == 0;
}

// Reads `count` bytes at the current offset, or after the ID3v2 tag that starts there. Restores the
// offset.
bool peek_after_tag(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file, uint8_t *bytes,
                    int32_t count) {
    int64_t start = 0;
    if (io->tell(file, &start) != 0) return false;
    bool found = true;
    if (memcmp(head, "ID3", 3) == 0) {
        int64_t length = id3v2_length(head);
        found = io->skip(file, &length) == 0;
    }
    found = found && io->read(file, bytes, count) == count;
    io->seek(file, &start);
    return found;
}

}  // namespace

int32_t mtsrc_get_file_type(const mtsrc_io *io, mtsrc_file *file, int32_t *type) {
    int64_t start = 0;
    uint8_t head[kHeadBytes] = {};
    if (io->tell(file, &start) != 0 || io->read(file, head, kHeadBytes) != kHeadBytes ||
        io->seek(file, &start) != 0) {
        return TAVO_ERR_READ;
    }
    int32_t answer = kMtsrcTypeUnknown;
    for (const probe recognise : kProbes) {
        answer = recognise(head, io, file);
        if (answer != kMtsrcTypeUnknown) break;
    }
    *type = answer;
    return TAVO_OK;
}

int32_t mtsrc_probe_asf(const uint8_t *head, const mtsrc_io * /*io*/, mtsrc_file * /*file*/) {
    constexpr uint8_t kHeaderObject[kHeadBytes] = {0x30, 0x26, 0xB2, 0x75, 0x8E, 0x66, 0xCF, 0x11,
                                                   0xA6, 0xD9, 0x00, 0xAA, 0x00, 0x62, 0xCE, 0x6C};
    return memcmp(head, kHeaderObject, kHeadBytes) == 0 ? kMtsrcTypeAsf : kMtsrcTypeUnknown;
}

int32_t mtsrc_probe_mp4(const uint8_t *head, const mtsrc_io * /*io*/, mtsrc_file * /*file*/) {
    const bool is_mp4 = is_at(head, 4, "ftyp") || is_at(head, 4, "mdat") || is_at(head, 4, "moov");
    return is_mp4 ? kMtsrcTypeMp4 : kMtsrcTypeUnknown;
}

int32_t mtsrc_probe_flac(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file) {
    uint8_t bytes[4];
    const bool is_flac =
        peek_after_tag(head, io, file, bytes, sizeof bytes) && is_at(bytes, 0, "fLaC");
    return is_flac ? kMtsrcTypeFlac : kMtsrcTypeUnknown;
}

int32_t mtsrc_probe_ogg(const uint8_t *head, const mtsrc_io * /*io*/, mtsrc_file * /*file*/) {
    constexpr uint8_t kMaxHeaderFlags = 6;
    constexpr uint8_t kFirstPosition[8] = {};
    const bool is_ogg = is_at(head, 0, "OggS") && head[4] == 0 && head[5] <= kMaxHeaderFlags &&
                        memcmp(head + 6, kFirstPosition, sizeof kFirstPosition) == 0;
    return is_ogg ? kMtsrcTypeOgg : kMtsrcTypeUnknown;
}

int32_t mtsrc_probe_wav(const uint8_t *head, const mtsrc_io * /*io*/, mtsrc_file * /*file*/) {
    const bool is_wav = is_at(head, 0, "RIFF") && is_at(head, 8, "WAVE") && is_at(head, 12, "fmt ");
    return is_wav ? kMtsrcTypeWav : kMtsrcTypeUnknown;
}

int32_t mtsrc_probe_aac(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file) {
    uint8_t bytes[7];
    if (!peek_after_tag(head, io, file, bytes, sizeof bytes)) return kMtsrcTypeUnknown;
    if (is_at(bytes, 0, "ADIF")) return kMtsrcTypeAac;
    // The ADTS sync word and layer 0, for both MPEG versions, with and without a checksum.
    switch (bytes[0] << 8 | bytes[1]) {
        case 0xFFF0:
        case 0xFFF1:
        case 0xFFF8:
        case 0xFFF9:
            return kMtsrcTypeAac;
        default:
            return kMtsrcTypeUnknown;
    }
}
