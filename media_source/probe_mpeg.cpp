// Recognises MPEG audio by two frame headers within the first 32 KiB. The distance between them
// must be exactly one frame length.
#include <cstdlib>
#include <cstring>

#include "media_source/id3v2.h"
#include "media_source/mtsrc.h"

namespace {

constexpr int32_t kScanBytes = 32'768;
constexpr int32_t kNextHeaderEnd = 32'764;  // the second header must start before this index
constexpr int32_t kHeaderBytes = 4;
constexpr int32_t kMinFrameBytes = 5;
constexpr int64_t kTransportPacketBytes = 188;
constexpr uint8_t kTransportSync = 0x47;

// Values of the header fields as the file stores them.
constexpr int32_t kVersion25 = 0;
constexpr int32_t kVersionReserved = 1;
constexpr int32_t kVersion1 = 3;
constexpr int32_t kLayerReserved = 0;
constexpr int32_t kLayer3 = 1;
constexpr int32_t kLayer2 = 2;
constexpr int32_t kLayer1 = 3;
constexpr int32_t kTypeLessLayerBits = 306;  // minus the layer bits, this gives the type code

struct frame_header {
    int32_t version;
    int32_t layer;
    int32_t bitrate;  // index; 0 is free format
    int32_t rate;     // index
    bool padded;
};

// Parses the first three bytes of a header. Returns false if they cannot start a header.
bool parse(const uint8_t *bytes, frame_header *header) {
    *header = {(bytes[1] >> 3) & 3, (bytes[1] >> 1) & 3, bytes[2] >> 4, (bytes[2] >> 2) & 3,
               (bytes[2] & 2) != 0};
    return bytes[0] == 0xFF && (bytes[1] & 0xE0) == 0xE0 && header->version != kVersionReserved &&
           header->layer != kLayerReserved && header->bitrate != 15 && header->rate != 3;
}

int32_t kilobits(const frame_header &header) {
    // [MPEG-1 Layer III, II, I; MPEG-2 Layer III, II, I][bitrate index]
    static constexpr int16_t kRates[6][15] = {
        {0, 32, 40, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320},
        {0, 32, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320, 384},
        {0, 32, 64, 96, 128, 160, 192, 224, 256, 288, 320, 352, 384, 416, 448},
        {0, 8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160},
        {0, 8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160},
        {0, 32, 48, 56, 64, 80, 96, 112, 128, 144, 160, 176, 192, 224, 256}};
    const int32_t row = header.layer - kLayer3 + (header.version == kVersion1 ? 0 : 3);
    return kRates[row][header.bitrate];
}

int32_t hertz(const frame_header &header) {
    // [version bits][rate index]; the row of the reserved version is not used
    static constexpr int32_t kRates[4][3] = {
        {11025, 12000, 8000}, {0, 0, 0}, {22050, 24000, 16000}, {44100, 48000, 32000}};
    return kRates[header.version][header.rate];
}

// Returns the length of a frame in bytes, without padding. Returns 0 for Layers I and II of version
// 2.5, which has only Layer III.
int32_t frame_length(const frame_header &header) {
    const int32_t bits = 1000 * kilobits(header);
    switch (header.layer) {
        case kLayer1:
            return header.version == kVersion25 ? 0 : 4 * (12 * bits / hertz(header));
        case kLayer2:
            return header.version == kVersion25 ? 0 : 144 * bits / hertz(header);
        default:
            return (header.version == kVersion1 ? 144 : 72) * bits / hertz(header);
    }
}

struct scan {
    const mtsrc_io *io;
    mtsrc_file *file;
    uint8_t *buf;  // [kScanBytes]
    int32_t got;   // bytes in buf
};

bool refill(scan *s) {
    const int64_t got = s->io->read(s->file, s->buf, kScanBytes);
    s->got = got < 1 || got > kScanBytes ? 0 : static_cast<int32_t>(got);
    return s->got > 0;
}

// Skips the tag that starts at buf[at] and refills the buffer with the bytes after it.
bool skip_tag(scan *s, int32_t at) {
    int64_t start = 0;
    if (s->io->tell(s->file, &start) != 0) return false;
    start += at - s->got;
    if (s->io->seek(s->file, &start) != 0) return false;
    uint8_t header[kId3HeaderBytes];
    if (at + kId3HeaderBytes <= s->got) {
        memcpy(header, s->buf + at, sizeof header);
    } else if (s->io->read(s->file, header, kId3HeaderBytes) != kId3HeaderBytes ||
               s->io->seek(s->file, &start) != 0) {
        return false;
    }
    int64_t length = id3v2_length(header);
    return s->io->skip(s->file, &length) == 0 && refill(s);
}

// Tests the candidate header at buf[at]. Returns a type code that ends the scan, or 0 to continue.
int32_t try_candidate(const scan &s, int32_t at) {
    frame_header header;
    if (!parse(s.buf + at, &header)) return 0;
    const int32_t length = frame_length(header);
    if (length < kMinFrameBytes) return 0;
    const int32_t padding = !header.padded ? 0 : header.layer == kLayer1 ? 4 : 1;
    const int32_t next = at + length + padding;
    if (next >= kNextHeaderEnd) return kMtsrcTypeUnknown;
    if (next + kHeaderBytes > s.got || !parse(s.buf + next, &header)) return 0;
    return kTypeLessLayerBits - header.layer;
}

int32_t run_scan(scan *s) {
    if (!refill(s)) return kMtsrcTypeUnknown;
    uint32_t window = 0;  // the last four bytes, up to index k
    for (int32_t k = 0; k < s->got; ++k) {
        window = window << 8 | s->buf[k];
        if (window >= 0x49443302 && window <= 0x49443304) {  // "ID3", version 2 to 4
            if (!skip_tag(s, k - 3)) return kMtsrcTypeUnknown;
            window = 0;
            k = -1;
            continue;
        }
        // The candidate header starts three bytes before k.
        const int32_t answer = k < 3 ? 0 : try_candidate(*s, k - 3);
        if (answer != 0) return answer;
    }
    return kMtsrcTypeUnknown;
}

bool has_transport_sync(const mtsrc_io *io, mtsrc_file *file) {
    uint8_t byte = 0;
    int64_t offset = kTransportPacketBytes;
    return io->seek(file, &offset) == 0 && io->read(file, &byte, 1) == 1 && byte == kTransportSync;
}

// True if the file is an MPEG transport or program stream. May move the file offset.
bool is_other_container(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file,
                        const int64_t *start) {
    constexpr uint8_t kPackHeader[4] = {0, 0, 1, 0xBA};
    if (head[0] == kTransportSync && (has_transport_sync(io, file) || io->seek(file, start) != 0)) {
        return true;
    }
    return memcmp(head, kPackHeader, sizeof kPackHeader) == 0;
}

}  // namespace

int32_t mtsrc_probe_mpeg(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file) {
    int64_t start = 0;
    if (io->tell(file, &start) != 0 || memcmp(head, "OggS", 4) == 0) return kMtsrcTypeUnknown;
    int32_t answer = kMtsrcTypeUnknown;
    if (!is_other_container(head, io, file, &start)) {
        scan s = {io, file, static_cast<uint8_t *>(malloc(kScanBytes)), 0};
        if (s.buf != nullptr) answer = run_scan(&s);
        free(s.buf);
    }
    io->seek(file, &start);
    return answer;
}
