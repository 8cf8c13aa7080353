// The raw blocks of one AAC track, shared by the ADTS reader and the MP4 demuxer.
//
// In: where each raw block is in the file, the configuration. Out: a stream whose blocks all have
// one length.
//
// A decoder's noise generator carries history, so the same block decoded after a seek would differ
// from a linear read. Therefore the track is cut into groups of equally many frames, and each
// starts a fresh decoder some frames before itself.
#ifndef WEXAAUDIO_AAC_STREAM_H
#define WEXAAUDIO_AAC_STREAM_H

#include "desktop/wexaaudio/aac/aac_config.h"
#include "desktop/wexaaudio/shared/stream.h"

// Completes a stream whose frames are in the index: decodes the first ones to find what the headers
// do not state (or state wrongly), makes the configuration explicit, gives all frames their length
// and chooses the groups. A block of impossible length becomes silence. False when nothing there
// decodes or out of memory.
bool aac_stream_complete(io_file *file, aac_config *config, stream_info *info);

#endif
