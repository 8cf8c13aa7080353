#include "desktop/wexaaudio/shared/frame_index.h"

#include <algorithm>
#include <cstdlib>

#include "desktop/wexaaudio/shared/units.h"

namespace {

constexpr int64_t kFirstRoom = 1024;  // entries

bool before(int64_t sample, const frame_entry &entry) {
    return sample < entry.first;
}

}  // namespace

bool frame_index_add(frame_index *index, frame_entry entry) {
    if (entry.first < 0) {
        entry.first = frame_index_end(index);
    }
    if (entry.first > kMaxSamples) {
        return false;
    }
    if (index->count == index->room) {
        const int64_t room = std::max(kFirstRoom, index->room * 2);
        void *grown = realloc(index->entry, static_cast<size_t>(room) * sizeof(frame_entry));
        if (grown == nullptr) {
            return false;
        }
        index->entry = static_cast<frame_entry *>(grown);
        index->room = room;
    }
    index->entry[index->count++] = entry;
    return true;
}

int64_t frame_index_find(const frame_index *index, int64_t sample) {
    if (index->count == 0) {
        return -1;
    }
    const frame_entry *begin = index->entry;
    const frame_entry *end = begin + index->count;
    const frame_entry *after = std::upper_bound(begin, end, sample, before);
    return std::max<int64_t>(after - begin - 1, 0);
}

int64_t frame_index_end(const frame_index *index) {
    if (index->count == 0) {
        return 0;
    }
    const frame_entry &last = index->entry[index->count - 1];
    return last.first + last.samples;
}

void frame_index_free(frame_index *index) {
    free(index->entry);
    *index = {};
}
