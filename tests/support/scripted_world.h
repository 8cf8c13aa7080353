// What the scripted codec library's two units share: the objects behind its handles, and all that a
// reset begins anew.
#ifndef TAVO_TESTS_SUPPORT_SCRIPTED_WORLD_H
#define TAVO_TESTS_SUPPORT_SCRIPTED_WORLD_H

#include <deque>
#include <map>
#include <mutex>
#include <set>

#include "tests/support/scripted_codec.h"

namespace scripted {

// What the handles point to. state comes first: the FLAC source sets a flag in its reader's before
// every read, and the read clears it.
struct object {
    uint8_t state[4096] = {};
    std::string kind = {};  // "xaacfd" of "xaacfd_create"
    const script *plan = nullptr;
    size_t place = 0;     // next frame
    size_t seeks = 0;     // answers given
    int64_t blanks = 0;   // given
    int hidden_ends = 0;  // in a row
    object *demux = nullptr;
    int streams = 0;
};

struct world {
    std::deque<script> scripts = {script()};  // in place until the reset
    std::map<std::string, std::deque<int32_t>> answers = {};
    std::vector<call> calls = {};
    std::set<object *> alive = {};
    std::vector<wexa_tags *> tags = {};
    std::vector<std::string> faults = {};
    tampering tamper = nullptr;
};

using lock = std::unique_lock<std::mutex>;

inline std::mutex guard;
inline world all;

// Where the record's buffers hang.
inline std::vector<void **> buffers_of(wexa_tags *tags) {
    std::vector<void **> places = {&tags->last};
    for (wexa_tag_text &text : tags->text) places.push_back(&text.data);
    for (wexa_tag_entry &entry : tags->entry) {
        places.insert(places.end(), {&entry.first, &entry.second});
    }
    return places;
}

}  // namespace scripted

#endif
