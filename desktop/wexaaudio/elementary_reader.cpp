// The readers of bare streams of frames, AAC and MPEG audio: the same reader over different scans.
//
// In: mtsrc_io. Out: PCM, the information records.
#include "desktop/wexaaudio/aac/adts_scan.h"
#include "desktop/wexaaudio/mpeg/mpeg_scan.h"
#include "media_source/wexaaudio.h"

namespace {

template <typename Info>
void *create(const mtsrc_io *io, const scan_kind &kind, Info *info) {
    stream_reader *r = info != nullptr ? stream_open(io, &kind) : nullptr;
    if (r == nullptr) return nullptr;
    info->sample_rate = r->info->rate;
    info->channels = r->info->channels;
    info->duration = stream_duration(r);
    return r;
}

}  // namespace

void *xaacfd_create(const mtsrc_io *io, int64_t * /*word*/, xaac_info *info, void * /*reserved*/) {
    return create(io, kAdtsScan, info);
}

int32_t xaacfd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second) {
    return stream_read(reader, buf, size, bytes, first, second);
}

int32_t xaacfd_seek(void *reader, const int64_t *position, int64_t *reached) {
    return stream_seek(reader, position, reached);
}

void xaacfd_delete(void *reader) {
    stream_close(reader);
}

void *xmp123fd_create(const mtsrc_io *io, int64_t * /*word*/, xmp123_info *info,
                      void * /*reserved*/) {
    return create(io, kMpegScan, info);
}

int32_t xmp123fd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                         int64_t *second) {
    return stream_read(reader, buf, size, bytes, first, second);
}

int32_t xmp123fd_seek(void *reader, const int64_t *position, int64_t *reached) {
    return stream_seek(reader, position, reached);
}

void xmp123fd_delete(void *reader) {
    stream_close(reader);
}
