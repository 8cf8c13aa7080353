// The codec library's functions, each noting its call and playing the script.
#include <malloc.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "tests/support/scripted_world.h"

namespace scripted {
namespace {

// A frame in its compressed form: enough to find it again.
struct label {
    char magic[8];  // "SCFRAME"
    const frame *of;
};

template <typename record>
void note(const record *handed) {
    const auto *bytes = reinterpret_cast<const uint8_t *>(handed);
    all.calls.back().addresses.push_back(handed);
    all.calls.back().records.emplace_back(bytes, bytes + (handed ? sizeof(record) : 0));
}

// Notes a call with the records handed over. What follows runs until the end of the call.
template <typename... record>
lock called(const char *name, const record *...records) {
    lock held(guard);
    if (all.tamper) all.calls.clear();
    all.calls.emplace_back();
    all.calls.back().name = name;
    (note(records), ...);
    return held;
}

void fault(const std::string &reason) {
    all.faults.push_back(all.calls.back().name + ": " + reason);
}

const script &latest() {
    return all.scripts.back();
}

// What the call hands back for a value of that name.
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

// The object behind the handle when it is alive and of that kind; else null and a fault.
object *checked(void *handle, const std::string &kind = kind_of_call()) {
    auto *of = static_cast<object *>(handle);
    if (all.alive.count(of) && of->kind == kind) return of;
    fault("no such object");
    return nullptr;
}

object *make(const script *plan = &latest()) {
    if (take(0) != 0) return nullptr;
    auto *made = new object;
    made->kind = kind_of_call();
    made->plan = plan;
    all.alive.insert(made);
    return made;
}

object *open_stream(void *handle, int32_t index) {
    all.calls.back().number = index;
    const std::string kind = kind_of_call();  // the demuxer's and an s
    object *demux = checked(handle, kind.substr(0, kind.size() - 1));
    object *made = demux ? make(demux->plan) : nullptr;
    if (made) {
        made->demux = demux;
        ++demux->streams;
    }
    return made;
}

void destroy(void *handle) {
    object *of = checked(handle);
    if (!of) return;
    if (of->streams != 0) fault("its stream is still open");
    if (of->demux && all.alive.count(of->demux)) --of->demux->streams;
    all.alive.erase(of);
    delete of;
}

int64_t start_of(const script &plan, size_t index) {
    const int64_t start = plan.frames[index].start;
    return start < 0 ? static_cast<int64_t>(index) : start;
}

int32_t read_frame(void *handle, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                   int64_t *second) {
    all.calls.back().number = size;
    object *of = checked(handle);
    if (!of) return -1;
    if (of->kind == "xflacfd" && of->state[kFlacReaderFlag]-- != 1) fault("the flag is not set");
    if (of->blanks < of->plan->blanks) {
        ++of->blanks;
        all.calls.pop_back();
        *bytes = 0;
        return 0;
    }
    if (of->place == of->plan->frames.size()) {  // an end that is hidden is an empty frame
        const int32_t result = take(kWexaEndOfStream);
        *bytes = told("bytes", 0);
        return result == 0 && ++of->hidden_ends > 1000 ? -1 : result;
    }
    const size_t index = of->place++;
    const frame &now = of->plan->frames[index];
    const label mark = {"SCFRAME", &now};
    const int32_t result = take(now.result);
    if (result != 0) return result;
    const bool wav = of->kind == "xwavd";
    const void *from = wav ? static_cast<const void *>(now.pcm.data()) : &mark;
    const size_t length = wav ? now.pcm.size() * 2 : sizeof mark;
    if (size < 0 || length > static_cast<size_t>(size)) {
        fault("the buffer is too short");
        return -1;
    }
    if (length > 0) memcpy(buf, from, length);
    *bytes = told("bytes", now.read_bytes.value_or(static_cast<int32_t>(length)));
    *first = told("first", start_of(*of->plan, index));
    *second = 0;
    return 0;
}

int32_t move(void *handle, int64_t position, int64_t *reached, int32_t flags) {
    all.calls.back().number = flags;
    object *of = checked(handle);
    if (!of) return -1;
    const int32_t failure = take(0);
    const script &plan = *of->plan;
    if (of->seeks < plan.seeks.size()) {
        const seek &answer = plan.seeks[of->seeks++];
        if (reached && answer.reached) *reached = *answer.reached;
        return failure ? failure : answer.result;
    }
    if (failure) return failure;
    const int64_t wanted = of->kind == "xwavd" ? position * 10'000'000 : position;
    of->place = 0;
    for (size_t i = 0; i < plan.frames.size(); ++i) {
        if (start_of(plan, i) <= wanted) of->place = i;
    }
    *reached = told("reached", plan.frames.empty() ? 0 : start_of(plan, of->place));
    return 0;
}

const frame *find(const wexa_frame *compressed) {
    label mark = {"", nullptr};
    if (!compressed->data || compressed->bytes < static_cast<int32_t>(sizeof mark)) return nullptr;
    memcpy(&mark, compressed->data, sizeof mark);
    return memcmp(mark.magic, "SCFRAME", sizeof mark.magic) == 0 ? mark.of : nullptr;
}

int32_t decode(void *handle, const wexa_frame *compressed, wexa_output *output,
               wexa_status *status) {
    if (compressed->data && compressed->bytes > 0) {
        const auto *bytes = static_cast<const uint8_t *>(compressed->data);
        all.calls.back().records.emplace_back(bytes, bytes + compressed->bytes);
    }
    if (!checked(handle)) return -1;
    const frame *now = find(compressed);
    if (!now) {  // the Vorbis set-up data, or a frame cut short by read_bytes
        status->produced = 0;
        return take(output->data ? -1 : 0);
    }
    const int32_t result = take(now->decode);
    if (result != 0) return result;
    status->produced = told("produced", now->produced);
    output->bytes = told("bytes", now->bytes.value_or(static_cast<int32_t>(now->pcm.size() * 2)));
    if (!now->pcm.empty()) memcpy(output->data, now->pcm.data(), now->pcm.size() * 2);
    return 0;
}

template <typename info>
void *create_file(info *to) {
    to->duration = told("duration", latest().duration);
    if (latest().tags) {
        to->tags = static_cast<wexa_tags *>(calloc(1, sizeof(wexa_tags)));
        for (void **place : buffers_of(to->tags)) *place = malloc(24);
        all.tags.push_back(to->tags);
    }
    return make();
}

template <typename info>
void *create_container(info *to, int32_t *count) {
    const std::vector<int32_t> &kinds = latest().kinds;
    *count = told("count", latest().kind_count.value_or(static_cast<int32_t>(kinds.size())));
    for (size_t i = 0; i < kinds.size() && i < std::size(to->kind); ++i) {
        to->kind[i] = told("kind", kinds[i]);
    }
    return create_file(to);
}

int32_t rate() {
    return told("rate", latest().sample_rate);
}
int32_t channels() {
    return told("channels", latest().channels);
}

}  // namespace

}  // namespace scripted

using namespace scripted;

// The functions that have one shape come from macros.
#define SCRIPTED_READ(function)                                                             \
    int32_t function(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first, \
                     int64_t *second) {                                                     \
        const auto held = called(__func__);                                                 \
        return read_frame(reader, buf, size, bytes, first, second);                         \
    }
#define SCRIPTED_SEEK(function)                                                 \
    int32_t function(void *reader, const int64_t *position, int64_t *reached) { \
        const auto held = called(__func__, position, reached);                  \
        return move(reader, *position, reached, 0);                             \
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
#define SCRIPTED_READER(reader)     \
    SCRIPTED_READ(reader##_get_frm) \
    SCRIPTED_SEEK(reader##_seek)    \
    SCRIPTED_REMOVAL(reader##_delete)
#define SCRIPTED_CONTAINER(container)                             \
    SCRIPTED_READ(container##s_get_frm)                           \
    SCRIPTED_SEEK_WITH_FLAGS(container##s_seek)                   \
    SCRIPTED_REMOVAL(container##s_close)                          \
    SCRIPTED_REMOVAL(container##_delete)                          \
    void *container##s_open(void *demux, int32_t index, void *) { \
        const auto held = called(__func__);                       \
        return open_stream(demux, index);                         \
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
SCRIPTED_READER(xaacfd)
SCRIPTED_READER(xflacfd)
SCRIPTED_READER(xmp123fd)
SCRIPTED_CONTAINER(xmp4fd)
SCRIPTED_CONTAINER(xoggd)
SCRIPTED_READ(xwavd_get_frm)
SCRIPTED_SEEK_WITH_FLAGS(xwavd_seek)
SCRIPTED_REMOVAL(xwavd_delete)

// The record is filled also when the answer is a failure.
void *xwavd_create(const mtsrc_io *io, xwav_info *info, int32_t *word) {
    const auto held = called(__func__, io, word, info);
    *info = {told("codec", latest().codec.value_or(kWexaPcm)),
             {},
             rate(),
             told("bits", latest().bits),
             channels(),
             told("duration", latest().duration),
             0};
    return make();
}

void *xaacfd_create(const mtsrc_io *io, int64_t *word, xaac_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    info->sample_rate = rate();
    info->channels = channels();
    return create_file(info);
}

void *xflacfd_create(const mtsrc_io *io, int64_t *word, xflac_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    info->sample_rate = rate();
    return create_file(info);
}

void *xmp123fd_create(const mtsrc_io *io, int64_t *word, xmp123_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    info->sample_rate = rate();
    info->channels = channels();
    return create_file(info);
}

void *xmp4fd_create(const mtsrc_io *io, int32_t *word, xmp4_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    return create_container(info, &info->track_count);
}

void *xoggd_create(const mtsrc_io *io, int64_t *word, xogg_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    return create_container(info, &info->stream_count);
}

int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track) {
    const auto held = called(__func__, track);
    checked(stream);
    track->format_tag = told("codec", latest().codec.value_or(kWexaTagAac));
    track->sample_rate = rate();
    track->channels = channels();
    return take(0);
}

int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    const auto held = called(__func__, info);
    checked(stream);
    info->codec = told("codec", latest().codec.value_or(323));
    info->sample_rate = rate();
    return take(0);
}

int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    const auto held = called(__func__, info, frame);
    checked(decoder);
    info->word_0 = 1;
    info->sample_rate = rate();
    return take(0);
}

int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    const auto held = called(__func__);
    checked(stream);
    all.calls.back().number = static_cast<int32_t>(malloc_usable_size(buf));
    const int32_t result = take(0);
    if (result != 0) return result;
    const std::vector<uint8_t> &setup = latest().setup;
    int32_t reported = latest().setup_length.value_or(static_cast<int32_t>(setup.size()));
    if (buf) {  // *length says how much it holds
        reported = std::clamp(*length, 0, static_cast<int32_t>(setup.size()));
        memcpy(buf, setup.data(), static_cast<size_t>(reported));
    }
    *length = told("length", reported);
    return 0;
}
}
