// FLAC files, decoded by libFLAC. Positions are the sample numbers of the frames, so that a frame
// that is missing or does not decode leaves silence of its length.
//
// In: mtsrc_io. Out: front left and right as 16-bit pairs, one channel twice; the information
// record.
#include <FLAC/stream_decoder.h>

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/io_file.h"
#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kPair = 2 * sizeof(int16_t);  // bytes
constexpr int64_t kTail = 65'536;               // bytes of the file's end looked at first

struct flac_reader {
    uint8_t reserved[kFlacReaderFlag];
    uint8_t flag;  // set by the source before every read; nothing depends on it
    io_file file;
    FLAC__StreamDecoder *decoder;  // owned
    int64_t at;                    // offset that the decoder reads next
    int32_t rate;                  // Hz
    int32_t max_block;             // sample frames
    int64_t stated;                // sample frames by the stream information, 0 unknown
    int64_t base;                  // number of the stream's first sample
    int64_t end;                   // sample frames
    int64_t next;                  // sample handed out next
    int16_t *pcm;                  // [max_block][2] owned; the block decoded last
    int64_t block;                 // its first sample
    int32_t count;                 // its sample frames; 0 without one
    bool damaged;                  // the frame being decoded has a wrong check sum
    bool moved;                    // a seek came, and the decoder is elsewhere
};
static_assert(offsetof(flac_reader, flag) == kFlacReaderFlag);

flac_reader *reader_of(void *client) {
    return static_cast<flac_reader *>(client);
}

FLAC__StreamDecoderReadStatus read_bytes(const FLAC__StreamDecoder * /*decoder*/, FLAC__byte buf[],
                                         size_t *bytes, void *client) {
    flac_reader *r = reader_of(client);
    const int64_t got = io_file_read(&r->file, r->at, buf, static_cast<int64_t>(*bytes));
    *bytes = static_cast<size_t>(std::max<int64_t>(got, 0));
    if (got < 0) return FLAC__STREAM_DECODER_READ_STATUS_ABORT;
    r->at += got;
    return got == 0 ? FLAC__STREAM_DECODER_READ_STATUS_END_OF_STREAM
                    : FLAC__STREAM_DECODER_READ_STATUS_CONTINUE;
}

FLAC__StreamDecoderSeekStatus move_to(const FLAC__StreamDecoder * /*decoder*/, FLAC__uint64 offset,
                                      void *client) {
    reader_of(client)->at = static_cast<int64_t>(offset);
    return FLAC__STREAM_DECODER_SEEK_STATUS_OK;
}

FLAC__StreamDecoderTellStatus tell(const FLAC__StreamDecoder * /*decoder*/, FLAC__uint64 *offset,
                                   void *client) {
    *offset = static_cast<FLAC__uint64>(reader_of(client)->at);
    return FLAC__STREAM_DECODER_TELL_STATUS_OK;
}

FLAC__StreamDecoderLengthStatus get_length(const FLAC__StreamDecoder * /*decoder*/,
                                           FLAC__uint64 *length, void *client) {
    *length = static_cast<FLAC__uint64>(reader_of(client)->file.size);
    return FLAC__STREAM_DECODER_LENGTH_STATUS_OK;
}

FLAC__bool is_at_end(const FLAC__StreamDecoder * /*decoder*/, void *client) {
    const flac_reader *r = reader_of(client);
    return r->at >= r->file.size ? 1 : 0;
}

void take_info(const FLAC__StreamDecoder * /*decoder*/, const FLAC__StreamMetadata *metadata,
               void *client) {
    flac_reader *r = reader_of(client);
    const FLAC__StreamMetadata_StreamInfo &info = metadata->data.stream_info;
    r->max_block = static_cast<int32_t>(info.max_blocksize);
    r->stated = static_cast<int64_t>(info.total_samples);
}

void take_error(const FLAC__StreamDecoder * /*decoder*/, FLAC__StreamDecoderErrorStatus status,
                void *client) {
    if (status == FLAC__STREAM_DECODER_ERROR_STATUS_FRAME_CRC_MISMATCH) {
        reader_of(client)->damaged = true;
    }
}

// One channel of a block as every second sample of pcm.
void take_channel(const FLAC__int32 *in, int32_t bits, int32_t count, int16_t *pcm) {
    if (bits <= 16) {
        for (ptrdiff_t i = 0; i < count; ++i) {
            pcm[2 * i] = static_cast<int16_t>(in[i] * (1 << (16 - bits)));
        }
        return;
    }
    const int32_t half = 1 << (bits - 17);  // rounded to nearest, up at half; the top is clipped
    for (ptrdiff_t i = 0; i < count; ++i) {
        const int32_t high = (in[i] >> (bits - 16)) + ((in[i] & half) != 0 ? 1 : 0);
        pcm[2 * i] = static_cast<int16_t>(std::min(high, 32767));
    }
}

// A frame with a wrong check sum is not taken: not even its number can be trusted.
FLAC__StreamDecoderWriteStatus take_block(const FLAC__StreamDecoder * /*decoder*/,
                                          const FLAC__Frame *frame,
                                          const FLAC__int32 *const buffer[], void *client) {
    flac_reader *r = reader_of(client);
    const FLAC__FrameHeader &head = frame->header;
    const auto count = static_cast<int32_t>(head.blocksize);
    const bool usable = !r->damaged && count <= r->max_block;
    r->damaged = false;
    r->count = usable ? count : 0;
    if (!usable) return FLAC__STREAM_DECODER_WRITE_STATUS_CONTINUE;
    r->block = static_cast<int64_t>(head.number.sample_number) - r->base;
    if (r->rate == 0) r->rate = static_cast<int32_t>(head.sample_rate);
    const auto bits = static_cast<int32_t>(head.bits_per_sample);
    take_channel(buffer[0], bits, count, r->pcm);
    take_channel(buffer[head.channels > 1 ? 1 : 0], bits, count, r->pcm + 1);
    return FLAC__STREAM_DECODER_WRITE_STATUS_CONTINUE;
}

// The next block that can be used. False at the end of what is readable.
bool decode_block(flac_reader *r) {
    r->count = 0;
    while (r->count == 0) {
        if (FLAC__stream_decoder_process_single(r->decoder) == 0) return false;
        const FLAC__StreamDecoderState state = FLAC__stream_decoder_get_state(r->decoder);
        if (r->count == 0 && state >= FLAC__STREAM_DECODER_END_OF_STREAM) return false;
    }
    return true;
}

// Back to the first frame.
bool rewind_stream(flac_reader *r) {
    r->count = 0;
    return FLAC__stream_decoder_reset(r->decoder) != 0 &&
           FLAC__stream_decoder_process_until_end_of_metadata(r->decoder) != 0;
}

// Decodes the block that holds a sample; the block then starts there. False where none holds it.
bool find_sample(flac_reader *r, int64_t sample) {
    r->count = 0;
    r->damaged = false;
    const auto number = static_cast<FLAC__uint64>(r->base + sample);
    return FLAC__stream_decoder_flush(r->decoder) != 0 &&  // out of a seek that failed
           FLAC__stream_decoder_seek_absolute(r->decoder, number) != 0 && r->count > 0;
}

// The end of the last block that begins at or behind an offset of the file; 0 without one.
int64_t last_end(flac_reader *r, int64_t offset) {
    r->damaged = false;
    r->at = offset;
    int64_t end = 0;
    if (FLAC__stream_decoder_flush(r->decoder) == 0) return 0;
    while (decode_block(r)) {
        if (r->block >= 0 && r->block <= kMaxSamples - r->count) {
            end = std::max(end, r->block + r->count);
        }
    }
    return end;
}

// Where the audio that is there ends, which need not be where the stream information says: at the
// end of the last block, looked for from the file's end.
bool find_end(flac_reader *r) {
    for (int64_t tail = kTail; r->end == 0 && !r->file.failed; tail *= 4) {
        r->end = last_end(r, std::max<int64_t>(r->file.size - tail, 0));
        if (tail >= r->file.size) break;
    }
    if (r->stated > 0) r->end = std::min(r->end, r->stated);
    return !r->file.failed && r->end > 0;
}

bool open_decoder(flac_reader *r) {
    r->decoder = FLAC__stream_decoder_new();
    if (r->decoder == nullptr ||
        FLAC__stream_decoder_init_stream(r->decoder, read_bytes, move_to, tell, get_length,
                                         is_at_end, take_block, take_info, take_error,
                                         r) != FLAC__STREAM_DECODER_INIT_STATUS_OK ||
        FLAC__stream_decoder_process_until_end_of_metadata(r->decoder) == 0 || r->max_block <= 0) {
        return false;
    }
    r->pcm = static_cast<int16_t *>(calloc(static_cast<size_t>(r->max_block), kPair));
    if (r->pcm == nullptr || !decode_block(r) || r->rate <= 0) return false;
    r->base = r->block;
    return find_end(r) && rewind_stream(r);
}

}  // namespace

void *xflacfd_create(const mtsrc_io *io, int64_t * /*word*/, xflac_info *info,
                     void * /*reserved*/) {
    auto *r = static_cast<flac_reader *>(calloc(1, sizeof(flac_reader)));
    if (r == nullptr || info == nullptr || !io_file_open(&r->file, io) || !open_decoder(r)) {
        xflacfd_delete(r);
        return nullptr;
    }
    info->sample_rate = r->rate;
    info->duration = units_of_duration(r->end, r->rate);
    return r;
}

int32_t xflacfd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second) {
    flac_reader *r = reader_of(reader);
    if (r == nullptr || buf == nullptr || bytes == nullptr || first == nullptr ||
        second == nullptr || size < kPair) {
        return -1;
    }
    if (r->next >= r->end) return kWexaEndOfStream;
    if (r->moved && !find_sample(r, r->next)) {
        // Where no seek leads, reading goes on from the start, up to the place.
        r->file.failed = false;
        if (!rewind_stream(r)) return -1;
    }
    r->moved = false;
    bool more = true;
    while (more && (r->count == 0 || r->block + r->count <= r->next)) more = decode_block(r);
    if (r->file.failed) return -1;
    const int64_t inside = r->next - r->block;  // below 0 in silence before the block
    const int64_t left = std::min<int64_t>(r->end - r->next, size / kPair);
    const int64_t samples = std::min(left, !more ? left : inside < 0 ? -inside : r->count - inside);
    *bytes = static_cast<int32_t>(samples) * kPair;
    if (more && inside >= 0) {
        memcpy(buf, r->pcm + 2 * inside, static_cast<size_t>(*bytes));
    } else {
        memset(buf, 0, static_cast<size_t>(*bytes));
    }
    *first = units_from_samples(r->next, r->rate);
    *second = units_from_samples(samples, r->rate);
    r->next += samples;
    return 0;
}

int32_t xflacfd_seek(void *reader, const int64_t *position, int64_t *reached) {
    flac_reader *r = reader_of(reader);
    if (r == nullptr || position == nullptr || reached == nullptr) return -1;
    r->next = seek_target(*position, r->end, r->rate);
    *reached = units_from_samples(r->next, r->rate);
    r->moved = true;
    return 0;
}

void xflacfd_delete(void *reader) {
    flac_reader *r = reader_of(reader);
    if (r == nullptr) return;
    if (r->decoder != nullptr) FLAC__stream_decoder_delete(r->decoder);
    free(r->pcm);
    io_file_close(&r->file);
    free(r);
}
