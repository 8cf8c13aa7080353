#include "desktop/wexaaudio/mp4/mp4_boxes.h"

#include <algorithm>
#include <climits>
#include <cstdlib>

#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kMaxBoxes = 65536;    // in one level; real files have far fewer
constexpr int64_t kFullHead = 4;        // bytes: version and flags of a full box
constexpr int64_t kMaxTable = 1 << 26;  // bytes; a day of audio needs less

// Smallest plausible number of file bytes per frame. The shortest AAC frame of silence takes 4
// bytes, and 4 more in the tables. Without this limit, frames that share the same bytes could take
// unlimited memory.
constexpr int64_t kMinFrameBytes = 2;

constexpr uint32_t name_of(const char (&text)[5]) {
    uint32_t name = 0;
    for (int i = 0; i < 4; ++i) name = name << 8 | static_cast<uint8_t>(text[i]);
    return name;
}

// File offsets of the start and the end of a box's contents, or of a level (a sequence of boxes).
// Both are 0 for a missing box.
struct span {
    int64_t from;
    int64_t to;
    int32_t boxes = 0;  // number of boxes read from the level so far
};

struct box {
    uint32_t name;
    int64_t start;
    span body;
};

// A track's frame size for fragments that do not state one.
struct frame_default {
    uint32_t track_id;
    uint32_t bytes;
};

struct parser {
    io_file *file;
    stream_info *info;
    mp4_codec *codec;
    uint32_t track_id;                   // of the audio track
    frame_default defaults[kMaxTracks];  // the first default_count are used
    int32_t default_count;
    bool ended;  // a frame was past the end of the file; no more are added
};

// Parses an unsigned big-endian number. Returns 0 if `p` is null.
uint64_t big_endian(const uint8_t *p, int32_t bytes) {
    uint64_t v = 0;
    for (int32_t i = 0; p != nullptr && i < bytes; ++i) v = v << 8 | p[i];
    return v;
}

// Reads a number from the file. Returns 0 if the file does not contain all of its bytes.
uint64_t number(io_file *file, int64_t offset, int32_t bytes) {
    return big_endian(io_file_bytes(file, offset, bytes), bytes);
}

uint32_t be32(io_file *file, int64_t offset) {
    return static_cast<uint32_t>(number(file, offset, 4));
}

// Reads the first box of a level and removes it from the level. A box whose stated size is too
// large ends with the level. Returns false if no box is left.
bool next_box(io_file *file, span *level, box *b) {
    const int64_t left = level->to - level->from;
    if (left < 8 || level->boxes++ == kMaxBoxes) return false;
    uint64_t size = be32(file, level->from);
    int64_t head = 8;
    if (size == 1) {
        size = number(file, level->from + 8, 8);
        head = 16;
    }
    if (size == 0 || size > static_cast<uint64_t>(left)) size = static_cast<uint64_t>(left);
    if (static_cast<int64_t>(size) < head) return false;
    *b = {be32(file, level->from + 4),
          level->from,
          {level->from + head, level->from + static_cast<int64_t>(size)}};
    level->from = b->body.to;
    return true;
}

// Reads and removes boxes up to the next one with this name. Returns false if no box has it.
bool next_named(io_file *file, span *level, uint32_t name, box *b) {
    while (next_box(file, level, b)) {
        if (b->name == name) return true;
    }
    return false;
}

// Returns the contents of the first box with this name in a level.
span find(io_file *file, span level, uint32_t name) {
    box b = {};
    return next_named(file, &level, name, &b) ? b.body : span{0, 0};
}

template <typename... Names>
span find(io_file *file, span level, uint32_t name, Names... deeper) {
    return find(file, find(file, level, name), deeper...);
}

// Reads a descriptor's tag and size. Reduces the span to the descriptor's contents.
uint8_t descriptor(io_file *file, span *level) {
    const auto tag = static_cast<uint8_t>(number(file, level->from++, 1));
    int64_t size = 0;
    for (uint64_t byte = 0x80, i = 0; (byte & 0x80) != 0 && i < 4; ++i) {
        byte = number(file, level->from++, 1);
        size = size << 7 | static_cast<int64_t>(byte & 0x7F);
    }
    level->to = std::min(level->to, level->from + size);
    return level->from <= level->to ? tag : uint8_t{0};
}

// Reads the object type and, for AAC, the configuration from an elementary stream descriptor.
void read_esds(const parser &p, span esds) {
    constexpr int64_t kObjectHead = 13;  // bytes: object type, stream type, buffer, bit rates
    esds.from += kFullHead;
    if (descriptor(p.file, &esds) != 3) return;
    const uint64_t flags = number(p.file, esds.from + 2, 1);
    esds.from += 3 + ((flags & 0x80) != 0 ? 2 : 0);
    if ((flags & 0x40) != 0) esds.from += 1 + static_cast<int64_t>(number(p.file, esds.from, 1));
    if ((flags & 0x20) != 0) esds.from += 2;
    if (descriptor(p.file, &esds) != 4) return;
    const uint64_t object = number(p.file, esds.from, 1);
    p.codec->is_mpeg = object == 0x69 || object == 0x6B;
    const bool is_aac = object == 0x40 || (object >= 0x66 && object <= 0x68);
    esds.from += kObjectHead;
    if (!is_aac || descriptor(p.file, &esds) != 5 || esds.to - esds.from > kAacMaxConfig) return;
    const auto bytes = static_cast<int32_t>(esds.to - esds.from);
    p.codec->is_aac =
        aac_config_read(&p.codec->config, io_file_bytes(p.file, esds.from, bytes), bytes);
}

// Determines the codec from the track's first sample description.
void read_codec(const parser &p, span stsd) {
    // Number of bytes before the entry's boxes, in ISO files and in versions 1 and 2 of QuickTime.
    constexpr int64_t kEntryHeads[] = {28, 28 + 16, 28 + 36};
    box entry = {};
    stsd.from += kFullHead + 4;
    if (!next_box(p.file, &stsd, &entry)) return;
    p.codec->is_mpeg = entry.name == name_of(".mp3") || entry.name == 0x6D730055;  // "ms", 0x55
    span esds = {0, 0};
    for (const int64_t head : kEntryHeads) {
        const span inner = {entry.body.from + head, entry.body.to};
        if (esds.to == 0) esds = find(p.file, inner, name_of("esds"));
        if (esds.to == 0) esds = find(p.file, inner, name_of("wave"), name_of("esds"));
    }
    if (entry.name == name_of("mp4a") && esds.to > 0) read_esds(p, esds);
}

// Adds a frame unless it is empty. Returns false if memory runs out or the file is too small for
// that many frames.
bool add_frame(parser *p, int64_t offset, int64_t bytes) {
    if (bytes == 0) return true;
    frame_index *frames = &p->info->frames;
    p->ended = offset < 0 || bytes < 0 || bytes > INT32_MAX || offset > p->file->size - bytes;
    return p->ended || (frames->count < p->file->size / kMinFrameBytes &&
                        frame_index_add(frames, offset, static_cast<int32_t>(bytes), 0));
}

// Contents of a table box, after its version and flags. Tables are read side by side but may be far
// apart in the file, so they are loaded into memory.
struct table {
    uint8_t *data;  // owned; null if missing or too long, or if memory ran out
    int64_t bytes;
};

table load(io_file *file, span body) {
    table t = {nullptr, body.to - body.from - kFullHead};
    if (t.bytes >= 4 && t.bytes <= kMaxTable) {
        t.data = static_cast<uint8_t *>(malloc(static_cast<size_t>(t.bytes)));
    }
    if (t.data != nullptr) t.bytes = io_file_read(file, body.from + kFullHead, t.data, t.bytes);
    if (t.data == nullptr || t.bytes < 0) t.bytes = 0;
    return t;
}

// Returns the number at an offset in the table, or 0 past its end.
int64_t value(const table &t, int64_t at, int32_t width) {
    const bool inside = at >= 0 && at + width <= t.bytes;
    return static_cast<int64_t>(big_endian(inside ? t.data + at : nullptr, width));
}

// A track's tables: the frames per chunk, the chunk offsets and the frame sizes.
struct tables {
    table runs;    // "stsc": count; first chunk, frames in each, description (32 bits each)
    table chunks;  // "stco", "co64": count; offsets of chunk_width bytes
    table sizes;   // "stsz": size of all frames or 0, count, sizes; "stz2": bits, count, sizes
    int32_t chunk_width;  // bytes per chunk offset
    int32_t size_bits;
    int64_t count;  // frames
};

tables load_tables(io_file *file, span stbl) {
    const span wide = find(file, stbl, name_of("co64"));
    const span plain = find(file, stbl, name_of("stsz"));
    tables t = {};
    t.runs = load(file, find(file, stbl, name_of("stsc")));
    t.chunk_width = wide.to > 0 ? 8 : 4;
    t.chunks = load(file, wide.to > 0 ? wide : find(file, stbl, name_of("stco")));
    t.sizes = load(file, plain.to > 0 ? plain : find(file, stbl, name_of("stz2")));
    const int64_t same = plain.to > 0 ? value(t.sizes, 0, 4) : 0;
    t.size_bits = same > 0 ? 0 : plain.to > 0 ? 32 : static_cast<int32_t>(value(t.sizes, 3, 1));
    t.count = value(t.sizes, 4, 4);
    if (same == 0) {
        const int64_t fitting = t.size_bits >= 4 ? (t.sizes.bytes - 8) * 8 / t.size_bits : 0;
        t.count = std::min(t.count, fitting);
    }
    return t;
}

int64_t size_of(const tables &t, int64_t i) {
    if (t.size_bits == 0) return value(t.sizes, 0, 4);
    if (t.size_bits >= 8) return value(t.sizes, 8 + i * t.size_bits / 8, t.size_bits / 8);
    const int64_t pair = value(t.sizes, 8 + i / 2, 1);
    return i % 2 == 0 ? pair >> 4 : pair & 15;
}

bool add_chunks(parser *p, const tables &t) {
    const int64_t chunks = std::min(value(t.chunks, 0, 4), (t.chunks.bytes - 4) / t.chunk_width);
    int64_t run = 4;
    int64_t frame = 0;
    for (int64_t chunk = 1; chunk <= chunks && frame < t.count && !p->ended; ++chunk) {
        while (run + 24 <= t.runs.bytes && value(t.runs, run + 12, 4) <= chunk) run += 12;
        const int64_t at = 4 + (chunk - 1) * t.chunk_width;
        int64_t offset = std::min(value(t.chunks, at, t.chunk_width), p->file->size);
        const int64_t end = std::min(frame + value(t.runs, run + 4, 4), t.count);
        for (; frame < end && !p->ended; ++frame) {
            const int64_t bytes = size_of(t, frame);
            if (!add_frame(p, offset, bytes)) return false;
            offset += bytes;
        }
    }
    return true;
}

bool read_tables(parser *p, span stbl) {
    const tables t = load_tables(p->file, stbl);
    const bool ok = add_chunks(p, t);
    free(t.runs.data);
    free(t.chunks.data);
    free(t.sizes.data);
    return ok;
}

// Reads the tracks' defaults for fragments from the "mvex" box.
void read_defaults(parser *p, span mvex) {
    box trex = {};
    while (p->default_count < kMaxTracks && next_named(p->file, &mvex, name_of("trex"), &trex)) {
        const int64_t at = trex.body.from + kFullHead;
        p->defaults[p->default_count++] = {be32(p->file, at), be32(p->file, at + 12)};
    }
}

uint32_t default_size(const parser *p, uint32_t track_id) {
    for (int32_t i = 0; i < p->default_count; ++i) {
        if (p->defaults[i].track_id == track_id) return p->defaults[i].bytes;
    }
    return 0;
}

// Reads one run of a track's frames, which start at *offset. Moves *offset to their end.
bool read_run(parser *p, span run, bool ours, int64_t base, uint32_t size, int64_t *offset) {
    const uint32_t flags = be32(p->file, run.from);
    const int64_t count = be32(p->file, run.from + kFullHead);
    int64_t at = run.from + kFullHead + 4;
    if ((flags & 0x1) != 0) {
        *offset = base + static_cast<int32_t>(be32(p->file, at));
        at += 4;
    }
    if ((flags & 0x4) != 0) at += 4;                      // flags of the first frame
    const int64_t before = (flags & 0x100) != 0 ? 4 : 0;  // each frame's duration
    const bool sized = (flags & 0x200) != 0;
    const int64_t entry =
        before + (sized ? 4 : 0) + ((flags & 0x400) != 0 ? 4 : 0) + ((flags & 0x800) != 0 ? 4 : 0);
    const int64_t end = p->file->size;
    if (!sized && (size == 0 || !ours)) {  // nothing except the file's size limits the count
        *offset = std::min(*offset, end) + (size > 0 ? std::min(count, end / size + 1) * size : 0);
        return true;
    }
    for (int64_t i = 0; i < count && at + entry <= run.to && !p->ended; ++i, at += entry) {
        const int64_t bytes = sized ? be32(p->file, at + before) : size;
        if (ours && !add_frame(p, *offset, bytes)) return false;
        *offset = std::min(*offset, end) + bytes;
    }
    return true;
}

// Reads all runs of one track of a fragment. The frames start at *offset, unless the fragment
// specifies another offset. Moves *offset to their end.
bool read_track_runs(parser *p, int64_t moof, span traf, int64_t *offset) {
    io_file *file = p->file;
    const span head = find(file, traf, name_of("tfhd"));
    const uint32_t flags = be32(file, head.from);
    const uint32_t track_id = be32(file, head.from + kFullHead);
    int64_t at = head.from + kFullHead + 4;
    if ((flags & 0x20000) != 0) *offset = moof;
    if ((flags & 0x1) != 0) {
        *offset = static_cast<int64_t>(number(file, at, 8));
        at += 8;
    }
    at += ((flags & 0x2) != 0 ? 4 : 0) + ((flags & 0x8) != 0 ? 4 : 0);
    const uint32_t size = (flags & 0x10) != 0 ? be32(file, at) : default_size(p, track_id);
    const int64_t base = std::clamp<int64_t>(*offset, 0, file->size);
    *offset = base;
    box run = {};
    while (next_named(file, &traf, name_of("trun"), &run)) {
        if (!read_run(p, run.body, track_id == p->track_id, base, size, offset)) return false;
    }
    return true;
}

// Reads the kinds of all tracks and the tables of the first audio track.
bool read_movie(parser *p, span moov) {
    io_file *file = p->file;
    stream_info *info = p->info;
    box trak = {};
    span level = moov;
    while (info->track_count < kMaxTracks && next_named(file, &level, name_of("trak"), &trak)) {
        const int32_t track = info->track_count++;
        const span media = find(file, trak.body, name_of("mdia"));
        const span handler = find(file, media, name_of("hdlr"));
        const uint32_t kind = be32(file, handler.from + kFullHead + 4);
        if (handler.to == 0 || kind != name_of("soun")) continue;
        info->kind[track] = kWexaKindAudio;
        if (info->track >= 0) continue;
        info->track = track;
        const span head = find(file, trak.body, name_of("tkhd"));
        const bool wide = number(file, head.from, 1) == 1;
        p->track_id = be32(file, head.from + kFullHead + (wide ? 16 : 8));
        const span stbl = find(file, media, name_of("minf"), name_of("stbl"));
        read_codec(*p, find(file, stbl, name_of("stsd")));
        const bool known = p->codec->is_aac || p->codec->is_mpeg;
        if (known && !read_tables(p, stbl)) return false;
    }
    read_defaults(p, find(file, moov, name_of("mvex")));
    return true;
}

}  // namespace

bool mp4_read_boxes(io_file *file, stream_info *info, mp4_codec *codec) {
    parser p = {};
    p.file = file;
    p.info = info;
    p.codec = codec;
    const span all = {0, file->size};
    const span moov = find(file, all, name_of("moov"));
    info->track = -1;
    if (moov.to == 0 || !read_movie(&p, moov)) return false;
    if (!codec->is_aac && !codec->is_mpeg) return !file->failed;
    box moof = {};
    span level = all;
    while (!p.ended && next_named(file, &level, name_of("moof"), &moof)) {
        int64_t offset = moof.start;
        box traf = {};
        while (next_named(file, &moof.body, name_of("traf"), &traf)) {
            if (!read_track_runs(&p, moof.start, traf.body, &offset)) return false;
        }
    }
    return !file->failed;
}
