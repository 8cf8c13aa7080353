// The codec library's functions, each noting its call and playing the script.
#include <algorithm>
#include <cstring>

#include "tests/support/scripted_objects.h"

using scripted::script;
using scripted::told;

extern "C" {

void *xwavd_create(const mtsrc_io *io, xwav_info *info, int32_t *word) {
    return scripted::create("xwavd_create", "xwavd", io, word, info,
                            [](const script &what, xwav_info *to, const char *name) {
                                to->codec = told(name, "codec", what.codec.value_or(kWexaPcm));
                                to->sample_rate = told(name, "rate", what.sample_rate);
                                to->bits = told(name, "bits", what.bits);
                                to->channels = told(name, "channels", what.channels);
                                to->duration = told(name, "duration", what.duration);
                            });
}
int32_t xwavd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                      int64_t *second) {
    return scripted::get_frm("xwavd_get_frm", "xwavd", reader, buf, size, bytes, first, second);
}
int32_t xwavd_seek(void *reader, const int64_t *seconds, int64_t *reached, int32_t flags) {
    return scripted::move("xwavd_seek", "xwavd", reader, seconds, reached, flags);
}
void xwavd_delete(void *reader) {
    scripted::destroy("xwavd_delete", reader, "xwavd");
}

// The functions that the elementary formats share in shape, under their own names.
#define SCRIPTED_READER(format)                                                                   \
    int32_t x##format##fd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes,          \
                                  int64_t *first, int64_t *second) {                              \
        return scripted::get_frm("x" #format "fd_get_frm", "x" #format "fd", reader, buf, size,   \
                                 bytes, first, second);                                           \
    }                                                                                             \
    int32_t x##format##fd_seek(void *reader, const int64_t *position, int64_t *reached) {         \
        return scripted::move("x" #format "fd_seek", "x" #format "fd", reader, position, reached, \
                              0);                                                                 \
    }                                                                                             \
    void x##format##fd_delete(void *reader) {                                                     \
        scripted::destroy("x" #format "fd_delete", reader, "x" #format "fd");                     \
    }

#define SCRIPTED_DECODER(format, config_record)                                                  \
    int32_t x##format##_init(void) {                                                             \
        return scripted::init("x" #format "_init", "x" #format);                                 \
    }                                                                                            \
    void x##format##_deinit(void) {                                                              \
        scripted::deinit("x" #format "_deinit", "x" #format);                                    \
    }                                                                                            \
    void *x##format##d_create(const config_record *config, void *) {                             \
        return scripted::create_decoder("x" #format "d_create", "x" #format "d", config);        \
    }                                                                                            \
    int32_t x##format##d_decode(void *decoder, const wexa_frame *frame, wexa_output *output,     \
                                wexa_status *status) {                                           \
        return scripted::decode("x" #format "d_decode", "x" #format "d", decoder, frame, output, \
                                status);                                                         \
    }                                                                                            \
    void x##format##d_reset(void *decoder) {                                                     \
        scripted::decoder_reset("x" #format "d_reset", "x" #format "d", decoder);                \
    }                                                                                            \
    void x##format##d_delete(void *decoder) {                                                    \
        scripted::destroy("x" #format "d_delete", decoder, "x" #format "d");                     \
    }

#define SCRIPTED_STREAM(format)                                                                   \
    void x##format##ds_close(void *stream) {                                                      \
        scripted::destroy("x" #format "ds_close", stream, "x" #format "ds");                      \
    }                                                                                             \
    int32_t x##format##ds_get_frm(void *stream, void *buf, int32_t size, int32_t *bytes,          \
                                  int64_t *first, int64_t *second) {                              \
        return scripted::get_frm("x" #format "ds_get_frm", "x" #format "ds", stream, buf, size,   \
                                 bytes, first, second);                                           \
    }                                                                                             \
    int32_t x##format##ds_seek(void *stream, const int64_t *position, int64_t *reached,           \
                               int32_t flags) {                                                   \
        return scripted::move("x" #format "ds_seek", "x" #format "ds", stream, position, reached, \
                              flags);                                                             \
    }

SCRIPTED_READER(aac)
SCRIPTED_READER(flac)
SCRIPTED_READER(mp123)
SCRIPTED_DECODER(aac, xaac_config)
SCRIPTED_DECODER(flac, wexa_config)
SCRIPTED_DECODER(mp123, wexa_config)
SCRIPTED_DECODER(vorbis, wexa_config)
SCRIPTED_STREAM(mp4f)
SCRIPTED_STREAM(ogg)

void *xaacfd_create(const mtsrc_io *io, int64_t *word, xaac_info *info, void *) {
    return scripted::create("xaacfd_create", "xaacfd", io, word, info,
                            [](const script &what, xaac_info *to, const char *name) {
                                to->sample_rate = told(name, "rate", what.sample_rate);
                                to->channels = told(name, "channels", what.channels);
                                to->duration = told(name, "duration", what.duration);
                                to->tags = scripted::make_tags(what);
                            });
}
int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    const wexa_frame handed = *frame;
    const int32_t result =
        scripted::stream_info("xaacd_info", "xaacd", decoder, info,
                              [](const script &what, xaac_stream_info *to, const char *name) {
                                  to->word_0 = 1;
                                  to->sample_rate = told(name, "rate", what.sample_rate);
                              });
    scripted::guard held(scripted::w().lock);
    scripted::hand(scripted::w().calls.back(), &handed);
    return result;
}
void *xflacfd_create(const mtsrc_io *io, int64_t *word, xflac_info *info, void *) {
    return scripted::create("xflacfd_create", "xflacfd", io, word, info,
                            [](const script &what, xflac_info *to, const char *name) {
                                to->sample_rate = told(name, "rate", what.sample_rate);
                                to->duration = told(name, "duration", what.duration);
                                to->tags = scripted::make_tags(what);
                            });
}
void *xmp123fd_create(const mtsrc_io *io, int64_t *word, xmp123_info *info, void *) {
    return scripted::create("xmp123fd_create", "xmp123fd", io, word, info,
                            [](const script &what, xmp123_info *to, const char *name) {
                                to->sample_rate = told(name, "rate", what.sample_rate);
                                to->channels = told(name, "channels", what.channels);
                                to->duration = told(name, "duration", what.duration);
                                to->tags = scripted::make_tags(what);
                            });
}

void *xmp4fd_create(const mtsrc_io *io, int32_t *word, xmp4_info *info, void *) {
    return scripted::create(
        "xmp4fd_create", "xmp4fd", io, word, info,
        [](const script &what, xmp4_info *to, const char *name) {
            to->track_count = told(
                name, "count", what.kind_count.value_or(static_cast<int32_t>(what.kinds.size())));
            for (size_t i = 0; i < what.kinds.size() && i < kMp4Tracks; ++i) {
                to->kind[i] = told(name, "kind", what.kinds[i]);
            }
            to->duration = told(name, "duration", what.duration);
            to->tags = scripted::make_tags(what);
        });
}
void xmp4fd_delete(void *demux) {
    scripted::destroy("xmp4fd_delete", demux, "xmp4fd");
}
void *xmp4fds_open(void *demux, int32_t track, void *) {
    return scripted::open_stream("xmp4fds_open", "xmp4fds", demux, "xmp4fd", track);
}
int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track) {
    return scripted::stream_info("xmp4fds_get_info_aud", "xmp4fds", stream, track,
                                 [](const script &what, xmp4_track *to, const char *name) {
                                     to->format_tag =
                                         told(name, "codec", what.codec.value_or(kWexaTagAac));
                                     to->sample_rate = told(name, "rate", what.sample_rate);
                                     to->channels = told(name, "channels", what.channels);
                                 });
}

void *xoggd_create(const mtsrc_io *io, int64_t *word, xogg_info *info, void *) {
    return scripted::create(
        "xoggd_create", "xoggd", io, word, info,
        [](const script &what, xogg_info *to, const char *name) {
            to->stream_count = told(
                name, "count", what.kind_count.value_or(static_cast<int32_t>(what.kinds.size())));
            for (size_t i = 0; i < what.kinds.size() && i < kOggStreams; ++i) {
                to->kind[i] = told(name, "kind", what.kinds[i]);
            }
            to->duration = told(name, "duration", what.duration);
            to->tags = scripted::make_tags(what);
        });
}
void xoggd_delete(void *demux) {
    scripted::destroy("xoggd_delete", demux, "xoggd");
}
void *xoggds_open(void *demux, int32_t index, void *) {
    return scripted::open_stream("xoggds_open", "xoggds", demux, "xoggd", index);
}
int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    return scripted::stream_info("xoggds_get_info_aud", "xoggds", stream, info,
                                 [](const script &what, xogg_stream *to, const char *name) {
                                     to->codec = told(name, "codec", what.codec.value_or(323));
                                     to->sample_rate = told(name, "rate", what.sample_rate);
                                 });
}
int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    scripted::guard held(scripted::w().lock);
    scripted::call &noted =
        scripted::note("xoggds_get_format", stream, scripted::take("xoggds_get_format", 0));
    noted.number = buf ? 1 : 0;
    const scripted::object *of = scripted::checked("xoggds_get_format", stream, "xoggds");
    if (!of || noted.result != 0) {
        return noted.result = noted.result ? noted.result : -1;
    }
    const std::vector<uint8_t> &setup = of->what->setup;
    int32_t reported = of->what->setup_length.value_or(static_cast<int32_t>(setup.size()));
    if (buf) {  // *length says how much it holds
        reported = std::clamp(*length, 0, static_cast<int32_t>(setup.size()));
        memcpy(buf, setup.data(), static_cast<size_t>(reported));
    }
    *length = told("xoggds_get_format", "length", reported);
    return 0;
}
}
