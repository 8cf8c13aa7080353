// A callback record over an input in memory: no file system, no descriptors.
#ifndef TAVO_FUZZ_MEMORY_IO_H
#define TAVO_FUZZ_MEMORY_IO_H

#include "media_source/mtsrc_io.h"

namespace fuzz {

// The one file that memory_io opens. Bytes from gap_at on are shifted behind gap zeros, so that a
// short input can be a long file.
struct memory_file {
    const uint8_t *data;
    int64_t bytes;  // of data
    int64_t gap_at;
    int64_t gap;
    int64_t fail_at;  // number of the call, from 1, that fails; 0: none
    int64_t calls;    // since the file was set
    int64_t open;     // handles open
};

// Sets the file. Handles of an earlier one must be closed.
memory_file *set_memory_file(const uint8_t *data, size_t bytes);

mtsrc_io memory_io();

}  // namespace fuzz

#endif
