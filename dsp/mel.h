// The mel scale: linear below 1000 Hz (15 mel), logarithmic above.
#ifndef TAVO_DSP_MEL_H
#define TAVO_DSP_MEL_H

extern "C" {

float Hz2Mel(float hz);
float Mel2Hz(float mel);
}

#endif
