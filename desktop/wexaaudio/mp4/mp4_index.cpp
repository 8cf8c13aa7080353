#include "desktop/wexaaudio/mp4/mp4_index.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "desktop/wexaaudio/shared/tags.h"

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavformat/avformat.h>
}

namespace {

constexpr int32_t kIoBytes = 32768;   // libavformat's own buffer
constexpr int32_t kMaxBoxes = 65536;  // looked through for a fragment
constexpr int32_t kBoxHead = 8;
constexpr int32_t kLongBoxHead = 16;
constexpr int32_t kKindVideo = 2;

struct av_file {
    AVFormatContext *format;
    AVIOContext *io;
    io_file *file;
    int64_t at;  // offset read next
};

int read_bytes(void *opaque, uint8_t *buf, int count) {
    av_file *f = static_cast<av_file *>(opaque);
    const int64_t got = io_file_read(f->file, f->at, buf, count);
    if (got <= 0) {
        return got == 0 ? AVERROR_EOF : AVERROR(EIO);
    }
    f->at += got;
    return static_cast<int>(got);
}

int64_t move(void *opaque, int64_t offset, int whence) {
    av_file *f = static_cast<av_file *>(opaque);
    int64_t base = 0;
    switch (whence & ~AVSEEK_FORCE) {
        case AVSEEK_SIZE:
            return f->file->size;
        case SEEK_SET:
            break;
        case SEEK_CUR:
            base = f->at;
            break;
        case SEEK_END:
            base = f->file->size;
            break;
        default:
            return AVERROR(EINVAL);
    }
    if (offset > INT64_MAX - base || base + offset < 0) {
        return AVERROR(EINVAL);
    }
    f->at = base + offset;
    return f->at;
}

// A track may name other files: they are not opened.
int refuse(AVFormatContext * /*format*/, AVIOContext ** /*io*/, const char * /*url*/, int /*flags*/,
           AVDictionary ** /*options*/) {
    return AVERROR(EACCES);
}

void close_file(av_file *f) {
    avformat_close_input(&f->format);
    if (f->io != nullptr) {
        av_freep(&f->io->buffer);
    }
    avio_context_free(&f->io);
}

bool open_file(av_file *f, io_file *file) {
    *f = {};
    f->file = file;
    uint8_t *buffer = static_cast<uint8_t *>(av_malloc(kIoBytes));
    f->io = buffer != nullptr
                ? avio_alloc_context(buffer, kIoBytes, 0, f, read_bytes, nullptr, move)
                : nullptr;
    if (f->io == nullptr) {
        av_free(buffer);
        return false;
    }
    f->format = avformat_alloc_context();
    AVDictionary *options = nullptr;
    bool ok = f->format != nullptr && av_dict_set(&options, "ignore_editlist", "1", 0) >= 0;
    if (ok) {
        f->format->pb = f->io;
        f->format->flags |= AVFMT_FLAG_CUSTOM_IO | AVFMT_FLAG_NOPARSE | AVFMT_FLAG_NOFILLIN;
        f->format->io_open = refuse;
        ok = avformat_open_input(&f->format, nullptr, av_find_input_format("mov"), &options) == 0;
    }
    av_dict_free(&options);
    if (!ok) {
        close_file(f);
    }
    return ok;
}

// Whether the frames are listed fragment by fragment instead of in one table.
bool is_fragmented(io_file *file) {
    int64_t at = 0;
    for (int32_t i = 0; i < kMaxBoxes && at >= 0; ++i) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(file, at, kLongBoxHead, &got);
        if (p == nullptr || got < kBoxHead) {
            return false;
        }
        if (memcmp(p + 4, "moof", 4) == 0) {
            return true;
        }
        uint64_t size = 0;
        for (int32_t b = 0; b < 4; ++b) {
            size = size << 8 | p[b];
        }
        if (size == 1 && got >= kLongBoxHead) {
            size = 0;
            for (int32_t b = kBoxHead; b < kLongBoxHead; ++b) {
                size = size << 8 | p[b];
            }
        }
        if (size < kBoxHead || size > static_cast<uint64_t>(file->size - at)) {
            return false;
        }
        at += static_cast<int64_t>(size);
    }
    return false;
}

// The list of frames ends before the first one that does not.
bool lies_within(const io_file *file, int64_t offset, int64_t bytes) {
    return offset >= 0 && bytes >= 0 && bytes <= file->size && offset <= file->size - bytes;
}

// False when out of memory, and only then.
bool add_frame(mp4_index *index, int64_t offset, int64_t bytes) {
    return frame_index_add(&index->frames, {offset, -1, static_cast<int32_t>(bytes), 0});
}

// False when out of memory.
bool read_table(mp4_index *index, AVStream *stream, const io_file *file) {
    const int count = avformat_index_get_entries_count(stream);
    for (int i = 0; i < count; ++i) {
        const AVIndexEntry *entry = avformat_index_get_entry(stream, i);
        if (!lies_within(file, entry->pos, entry->size)) {
            return true;
        }
        if (!add_frame(index, entry->pos, entry->size)) {
            return false;
        }
    }
    return true;
}

// Goes through the whole file, since each fragment's table comes before its frames. False when out
// of memory.
bool read_fragments(mp4_index *index, av_file *f, const io_file *file) {
    AVPacket *packet = av_packet_alloc();
    int result = packet != nullptr ? 0 : AVERROR(ENOMEM);
    while (result == 0) {
        result = av_read_frame(f->format, packet);
        if (result == 0 && packet->stream_index == index->track) {
            result = !lies_within(file, packet->pos, packet->size)  ? AVERROR_EOF
                     : !add_frame(index, packet->pos, packet->size) ? AVERROR(ENOMEM)
                                                                    : 0;
        }
        av_packet_unref(packet);
    }
    av_packet_free(&packet);
    return result != AVERROR(ENOMEM);
}

void read_tracks(mp4_index *index, const AVFormatContext *format) {
    index->track = -1;
    index->track_count = static_cast<int32_t>(std::min<unsigned>(format->nb_streams, kMp4Tracks));
    for (int32_t i = 0; i < index->track_count; ++i) {
        AVStream *stream = format->streams[i];
        const AVMediaType type = stream->codecpar->codec_type;
        index->kind[i] = type == AVMEDIA_TYPE_AUDIO   ? kWexaKindAudio
                         : type == AVMEDIA_TYPE_VIDEO ? kKindVideo
                                                      : 0;
        if (type == AVMEDIA_TYPE_AUDIO && index->track < 0) {
            index->track = i;
        } else {
            stream->discard = AVDISCARD_ALL;
        }
    }
    for (unsigned i = kMp4Tracks; i < format->nb_streams; ++i) {
        format->streams[i]->discard = AVDISCARD_ALL;
    }
}

// Returns the track's format tag, 0 when it cannot be decoded.
int32_t read_codec(mp4_index *index, const AVCodecParameters *codec) {
    index->sample_rate = codec->sample_rate;
    index->channels = codec->ch_layout.nb_channels;
    if (codec->codec_id == AV_CODEC_ID_MP3) {
        return kWexaTagMpegLayer3;
    }
    if (codec->codec_id == AV_CODEC_ID_AAC &&
        aac_config_read(&index->config, codec->extradata, codec->extradata_size)) {
        return kWexaTagAac;
    }
    return 0;
}

}  // namespace

bool mp4_index_read(mp4_index *index, io_file *file, wexa_tags *tags) {
    *index = {};
    av_file f;
    if (!open_file(&f, file)) {
        return false;
    }
    tags_from_metadata(tags, f.format->metadata);
    read_tracks(index, f.format);
    bool ok = true;
    if (index->track >= 0) {
        AVStream *stream = f.format->streams[index->track];
        index->format_tag = read_codec(index, stream->codecpar);
        if (index->format_tag != 0 && is_fragmented(file)) {
            ok = read_fragments(index, &f, file);
        } else if (index->format_tag != 0) {
            ok = read_table(index, stream, file);
        }
    }
    close_file(&f);
    ok = ok && !file->failed;
    if (!ok) {
        frame_index_free(&index->frames);
    }
    return ok;
}
