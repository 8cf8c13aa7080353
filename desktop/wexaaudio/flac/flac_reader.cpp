// Reads FLAC files with libFLAC. Positions come from the frames' sample numbers, so a missing or
// undecodable frame becomes silence of the same length.
//
// Input: mtsrc_io. Output: the information record and 16-bit stereo PCM, which is front left and
// right or a single channel twice. Precedes copy_decoder.cpp.
#include <FLAC/stream_decoder.h>

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/scan_cache.h"
#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kPair = 2 * sizeof(int16_t);  // bytes
constexpr int64_t kTail = 65'536;  // bytes at the file's end, searched first for the last block

// Largest plausible number of sample frames per byte of the file. Digital silence reaches 290 in
// the encoder's default blocks of 4096, and 1200 in the largest blocks of a streamable file.
constexpr int64_t kMaxSamplesPerByte = 2048;

// A libFLAC decoder and the block that it decoded last.
struct flac_stream {
    io_file *file;
    FLAC__StreamDecoder *decoder;  // owned
    int64_t at;                    // offset of the next byte that the decoder reads
    int32_t max_block;             // sample frames
    int64_t base;                  // number of the stream's first sample
    int16_t *pcm;                  // [max_block][2] owned; the last decoded block
    int64_t block;                 // first sample of the block
    int32_t count;                 // sample frames of the block, or 0
    bool damaged;                  // the current frame has a wrong checksum
};

struct flac_reader {
    uint8_t reserved[kFlacReaderFlag];
    uint8_t flag;  // the source sets it before every read; it has no effect
    io_file file;
    flac_stream stream;
    const stream_info *info;  // shared by the readers of the file
    int64_t next;             // next sample to deliver
    bool moved;               // a seek was requested, but the decoder has not moved yet
};
static_assert(offsetof(flac_reader, flag) == kFlacReaderFlag);

flac_stream *stream_of(void *client) {
    return static_cast<flac_stream *>(client);
}

FLAC__StreamDecoderReadStatus read_bytes(const FLAC__StreamDecoder * /*decoder*/, FLAC__byte buf[],
                                         size_t *bytes, void *client) {
    flac_stream *s = stream_of(client);
    const int64_t got = io_file_read(s->file, s->at, buf, static_cast<int64_t>(*bytes));
    *bytes = static_cast<size_t>(std::max<int64_t>(got, 0));
    if (got < 0) return FLAC__STREAM_DECODER_READ_STATUS_ABORT;
    s->at += got;
    return got == 0 ? FLAC__STREAM_DECODER_READ_STATUS_END_OF_STREAM
                    : FLAC__STREAM_DECODER_READ_STATUS_CONTINUE;
}

// Converts a block to 16-bit pairs.
void store_pairs(const FLAC__int32 *left, const FLAC__int32 *right, int32_t bits, int32_t count,
                 int16_t *pcm) {
    const auto store = [&](auto convert) {
        for (ptrdiff_t i = 0; i < count; ++i) {
            pcm[2 * i] = static_cast<int16_t>(convert(left[i]));
            pcm[2 * i + 1] = static_cast<int16_t>(convert(right[i]));
        }
    };
    const int32_t up = 16 - bits;
    if (up >= 0) return store([=](FLAC__int32 x) { return static_cast<uint32_t>(x) << up; });
    const int32_t half = 1 << (bits - 17);  // rounds to nearest, ties up; clips at the top
    store([&](FLAC__int32 x) {
        return std::min((x >> (bits - 16)) + ((x & half) != 0 ? 1 : 0), 32767);
    });
}

// Stores a decoded frame as the current block. Ignores a frame with a wrong checksum, because even
// its sample number may be wrong.
FLAC__StreamDecoderWriteStatus store_block(const FLAC__StreamDecoder * /*decoder*/,
                                           const FLAC__Frame *frame,
                                           const FLAC__int32 *const buffer[], void *client) {
    flac_stream *s = stream_of(client);
    const FLAC__FrameHeader &head = frame->header;
    const auto count = static_cast<int32_t>(head.blocksize);
    const bool usable = !s->damaged && count <= s->max_block;
    s->damaged = false;
    s->count = usable ? count : 0;
    if (!usable) return FLAC__STREAM_DECODER_WRITE_STATUS_CONTINUE;
    s->block = static_cast<int64_t>(head.number.sample_number) - s->base;
    store_pairs(buffer[0], buffer[head.channels > 1 ? 1 : 0],
                static_cast<int32_t>(head.bits_per_sample), count, s->pcm);
    return FLAC__STREAM_DECODER_WRITE_STATUS_CONTINUE;
}

bool open_stream(flac_stream *s, io_file *file) {
    const auto seek = [](const auto *, FLAC__uint64 offset, void *client) {
        stream_of(client)->at = static_cast<int64_t>(offset);
        return FLAC__STREAM_DECODER_SEEK_STATUS_OK;
    };
    const auto tell = [](const auto *, FLAC__uint64 *offset, void *client) {
        *offset = static_cast<FLAC__uint64>(stream_of(client)->at);
        return FLAC__STREAM_DECODER_TELL_STATUS_OK;
    };
    const auto length = [](const auto *, FLAC__uint64 *bytes, void *client) {
        *bytes = static_cast<FLAC__uint64>(stream_of(client)->file->size);
        return FLAC__STREAM_DECODER_LENGTH_STATUS_OK;
    };
    const auto at_end = [](const auto *, void *client) -> FLAC__bool {
        return stream_of(client)->at >= stream_of(client)->file->size ? 1 : 0;
    };
    const auto read_info = [](const auto *, const FLAC__StreamMetadata *metadata, void *client) {
        const uint32_t largest = metadata->data.stream_info.max_blocksize;
        stream_of(client)->max_block = static_cast<int32_t>(largest);
    };
    const auto note_error = [](const auto *, FLAC__StreamDecoderErrorStatus status, void *client) {
        flac_stream *stream = stream_of(client);
        if (status == FLAC__STREAM_DECODER_ERROR_STATUS_FRAME_CRC_MISMATCH) stream->damaged = true;
    };
    s->file = file;
    s->decoder = FLAC__stream_decoder_new();
    if (s->decoder == nullptr ||
        FLAC__stream_decoder_init_stream(s->decoder, read_bytes, seek, tell, length, at_end,
                                         store_block, read_info, note_error,
                                         s) != FLAC__STREAM_DECODER_INIT_STATUS_OK ||
        FLAC__stream_decoder_process_until_end_of_metadata(s->decoder) == 0 || s->max_block <= 0) {
        return false;
    }
    s->pcm = static_cast<int16_t *>(calloc(static_cast<size_t>(s->max_block), kPair));
    return s->pcm != nullptr;
}

void close_stream(flac_stream *s) {
    if (s->decoder != nullptr) FLAC__stream_decoder_delete(s->decoder);
    free(s->pcm);
}

// Decodes the next usable block. Returns false at the end of the stream and on failure.
bool decode_block(flac_stream *s) {
    s->count = 0;
    while (s->count == 0) {
        if (FLAC__stream_decoder_process_single(s->decoder) == 0) return false;
        const FLAC__StreamDecoderState state = FLAC__stream_decoder_get_state(s->decoder);
        if (s->count == 0 && state >= FLAC__STREAM_DECODER_END_OF_STREAM) return false;
    }
    return true;
}

// Seeks to a sample and decodes its block from that sample on. Returns false on failure.
bool find_sample(flac_stream *s, int64_t sample) {
    s->count = 0;
    s->damaged = false;
    const auto number = static_cast<FLAC__uint64>(s->base + sample);
    return FLAC__stream_decoder_flush(s->decoder) != 0 &&  // recovers from a failed seek
           FLAC__stream_decoder_seek_absolute(s->decoder, number) != 0 && s->count > 0;
}

// Returns the end, in samples, of the last block after a file offset, or 0 if there is none.
int64_t last_end(flac_stream *s, int64_t offset) {
    s->damaged = false;
    s->at = offset;
    int64_t end = 0;
    if (FLAC__stream_decoder_flush(s->decoder) == 0) return 0;
    while (decode_block(s)) {
        if (s->block >= 0 && s->block <= kMaxSamples - s->count) {
            end = std::max(end, s->block + s->count);
        }
    }
    return end;
}

// Searches the end of the file for the last block. The end of that block is the true end of the
// audio. Returns false if no plausible end is found.
bool find_end(flac_stream *s, int64_t *end) {
    const int64_t size = s->file->size;
    for (int64_t tail = kTail; *end == 0 && !s->file->failed; tail *= 4) {
        *end = last_end(s, std::max<int64_t>(size - tail, 0));
        if (tail >= size) break;
    }
    const auto stated = static_cast<int64_t>(FLAC__stream_decoder_get_total_samples(s->decoder));
    if (stated > 0) *end = std::min(*end, stated);  // 0 means unknown
    return !s->file->failed && *end > 0 && *end / kMaxSamplesPerByte <= size;
}

bool scan_file(io_file *file, stream_info *info) {
    flac_stream s = {};
    bool found = open_stream(&s, file) && decode_block(&s);
    if (found) {
        info->rate = static_cast<int32_t>(FLAC__stream_decoder_get_sample_rate(s.decoder));
        info->base = s.base = s.block;
        found = info->rate > 0 && find_end(&s, &info->end);
    }
    close_stream(&s);
    return found;
}

}  // namespace

void *xflacfd_create(const mtsrc_io *io, int64_t * /*word*/, xflac_info *info,
                     void * /*reserved*/) {
    auto *r = static_cast<flac_reader *>(calloc(1, sizeof(flac_reader)));
    if (r == nullptr) return nullptr;
    if (io_file_open(&r->file, io)) r->info = scan_cache_get(&r->file, scan_file);
    if (r->info == nullptr || !open_stream(&r->stream, &r->file)) {
        xflacfd_delete(r);
        return nullptr;
    }
    r->stream.base = r->info->base;
    info->sample_rate = r->info->rate;
    info->duration = units_of_duration(r->info->end, r->info->rate);
    return r;
}

int32_t xflacfd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second) {
    auto *r = static_cast<flac_reader *>(reader);
    if (size < kPair) return -1;
    flac_stream *s = &r->stream;
    if (r->next >= r->info->end) return kWexaEndOfStream;
    if (r->moved && !find_sample(s, r->next)) {
        // If the seek fails, the stream is decoded from its start up to the position.
        r->file.failed = false;
        s->count = 0;
        if (FLAC__stream_decoder_reset(s->decoder) == 0) return -1;
        if (FLAC__stream_decoder_process_until_end_of_metadata(s->decoder) == 0) return -1;
    }
    r->moved = false;
    bool more = true;
    while (more && (s->count == 0 || s->block + s->count <= r->next)) more = decode_block(s);
    if (r->file.failed) return -1;
    const int64_t inside = r->next - s->block;  // negative in silence before the block
    const int64_t left = std::min<int64_t>(r->info->end - r->next, size / kPair);
    const int64_t samples = std::min(left, !more ? left : inside < 0 ? -inside : s->count - inside);
    *bytes = static_cast<int32_t>(samples) * kPair;
    if (more && inside >= 0) {
        memcpy(buf, s->pcm + 2 * inside, static_cast<size_t>(*bytes));
    } else {
        memset(buf, 0, static_cast<size_t>(*bytes));
    }
    *first = units_from_samples(r->next, r->info->rate);
    *second = units_from_samples(samples, r->info->rate);
    r->next += samples;
    return 0;
}

int32_t xflacfd_seek(void *reader, const int64_t *position, int64_t *reached) {
    auto *r = static_cast<flac_reader *>(reader);
    r->next = seek_target(*position, r->info->end, r->info->rate);
    *reached = units_from_samples(r->next, r->info->rate);
    r->moved = true;
    return 0;
}

void xflacfd_delete(void *reader) {
    auto *r = static_cast<flac_reader *>(reader);
    close_stream(&r->stream);
    scan_cache_put(r->info);
    io_file_close(&r->file);
    free(r);
}
