#include "desktop/wexaaudio/shared/stream.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kFailed = -3;  // a read error

// Returns the frame where decoding must start so that frame n is the same as in a linear read.
int64_t first_needed(const stream_info *info, int64_t n) {
    if (info->group > 0) n -= n % info->group;
    n = std::max<int64_t>(n - info->preroll, 0);
    for (int32_t left = info->reservoir; left > 0 && n > 0;) {
        --n;
        left -= std::max(info->frames.entry[n].bytes - info->overhead, 1);
    }
    return n;
}

// Returns the number of sample frames in the output, or 0 if the frame cannot be decoded. Returns
// kFailed or kCodecNoMemory if the read must end.
int32_t decode_frame(stream_reader *r, const frame_entry &entry) {
    if (entry.bytes <= 0 || entry.bytes > kMaxPacket) return 0;
    uint8_t *packet = r->library->packet(r->decoder, entry.bytes);
    if (packet == nullptr) return kCodecNoMemory;
    if (stream_copy(&r->file, r->info, entry.offset, packet, entry.bytes) != entry.bytes) {
        return kFailed;
    }
    const int32_t held = r->library->decode(r->decoder);
    return held == -1 ? 0 : held;
}

// Decodes frame r->next. A fresh decoder first decodes the frames that this frame depends on.
int32_t decode_next(stream_reader *r) {
    const stream_info *info = r->info;
    int64_t n = r->next;
    if (r->decoder == nullptr || (info->group > 0 && n % info->group == 0)) {
        r->library->close(r->decoder);
        r->decoder = r->library->open(info->codec, info->setup, info->setup_bytes);
        if (r->decoder == nullptr) return kCodecNoMemory;
        n = first_needed(info, n);
    }
    int32_t held = 0;
    for (; n <= r->next && held >= 0; ++n) held = decode_frame(r, info->frames.entry[n]);
    return held;
}

// Returns the number of sample frames that the source delivers.
int64_t delivered(const stream_info *info) {
    return std::max<int64_t>(frame_index_end(&info->frames) - info->delay, 0);
}

}  // namespace

extern "C" {

void stream_close(void *reader) {
    auto *r = static_cast<stream_reader *>(reader);
    if (r == nullptr) return;
    if (r->decoder != nullptr) r->library->close(r->decoder);
    scan_cache_put(r->info);
    io_file_close(&r->file);
    free(r);
}

// A container's stream handle is the container's reader itself.
void *stream_of_track(void *reader, int32_t track, void * /*reserved*/) {
    const auto *r = static_cast<stream_reader *>(reader);
    return track >= 0 && track == r->info->track ? reader : nullptr;
}

// Reads the next frame that has samples. A frame that cannot be decoded becomes silence.
int32_t stream_read(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                    int64_t *second) {
    auto *r = static_cast<stream_reader *>(reader);
    const stream_info *info = r->info;
    if (info->codec == nullptr) return -1;
    int32_t held = 0;
    int32_t samples = 0;
    for (; samples == 0; ++r->next) {
        if (r->next >= info->frames.count) return kWexaEndOfStream;
        held = decode_next(r);
        if (held < 0) return -1;
        samples = info->frames.entry[r->next].samples - r->skip;
    }
    const int64_t n = r->next - 1;
    const int32_t frame = info->out_channels * static_cast<int32_t>(sizeof(int16_t));
    if (samples > size / frame) return -1;
    auto *pcm = static_cast<int16_t *>(buf);  // [samples][out_channels]
    const int32_t from = r->skip + (n == info->cut_frame ? info->cut_samples : 0);
    const int32_t got =
        held > from ? r->library->pcm(r->decoder, info->out_channels, from, samples, pcm) : 0;
    *bytes = samples * frame;
    const ptrdiff_t written = int64_t{got} * info->out_channels;
    memset(pcm + written, 0, static_cast<size_t>(samples - got) * static_cast<size_t>(frame));
    *first = units_from_samples(info->frames.entry[n].first + r->skip, info->rate);
    *second = units_from_samples(samples, info->rate);
    r->skip = 0;
    return 0;
}

int32_t stream_seek(void *reader, const int64_t *position, int64_t *reached) {
    auto *r = static_cast<stream_reader *>(reader);
    const stream_info *info = r->info;
    if (info->codec == nullptr) return -1;
    const int64_t end = delivered(info);
    const int64_t sample = seek_target(*position, end, info->rate);
    // The source drops samples only at time 0. Every other position, even in the first frame, gets
    // a time other than 0 so that nothing is dropped twice.
    const int64_t decoded = sample > 0 ? sample + info->delay : 0;
    const frame_index *frames = &info->frames;
    r->next = sample < end ? frame_index_find(frames, decoded) : frames->count;
    r->skip = sample < end ? static_cast<int32_t>(decoded - frames->entry[r->next].first) : 0;
    r->library->close(r->decoder);
    r->decoder = nullptr;
    *reached = units_from_samples(sample, info->rate);
    return 0;
}

int32_t stream_seek_in_container(void *stream, const int64_t *position, int64_t *reached,
                                 int32_t /*flags*/) {
    return stream_seek(stream, position, reached);
}

// These functions of the interface differ only in their names.
decltype(stream_read) xaacfd_get_frm [[gnu::alias("stream_read")]];
decltype(stream_read) xmp123fd_get_frm [[gnu::alias("stream_read")]];
decltype(stream_read) xmp4fds_get_frm [[gnu::alias("stream_read")]];
decltype(stream_read) xoggds_get_frm [[gnu::alias("stream_read")]];
decltype(stream_seek) xaacfd_seek [[gnu::alias("stream_seek")]];
decltype(stream_seek) xmp123fd_seek [[gnu::alias("stream_seek")]];
decltype(xmp4fds_seek) xmp4fds_seek [[gnu::alias("stream_seek_in_container")]];
decltype(xoggds_seek) xoggds_seek [[gnu::alias("stream_seek_in_container")]];
decltype(stream_close) xaacfd_delete [[gnu::alias("stream_close")]];
decltype(stream_close) xmp123fd_delete [[gnu::alias("stream_close")]];
decltype(stream_close) xmp4fd_delete [[gnu::alias("stream_close")]];
decltype(stream_close) xoggd_delete [[gnu::alias("stream_close")]];
decltype(stream_of_track) xmp4fds_open [[gnu::alias("stream_of_track")]];
decltype(stream_of_track) xoggds_open [[gnu::alias("stream_of_track")]];

}  // extern "C"

stream_reader *stream_open(const mtsrc_io *io, scan_function scan, int64_t *duration) {
    auto *r = static_cast<stream_reader *>(calloc(1, sizeof(stream_reader)));
    if (r == nullptr) return nullptr;
    r->library = codec_library_get();
    if (r->library != nullptr && io_file_open(&r->file, io)) {
        r->info = scan_cache_get(&r->file, scan);
    }
    if (r->info == nullptr) {
        stream_close(r);
        return nullptr;
    }
    const int32_t rate = r->info->rate;
    *duration = rate > 0 ? units_of_duration(delivered(r->info), rate) : 0;
    return r;
}

int64_t stream_copy(io_file *file, const stream_info *info, int64_t offset, uint8_t *buf,
                    int64_t bytes) {
    if (info->pages.count == 0) return io_file_read(file, offset, buf, bytes);
    int64_t done = 0;
    for (int64_t i = frame_index_find(&info->pages, offset); i < info->pages.count; ++i) {
        const frame_entry &page = info->pages.entry[i];
        const int64_t skip = offset + done - page.first;
        const int64_t piece = std::min(bytes - done, page.bytes - skip);
        if (piece <= 0) break;
        const int64_t got = io_file_read(file, page.offset + skip, buf + done, piece);
        if (got < 0) return -1;
        done += got;
        if (got < piece || done == bytes) break;
    }
    return done;
}
