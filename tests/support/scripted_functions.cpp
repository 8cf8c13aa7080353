// The codec library's functions, each noting its call and playing the script.
#include <malloc.h>

#include <algorithm>
#include <cstring>

#include "tests/support/scripted_objects.h"

using scripted::called;
using scripted::make;
using scripted::script;
using scripted::told;

namespace {

const script &latest() {
    return scripted::w().scripts.back();
}

template <typename info>
void describe(info *to) {
    to->duration = told("duration", latest().duration);
    to->tags = scripted::make_tags(latest());
}

template <typename info>
void list_streams(info *to, int32_t *count) {
    const std::vector<int32_t> &kinds = latest().kinds;
    *count = told("count", latest().kind_count.value_or(static_cast<int32_t>(kinds.size())));
    for (size_t i = 0; i < kinds.size() && i < std::size(to->kind); ++i) {
        to->kind[i] = told("kind", kinds[i]);
    }
    describe(to);
}

}  // namespace

extern "C" {

// The functions that the formats share in shape, under their own names.
#define SCRIPTED_READ(function)                                                             \
    int32_t function(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first, \
                     int64_t *second) {                                                     \
        const auto held = called(__func__);                                                 \
        return scripted::read_frame(reader, buf, size, bytes, first, second);               \
    }
#define SCRIPTED_SEEK(function)                                                 \
    int32_t function(void *reader, const int64_t *position, int64_t *reached) { \
        const auto held = called(__func__, position, reached);                  \
        return scripted::move(reader, *position, reached, 0);                   \
    }
#define SCRIPTED_SEEK_WITH_FLAGS(function)                                                     \
    int32_t function(void *reader, const int64_t *position, int64_t *reached, int32_t flags) { \
        const auto held = called(__func__, position, reached);                                 \
        return scripted::move(reader, *position, reached, flags);                              \
    }
#define SCRIPTED_REMOVAL(function)          \
    void function(void *object) {           \
        const auto held = called(__func__); \
        scripted::destroy(object);          \
    }
#define SCRIPTED_DECODER(library, decoder, config_record)                            \
    int32_t library##_init(void) {                                                   \
        const auto held = called(__func__);                                          \
        return scripted::take(0);                                                    \
    }                                                                                \
    void library##_deinit(void) {                                                    \
        const auto held = called(__func__);                                          \
    }                                                                                \
    void *decoder##_create(const config_record *config, void *) {                    \
        const auto held = called(__func__, config);                                  \
        return make();                                                               \
    }                                                                                \
    int32_t decoder##_decode(void *of, const wexa_frame *frame, wexa_output *output, \
                             wexa_status *status) {                                  \
        const auto held = called(__func__, frame, output, status);                   \
        return scripted::decode(of, frame, output, status);                          \
    }                                                                                \
    void decoder##_reset(void *of) {                                                 \
        const auto held = called(__func__);                                          \
        scripted::checked(of);                                                       \
    }                                                                                \
    SCRIPTED_REMOVAL(decoder##_delete)

SCRIPTED_DECODER(xaac, xaacd, xaac_config)
SCRIPTED_DECODER(xflac, xflacd, wexa_config)
SCRIPTED_DECODER(xmp123, xmp123d, wexa_config)
SCRIPTED_DECODER(xvorbis, xvorbisd, wexa_config)

SCRIPTED_READ(xwavd_get_frm)
SCRIPTED_READ(xaacfd_get_frm)
SCRIPTED_READ(xflacfd_get_frm)
SCRIPTED_READ(xmp123fd_get_frm)
SCRIPTED_READ(xmp4fds_get_frm)
SCRIPTED_READ(xoggds_get_frm)

SCRIPTED_SEEK_WITH_FLAGS(xwavd_seek)
SCRIPTED_SEEK(xaacfd_seek)
SCRIPTED_SEEK(xflacfd_seek)
SCRIPTED_SEEK(xmp123fd_seek)
SCRIPTED_SEEK_WITH_FLAGS(xmp4fds_seek)
SCRIPTED_SEEK_WITH_FLAGS(xoggds_seek)

SCRIPTED_REMOVAL(xwavd_delete)
SCRIPTED_REMOVAL(xaacfd_delete)
SCRIPTED_REMOVAL(xflacfd_delete)
SCRIPTED_REMOVAL(xmp123fd_delete)
SCRIPTED_REMOVAL(xmp4fds_close)
SCRIPTED_REMOVAL(xmp4fd_delete)
SCRIPTED_REMOVAL(xoggds_close)
SCRIPTED_REMOVAL(xoggd_delete)

// The record is filled also when the answer is a failure.
void *xwavd_create(const mtsrc_io *io, xwav_info *info, int32_t *word) {
    const auto held = called(__func__, io, word, info);
    void *made = make();
    info->codec = told("codec", latest().codec.value_or(kWexaPcm));
    info->sample_rate = told("rate", latest().sample_rate);
    info->bits = told("bits", latest().bits);
    info->channels = told("channels", latest().channels);
    info->duration = told("duration", latest().duration);
    return made;
}

void *xaacfd_create(const mtsrc_io *io, int64_t *word, xaac_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    void *made = make();
    info->sample_rate = told("rate", latest().sample_rate);
    info->channels = told("channels", latest().channels);
    describe(info);
    return made;
}
int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    const auto held = called(__func__, info, frame);
    const int32_t result = scripted::take(0);
    if (const scripted::object *of = scripted::checked(decoder)) {
        info->word_0 = 1;
        info->sample_rate = told("rate", of->what->sample_rate);
    }
    return result;
}

void *xflacfd_create(const mtsrc_io *io, int64_t *word, xflac_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    void *made = make();
    info->sample_rate = told("rate", latest().sample_rate);
    describe(info);
    return made;
}

void *xmp123fd_create(const mtsrc_io *io, int64_t *word, xmp123_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    void *made = make();
    info->sample_rate = told("rate", latest().sample_rate);
    info->channels = told("channels", latest().channels);
    describe(info);
    return made;
}

void *xmp4fd_create(const mtsrc_io *io, int32_t *word, xmp4_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    void *made = make();
    list_streams(info, &info->track_count);
    return made;
}
void *xmp4fds_open(void *demux, int32_t track, void *) {
    const auto held = called(__func__);
    return scripted::open_stream(demux, track);
}
int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track) {
    const auto held = called(__func__, track);
    const int32_t result = scripted::take(0);
    if (const scripted::object *of = scripted::checked(stream)) {
        track->format_tag = told("codec", of->what->codec.value_or(kWexaTagAac));
        track->sample_rate = told("rate", of->what->sample_rate);
        track->channels = told("channels", of->what->channels);
    }
    return result;
}

void *xoggd_create(const mtsrc_io *io, int64_t *word, xogg_info *info, void *) {
    const auto held = called(__func__, io, word, info);
    void *made = make();
    list_streams(info, &info->stream_count);
    return made;
}
void *xoggds_open(void *demux, int32_t index, void *) {
    const auto held = called(__func__);
    return scripted::open_stream(demux, index);
}
int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    const auto held = called(__func__, info);
    const int32_t result = scripted::take(0);
    if (const scripted::object *of = scripted::checked(stream)) {
        info->codec = told("codec", of->what->codec.value_or(323));
        info->sample_rate = told("rate", of->what->sample_rate);
    }
    return result;
}
int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    const auto held = called(__func__);
    scripted::w().calls.back().number = static_cast<int32_t>(malloc_usable_size(buf));
    const int32_t result = scripted::take(0);
    const scripted::object *of = scripted::checked(stream);
    if (!of || result != 0) {
        return result ? result : -1;
    }
    const std::vector<uint8_t> &setup = of->what->setup;
    int32_t reported = of->what->setup_length.value_or(static_cast<int32_t>(setup.size()));
    if (buf) {  // *length says how much it holds
        reported = std::clamp(*length, 0, static_cast<int32_t>(setup.size()));
        memcpy(buf, setup.data(), static_cast<size_t>(reported));
    }
    *length = told("length", reported);
    return 0;
}
}
