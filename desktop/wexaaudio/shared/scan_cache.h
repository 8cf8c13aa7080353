// The scans of files that are open, shared by their readers: a job reads one file through four.
//
// A file is known by its path's device, inode, size and time of change, so that a file replaced or
// written to is scanned again. The last reader frees a scan: nothing is kept between jobs.
// Callbacks that serve other paths, or none, are never shared.
#ifndef WEXAAUDIO_SCAN_CACHE_H
#define WEXAAUDIO_SCAN_CACHE_H

#include "desktop/wexaaudio/shared/stream.h"

// The scan of an open file: another reader's, or a new one by scan. Null when that fails. Given
// back with scan_cache_put. Any thread.
const stream_info *scan_cache_get(io_file *file, const codec_library *library, stream_scan scan);

void scan_cache_put(const stream_info *info);  // null is allowed

#endif
