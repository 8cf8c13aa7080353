#include "desktop/wexaaudio/shared/frame_index.h"

#include <algorithm>
#include <cstdlib>

#include "desktop/wexaaudio/shared/units.h"

bool frame_index_add(frame_index *index, int64_t offset, int32_t bytes, int32_t samples) {
    constexpr int64_t kFirstCapacity = 1024;  // entries
    constexpr int64_t kMaxFrames = 1 << 22;   // more frames than a day of audio has
    const int64_t first = frame_index_end(index);
    if (first > kMaxSamples || index->count == kMaxFrames) return false;
    if (index->count == index->capacity) {
        const int64_t capacity = std::max(kFirstCapacity, index->capacity * 2);
        void *grown = realloc(index->entry, static_cast<size_t>(capacity) * sizeof(frame_entry));
        if (grown == nullptr) return false;
        index->entry = static_cast<frame_entry *>(grown);
        index->capacity = capacity;
    }
    index->entry[index->count++] = {offset, first, bytes, samples};
    return true;
}

int64_t frame_index_find(const frame_index *index, int64_t sample) {
    const frame_entry *begin = index->entry;
    const frame_entry *after =
        std::upper_bound(begin, begin + index->count, sample,
                         [](int64_t at, const frame_entry &entry) { return at < entry.first; });
    return std::max<int64_t>(after - begin - 1, 0);
}

int64_t frame_index_end(const frame_index *index) {
    if (index->count == 0) return 0;
    const frame_entry &last = index->entry[index->count - 1];
    return last.first + last.samples;
}
