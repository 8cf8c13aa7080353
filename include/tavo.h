/** @file
 * The public C interface of libtavo: the highlight and the beats of a song.
 *
 * The input is the path of an audio file and an analysis mode. The result is one TAVO_INFO,
 * delivered once through a callback on a thread of the library. A complete program:
 *
 * @code{.c}
 * #include <semaphore.h>
 * #include <stdio.h>
 * #include <tavo.h>
 *
 * static sem_t done;
 *
 * static void on_result(TAVO_INFO *info) {
 *     if (info->status == 0) printf("%d\n", (int)info->hl_pos);
 *     sem_post(&done);
 * }
 *
 * int main(int argc, char **argv) {
 *     fnamedec = "";  // write no click track
 *     TAVO_PARAM param = {argc > 1 ? argv[1] : "song.wav", TAVO_MODE_HIGHLIGHT};
 *     int32_t err;
 *     TAVO_CTX *tavo = tavo_init(&param, &err);
 *     if (tavo == NULL) return 1;
 *     sem_init(&done, 0, 0);
 *     tavo_setcallback(tavo, on_result);
 *     if (tavo_analyze(tavo, 30, 0, 0) == 0) sem_wait(&done);
 *     tavo_deinit(tavo);
 *     return 0;
 * }
 * @endcode
 *
 * The library does not analyse two files at a time in one process, take audio from memory, or
 * report progress. To analyse several files at once, use several processes.
 *
 * The states of an instance, and what each call does and returns in each state:
 *
 * | state      | tavo_analyze | tavo_deinit                                                     |
 * |------------|--------------|-----------------------------------------------------------------|
 * | 1 ready    | starts, 0    | releases, 0                                                     |
 * | 2 running  | -5           | raises the stop flag, waits for the job's callback, releases, 0 |
 * | 3 finished | -5           | releases, 0                                                     |
 * | 4 failed   | -5           | releases, 0                                                     |
 *
 * Threads: call the functions from one thread, or from several that take turns. The callback runs
 * on a thread of the library; there, the tavo_get_ functions, tavo_has_audio and tavo_is_complete
 * are allowed, and tavo_deinit returns -4. tavo_probe and tavo_error_text may be called on any
 * thread at any time.
 *
 * Binary compatibility: within one major version, functions, codes and the fields of TAVO_PARAM and
 * TAVO_INFO keep their meaning, order and size; a minor version only adds functions. The library's
 * file name ends in the major version. Other exported names serve the library and its tests and are
 * not covered by this promise.
 */
#ifndef TAVO_H
#define TAVO_H

#include <stdint.h>

#define TAVO_VERSION_MAJOR 1 /**< raised by changes that break programs */
#define TAVO_VERSION_MINOR 0 /**< raised by changes that add functions */
#define TAVO_VERSION_PATCH 0 /**< raised by other changes */

#ifdef __cplusplus
extern "C" {
#endif

/** Analysis modes. */
enum {
    TAVO_MODE_HIGHLIGHT = 0, /**< the start of the highlight */
    TAVO_MODE_BEATS = 1,     /**< the beats and the tempo of the whole file */
    TAVO_MODE_BOTH = 2       /**< the highlight, then the beats and the tempo from there on */
};

/** Return codes. */
enum {
    TAVO_OK = 0,             /**< done or started */
    TAVO_ERR_BUSY = -1,      /**< the Java bridge already holds an instance */
    TAVO_ERR_MEMORY = -2,    /**< out of memory, or a thread could not be started */
    TAVO_ERR_FORMAT = -3,    /**< unusable format, stream parameters, length or rate */
    TAVO_ERR_HANDLE = -4,    /**< bad handle or argument; from tavo_init: the file is unusable */
    TAVO_ERR_NOT_READY = -5, /**< the job of the instance has already been started */
    TAVO_ERR_READ = -6,      /**< a media source could not read or decode */
    TAVO_ERR_OPEN = -7,      /**< a file cannot be opened or has no usable audio stream */
    TAVO_ERR_SHORT = -8,     /**< tavo_probe: the audio lasts 1 s or less */
    TAVO_ERR_LOW_RATE = -9,  /**< tavo_probe: the sample rate is below TAVO_MIN_RATE */
    TAVO_ERR_CODEC = -255    /**< the codec library could not be set up or has no decoder */
};

/** Limits on the files that can be analysed. */
enum {
    TAVO_PATH_BYTES = 512,    /**< size of the longest path, with its terminator */
    TAVO_MIN_FILE_BYTES = 16, /**< smallest file that can be recognised */
    TAVO_MIN_RATE = 8000,     /**< lowest sample rate, Hz */
    TAVO_MAX_RATE = 48000     /**< highest sample rate, except for FLAC, Hz */
};

/** The loudness curve: one value per hop, measured over a window that starts with that hop. */
enum {
    TAVO_LOUDNESS_HOP_MS = 2000,   /**< from the start of one window to the start of the next */
    TAVO_LOUDNESS_WINDOW_MS = 6000 /**< length of a window */
};

/** Margins of the highlight search: how many values it skips at each end of the curve. */
enum {
    TAVO_SHORT_SONG_S = 90,     /**< seconds; shorter songs have narrower margins */
    TAVO_SEARCH_SKIP = 9,       /**< values at the start; 0 in a short song */
    TAVO_SEARCH_TAIL = 25,      /**< values at the end */
    TAVO_SHORT_SEARCH_TAIL = 10 /**< values at the end of a short song */
};

/** One analysis, from tavo_init to tavo_deinit. Its fields are private. */
typedef struct TAVO_CTX TAVO_CTX;

/** The input of tavo_init. Owned by the caller and not read after tavo_init has returned. */
typedef struct TAVO_PARAM {
    const char *path; /**< NUL-terminated, UTF-8, at most 511 bytes */
    int32_t mode;     /**< TAVO_MODE_* */
} TAVO_PARAM;

/** The result. The record and its array belong to the instance and are valid until tavo_deinit. */
typedef struct TAVO_INFO {
    int32_t hl_pos;     /**< highlight start, ms from the start of the file; 0 in mode 1 */
    int32_t beat_count; /**< entries of beat_times; 0 on failure and in mode 0 */
    float *beat_times;  /**< [beat_count] ms from the start of the file, ascending; or null */
    int32_t status;     /**< 0 result, -1 failure */
} TAVO_INFO;

/** The audio stream of a file, as the file states it. */
typedef struct TAVO_STREAM {
    int32_t rate;        /**< sample rate in Hz */
    int32_t channels;    /**< channels of the decoder's output */
    int64_t duration_ms; /**< duration in ms, rounded down */
} TAVO_STREAM;

/** Receives the result, once per job, on the job's worker thread. Must not call tavo_deinit,
 * which returns -4 there; another thread may. */
typedef void (*TAVO_CALLBACK)(TAVO_INFO *info);

/** Receives the result as TAVO_CALLBACK does, and the pointer that was passed to
 * tavo_set_listener. */
typedef void (*TAVO_LISTENER)(TAVO_INFO *info, void *user);

/** Opens a file, reads its format and closes it, to find out whether tavo_init can use it. Needs no
 * instance. If the result is 0, -8 or -9, *stream receives the stream's properties; otherwise it is
 * zeroed. stream may be null.
 *
 * Returns 0 if the file can be used, or the reason why it cannot:
 * - -2: out of memory;
 * - -3: the format is unknown or refused, its sample rate or coding is not supported, or the path
 *   has 512 bytes or more;
 * - -4: path is null;
 * - -6: the file cannot be read, or is shorter than 16 bytes;
 * - -7: the file cannot be opened, or has no usable audio stream;
 * - -8: the audio lasts 1 s or less;
 * - -9: the sample rate is below 8000 Hz;
 * - -255: the codec library failed. */
int32_t tavo_probe(const char *path, TAVO_STREAM *stream);

/** Returns an English clause for a return code, without a final period, such as "the file cannot be
 * opened or has no audio stream". Never null; the string is static. */
const char *tavo_error_text(int32_t code);

/** Opens the file, reads its format and plans the decoding.
 *
 * Only one instance may exist in a process; the caller must ensure this. A second tavo_init
 * succeeds while the first instance exists, but both then share their locks and may wait forever.
 *
 * Sets *err to 0 and returns the instance, which the caller owns until tavo_deinit. On failure
 * returns null, releases everything, and sets *err to -2 (out of memory) or -4 (the file cannot be
 * used, whatever the reason). tavo_probe with the same path returns the reason; if it returns 0,
 * there was too little memory. */
TAVO_CTX *tavo_init(const TAVO_PARAM *param, int32_t *err);

/** Stores the callback. Call it before tavo_analyze. The handle is not checked. */
void tavo_setcallback(TAVO_CTX *ctx, TAVO_CALLBACK callback);

/** Stores a listener instead of a callback, and a pointer that is passed to the listener but not
 * otherwise used. Call it before tavo_analyze, on an instance that tavo_init returned. The last
 * call to tavo_setcallback or tavo_set_listener takes effect. A null listener removes the stored
 * one. Returns 0. For a bad handle, stores nothing and returns -4. */
int32_t tavo_set_listener(TAVO_CTX *ctx, TAVO_LISTENER listener, void *user);

/** Starts the one job of the instance on its own thread and returns immediately.
 * - hl_param: requested length of the highlight in seconds; 0 or less for none (modes 0 and 2).
 * - max_beats: maximum number of threshold-selected beats; 0 or less for no limit (modes 1 and 2).
 * - beat_param2: not used.
 *
 * Returns 0 if started; -2 if the thread could not be started (the instance stays ready); -4 for a
 * bad handle or a mode outside 0 to 2; -5 if already started. A callback follows only if the result
 * is 0. */
int32_t tavo_analyze(TAVO_CTX *ctx, int32_t hl_param, int32_t max_beats, int32_t beat_param2);

/** Stops a running job, waits until its callback has returned, and releases the instance. Decoding
 * and the highlight search run to completion before the job stops. Returns 0. For a bad handle or
 * inside the callback, changes nothing and returns -4. */
int32_t tavo_deinit(TAVO_CTX *ctx);

/** Stores the stream's sample rate in Hz, the channels of the decoder's output, and the duration in
 * ms that the file states. Null pointers are skipped. Valid after tavo_init. Returns 0. For a bad
 * handle, writes nothing and returns -4. */
int32_t tavo_get_stream(const TAVO_CTX *ctx, int32_t *rate, int32_t *channels,
                        int64_t *duration_ms);

/** Returns the tempo in beats per minute, 30 to 200, once a job of mode 1 or 2 has succeeded; call
 * this function in the callback or later. In mode 2 it is the tempo of the music from the highlight
 * on. Returns 0 before the end of the job, after a failure, in mode 0, or for a bad handle. */
int32_t tavo_get_tempo(const TAVO_CTX *ctx);

/** Returns 1 if the job decoded any audio; call this function in the callback or later. Without
 * audio, a highlight at 0 has no meaning. Returns 0 before the end of the job, if nothing was
 * decoded, or for a bad handle. */
int32_t tavo_has_audio(const TAVO_CTX *ctx);

/** Returns 1 if the job decoded the file to its end; call this function in the callback or later.
 * Returns 0 if the file could not be read to its end or memory ran out; the result then covers only
 * what was analysed. Also returns 0 before the end of the job and for a bad handle. */
int32_t tavo_is_complete(const TAVO_CTX *ctx);

/** Returns the loudness curve of the file, once a job of mode 0 or 2 has ended. Value i is measured
 * over the window that starts at i * TAVO_LOUDNESS_HOP_MS. It is 10 * log10(m + 1), where m is the
 * mean square of the samples, with full scale 1.0. This gives 0 for silence and 3.01 for a
 * full-scale square wave. The curve has *count values and is valid until tavo_deinit. Returns null
 * with *count 0 before the end of the job, in mode 1, for audio shorter than a window, or for a bad
 * handle. count must not be null. */
const float *tavo_get_loudness(const TAVO_CTX *ctx, int32_t *count);

/** An open file whose samples are read from start to end. Its fields are private. */
typedef struct mtsrc_ctx mtsrc_ctx;

/** The input of mtsrc_init, which copies the path. */
typedef struct mtsrc_param {
    const char *path; /**< NUL-terminated, at most 511 bytes */
} mtsrc_param;

/** A read request. */
typedef struct mtsrc_frame {
    void *data;   /**< receives 16-bit mono samples at the stream's rate, in native byte order */
    int32_t size; /**< receives the number of bytes delivered */
} mtsrc_frame;

/** Opens a file to read its samples, for instance to draw them; an analysis does not need this.
 * Sets *err to 0 and returns a handle, which the caller releases with mtsrc_deinit. On failure,
 * returns null and sets *err to -2 (out of memory), -3 (format unknown or unsupported, or path too
 * long), -4 (no path), -6 (file unreadable or shorter than 16 bytes), -7 (file cannot be opened or
 * has no usable audio) or -255 (codec library failed). */
mtsrc_ctx *mtsrc_init(const mtsrc_param *param, int32_t *err);

/** Delivers `want` bytes; any count up to 917,506 is allowed. Returns 0 if it delivered all of
 * them; 1 if the stream ended, with the remaining bytes delivered; -2 if memory ran out; -4 for a
 * bad handle or frame, or if `want` is negative or too large; -6 if reading or decoding failed. */
int32_t mtsrc_getstream(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);

/** Releases everything. Returns -5 on success, -4 for a bad handle. */
int32_t mtsrc_deinit(mtsrc_ctx *src);

/** The path of the diagnostic click track (mono 16-bit WAV at 11025 Hz). Modes 1 and 2 write it
 * at the end of every beat analysis and overwrite an existing file. By default it is in the
 * working directory. To write no file, set an empty path; to write it elsewhere, set another
 * path. Set it before tavo_analyze, not while a job runs. The string is not copied and not
 * freed. */
extern const char *fnamedec;

#ifdef __cplusplus
}
#endif

#endif
