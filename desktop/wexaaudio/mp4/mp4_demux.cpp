// Reads the first audio track of an MP4 file, AAC or MPEG Layer III. A demuxer has only this
// stream, so the stream handle is the demuxer itself.
//
// Input: mtsrc_io. Output: PCM and the information records. Follows mp4/mp4_boxes.h.
#include <algorithm>
#include <cstring>

#include "desktop/wexaaudio/aac/aac_stream.h"
#include "desktop/wexaaudio/mp4/mp4_boxes.h"
#include "desktop/wexaaudio/mpeg/mpeg_header.h"
#include "media_source/wexaaudio.h"

namespace {

// Number of frames searched for a valid header. Normally the first frame has one.
constexpr int64_t kTriedFrames = 64;

// Reads the rate, channels and frame length of a Layer III track from its first valid header. All
// frames have the same length.
bool read_mpeg_format(io_file *file, stream_info *info) {
    mpeg_header h = {};
    bool known = false;
    for (int64_t k = 0; k < std::min(info->frames.count, kTriedFrames) && !known; ++k) {
        const uint8_t *p = io_file_bytes(file, info->frames.entry[k].offset, kMpegHeaderBytes);
        known = p != nullptr && mpeg_parse(p, &h) && h.layer == 3;
    }
    if (!known) return false;
    mpeg_describe(&h, info);
    for (int64_t k = 0; k < info->frames.count; ++k) {
        info->frames.entry[k].first = k * h.samples;
        info->frames.entry[k].samples = h.samples;
    }
    return true;
}

bool scan_file(io_file *file, stream_info *info) {
    mp4_codec codec = {};
    if (!mp4_read_boxes(file, info, &codec)) return false;
    if (codec.is_aac) return aac_stream_complete(file, &codec.config, info);
    return !codec.is_mpeg || read_mpeg_format(file, info);  // the source refuses any other codec
}

}  // namespace

void *xmp4fd_create(const mtsrc_io *io, int32_t * /*word*/, xmp4_info *info, void * /*reserved*/) {
    stream_reader *r = stream_open(io, scan_file, &info->duration);
    if (r == nullptr) return nullptr;
    info->track_count = r->info->track_count;
    memcpy(info->kind, r->info->kind, sizeof info->kind);
    return r;
}

void xmp4fds_close(void * /*stream*/) {}

int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track) {
    const stream_info *info = static_cast<stream_reader *>(stream)->info;
    track->format_tag = info->codec == nullptr            ? 0
                        : strcmp(info->codec, "aac") == 0 ? kWexaTagAac
                                                          : kWexaTagMpegLayer3;
    track->sample_rate = info->rate;
    track->channels = info->channels;
    return 0;
}
