#include "tests/support/scripted_codec.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "tests/support/scripted_objects.h"

namespace scripted {
namespace {

// The compressed form of a frame: enough to find it again.
struct label {
    char magic[4] = {'S', 'C', 'F', 'R'};
    uint32_t script = 0;
    uint32_t index = 0;
    uint32_t zero = 0;
};

void for_each_tag(wexa_tags *tags, void (*act)(void **, int *), int *count) {
    for (wexa_tag_text &text : tags->text) {
        act(&text.data, count);
    }
    for (wexa_tag_entry &entry : tags->entry) {
        act(&entry.first, count);
        act(&entry.second, count);
    }
    act(&tags->last, count);
}

const frame *next_frame(object *of) {
    return of->place < of->what->frames.size() ? &of->what->frames[of->place] : nullptr;
}

const frame *find(const wexa_frame *of) {
    label mark;
    if (!of->data || of->bytes < static_cast<int32_t>(sizeof(mark))) {
        return nullptr;
    }
    memcpy(&mark, of->data, sizeof(mark));
    if (memcmp(mark.magic, "SCFR", 4) != 0 || mark.script >= w().scripts.size() ||
        mark.index >= w().scripts[mark.script]->frames.size()) {
        return nullptr;
    }
    return &w().scripts[mark.script]->frames[mark.index];
}

}  // namespace

world &w() {
    static world one;
    return one;
}

wexa_tags *make_tags(const script &what) {
    if (!what.tags) {
        return nullptr;
    }
    auto *tags = static_cast<wexa_tags *>(calloc(1, sizeof(wexa_tags)));
    for_each_tag(
        tags, [](void **place, int *) { *place = malloc(24); }, nullptr);
    w().tags.push_back(tags);
    return tags;
}

int32_t take(const std::string &name, int32_t otherwise) {
    auto found = w().answers.find(name);
    if (found == w().answers.end() || found->second.empty()) {
        return told(name, "result", otherwise);
    }
    const int32_t result = found->second.front();
    found->second.pop_front();
    return told(name, "result", result);
}

call &note(const char *name, void *of, int32_t result) {
    if (w().tamper) {
        w().calls.clear();
    }
    w().calls.emplace_back();
    call &made = w().calls.back();
    made.name = name;
    made.object = of;
    made.result = result;
    return made;
}

object *checked(const char *name, void *handle, const char *kind) {
    auto *of = static_cast<object *>(handle);
    if (!w().alive.count(of)) {
        w().faults.push_back(std::string(name) + ": no such object");
        return nullptr;
    }
    if (of->kind != kind) {
        w().faults.push_back(std::string(name) + ": object of kind " + of->kind);
        return nullptr;
    }
    return of;
}

object *make(const char *kind, size_t script_number) {
    auto *made = new object;
    made->kind = kind;
    made->script_number = script_number;
    made->what =
        w().scripts.empty() ? std::make_shared<const script>() : w().scripts[script_number];
    w().alive.insert(made);
    return made;
}

void destroy(const char *name, void *handle, const char *kind) {
    guard held(w().lock);
    note(name, handle, 0);
    object *of = checked(name, handle, kind);
    if (!of) {
        return;
    }
    if (of->streams != 0) {
        w().faults.push_back(std::string(name) + ": its stream is still open");
    }
    if (of->parent && w().alive.count(of->parent)) {
        --of->parent->streams;
    }
    w().alive.erase(of);
    delete of;
}

int32_t init(const char *name, const char *library) {
    guard held(w().lock);
    const int32_t result = take(name, 0);
    note(name, nullptr, result);
    if (result == 0) {
        ++w().balance[library];
    }
    return result;
}

void deinit(const char *name, const char *library) {
    guard held(w().lock);
    note(name, nullptr, 0);
    --w().balance[library];
}

int32_t get_frm(const char *name, const char *kind, void *handle, void *buf, int32_t size,
                int32_t *bytes, int64_t *first, int64_t *second) {
    guard held(w().lock);
    call &noted = note(name, handle, 0);
    noted.number = size;
    object *of = checked(name, handle, kind);
    if (!of) {
        return noted.result = -1;
    }
    if (of->kind == "xflacfd") {
        w().flac_flag = w().flac_flag && of->state[kFlacReaderFlag] == 1;
        of->state[kFlacReaderFlag] = 0;
    }
    const frame *now = next_frame(of);
    noted.result = take(name, now ? now->result : 1);
    if (!now) {  // an end that is hidden is an empty frame
        *bytes = told(name, "bytes", 0);
        return noted.result;
    }
    const size_t index = of->place++;
    if (noted.result != 0) {
        return noted.result;
    }
    label mark;
    mark.script = static_cast<uint32_t>(of->script_number);
    mark.index = static_cast<uint32_t>(index);
    const bool wav = of->kind == "xwavd";
    const void *from = wav ? static_cast<const void *>(now->pcm.data()) : &mark;
    const size_t length = wav ? now->pcm.size() * 2 : sizeof(mark);
    if (size < 0 || length > static_cast<size_t>(size)) {
        w().faults.push_back(std::string(name) + ": the buffer is too short");
        return noted.result = -1;
    }
    if (length > 0) {
        memcpy(buf, from, length);
    }
    *bytes = told(name, "bytes", now->read_bytes.value_or(static_cast<int32_t>(length)));
    *first = told(name, "first", now->start < 0 ? static_cast<int64_t>(index) : now->start);
    *second = 0;
    return 0;
}

int32_t move(const char *name, const char *kind, void *handle, const int64_t *position,
             int64_t *reached, int32_t flags) {
    guard held(w().lock);
    call &noted = note(name, handle, 0);
    noted.number = flags;
    hand(noted, position);
    object *of = checked(name, handle, kind);
    if (!of) {
        return noted.result = -1;
    }
    const int32_t failure = take(name, 0);
    const script &what = *of->what;
    if (of->seeks < what.seeks.size()) {
        const seek &told = what.seeks[of->seeks++];
        if (told.reached) {
            *reached = *told.reached;
        }
        return noted.result = failure ? failure : told.result;
    }
    if (failure) {
        return noted.result = failure;
    }
    const int64_t wanted = of->kind == "xwavd" ? *position * 10'000'000 : *position;
    of->place = 0;
    *reached = 0;
    for (size_t i = 0; i < what.frames.size(); ++i) {
        const int64_t start =
            what.frames[i].start < 0 ? static_cast<int64_t>(i) : what.frames[i].start;
        if (start <= wanted) {
            of->place = i;
            *reached = start;
        }
    }
    *reached = told(name, "reached", *reached);
    return 0;
}

int32_t decode(const char *name, const char *kind, void *handle, const wexa_frame *what,
               wexa_output *output, wexa_status *status) {
    guard held(w().lock);
    call &noted = note(name, handle, 0);
    hand(noted, what);
    hand(noted, output);
    hand(noted, status);
    if (what->data && what->bytes > 0) {
        const auto *bytes = static_cast<const uint8_t *>(what->data);
        noted.records.emplace_back(bytes, bytes + what->bytes);
    }
    if (!checked(name, handle, kind)) {
        return noted.result = -1;
    }
    const frame *now = find(what);
    if (!now) {  // the Vorbis set-up data, or a frame cut short by read_bytes
        status->produced = 0;
        return noted.result = take(name, output->data ? -1 : 0);
    }
    noted.result = take(name, now->decode);
    if (noted.result != 0) {
        return noted.result;
    }
    status->produced = told(name, "produced", now->produced);
    output->bytes =
        told(name, "bytes", now->bytes.value_or(static_cast<int32_t>(now->pcm.size() * 2)));
    if (!now->pcm.empty()) {
        memcpy(output->data, now->pcm.data(), now->pcm.size() * 2);
    }
    return 0;
}

void decoder_reset(const char *name, const char *kind, void *handle) {
    guard held(w().lock);
    note(name, handle, 0);
    checked(name, handle, kind);
}

void *open_stream(const char *name, const char *kind, void *handle, const char *demux_kind,
                  int32_t index) {
    guard held(w().lock);
    object *demux = checked(name, handle, demux_kind);
    const int32_t failure = demux ? take(name, 0) : -1;
    object *made = failure ? nullptr : make(kind, demux->script_number);
    if (made) {
        made->parent = demux;
        ++demux->streams;
    }
    note(name, made, failure).number = index;
    return made;
}

void reset() {
    guard held(w().lock);
    for (wexa_tags *tags : w().tags) {
        free(tags);
    }
    for (object *left : w().alive) {
        delete left;
    }
    w().tags.clear();
    w().alive.clear();
    w().scripts.clear();
    w().current = 0;
    w().by_path.clear();
    w().answers.clear();
    w().calls.clear();
    w().balance.clear();
    w().faults.clear();
    w().flac_flag = true;
    w().tamper = nullptr;
}

void tamper(tampering with) {
    guard held(w().lock);
    w().tamper = with;
}

void use(const script &what) {
    guard held(w().lock);
    w().scripts.push_back(std::make_shared<const script>(what));
    w().current = w().scripts.size() - 1;
}

void use(const std::string &path, const script &what) {
    guard held(w().lock);
    w().scripts.push_back(std::make_shared<const script>(what));
    w().by_path[path] = w().scripts.size() - 1;
}

void answer(const std::string &name, const std::vector<int32_t> &results) {
    guard held(w().lock);
    w().answers[name].assign(results.begin(), results.end());
}

std::vector<call> calls() {
    guard held(w().lock);
    return w().calls;
}

std::vector<call> calls_of(const std::string &name) {
    guard held(w().lock);
    std::vector<call> found;
    for (const call &one : w().calls) {
        if (one.name == name) {
            found.push_back(one);
        }
    }
    return found;
}

std::vector<std::string> call_names() {
    guard held(w().lock);
    std::vector<std::string> names;
    for (const call &one : w().calls) {
        names.push_back(one.name);
    }
    return names;
}

void forget_calls() {
    guard held(w().lock);
    w().calls.clear();
}

int live_objects() {
    guard held(w().lock);
    return static_cast<int>(w().alive.size());
}

int balance(const std::string &library) {
    guard held(w().lock);
    return w().balance[library];
}

int tag_buffers_left() {
    guard held(w().lock);
    int count = 0;
    for (wexa_tags *tags : w().tags) {
        for_each_tag(
            tags, [](void **place, int *left) { *left += *place != nullptr; }, &count);
    }
    return count;
}

std::vector<std::string> faults() {
    guard held(w().lock);
    return w().faults;
}

bool flac_flag_always_set() {
    guard held(w().lock);
    return w().flac_flag;
}

script song(const std::vector<int16_t> &interleaved, int32_t channels, int32_t sample_rate,
            int32_t frame_samples) {
    script made;
    made.sample_rate = sample_rate;
    made.channels = channels;
    const size_t total = interleaved.size() / static_cast<size_t>(channels);
    made.duration = static_cast<int64_t>(total) * 10'000'000 / sample_rate;
    for (size_t at = 0; at < total; at += static_cast<size_t>(frame_samples)) {
        const size_t end = std::min(total, at + static_cast<size_t>(frame_samples));
        frame one;
        one.pcm.assign(
            interleaved.begin() + static_cast<std::ptrdiff_t>(at * static_cast<size_t>(channels)),
            interleaved.begin() + static_cast<std::ptrdiff_t>(end * static_cast<size_t>(channels)));
        one.start = static_cast<int64_t>(at) * 10'000'000 / sample_rate;
        made.frames.push_back(one);
    }
    return made;
}

}  // namespace scripted
