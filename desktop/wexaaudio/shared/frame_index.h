// Every compressed frame of a stream with its offsets in the file and in the stream. Built once at
// open. Durations and seeks are looked up here, never estimated.
#ifndef WEXAAUDIO_FRAME_INDEX_H
#define WEXAAUDIO_FRAME_INDEX_H

#include <cstdint>

struct frame_entry {
    int64_t offset;   // bytes from the start of the file
    int64_t first;    // first sample of the frame in the decoded stream, sample frames
    int32_t bytes;    // of the compressed frame
    int32_t samples;  // sample frames of the output
};

struct frame_index {
    frame_entry *entry;  // [capacity] owned; the first count are used, ascending
    int64_t count;
    int64_t capacity;
};

// Appends a frame that begins where the last one ends. False, with the index unchanged, if memory
// runs out or there are more frames or samples than any real file has.
bool frame_index_add(frame_index *index, int64_t offset, int32_t bytes, int32_t samples);

// Index of the frame that contains `sample`: the last one whose `first` is not after it. 0 before
// the first frame, count - 1 past the end. The index must not be empty.
int64_t frame_index_find(const frame_index *index, int64_t sample);

// End of the last frame, sample frames; 0 if empty.
int64_t frame_index_end(const frame_index *index);

#endif
