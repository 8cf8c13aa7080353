// Limits on the files that can be analysed. The stages refuse files outside these limits; the
// command prints the limits for the user.
#pragma once

#include "common/tavo_ctx.h"

constexpr int32_t kPathBytes = TAVO_PATH_BYTES;
constexpr int32_t kHeadBytes = TAVO_MIN_FILE_BYTES;  // bytes read to recognise a format
constexpr int32_t kMinRate = TAVO_MIN_RATE;          // Hz
constexpr int32_t kMaxRate = TAVO_MAX_RATE;          // Hz, for all formats except FLAC
constexpr int64_t kRefusedUnits = kUnitsPerSecond;   // streams up to this length are refused
