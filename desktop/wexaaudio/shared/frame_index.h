// Index of a stream's compressed frames: where each is in the file and in the decoded stream. It is
// built when a file is opened. Durations and seek positions come from it and are never estimated.
#pragma once

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

// Appends a frame that starts where the last one ends. Returns false and leaves the index unchanged
// if memory runs out or there are more frames or samples than any real file has.
bool frame_index_add(frame_index *index, int64_t offset, int32_t bytes, int32_t samples);

// Returns the index of the frame that contains `sample`: the last frame that starts at or before
// it. Returns 0 before the first frame and count - 1 past the end. The index must not be empty.
int64_t frame_index_find(const frame_index *index, int64_t sample);

// Returns the end of the last frame in sample frames, or 0 if the index is empty.
int64_t frame_index_end(const frame_index *index);
