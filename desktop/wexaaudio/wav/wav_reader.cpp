// Reads RIFF WAVE files with 16-bit PCM. Accepts any chunk order, wrong sizes and files over 4 GiB.
//
// Input: mtsrc_io. Output: complete sample frames of interleaved PCM, and the information record.
#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/io_file.h"
#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kRiffHead = 12;         // bytes: "RIFF", size, "WAVE"
constexpr int32_t kChunkHead = 8;         // bytes: name, size
constexpr int32_t kFormatBytes = 16;      // smallest size of a "fmt " chunk
constexpr int32_t kExtensibleBytes = 40;  // smallest size of an extensible one
constexpr uint32_t kUnknownSize = 0xFFFFFFFF;
constexpr int32_t kMaxChunks = 65536;  // real files have far fewer
constexpr int32_t kTagPcm = 1;
constexpr int32_t kTagExtensible = 0xFFFE;
constexpr int32_t kTagCollision = 0x10000;  // distinguishes a file's own tag 300 from kWexaPcm
constexpr int32_t kSampleBytes = 2;

// In an extensible header, the bytes that follow the format tag in the sub-format.
constexpr uint8_t kSubFormatTail[14] = {0, 0, 0, 0, 0x10, 0, 0x80, 0, 0, 0xAA, 0, 0x38, 0x9B, 0x71};

struct wav_reader {
    io_file file;
    bool has_format;
    bool has_data;
    int32_t tag;
    int32_t channels;
    int32_t rate;  // Hz; negative if the file states 2^31 or more
    int32_t bits;
    int64_t data;        // offset of the first sample frame
    int64_t data_bytes;  // bytes of audio in the file
    int32_t block;       // bytes of a sample frame
    int64_t total;       // sample frames
    int64_t next;        // sample frame to read next
};

uint32_t le16(const uint8_t *p) {
    return static_cast<uint32_t>(p[0] | p[1] << 8);
}

uint32_t le32(const uint8_t *p) {
    return le16(p) | le16(p + 2) << 16;
}

void read_format(wav_reader *r, const uint8_t *p, int64_t bytes) {
    r->has_format = true;
    r->tag = static_cast<int32_t>(le16(p));
    r->channels = static_cast<int32_t>(le16(p + 2));
    r->rate = static_cast<int32_t>(le32(p + 4));
    r->bits = static_cast<int32_t>(le16(p + 14));
    if (r->tag == kTagExtensible && bytes >= kExtensibleBytes &&
        memcmp(p + 26, kSubFormatTail, sizeof kSubFormatTail) == 0) {
        r->tag = static_cast<int32_t>(le16(p + 24));
    }
}

// Locates the data. A writer that was interrupted leaves a size of 0 or all ones, and a
// truncated file has less data than its header states. In both cases the data is the rest of the
// file.
void read_data(wav_reader *r, int64_t offset, uint32_t size) {
    const int64_t rest = r->file.size - offset;
    r->has_data = true;
    r->data = offset;
    r->data_bytes = rest;
    if (size != 0 && size != kUnknownSize) r->data_bytes = std::min<int64_t>(rest, size);
}

// Walks the chunks until both the format and the data are known. Returns false on a read error or
// if the file is not RIFF WAVE.
bool read_chunks(wav_reader *r) {
    io_file *f = &r->file;
    int32_t got = 0;
    const uint8_t *p = io_file_peek(f, 0, kRiffHead, &got);
    if (p == nullptr || got < kRiffHead || memcmp(p + 8, "WAVE", 4) != 0 ||
        memcmp(p, "RIFF", 4) != 0) {
        return false;
    }
    int64_t at = kRiffHead;
    for (int32_t i = 0; i < kMaxChunks && !(r->has_format && r->has_data); ++i) {
        p = io_file_peek(f, at, kChunkHead + kExtensibleBytes, &got);
        if (p == nullptr || got < kChunkHead) return !f->failed;
        const uint32_t size = le32(p + 4);
        const int64_t body = std::min<int64_t>(got - kChunkHead, size);
        if (memcmp(p, "fmt ", 4) == 0 && body >= kFormatBytes && !r->has_format) {
            read_format(r, p + kChunkHead, body);
        } else if (memcmp(p, "data", 4) == 0 && !r->has_data) {
            read_data(r, at + kChunkHead, size);
            at = r->data + r->data_bytes + (r->data_bytes & 1);
            continue;
        }
        at += kChunkHead + static_cast<int64_t>(size) + (size & 1);
    }
    return true;
}

// Fills in the record even if the file is refused, so that the source can see why. Returns false
// and leaves the record empty if the header is too damaged.
bool fill_info(xwav_info *info, const wav_reader *r) {
    if (!r->has_format || r->channels == 0 || r->rate <= 0) return false;
    info->codec = r->tag == kTagPcm    ? kWexaPcm
                  : r->tag == kWexaPcm ? r->tag | kTagCollision
                                       : r->tag;
    info->sample_rate = r->rate;
    info->bits = r->bits;
    info->channels = r->channels;
    return true;
}

}  // namespace

void *xwavd_create(const mtsrc_io *io, xwav_info *info, int32_t * /*word*/) {
    auto *r = static_cast<wav_reader *>(calloc(1, sizeof(wav_reader)));
    if (r == nullptr) return nullptr;
    if (!io_file_open(&r->file, io) || !read_chunks(r) || !fill_info(info, r) || !r->has_data ||
        info->codec != kWexaPcm || info->bits != kSampleBytes * CHAR_BIT) {
        xwavd_delete(r);
        return nullptr;
    }
    r->block = r->channels * kSampleBytes;
    r->total = std::min(r->data_bytes / r->block, kMaxSamples);
    info->duration = units_of_duration(r->total, r->rate);
    return r;
}

int32_t xwavd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                      int64_t *second) {
    auto *r = static_cast<wav_reader *>(reader);
    if (size < r->block) return -1;
    const int64_t frames = std::min<int64_t>(size / r->block, r->total - r->next);
    if (frames <= 0) return kWexaEndOfStream;
    const int64_t got =
        io_file_read(&r->file, r->data + r->next * r->block, buf, frames * r->block);
    if (got < r->block) return got < 0 ? -1 : kWexaEndOfStream;
    const int64_t whole = got / r->block;
    *first = units_from_samples(r->next, r->rate);
    *second = units_from_samples(whole, r->rate);
    r->next += whole;
    *bytes = static_cast<int32_t>(whole * r->block);
    return 0;
}

int32_t xwavd_seek(void *reader, const int64_t *seconds, int64_t *reached, int32_t /*flags*/) {
    auto *r = static_cast<wav_reader *>(reader);
    const int64_t wanted = std::max<int64_t>(*seconds, 0);
    r->next = wanted > r->total / r->rate ? r->total : std::min(wanted * r->rate, r->total);
    *reached = units_from_samples(r->next, r->rate);
    return 0;
}

void xwavd_delete(void *reader) {
    io_file_close(&static_cast<wav_reader *>(reader)->file);
    free(reader);
}
