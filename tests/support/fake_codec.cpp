#include "tests/support/fake_codec.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <mutex>

namespace fake_codec {
namespace {

constexpr size_t kMaxCalls = 1000;

std::mutex mutex;

template <typename record>
void record_argument(const record *argument) {
    state.calls.back().addresses.push_back(argument);
    state.calls.back().records.push_back(argument ? bytes_of(*argument) : "");
}

// Records a call and its arguments. The caller holds the returned lock for the rest of the call.
template <typename... record>
std::unique_lock<std::mutex> record_call(const char *name, const record *...arguments) {
    std::unique_lock<std::mutex> lock(mutex);
    if (state.calls.size() == kMaxCalls) state.calls.clear();
    state.calls.push_back({name});
    (record_argument(arguments), ...);
    return lock;
}

// Records a misuse by the current call and returns -1.
int32_t record_misuse(const std::string &reason) {
    state.misuses.push_back(state.calls.back().name + ": " + reason);
    return -1;
}

// Returns the result of the current call: the next one specified for the function, or the default.
int32_t next_result(int32_t default_result) {
    std::deque<int32_t> &results = state.results[state.calls.back().name];
    if (results.empty()) return default_result;
    const int32_t result = results.front();
    results.pop_front();
    return result;
}

std::string kind_of_call() {
    const std::string &name = state.calls.back().name;
    return name.substr(0, name.find('_'));
}

// Returns the object of a handle. If it does not exist, records a misuse and returns null.
object *find_object(const void *handle, const std::string &kind = kind_of_call()) {
    for (object &each : state.objects) {
        if (&each == handle && each.kind == kind) return &each;
    }
    record_misuse("no such object");
    return nullptr;
}

object *create_object(const stream_spec *stream = &state.streams.back(),
                      const object *demux = nullptr) {
    if (next_result(0) != 0) return nullptr;
    state.objects.push_back({{}, kind_of_call(), stream, demux});
    return &state.objects.back();
}

void delete_object(const void *handle) {
    if (!find_object(handle)) return;
    for (const object &each : state.objects) {
        if (each.demux == handle) record_misuse("its stream is still open");
    }
    state.objects.remove_if([handle](const object &each) { return &each == handle; });
}

int32_t read_frame(void *handle, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                   int64_t *second) {
    state.calls.back().number = size;
    object *reader = find_object(handle);
    if (!reader) return -1;
    if (reader->kind == "xflacfd" && reader->reserved[kFlacReaderFlag]-- != 1) {
        record_misuse("the flag is not set");
    }
    const stream_spec &stream = *reader->stream;
    const bool past_end = reader->next_frame == stream.frames.size();
    const frame *next = past_end ? &stream.last : &stream.frames[reader->next_frame++];
    const int32_t result = next_result(next->read_result);
    if (result != 0) return result;
    const bool wav = reader->kind == "xwavd";  // other readers deliver the frame's address
    const void *data = wav ? static_cast<const void *>(next->pcm.data()) : &next;
    const size_t length = wav ? next->pcm.size() * 2 : sizeof next;
    if (size < 0 || length > static_cast<size_t>(size)) {
        return record_misuse("the buffer is too short");
    }
    if (length > 0) memcpy(buf, data, length);
    *bytes = next->read_bytes.value_or(static_cast<int32_t>(length));
    *first = next->start;
    *second = 0;
    return 0;
}

int32_t seek(const void *handle, int64_t *reached, int32_t flags) {
    state.calls.back().number = flags;
    object *reader = find_object(handle);
    if (!reader) return -1;
    const stream_spec &stream = *reader->stream;
    if (reader->seeks < stream.seeks.size()) {
        const seek_reply &reply = stream.seeks[reader->seeks++];
        if (reached && reply.reached) *reached = *reply.reached;
        return next_result(reply.result);
    }
    return next_result(0);
}

int32_t decode(const void *handle, const wexa_frame *input, wexa_output *output,
               wexa_status *status) {
    const auto *bytes = static_cast<const char *>(input->data);
    state.calls.back().records.emplace_back(bytes, input->bytes);
    if (!find_object(handle)) return -1;
    status->produced = 0;
    if (!output->data) return next_result(0);  // the input is the set-up data
    const frame *original = nullptr;
    memcpy(&original, bytes, sizeof original);
    const frame &decoded = *original;
    const int32_t result = next_result(decoded.decode_result);
    if (result != 0) return result;
    const auto pcm_bytes = static_cast<int32_t>(decoded.pcm.size() * 2);
    status->produced = decoded.produced;
    output->bytes = decoded.bytes.value_or(pcm_bytes);
    if (!decoded.pcm.empty()) memcpy(output->data, decoded.pcm.data(), decoded.pcm.size() * 2);
    return 0;
}

template <typename info>
void *create_reader(info *record) {
    record->duration = state.streams.back().duration;
    record->tags = &state.tags.emplace_back();
    record->tags->last = malloc(24);
    for (wexa_tag_text &text : record->tags->text) text.data = malloc(24);
    for (wexa_tag_entry &entry : record->tags->entry) {
        entry.first = malloc(24);
        entry.second = malloc(24);
    }
    return create_object();
}

template <typename info>
void *create_demuxer(info *record, int32_t *count) {
    const std::vector<int32_t> &kinds = state.streams.back().kinds;
    *count = state.streams.back().kind_count.value_or(static_cast<int32_t>(kinds.size()));
    for (size_t i = 0; i < kinds.size() && i < std::size(record->kind); ++i) {
        record->kind[i] = kinds[i];
    }
    return create_reader(record);
}

// These functions fill information records of any type.
template <typename info>
void report_rate(info *record) {
    record->sample_rate = state.streams.back().sample_rate;
}
template <typename info>
void report_rate_and_channels(info *record) {
    report_rate(record);
    record->channels = state.streams.back().channels;
}

}  // namespace

std::vector<call> calls_of(const std::string &part) {
    std::vector<call> found;
    for (const call &recorded : state.calls) {
        if (recorded.name.find(part) != std::string::npos) found.push_back(recorded);
    }
    return found;
}

std::string call_names() {
    std::string names;
    for (const call &recorded : state.calls) names += recorded.name + " ";
    return names;
}

bool tags_are_empty() {
    const std::string empty = bytes_of(wexa_tags{});
    return std::all_of(state.tags.begin(), state.tags.end(),
                       [&empty](const wexa_tags &each) { return bytes_of(each) == empty; });
}

}  // namespace fake_codec

using namespace fake_codec;

// These macros define functions that have the same signature in several parts of the library.
#define FAKE_READ(function)                                                                 \
    int32_t function(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first, \
                     int64_t *second) {                                                     \
        const auto lock = record_call(__func__);                                            \
        return read_frame(reader, buf, size, bytes, first, second);                         \
    }
#define FAKE_SEEK_WITH_FLAGS(function)                                                         \
    int32_t function(void *reader, const int64_t *position, int64_t *reached, int32_t flags) { \
        const auto lock = record_call(__func__, position, reached);                            \
        return seek(reader, reached, flags);                                                   \
    }
#define FAKE_REMOVAL(function)                   \
    void function(void *handle) {                \
        const auto lock = record_call(__func__); \
        delete_object(handle);                   \
    }
#define FAKE_READER(reader, info_record, report_stream)                                   \
    void *reader##_create(const mtsrc_io *io, int64_t *word, info_record *info, void *) { \
        const auto lock = record_call(__func__, io, word, info);                          \
        report_stream(info);                                                              \
        return create_reader(info);                                                       \
    }                                                                                     \
    FAKE_READ(reader##_get_frm)                                                           \
    int32_t reader##_seek(void *handle, const int64_t *position, int64_t *reached) {      \
        const auto lock = record_call(__func__, position, reached);                       \
        return seek(handle, reached, 0);                                                  \
    }                                                                                     \
    FAKE_REMOVAL(reader##_delete)
#define FAKE_CONTAINER(container, word_type, info_record, count)                               \
    void *container##_create(const mtsrc_io *io, word_type *word, info_record *info, void *) { \
        const auto lock = record_call(__func__, io, word, info);                               \
        return create_demuxer(info, &info->count);                                             \
    }                                                                                          \
    FAKE_READ(container##s_get_frm)                                                            \
    FAKE_SEEK_WITH_FLAGS(container##s_seek)                                                    \
    FAKE_REMOVAL(container##s_close)                                                           \
    FAKE_REMOVAL(container##_delete)                                                           \
    void *container##s_open(void *demux, int32_t index, void *) {                              \
        const auto lock = record_call(__func__);                                               \
        state.calls.back().number = index;                                                     \
        const object *parent = find_object(demux, #container);                                 \
        return parent ? create_object(parent->stream, parent) : nullptr;                       \
    }
#define FAKE_DECODER(library, decoder, config_record)                                    \
    int32_t library##_init(void) {                                                       \
        const auto lock = record_call(__func__);                                         \
        return next_result(0);                                                           \
    }                                                                                    \
    void library##_deinit(void) {                                                        \
        record_call(__func__);                                                           \
    }                                                                                    \
    void *decoder##_create(const config_record *config, void *) {                        \
        const auto lock = record_call(__func__, config);                                 \
        return create_object();                                                          \
    }                                                                                    \
    int32_t decoder##_decode(void *handle, const wexa_frame *frame, wexa_output *output, \
                             wexa_status *status) {                                      \
        const auto lock = record_call(__func__, frame, output, status);                  \
        return decode(handle, frame, output, status);                                    \
    }                                                                                    \
    void decoder##_reset(void *handle) {                                                 \
        const auto lock = record_call(__func__);                                         \
        find_object(handle);                                                             \
    }                                                                                    \
    FAKE_REMOVAL(decoder##_delete)

extern "C" {

FAKE_DECODER(xaac, xaacd, xaac_config)
FAKE_DECODER(xflac, xflacd, wexa_config)
FAKE_DECODER(xmp123, xmp123d, wexa_config)
FAKE_DECODER(xvorbis, xvorbisd, wexa_config)
FAKE_READER(xaacfd, xaac_info, report_rate_and_channels)
FAKE_READER(xflacfd, xflac_info, report_rate)
FAKE_READER(xmp123fd, xmp123_info, report_rate_and_channels)
FAKE_CONTAINER(xmp4fd, int32_t, xmp4_info, track_count)
FAKE_CONTAINER(xoggd, int64_t, xogg_info, stream_count)
FAKE_READ(xwavd_get_frm)
FAKE_SEEK_WITH_FLAGS(xwavd_seek)
FAKE_REMOVAL(xwavd_delete)

// The record is filled even if no reader is created.
void *xwavd_create(const mtsrc_io *io, xwav_info *info, int32_t *word) {
    const auto lock = record_call(__func__, io, word, info);
    report_rate_and_channels(info);
    info->codec = state.streams.back().codec.value_or(kWexaPcm);
    info->bits = state.streams.back().bits;
    info->duration = state.streams.back().duration;
    return create_object();
}

int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track) {
    const auto lock = record_call(__func__, track);
    find_object(stream);
    report_rate_and_channels(track);
    track->format_tag = state.streams.back().codec.value_or(kWexaTagAac);
    return next_result(0);
}

int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    const auto lock = record_call(__func__, info);
    find_object(stream);
    report_rate(info);
    info->codec = state.streams.back().codec.value_or(323);
    return next_result(0);
}

int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    const auto lock = record_call(__func__, info, frame);
    find_object(decoder);
    info->word_0 = 1;
    report_rate(info);
    return next_result(0);
}

int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    const auto lock = record_call(__func__);
    find_object(stream);
    const int32_t result = next_result(0);
    if (result != 0) return result;
    const stream_spec &described = state.streams.back();
    const auto size = static_cast<int32_t>(described.setup.size());
    if (buf) memcpy(buf, described.setup.data(), static_cast<size_t>(std::clamp(*length, 0, size)));
    *length = buf ? size : described.setup_length.value_or(size);
    return 0;
}
}
