#include "desktop/wexaaudio/mpeg/mpeg_frames.h"

#include <algorithm>
#include <cstring>

#include "desktop/wexaaudio/mpeg/mpeg_header.h"
#include "desktop/wexaaudio/shared/bundle.h"

namespace {

// The filter bank's memory spans two frames at most (Layer I; Layer III of MPEG-2). One more is
// margin, since it costs next to nothing.
constexpr int32_t kStateFrames = 3;
constexpr int32_t kSideHead = 8;      // bytes of a frame up to its reach back
constexpr int64_t kReadBack = 65536;  // bytes before the frame brought into the file's buffer

// The frame's header and how far it reaches back. False when it is lost or cannot be read.
bool look_at(io_file *file, const frame_entry &entry, mpeg_header *h, int32_t *backstep) {
    int32_t got = 0;
    const uint8_t *p =
        entry.bytes > 0 ? io_file_peek(file, entry.offset, kSideHead, &got) : nullptr;
    if (p == nullptr || got < kSideHead || !mpeg_parse(p, h)) {
        return false;
    }
    *backstep = mpeg_backstep(h, p);
    return true;
}

// First frame of those that hold the backstep bytes before frame n.
int64_t reach_back(io_file *file, const frame_index *index, int64_t n, int32_t backstep) {
    while (backstep > 0 && n > 0) {
        --n;
        mpeg_header h = {};
        int32_t unused = 0;
        if (look_at(file, index->entry[n], &h, &unused)) {
            backstep -= std::max(h.bytes - mpeg_main_data_at(&h), 0);
        }
    }
    return n;
}

// The first frame to decode so that frame n comes out as in a linear read.
int64_t first_needed(io_file *file, const frame_index *index, int64_t n) {
    int64_t back = n;
    while (back > 0 && index->entry[n].offset - index->entry[back - 1].offset <= kReadBack) {
        --back;
    }
    int32_t got = 0;
    io_file_peek(file, index->entry[back].offset, kMpegHeaderBytes,
                 &got);  // read once, not n times
    int64_t first = n;
    int32_t seen = 0;
    for (int64_t k = n; k >= 0 && seen <= kStateFrames; --k) {
        mpeg_header h = {};
        int32_t backstep = 0;
        if (look_at(file, index->entry[k], &h, &backstep)) {
            first = std::min(first, reach_back(file, index, k, backstep));
            first = std::min(first, k);
            ++seen;
        }
    }
    return first;
}

struct span {
    int64_t first;
    int32_t frames;
    int64_t payload;  // bytes
};

// The frames first to n that are there, cut at the front until the bundle fits.
span fit(const frame_index *index, int64_t first, int64_t n, int32_t size) {
    span s = {first, 0, 0};
    for (int64_t k = first; k <= n; ++k) {
        s.frames += index->entry[k].bytes > 0 ? 1 : 0;
        s.payload += index->entry[k].bytes;
    }
    for (; s.first < n && bundle_size(0, s.frames, s.payload) > size; ++s.first) {
        s.frames -= index->entry[s.first].bytes > 0 ? 1 : 0;
        s.payload -= index->entry[s.first].bytes;
    }
    return s;
}

}  // namespace

int32_t mpeg_frames_read(io_file *file, const frame_index *index, int64_t n, bool fresh,
                         int32_t skip, int32_t channels, void *buf, int32_t size) {
    const frame_entry &wanted = index->entry[n];
    const span s = fit(index, fresh ? first_needed(file, index, n) : n, n, size);
    bundle_head head = {};
    head.flags = (fresh ? kBundleFresh : 0) | (wanted.bytes == 0 ? kBundleLost : 0);
    head.channels = channels;
    head.samples = wanted.samples - skip;
    head.skip = skip;
    head.frames = s.frames;
    bundle_writer w = {};
    bundle_begin(&w, buf, size, head, nullptr);
    for (int64_t k = s.first; k <= n; ++k) {
        const frame_entry &entry = index->entry[k];
        uint8_t *space = entry.bytes > 0 ? bundle_add(&w, entry.bytes) : nullptr;
        if (space == nullptr) {
            continue;
        }
        const int64_t got = io_file_read(file, entry.offset, space, entry.bytes);
        if (got != entry.bytes) {
            return got < 0 ? -1 : 0;
        }
    }
    return bundle_end(&w);
}
