#include "desktop/wexaaudio/ogg/ogg_index.h"

#include <ogg/ogg.h>

#include <algorithm>
#include <cstring>

#include "desktop/wexaaudio/ogg/ogg_scan.h"

namespace {

constexpr int32_t kReadBytes = 65536;
constexpr int32_t kKindVideo = 2;

struct codec_name {
    const char *name;
    size_t bytes;
    int32_t kind;
    int32_t codec;
};

constexpr codec_name kNames[] = {
    {"\x01vorbis", 7, kWexaKindAudio, kOggVorbis},
    {"OpusHead", 8, kWexaKindAudio, 0},
    {"\x7F"
     "FLAC",
     5, kWexaKindAudio, 0},
    {"fLaC", 4, kWexaKindAudio, 0},
    {"Speex   ", 8, kWexaKindAudio, 0},
    {"\x80theora", 7, kKindVideo, 0},
};

void add_stream(ogg_index *index, const ogg_page *page) {
    if (index->stream_count >= kOggStreams) {
        return;
    }
    const int32_t i = index->stream_count++;
    index->serial[i] = ogg_page_serialno(page);
    for (const codec_name &codec : kNames) {
        if (page->body_len >= static_cast<long>(codec.bytes) &&
            memcmp(page->body, codec.name, codec.bytes) == 0) {
            index->kind[i] = codec.kind;
            if (codec.kind == kWexaKindAudio && index->stream < 0) {
                index->stream = i;
                index->codec = codec.codec;
            }
            return;
        }
    }
}

struct page_reader {
    ogg_sync_state sync;
    io_file *file;
    int64_t read;  // offset of the next byte to be read
    int64_t at;    // offset of the next byte to be looked at
};

// The next whole page, its checksum right; *offset receives its place. 0 at the end, -1 on failure.
int32_t next_page(page_reader *r, ogg_page *page, int64_t *offset) {
    for (;;) {
        const long step = ogg_sync_pageseek(&r->sync, page);
        if (step > 0) {
            *offset = r->at;
            r->at += step;
            return 1;
        }
        if (step < 0) {
            r->at -= step;
            continue;
        }
        char *buf = ogg_sync_buffer(&r->sync, kReadBytes);
        if (buf == nullptr) {
            return -1;
        }
        const int64_t got = io_file_read(r->file, r->read, buf, kReadBytes);
        if (got <= 0) {
            return got == 0 ? 0 : -1;
        }
        r->read += got;
        ogg_sync_wrote(&r->sync, static_cast<long>(got));
    }
}

// Goes through the pages of the first group of streams. False on failure.
bool read_pages(ogg_index *index, page_reader *r, ogg_scan *scan) {
    ogg_page page;
    int64_t offset = 0;
    int32_t got = next_page(r, &page, &offset);
    bool in_heads = true;
    for (; got > 0; got = next_page(r, &page, &offset)) {
        const bool head = ogg_page_bos(&page) != 0;
        if (head && !in_heads) {
            return true;  // chained behind
        }
        in_heads = in_heads && head;
        if (head) {
            add_stream(index, &page);
        }
        const bool ours =
            index->stream >= 0 && index->serial[index->stream] == ogg_page_serialno(&page);
        if (ours && index->codec == kOggVorbis &&
            !ogg_scan_page(scan, &page, offset + page.header_len)) {
            return scan->headers < kVorbisHeaders;  // not Vorbis after all
        }
        if (!in_heads && index->codec != kOggVorbis) {
            return true;  // nothing more to be learned
        }
    }
    return got == 0 && index->stream_count > 0;
}

}  // namespace

bool ogg_index_read(ogg_index *index, io_file *file, wexa_tags *tags) {
    *index = {};
    index->stream = -1;
    page_reader r = {};
    r.file = file;
    ogg_sync_init(&r.sync);
    ogg_scan scan;
    ogg_scan_start(&scan, index, file, tags);
    const bool ok = read_pages(index, &r, &scan);
    if (ok && index->codec == kOggVorbis && !ogg_scan_end(&scan)) {
        index->codec = 0;
    }
    ogg_scan_free(&scan);
    ogg_sync_clear(&r.sync);
    if (!ok) {
        ogg_index_free(index);
    }
    return ok;
}

bool ogg_index_copy(const ogg_index *index, io_file *file, int64_t offset, void *buf,
                    int32_t bytes) {
    uint8_t *out = static_cast<uint8_t *>(buf);
    int64_t i = frame_index_find(&index->pages, offset);
    while (bytes > 0) {
        if (i < 0 || i >= index->pages.count) {
            return false;
        }
        const frame_entry &page = index->pages.entry[i++];
        const int64_t skip = offset - page.first;
        const int32_t piece = static_cast<int32_t>(std::min<int64_t>(bytes, page.bytes - skip));
        if (piece <= 0 || io_file_read(file, page.offset + skip, out, piece) != piece) {
            return false;
        }
        out += piece;
        offset += piece;
        bytes -= piece;
    }
    return true;
}

void ogg_index_free(ogg_index *index) {
    frame_index_free(&index->pages);
    frame_index_free(&index->packets);
    vorbis_setup_free(&index->setup);
    *index = {};
    index->stream = -1;
}
