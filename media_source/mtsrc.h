/// @file
/// Stage 1: decodes an audio file into a stream of 16-bit mono PCM. Callers read any number of
/// bytes at a time and seek by time.
///
/// Input: a path. Output: PCM at the stream's own sample rate, in native byte order. Called by
/// pcm/decode.h. A source is used by one thread at a time; different sources share nothing. The
/// handle, mtsrc_init, mtsrc_getstream and mtsrc_deinit are declared in tavo.h.
#pragma once

#include "include/tavo.h"
#include "media_source/mtsrc_io.h"

/// Format of the stream that a source delivers.
struct mtsrc_format {
    int32_t sample_rate;  ///< Hz
    int32_t channels;     ///< of the decoder's output; the delivered PCM always has one
    int32_t bits;         ///< 16
    int64_t duration;     ///< 100-ns units
};
static_assert(offsetof(mtsrc_format, duration) == 16);

// Further results, besides 0 and the codes of tavo.h.
constexpr int32_t kMtsrcEndOfStream = 1;  ///< mtsrc_getstream delivered all that was left
constexpr int32_t kMtsrcDone = -5;        ///< mtsrc_reset or mtsrc_deinit succeeded

// Type codes returned by recognition.
constexpr int32_t kMtsrcTypeMp4 = 2000;        ///< MP4
constexpr int32_t kMtsrcTypeAsf = 2002;        ///< ASF, which no source reads
constexpr int32_t kMtsrcTypeOgg = 2005;        ///< Ogg
constexpr int32_t kMtsrcTypeWav = 2006;        ///< RIFF WAVE
constexpr int32_t kMtsrcTypeAac = 2007;        ///< AAC as ADTS or ADIF
constexpr int32_t kMtsrcTypeMpegLayer1 = 303;  ///< MPEG audio Layer I
constexpr int32_t kMtsrcTypeMpegLayer2 = 304;  ///< MPEG audio Layer II
constexpr int32_t kMtsrcTypeMpegLayer3 = 305;  ///< MPEG audio Layer III
constexpr int32_t kMtsrcTypeFlac = 322;        ///< FLAC
constexpr int32_t kMtsrcTypeUnknown = 2199;    ///< none of the above

extern "C" {

/// Opens a file through the caller's callbacks, which are copied. On success the handle owns
/// io->path and releases it with free; on failure the caller still owns it. Reports errors as
/// mtsrc_init does. `flags` is unused; pass 0.
mtsrc_ctx *mtsrc_open_mfal(const mtsrc_io *io, int64_t flags, int32_t *err);

/// Stores the stream's format in *fmt. Returns 0, or -4 for a bad handle or a null pointer.
int32_t mtsrc_getstream_format(mtsrc_ctx *src, mtsrc_format *fmt);

/// Seeks to `position` (100-ns units). The reader stores in *reached the position at which reading
/// resumes. Initialise *reached, because a reader may leave it unchanged. Returns 0, or -4 for a
/// bad handle or a failed seek; after a failed seek the queue is empty.
int32_t mtsrc_seekstream(mtsrc_ctx *src, int64_t position, int64_t *reached);

/// Empties the queue and resets the decoder. Returns -5 on success, -4 for a bad handle.
int32_t mtsrc_reset(mtsrc_ctx *src);

/// Recognises an open file by its content and restores the file offset. Returns 0 and sets *type
/// (to kMtsrcTypeUnknown if no probe matches), or returns -6 if 16 bytes cannot be read.
int32_t mtsrc_get_file_type(const mtsrc_io *io, mtsrc_file *file, int32_t *type);

/// The probes, in calling order. `head` holds the first 16 bytes of the file. Each probe returns a
/// type code and restores the file offset. It uses only the callbacks read, tell, seek and skip.
/// @{
int32_t mtsrc_probe_asf(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);
int32_t mtsrc_probe_mp4(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);
int32_t mtsrc_probe_flac(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);
int32_t mtsrc_probe_ogg(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);
int32_t mtsrc_probe_wav(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);
int32_t mtsrc_probe_aac(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);
int32_t mtsrc_probe_mpeg(const uint8_t *head, const mtsrc_io *io, mtsrc_file *file);
/// @}
}
