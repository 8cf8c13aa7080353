// AAC in ADIF form: one header, then raw blocks without any framing of their own. Where each block
// ends is known only by decoding it.
//
// In: the file. Out: the configuration and the blocks' places, for aac_stream.h.
#ifndef WEXAAUDIO_ADIF_SCAN_H
#define WEXAAUDIO_ADIF_SCAN_H

#include "desktop/wexaaudio/aac/aac_stream.h"

// Reads from the "ADIF" at offset start. Nothing is known behind a damaged block: the stream ends
// before it. False when there is no block, on a read error and when out of memory.
bool adif_scan(io_file *file, const codec_library *library, int64_t start, aac_config *config,
               frame_index *frames);

#endif
