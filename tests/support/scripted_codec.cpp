#include "tests/support/scripted_codec.h"

#include <malloc.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <mutex>

namespace scripted {
namespace {

constexpr size_t kCallsKept = 1000;
constexpr int kMostRepeats = 1000;  // while tampering: an end that is hidden forever is a failure

std::mutex guard;

// A frame in its compressed form: enough to find it again.
struct label {
    char magic[8] = "SCFRAME";
    const frame *of = nullptr;
};

template <typename record>
void note(const record *handed) {
    all.calls.back().addresses.push_back(handed);
    all.calls.back().records.push_back(handed ? bytes_of(*handed) : "");
}

// Notes a call with the records handed over. What follows runs until the end of the call.
template <typename... record>
std::unique_lock<std::mutex> called(const char *name, const record *...records) {
    std::unique_lock<std::mutex> held(guard);
    if (all.tamper || all.calls.size() == kCallsKept) all.calls.clear();
    all.calls.push_back({name});
    (note(records), ...);
    return held;
}

// Returns -1.
int32_t fault(const std::string &reason) {
    all.faults.push_back(all.calls.back().name + ": " + reason);
    return -1;
}

// The call's answer for a value of that name.
template <typename number>
number told(const char *value, number truth) {
    if (!all.tamper) return truth;
    return static_cast<number>(all.tamper(all.calls.back().name, value, truth));
}

// The call's result: the next answer given for its function, else the other value.
int32_t take(int32_t otherwise) {
    std::deque<int32_t> &answers = all.answers[all.calls.back().name];
    if (!answers.empty()) {
        otherwise = answers.front();
        answers.pop_front();
    }
    return told("result", otherwise);
}

std::string kind_of_call() {
    const std::string &name = all.calls.back().name;
    return name.substr(0, name.find('_'));
}

// Returns the handle's object if it is alive and of that kind; else null, and records a fault.
object *checked(const void *handle, const std::string &kind = kind_of_call()) {
    for (object &each : all.alive) {
        if (&each == handle && each.kind == kind) return &each;
    }
    fault("no such object");
    return nullptr;
}

object *make(const script *plan = &all.scripts.back(), const object *demux = nullptr) {
    if (take(0) != 0) return nullptr;
    all.alive.push_back({{}, kind_of_call(), plan, demux});
    return &all.alive.back();
}

void destroy(const void *handle) {
    if (!checked(handle)) return;
    for (const object &each : all.alive) {
        if (each.demux == handle) fault("its stream is still open");
    }
    all.alive.remove_if([handle](const object &each) { return &each == handle; });
}

int32_t read_frame(void *handle, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                   int64_t *second) {
    all.calls.back().number = size;
    object *of = checked(handle);
    if (!of) return -1;
    if (of->kind == "xflacfd" && of->state[kFlacReaderFlag]-- != 1) fault("the flag is not set");
    const script &plan = *of->plan;
    const bool behind = of->place == plan.frames.size();
    const frame &now = behind ? plan.last : plan.frames[of->place++];
    const int32_t result = take(now.result);
    if (result != 0) return result;
    if (all.tamper && behind && ++of->repeats > kMostRepeats) return -1;
    label mark;
    mark.of = &now;
    const bool wav = of->kind == "xwavd";
    const void *from = wav ? static_cast<const void *>(now.pcm.data()) : &mark;
    const size_t length = wav ? now.pcm.size() * 2 : sizeof mark;
    if (size < 0 || length > static_cast<size_t>(size)) return fault("the buffer is too short");
    if (length > 0) memcpy(buf, from, length);
    *bytes = told("bytes", now.read_bytes.value_or(static_cast<int32_t>(length)));
    *first = told("first", now.start);
    *second = 0;
    return 0;
}

int32_t move(const void *handle, int64_t position, int64_t *reached, int32_t flags) {
    all.calls.back().number = flags;
    object *of = checked(handle);
    if (!of) return -1;
    const script &plan = *of->plan;
    if (of->seeks < plan.seeks.size()) {
        const seek &answer = plan.seeks[of->seeks++];
        if (reached && answer.reached) *reached = *answer.reached;
        return take(answer.result);
    }
    const int32_t result = take(0);
    if (result != 0) return result;
    const int64_t wanted = of->kind == "xwavd" ? position * 10'000'000 : position;
    of->place = 0;
    for (size_t i = 0; i < plan.frames.size(); ++i) {
        if (plan.frames[i].start <= wanted) of->place = i;
    }
    *reached = told("reached", plan.frames.empty() ? 0 : plan.frames[of->place].start);
    return 0;
}

int32_t decode(const void *handle, const wexa_frame *compressed, wexa_output *output,
               wexa_status *status) {
    const auto *bytes = static_cast<const char *>(compressed->data);
    all.calls.back().records.emplace_back(bytes, compressed->bytes);
    if (!checked(handle)) return -1;
    label mark = {"", nullptr};
    if (compressed->bytes >= static_cast<int32_t>(sizeof mark)) memcpy(&mark, bytes, sizeof mark);
    status->produced = 0;
    // The set-up data, or a frame cut short.
    if (strncmp(mark.magic, label().magic, 8) != 0) return take(output->data ? -1 : 0);
    const frame &now = *mark.of;
    const int32_t result = take(now.decode);
    if (result != 0) return result;
    status->produced = told("produced", now.produced);
    output->bytes = told("bytes", now.bytes.value_or(static_cast<int32_t>(now.pcm.size() * 2)));
    if (!now.pcm.empty()) memcpy(output->data, now.pcm.data(), now.pcm.size() * 2);
    return 0;
}

template <typename info>
void *create_file(info *to) {
    to->duration = told("duration", all.scripts.back().duration);
    to->tags = &all.tags.emplace_back();
    to->tags->last = malloc(24);
    for (wexa_tag_text &text : to->tags->text) text.data = malloc(24);
    for (wexa_tag_entry &entry : to->tags->entry) {
        entry.first = malloc(24);
        entry.second = malloc(24);
    }
    return make();
}

template <typename info>
void *create_container(info *to, int32_t *count) {
    const std::vector<int32_t> &kinds = all.scripts.back().kinds;
    *count =
        told("count", all.scripts.back().kind_count.value_or(static_cast<int32_t>(kinds.size())));
    for (size_t i = 0; i < kinds.size() && i < std::size(to->kind); ++i) {
        to->kind[i] = told("kind", kinds[i]);
    }
    return create_file(to);
}

// A stream's record, of whatever type.
template <typename info>
void tell_rate(info *to) {
    to->sample_rate = told("rate", all.scripts.back().sample_rate);
}
template <typename info>
void tell_rate_and_channels(info *to) {
    tell_rate(to);
    to->channels = told("channels", all.scripts.back().channels);
}

}  // namespace

std::vector<call> calls_of(const std::string &part) {
    std::vector<call> found;
    for (const call &each : all.calls) {
        if (each.name.find(part) != std::string::npos) found.push_back(each);
    }
    return found;
}

std::string call_names() {
    std::string names;
    for (const call &each : all.calls) names += each.name + " ";
    return names;
}

bool tags_are_empty() {
    const std::string empty = bytes_of(wexa_tags{});
    return std::all_of(all.tags.begin(), all.tags.end(),
                       [&empty](const wexa_tags &each) { return bytes_of(each) == empty; });
}

}  // namespace scripted

using namespace scripted;

// The functions that have one shape come from macros.
#define SCRIPTED_READ(function)                                                             \
    int32_t function(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first, \
                     int64_t *second) {                                                     \
        const auto held = called(__func__);                                                 \
        return read_frame(reader, buf, size, bytes, first, second);                         \
    }
#define SCRIPTED_SEEK_WITH_FLAGS(function)                                                     \
    int32_t function(void *reader, const int64_t *position, int64_t *reached, int32_t flags) { \
        const auto held = called(__func__, position, reached);                                 \
        return move(reader, *position, reached, flags);                                        \
    }
#define SCRIPTED_REMOVAL(function)          \
    void function(void *handle) {           \
        const auto held = called(__func__); \
        destroy(handle);                    \
    }
#define SCRIPTED_READER(reader, info_record, tell_stream)                                 \
    void *reader##_create(const mtsrc_io *io, int64_t *word, info_record *info, void *) { \
        const auto held = called(__func__, io, word, info);                               \
        tell_stream(info);                                                                \
        return create_file(info);                                                         \
    }                                                                                     \
    SCRIPTED_READ(reader##_get_frm)                                                       \
    int32_t reader##_seek(void *of, const int64_t *position, int64_t *reached) {          \
        const auto held = called(__func__, position, reached);                            \
        return move(of, *position, reached, 0);                                           \
    }                                                                                     \
    SCRIPTED_REMOVAL(reader##_delete)
#define SCRIPTED_CONTAINER(container, word_type, info_record, count)                           \
    void *container##_create(const mtsrc_io *io, word_type *word, info_record *info, void *) { \
        const auto held = called(__func__, io, word, info);                                    \
        return create_container(info, &info->count);                                           \
    }                                                                                          \
    SCRIPTED_READ(container##s_get_frm)                                                        \
    SCRIPTED_SEEK_WITH_FLAGS(container##s_seek)                                                \
    SCRIPTED_REMOVAL(container##s_close)                                                       \
    SCRIPTED_REMOVAL(container##_delete)                                                       \
    void *container##s_open(void *demux, int32_t index, void *) {                              \
        const auto held = called(__func__);                                                    \
        all.calls.back().number = index;                                                       \
        const object *of = checked(demux, #container);                                         \
        return of ? make(of->plan, of) : nullptr;                                              \
    }
#define SCRIPTED_DECODER(library, decoder, config_record)                                \
    int32_t library##_init(void) {                                                       \
        const auto held = called(__func__);                                              \
        return take(0);                                                                  \
    }                                                                                    \
    void library##_deinit(void) {                                                        \
        called(__func__);                                                                \
    }                                                                                    \
    void *decoder##_create(const config_record *config, void *) {                        \
        const auto held = called(__func__, config);                                      \
        return make();                                                                   \
    }                                                                                    \
    int32_t decoder##_decode(void *handle, const wexa_frame *frame, wexa_output *output, \
                             wexa_status *status) {                                      \
        const auto held = called(__func__, frame, output, status);                       \
        return decode(handle, frame, output, status);                                    \
    }                                                                                    \
    void decoder##_reset(void *handle) {                                                 \
        const auto held = called(__func__);                                              \
        checked(handle);                                                                 \
    }                                                                                    \
    SCRIPTED_REMOVAL(decoder##_delete)

extern "C" {

SCRIPTED_DECODER(xaac, xaacd, xaac_config)
SCRIPTED_DECODER(xflac, xflacd, wexa_config)
SCRIPTED_DECODER(xmp123, xmp123d, wexa_config)
SCRIPTED_DECODER(xvorbis, xvorbisd, wexa_config)
SCRIPTED_READER(xaacfd, xaac_info, tell_rate_and_channels)
SCRIPTED_READER(xflacfd, xflac_info, tell_rate)
SCRIPTED_READER(xmp123fd, xmp123_info, tell_rate_and_channels)
SCRIPTED_CONTAINER(xmp4fd, int32_t, xmp4_info, track_count)
SCRIPTED_CONTAINER(xoggd, int64_t, xogg_info, stream_count)
SCRIPTED_READ(xwavd_get_frm)
SCRIPTED_SEEK_WITH_FLAGS(xwavd_seek)
SCRIPTED_REMOVAL(xwavd_delete)

// The record is filled also when the answer is a failure.
void *xwavd_create(const mtsrc_io *io, xwav_info *info, int32_t *word) {
    const auto held = called(__func__, io, word, info);
    tell_rate_and_channels(info);
    info->codec = told("codec", all.scripts.back().codec.value_or(kWexaPcm));
    info->bits = told("bits", all.scripts.back().bits);
    info->duration = told("duration", all.scripts.back().duration);
    return make();
}

int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track) {
    const auto held = called(__func__, track);
    checked(stream);
    tell_rate_and_channels(track);
    track->format_tag = told("codec", all.scripts.back().codec.value_or(kWexaTagAac));
    return take(0);
}

int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    const auto held = called(__func__, info);
    checked(stream);
    tell_rate(info);
    info->codec = told("codec", all.scripts.back().codec.value_or(323));
    return take(0);
}

int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    const auto held = called(__func__, info, frame);
    checked(decoder);
    info->word_0 = 1;
    tell_rate(info);
    return take(0);
}

int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    const auto held = called(__func__);
    checked(stream);
    const int32_t result = take(0);
    if (result != 0) return result;
    const std::string &setup = all.scripts.back().setup;
    int32_t reported = all.scripts.back().setup_length.value_or(static_cast<int32_t>(setup.size()));
    if (buf) {  // *length says how much it holds
        reported = std::clamp(*length, 0, static_cast<int32_t>(setup.size()));
        memcpy(buf, setup.data(), static_cast<size_t>(reported));
        all.calls.back().number = static_cast<int32_t>(malloc_usable_size(buf));
    }
    *length = told("length", reported);
    return 0;
}
}
