// Results of scanning files, shared by the readers of a file: a job opens one file five times.
//
// A file is identified by its path's device, inode, size and time of change, so that a file that
// was replaced or written to is scanned again. The result used last is kept for the next reader,
// unless the file changed so shortly before that a further change could go unnoticed. Readers whose
// callbacks serve other paths, or none, share nothing.
#ifndef WEXAAUDIO_SCAN_CACHE_H
#define WEXAAUDIO_SCAN_CACHE_H

#include <cstddef>

#include "desktop/wexaaudio/shared/io_file.h"

// One format's scan. The record that describes it is its identity and stays valid.
struct scan_kind {
    size_t bytes;  // of a result
    // Fills in a zeroed result. False when the file is not of the format or cannot be read, and
    // when out of memory; what the result owns by then is released by the caller.
    bool (*scan)(io_file *file, void *result);
    void (*release)(void *result);  // frees what a result owns; null when it owns nothing
};

// The result for an open file, read-only: another reader's, or of a new scan. Null when the scan
// fails. Returned with scan_cache_put. Any thread.
const void *scan_cache_get(io_file *file, const scan_kind *kind);

void scan_cache_put(const void *result);  // null is allowed

#endif
