// Converts between Hz and the mel scale, which is linear up to 1000 Hz (15 mel) and logarithmic
// above. Used by beat/beat_ctx.h for the edges of the mel bands.
#pragma once

extern "C" {

float Hz2Mel(float hz);
float Mel2Hz(float mel);
}
