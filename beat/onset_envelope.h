// Stage 4: the onset envelope, how much the mel spectrum changes from each frame to the next.
//
// In: TAVO_BEAT_CTX.signal. Out: onset_env, one value per hop (256 samples at 11025 Hz), in units
// of its own standard deviation. Before: beat/beat_ctx.h. After: beat/tempo.h, beat/threshold.h.
#ifndef TAVO_BEAT_ONSET_ENVELOPE_H
#define TAVO_BEAT_ONSET_ENVELOPE_H

#include "beat/beat_ctx.h"

extern "C" {

// Fills onset_env[0 .. F - 2] on four threads; leaves it as it was when memory runs out. Reads
// signal, frame_count and mel_matrix (frame_size / 2 rows of 36) of the context, and frame_size, a
// power of two from 2 to 16384, and hop_size from the arguments, all in samples.
void _getOnsetEnvelope(TAVO_BEAT_CTX *beat, int32_t frame_size, int32_t hop_size);

// Thread entry of one worker, and its completion handler. The argument is the TAVO_ONSET_WORKER.
void *_tavo_proc_onsetenv(void *worker);
void _thd_cleanup(void *worker);
}

#endif
