/** @file
 * The library's public interface.
 *
 * In: the path of an audio file and an analysis mode. Out: one TAVO_INFO, delivered once through a
 * callback on a thread of the library's own. A whole program:
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
 * States of an instance, and what each call answers in it:
 *
 * | state      | tavo_analyze | tavo_deinit                                                     |
 * |------------|--------------|-----------------------------------------------------------------|
 * | 1 ready    | starts, 0    | releases, 0                                                     |
 * | 2 running  | -5           | raises the stop flag, waits for the job's callback, releases, 0 |
 * | 3 finished | -5           | releases, 0                                                     |
 * | 4 failed   | -5           | releases, 0                                                     |
 *
 * One instance exists in a process at a time: the locks of the library are process-wide.
 */
#ifndef TAVO_CORE_TAVO_H
#define TAVO_CORE_TAVO_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/** What an instance is to find. */
enum {
    TAVO_MODE_HIGHLIGHT = 0, /**< the start of the highlight */
    TAVO_MODE_BEATS = 1,     /**< the beats and the tempo of the whole file */
    TAVO_MODE_BOTH = 2       /**< the highlight, then the beats from there on */
};

/** What the calls answer. */
enum {
    TAVO_OK = 0,             /**< done or started */
    TAVO_ERR_BUSY = -1,      /**< the Java bridge already holds an instance */
    TAVO_ERR_MEMORY = -2,    /**< an allocation or a thread start failed */
    TAVO_ERR_FORMAT = -3,    /**< unusable file: format, stream parameters, length, rate */
    TAVO_ERR_HANDLE = -4,    /**< bad handle or argument; from tavo_init: no decoding possible */
    TAVO_ERR_NOT_READY = -5, /**< tavo_analyze on an instance that already ran or runs */
    TAVO_ERR_READ = -6,      /**< a media source could not read or decode */
    TAVO_ERR_OPEN = -7,      /**< a file cannot be opened or has no usable audio stream */
    TAVO_ERR_CODEC = -255    /**< the codec library failed to initialise or to make a decoder */
};

/** One analysis, from tavo_init to tavo_deinit. Nothing in it is for the host. */
typedef struct TAVO_CTX TAVO_CTX;

/** What tavo_init reads. The caller owns it; nothing of it is read after tavo_init has returned. */
typedef struct TAVO_PARAM {
    const char *path; /**< NUL-terminated, UTF-8, at most 511 bytes */
    int32_t mode;     /**< TAVO_MODE_* */
} TAVO_PARAM;

/** The result. Owned by the instance, as is the array: both are valid until tavo_deinit. */
typedef struct TAVO_INFO {
    int32_t hl_pos;     /**< highlight start, ms from the start of the file; 0 in mode 1 */
    int32_t beat_count; /**< entries of beat_times; 0 on failure and in mode 0 */
    float *beat_times;  /**< [beat_count] ms from the start of the file, ascending; or null */
    int32_t status;     /**< 0 result, -1 failure */
} TAVO_INFO;

/** Runs on the job's worker thread, once per job. Must not call tavo_deinit (it answers -4 there):
 * hand that to another thread. */
typedef void (*TAVO_CALLBACK)(TAVO_INFO *info);

/** Opens the file, learns its format and plans the decoding.
 * Returns the instance, the caller's until tavo_deinit, with *err 0; or null with *err
 * -2 out of memory, -4 the file cannot be used. Nothing is left behind on failure. */
TAVO_CTX *tavo_init(const TAVO_PARAM *param, int32_t *err);

/** Stores the callback; to be called before tavo_analyze. Checks nothing. */
void tavo_setcallback(TAVO_CTX *ctx, TAVO_CALLBACK callback);

/** Starts the one job of the instance on a thread of its own.
 * - hl_param: highlight length wanted, seconds, 0 or less for none (modes 0 and 2).
 * - max_beats: most beats chosen by the threshold, 0 or less for no limit (modes 1 and 2).
 * - beat_param2: not used.
 *
 * Returns 0 started; -2 the thread could not be started (the instance stays ready); -4 bad handle
 * or a mode outside 0 to 2; -5 already started. The callback comes only after a 0. */
int32_t tavo_analyze(TAVO_CTX *ctx, int32_t hl_param, int32_t max_beats, int32_t beat_param2);

/** Stops a running job, waits until its callback has returned, and releases the instance.
 * Returns 0; -4 bad handle, or called from inside the callback (nothing is touched then). */
int32_t tavo_deinit(TAVO_CTX *ctx);

/** Where the beat modes write their diagnostic click track (mono 16-bit WAV at 11025 Hz). A host
 * that wants no file points it at an empty path before tavo_analyze. Not copied, not freed. */
extern const char *fnamedec;

#ifdef __cplusplus
}
#endif

#endif
