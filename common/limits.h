// What a file must have to be analysed. The stages refuse what breaks a limit; the command names
// the limit to the user.
#ifndef TAVO_COMMON_LIMITS_H
#define TAVO_COMMON_LIMITS_H

#include "common/tavo_ctx.h"

constexpr int32_t kPathBytes = 512;                 // room for a path with its terminator
constexpr int32_t kHeadBytes = 16;                  // read to recognise a format
constexpr int32_t kMinRate = 8000;                  // Hz
constexpr int32_t kMaxRate = 48'000;                // Hz, of all formats but FLAC
constexpr int64_t kRefusedUnits = kUnitsPerSecond;  // streams up to this length are too short

#endif
