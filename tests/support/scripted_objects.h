// The objects behind the scripted codec library's handles, for its own two units. All but called
// run within a call of the library: between called and the end of what it returned.
#ifndef TAVO_TESTS_SUPPORT_SCRIPTED_OBJECTS_H
#define TAVO_TESTS_SUPPORT_SCRIPTED_OBJECTS_H

#include <deque>
#include <map>
#include <mutex>
#include <set>

#include "tests/support/scripted_codec.h"

namespace scripted {

// What the handles point to. state comes first: the FLAC source writes into its reader's, before
// every read, a flag that the read clears.
struct object {
    uint8_t state[4096] = {};
    std::string kind = {};  // what the names of its functions begin with
    size_t script_number = 0;
    const script *what = nullptr;
    size_t place = 0;     // next frame
    size_t seeks = 0;     // answers given
    int64_t blanks = 0;   // given
    int hidden_ends = 0;  // in a row
    object *parent = nullptr;
    int streams = 0;
};

// What a reset begins anew.
struct contents {
    std::deque<script> scripts = {script()};  // in place until the reset
    std::map<std::string, std::deque<int32_t>> answers = {};
    std::vector<call> calls = {};
    std::set<object *> alive = {};
    std::vector<wexa_tags *> tags = {};
    std::vector<std::string> faults = {};
    tampering tamper = nullptr;
};

struct world : contents {
    std::mutex lock;
};

world &w();

using lock = std::unique_lock<std::mutex>;

lock called(const char *name);

template <typename record>
void hand(const record *what) {
    const auto *bytes = reinterpret_cast<const uint8_t *>(what);
    w().calls.back().addresses.push_back(what);
    w().calls.back().records.emplace_back(bytes, bytes + (what ? sizeof(record) : 0));
}

// Notes a call with the records handed over.
template <typename... record>
lock called(const char *name, const record *...records) {
    lock held = called(name);
    (hand(records), ...);
    return held;
}

// What the call hands back for a value of that name.
template <typename number>
number told(const char *value, number truth) {
    const tampering tamper = w().tamper;
    return tamper ? static_cast<number>(tamper(w().calls.back().name, value, truth)) : truth;
}

// The call's result: the next answer laid down for its function, else the other value.
int32_t take(int32_t otherwise);

// "xaacfd" of "xaacfd_create".
std::string kind_of_call();

// The object behind the handle when it is alive and of that kind; else null and a fault.
object *checked(void *handle, const std::string &kind = kind_of_call());

// A new object of the call's kind, null when the call's result is a failure.
object *make(size_t script_number);
object *make();  // with the latest script
object *open_stream(void *demux, int32_t index);
void destroy(void *handle);

wexa_tags *make_tags(const script &what);

int32_t read_frame(void *handle, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                   int64_t *second);
int32_t move(void *handle, int64_t position, int64_t *reached, int32_t flags);
int32_t decode(void *handle, const wexa_frame *what, wexa_output *output, wexa_status *status);

}  // namespace scripted

#endif
