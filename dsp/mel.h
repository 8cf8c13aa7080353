// The mel scale: linear up to 1000 Hz (15 mel), logarithmic above. Caller: beat/beat_ctx.h, for the
// edges of the mel bands.
#ifndef TAVO_DSP_MEL_H
#define TAVO_DSP_MEL_H

extern "C" {

float Hz2Mel(float hz);   // Hz to mel
float Mel2Hz(float mel);  // mel to Hz
}

#endif
