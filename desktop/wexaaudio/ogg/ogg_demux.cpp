// Ogg: the first audio stream of the file's first group of streams, Vorbis only. A demuxer has that
// one stream, and the stream handle is the demuxer itself.
//
// In: mtsrc_io. Out: PCM, the set-up data, the information records.
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "desktop/wexaaudio/ogg/ogg_scan.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kReadBytes = 65536;
constexpr int32_t kVorbis = 323;  // codec code

// How the first packets of the audio codecs begin; Vorbis first.
constexpr std::string_view kAudio[] = {"\x01vorbis", "OpusHead", "\177FLAC", "fLaC", "Speex   "};

struct page_reader {
    ogg_sync_state sync;
    io_file *file;
    int64_t read;  // offset of the next byte to be read
    int64_t at;    // offset of the next byte to be parsed
};

// Reads the next whole page with a correct check sum; *offset receives where it starts. False at
// the end and on failure.
bool next_page(page_reader *r, ogg_page *page, int64_t *offset) {
    for (;;) {
        const long step = ogg_sync_pageseek(&r->sync, page);
        *offset = r->at;
        r->at += std::abs(step);
        if (step > 0) return true;
        if (step < 0) continue;
        char *buf = ogg_sync_buffer(&r->sync, kReadBytes);
        const int64_t got = buf != nullptr ? io_file_read(r->file, r->read, buf, kReadBytes) : -1;
        if (got <= 0) {
            r->file->failed = r->file->failed || got < 0;
            return false;
        }
        r->read += got;
        ogg_sync_wrote(&r->sync, static_cast<long>(got));
    }
}

// Adds a stream by its first page; the first audio stream is the one that is read.
void add_stream(stream_info *info, const ogg_page *page) {
    if (info->track_count >= kOggStreams) return;
    const int32_t i = info->track_count++;
    const std::string_view body(reinterpret_cast<const char *>(page->body),
                                static_cast<size_t>(page->body_len));
    for (const std::string_view &audio : kAudio) {
        if (body.substr(0, audio.size()) != audio) continue;
        info->kind[i] = kWexaKindAudio;
        if (info->track >= 0) return;
        info->track = i;
        info->codec = &audio == kAudio ? "vorbis" : nullptr;
    }
}

// Reads the pages of the first group of streams; a second one may be chained to it. False when the
// audio stream is not Vorbis after all.
bool read_pages(page_reader *r, ogg_scan *scan) {
    stream_info *info = scan->info;
    ogg_page page;
    int64_t offset = 0;
    int serial = 0;
    bool in_heads = true;
    while (next_page(r, &page, &offset)) {
        const bool head = ogg_page_bos(&page) != 0;
        if (head && !in_heads) return true;
        in_heads = head;
        const bool was_known = info->track >= 0;
        if (head) add_stream(info, &page);
        if (!was_known) serial = ogg_page_serialno(&page);
        if (!in_heads && info->codec == nullptr) return true;  // nothing more to find
        if (info->codec != nullptr && serial == ogg_page_serialno(&page) &&
            !ogg_scan_page(scan, &page, offset + page.header_len)) {
            return false;
        }
    }
    return true;
}

bool scan_file(io_file *file, stream_info *info) {
    page_reader r = {{}, file, 0, 0};
    ogg_sync_init(&r.sync);
    ogg_scan scan = {};
    scan.file = file;
    scan.library = codec_library_get();
    scan.info = info;
    info->track = -1;
    info->out_channels = 1;
    info->preroll = 1;  // what a packet overlaps with
    const bool is_vorbis = read_pages(&r, &scan) && info->codec != nullptr && ogg_scan_end(&scan);
    if (!is_vorbis) info->codec = nullptr;
    scan.library->parser_close(scan.parser);
    ogg_sync_clear(&r.sync);
    return !file->failed && info->track_count > 0;
}

}  // namespace

void *xoggd_create(const mtsrc_io *io, int64_t * /*word*/, xogg_info *info, void * /*reserved*/) {
    stream_reader *r = stream_open(io, scan_file, &info->duration);
    if (r == nullptr) return nullptr;
    info->stream_count = r->info->track_count;
    memcpy(info->kind, r->info->kind, sizeof info->kind);
    return r;
}

void xoggds_close(void * /*stream*/) {}

int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    const auto *r = static_cast<stream_reader *>(stream);
    info->codec = r->info->codec != nullptr ? kVorbis : 0;
    info->sample_rate = r->info->rate;
    return 0;
}

int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    const stream_info *info = static_cast<stream_reader *>(stream)->info;
    if (info->codec == nullptr) return -1;
    *length = info->setup_bytes;
    if (buf != nullptr) memcpy(buf, info->setup, static_cast<size_t>(info->setup_bytes));
    return 0;
}
