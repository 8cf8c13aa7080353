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

// Where the record's buffers hang.
std::vector<void **> buffers_of(wexa_tags *tags) {
    std::vector<void **> places = {&tags->last};
    for (wexa_tag_text &text : tags->text) {
        places.push_back(&text.data);
    }
    for (wexa_tag_entry &entry : tags->entry) {
        places.insert(places.end(), {&entry.first, &entry.second});
    }
    return places;
}

const frame *find(const wexa_frame *of) {
    label mark;
    if (!of->data || of->bytes < static_cast<int32_t>(sizeof(mark))) {
        return nullptr;
    }
    memcpy(&mark, of->data, sizeof(mark));
    if (memcmp(mark.magic, "SCFR", 4) != 0 || mark.script >= w().scripts.size() ||
        mark.index >= w().scripts[mark.script].frames.size()) {
        return nullptr;
    }
    return &w().scripts[mark.script].frames[mark.index];
}

int64_t start_of(const script &what, size_t index) {
    const int64_t start = what.frames[index].start;
    return start < 0 ? static_cast<int64_t>(index) : start;
}

void fault(const std::string &what) {
    w().faults.push_back(w().calls.back().name + ": " + what);
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
    for (void **place : buffers_of(tags)) {
        *place = malloc(24);
    }
    w().tags.push_back(tags);
    return tags;
}

lock called(const char *name) {
    lock held(w().lock);
    if (w().tamper) {
        w().calls.clear();
    }
    w().calls.emplace_back();
    w().calls.back().name = name;
    return held;
}

int32_t take(int32_t otherwise) {
    std::deque<int32_t> &answers = w().answers[w().calls.back().name];
    if (!answers.empty()) {
        otherwise = answers.front();
        answers.pop_front();
    }
    return told("result", otherwise);
}

std::string kind_of_call() {
    const std::string &name = w().calls.back().name;
    return name.substr(0, name.find('_'));
}

object *checked(void *handle, const std::string &kind) {
    auto *of = static_cast<object *>(handle);
    if (!w().alive.count(of)) {
        fault("no such object");
        return nullptr;
    }
    if (of->kind != kind) {
        fault("object of kind " + of->kind);
        return nullptr;
    }
    return of;
}

object *make(size_t script_number) {
    if (take(0) != 0) {
        return nullptr;
    }
    auto *made = new object;
    made->kind = kind_of_call();
    made->script_number = script_number;
    made->what = &w().scripts[script_number];
    w().alive.insert(made);
    return made;
}

object *make() {
    return make(w().scripts.size() - 1);
}

object *open_stream(void *handle, int32_t index) {
    w().calls.back().number = index;
    const std::string kind = kind_of_call();  // the demuxer's and an s
    object *demux = checked(handle, kind.substr(0, kind.size() - 1));
    object *made = demux ? make(demux->script_number) : nullptr;
    if (made) {
        made->parent = demux;
        ++demux->streams;
    }
    return made;
}

void destroy(void *handle) {
    object *of = checked(handle);
    if (!of) {
        return;
    }
    if (of->streams != 0) {
        fault("its stream is still open");
    }
    if (of->parent && w().alive.count(of->parent)) {
        --of->parent->streams;
    }
    w().alive.erase(of);
    delete of;
}

int32_t read_frame(void *handle, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                   int64_t *second) {
    w().calls.back().number = size;
    object *of = checked(handle);
    if (!of) {
        return -1;
    }
    if (of->kind == "xflacfd") {
        if (of->state[kFlacReaderFlag] != 1) {
            fault("the flag is not set");
        }
        of->state[kFlacReaderFlag] = 0;
    }
    if (of->blanks < of->what->blanks) {
        ++of->blanks;
        w().calls.pop_back();
        *bytes = 0;
        return 0;
    }
    const std::vector<frame> &frames = of->what->frames;
    const frame *now = of->place < frames.size() ? &frames[of->place] : nullptr;
    const int32_t result = take(now ? now->result : 1);
    if (!now) {  // an end that is hidden is an empty frame, a thousand times
        *bytes = told("bytes", 0);
        const bool hidden = result == 0 && ++of->hidden_ends <= 1000;
        return result == 0 && !hidden ? -1 : result;
    }
    const size_t index = of->place++;
    if (result != 0) {
        return result;
    }
    label mark;
    mark.script = static_cast<uint32_t>(of->script_number);
    mark.index = static_cast<uint32_t>(index);
    const bool wav = of->kind == "xwavd";
    const void *from = wav ? static_cast<const void *>(now->pcm.data()) : &mark;
    const size_t length = wav ? now->pcm.size() * 2 : sizeof(mark);
    if (size < 0 || length > static_cast<size_t>(size)) {
        fault("the buffer is too short");
        return -1;
    }
    if (length > 0) {
        memcpy(buf, from, length);
    }
    *bytes = told("bytes", now->read_bytes.value_or(static_cast<int32_t>(length)));
    *first = told("first", start_of(*of->what, index));
    *second = 0;
    return 0;
}

int32_t move(void *handle, int64_t position, int64_t *reached, int32_t flags) {
    w().calls.back().number = flags;
    object *of = checked(handle);
    if (!of) {
        return -1;
    }
    const int32_t failure = take(0);
    const script &what = *of->what;
    if (of->seeks < what.seeks.size()) {
        const seek &answer = what.seeks[of->seeks++];
        if (reached && answer.reached) {
            *reached = *answer.reached;
        }
        return failure ? failure : answer.result;
    }
    if (failure) {
        return failure;
    }
    const int64_t wanted = of->kind == "xwavd" ? position * 10'000'000 : position;
    of->place = 0;
    *reached = 0;
    for (size_t i = 0; i < what.frames.size(); ++i) {
        if (start_of(what, i) <= wanted) {
            of->place = i;
            *reached = start_of(what, i);
        }
    }
    *reached = told("reached", *reached);
    return 0;
}

int32_t decode(void *handle, const wexa_frame *what, wexa_output *output, wexa_status *status) {
    if (what->data && what->bytes > 0) {
        const auto *bytes = static_cast<const uint8_t *>(what->data);
        w().calls.back().records.emplace_back(bytes, bytes + what->bytes);
    }
    if (!checked(handle)) {
        return -1;
    }
    const frame *now = find(what);
    if (!now) {  // the Vorbis set-up data, or a frame cut short by read_bytes
        status->produced = 0;
        return take(output->data ? -1 : 0);
    }
    const int32_t result = take(now->decode);
    if (result != 0) {
        return result;
    }
    status->produced = told("produced", now->produced);
    output->bytes = told("bytes", now->bytes.value_or(static_cast<int32_t>(now->pcm.size() * 2)));
    if (!now->pcm.empty()) {
        memcpy(output->data, now->pcm.data(), now->pcm.size() * 2);
    }
    return 0;
}

void reset() {
    const lock held(w().lock);
    for (wexa_tags *tags : w().tags) {
        free(tags);
    }
    for (object *left : w().alive) {
        delete left;
    }
    static_cast<contents &>(w()) = contents{};
}

void tamper(tampering with) {
    const lock held(w().lock);
    w().tamper = with;
}

void use(const script &what) {
    const lock held(w().lock);
    w().scripts.push_back(what);
}

void answer(const std::string &name, const std::vector<int32_t> &results) {
    const lock held(w().lock);
    w().answers[name].assign(results.begin(), results.end());
}

std::vector<call> calls_of(const std::string &name) {
    const lock held(w().lock);
    std::vector<call> found;
    for (const call &one : w().calls) {
        if (one.name == name) {
            found.push_back(one);
        }
    }
    return found;
}

std::vector<std::string> call_names() {
    const lock held(w().lock);
    std::vector<std::string> names;
    for (const call &one : w().calls) {
        names.push_back(one.name);
    }
    return names;
}

void forget_calls() {
    const lock held(w().lock);
    w().calls.clear();
}

int live_objects() {
    const lock held(w().lock);
    return static_cast<int>(w().alive.size());
}

int tag_buffers_left() {
    const lock held(w().lock);
    int count = 0;
    for (wexa_tags *tags : w().tags) {
        for (void **place : buffers_of(tags)) {
            count += *place != nullptr;
        }
    }
    return count;
}

std::vector<std::string> faults() {
    const lock held(w().lock);
    return w().faults;
}

script song(const std::vector<int16_t> &interleaved, int32_t channels, int32_t sample_rate,
            int32_t frame_samples) {
    script made;
    made.sample_rate = sample_rate;
    made.channels = channels;
    const auto total = static_cast<int64_t>(interleaved.size()) / channels;
    made.duration = total * 10'000'000 / sample_rate;
    for (int64_t at = 0; at < total; at += frame_samples) {
        const int64_t end = std::min(total, at + frame_samples);
        frame one;
        one.pcm.assign(interleaved.begin() + at * channels, interleaved.begin() + end * channels);
        one.start = at * 10'000'000 / sample_rate;
        made.frames.push_back(one);
    }
    return made;
}

}  // namespace scripted
