// The objects behind the scripted codec library's handles, for its own two units.
#ifndef TAVO_TESTS_SUPPORT_SCRIPTED_OBJECTS_H
#define TAVO_TESTS_SUPPORT_SCRIPTED_OBJECTS_H

#include <deque>
#include <map>
#include <memory>
#include <mutex>
#include <set>

#include "tests/support/scripted_codec.h"

namespace scripted {

// What the handles point to. state comes first: the FLAC source writes into its reader's.
struct object {
    uint8_t state[4096] = {};
    std::string kind = {};
    std::shared_ptr<const script> what = {};
    size_t script_number = 0;
    size_t place = 0;  // next frame
    size_t seeks = 0;  // answers given
    object *parent = nullptr;
    int streams = 0;
};

struct world {
    std::mutex lock;
    std::vector<std::shared_ptr<const script>> scripts;
    size_t current = 0;
    std::map<std::string, size_t> by_path;
    std::map<std::string, std::deque<int32_t>> answers;
    std::vector<call> calls;
    std::set<object *> alive;
    std::map<std::string, int> balance;
    std::vector<wexa_tags *> tags;
    std::vector<std::string> faults;
    bool flac_flag = true;
    tampering tamper = nullptr;
};

world &w();

using guard = std::lock_guard<std::mutex>;

wexa_tags *make_tags(const script &what);

// What the function hands back for a value of that name.
template <typename number>
number told(const std::string &function, const char *value, number truth) {
    return w().tamper ? static_cast<number>(w().tamper(function, value, truth)) : truth;
}

// The next answer laid down for the function, else the other value.
int32_t take(const std::string &name, int32_t otherwise);
call &note(const char *name, void *of, int32_t result);
object *checked(const char *name, void *handle, const char *kind);
object *make(const char *kind, size_t script_number);
void destroy(const char *name, void *handle, const char *kind);
int32_t init(const char *name, const char *library);
void deinit(const char *name, const char *library);
int32_t get_frm(const char *name, const char *kind, void *handle, void *buf, int32_t size,
                int32_t *bytes, int64_t *first, int64_t *second);
int32_t move(const char *name, const char *kind, void *handle, const int64_t *position,
             int64_t *reached, int32_t flags);
int32_t decode(const char *name, const char *kind, void *handle, const wexa_frame *what,
               wexa_output *output, wexa_status *status);
void decoder_reset(const char *name, const char *kind, void *handle);
void *open_stream(const char *name, const char *kind, void *handle, const char *demux_kind,
                  int32_t index);

template <typename record>
void hand(call &to, const record *what) {
    to.addresses.push_back(what);
    to.records.emplace_back();
    if (what) {
        const auto *bytes = reinterpret_cast<const uint8_t *>(what);
        to.records.back().assign(bytes, bytes + sizeof(record));
    }
}

// fill stores what the script says in the information record, also when the answer is a failure.
template <typename word, typename info, typename filler>
void *create(const char *name, const char *kind, const mtsrc_io *io, word *unread, info *record,
             filler fill) {
    guard held(w().lock);
    const auto path = w().by_path.find(io && io->path ? io->path : "");
    const size_t number = path == w().by_path.end() ? w().current : path->second;
    const int32_t failure = take(name, 0);
    object *made = failure ? nullptr : make(kind, number);
    call &noted = note(name, made, failure);
    hand(noted, io);
    hand(noted, unread);
    hand(noted, record);
    const script what = w().scripts.empty() ? script() : *w().scripts[number];
    fill(what, record, name);
    return made;
}

template <typename config>
void *create_decoder(const char *name, const char *kind, const config *record) {
    guard held(w().lock);
    const int32_t failure = take(name, 0);
    object *made = failure ? nullptr : make(kind, w().current);
    hand(note(name, made, failure), record);
    return made;
}

template <typename info, typename filler>
int32_t stream_info(const char *name, const char *kind, void *handle, info *record, filler fill) {
    guard held(w().lock);
    call &noted = note(name, handle, take(name, 0));
    hand(noted, record);
    if (object *of = checked(name, handle, kind)) {
        fill(*of->what, record, name);
    }
    return noted.result;
}

}  // namespace scripted

#endif
