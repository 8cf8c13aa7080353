#include "cli/input/player_offset.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>

#include "cli/input/file_bytes.h"
#include "cli/input/recognise.h"

namespace {

constexpr int64_t kDecoderDelay = 529;  // samples, of every Layer III decoder
constexpr int32_t kDropRate = 44'100;   // the library drops that delay at this rate in stereo
constexpr int64_t kLayer1Samples = 384;

// Samples that players drop according to a LAME header in the first frame, whose bytes start at
// frame; 0 if there is none.
int64_t samples_dropped(const std::string &bytes, size_t frame) {
    const auto byte = [&](size_t i) { return static_cast<uint8_t>(bytes[frame + i]); };
    const bool is_mpeg1 = (byte(1) >> 3 & 3) == 3;
    const bool is_mono = byte(3) >> 6 == 3;
    const size_t side_bytes = is_mpeg1 ? (is_mono ? 17 : 32) : (is_mono ? 9 : 17);
    for (const size_t tag : {frame + 4 + side_bytes, frame + 6 + side_bytes}) {
        const std::string name = bytes.substr(std::min(tag, bytes.size()), 4);
        if (name != "Xing" && name != "Info") continue;
        const uint64_t flags = big_endian(bytes, tag + 4, 4);
        size_t encoder = tag + 8;
        const size_t field_bytes[] = {4, 4, 100, 4};  // frames, bytes, table of contents, quality
        for (size_t i = 0; i < 4; ++i) encoder += (flags >> i & 1) != 0 ? field_bytes[i] : 0;
        const std::string maker = bytes.substr(std::min(encoder, bytes.size()), 4);
        if (maker != "LAME" && maker != "Lavf" && maker != "Lavc") return 0;
        return static_cast<int64_t>(big_endian(bytes, encoder + 21, 3) >> 12) + kDecoderDelay;
    }
    return 0;
}

double mpeg_offset_ms(file_bytes &file, int32_t rate, int32_t channels) {
    constexpr size_t kSearchedBytes = 4096;  // for the first frame, after the tags
    const std::string bytes = read_bytes(file, id3v2_end(file), kSearchedBytes);
    int64_t dropped = 0;  // by players
    int64_t library_drops = 0;
    for (size_t i = 0; i + kKindBytes <= bytes.size() && dropped == 0; ++i) {
        if (recognise_bytes(bytes.substr(i, kKindBytes)) != file_kind::mpeg) continue;
        const bool is_layer1 = (bytes[i + 1] & 6) == 6;
        if (library_drops == 0) library_drops = is_layer1 ? kLayer1Samples : kDecoderDelay;
        dropped = samples_dropped(bytes, i);
    }
    if (rate == kDropRate && channels == 2) dropped -= library_drops;
    return 1000.0 * static_cast<double>(dropped) / rate;
}

// A box of an MP4 file: its content is [begin, end) of the movie box's bytes.
struct box {
    size_t begin = 0;
    size_t end = 0;
};

// The first box of the type in parent from offset on. False when there is none.
bool find_box(const std::string &movie, const box &parent, const char *type, size_t offset,
              box &found) {
    while (offset + 8 <= parent.end) {
        const uint64_t size = big_endian(movie, offset, 4);
        if (size < 8 || size > parent.end - offset) return false;
        found = {offset + 8, offset + static_cast<size_t>(size)};
        if (movie.compare(offset + 4, 4, type) == 0) return true;
        offset = found.end;
    }
    return false;
}

bool find_path(const std::string &movie, box parent, std::initializer_list<const char *> types,
               box &found) {
    for (const char *type : types) {
        if (!find_box(movie, parent, type, parent.begin, found)) return false;
        parent = found;
    }
    return true;
}

// Content of the movie box; empty without one.
std::string read_movie(file_bytes &file) {
    constexpr int64_t kMostBytes = 256 << 20;
    for (int64_t at = 0; at < file.size;) {
        const std::string head = read_bytes(file, at, 16);
        auto size = static_cast<int64_t>(big_endian(head, 0, 4));
        const int64_t head_bytes = size == 1 ? 16 : 8;
        if (size == 1) size = static_cast<int64_t>(big_endian(head, 8, 8));
        if (size == 0) size = file.size - at;
        if (size < head_bytes || size > file.size - at) break;
        if (head.compare(4, 4, "moov") == 0 && size <= kMostBytes) {
            return read_bytes(file, at + head_bytes, static_cast<size_t>(size - head_bytes));
        }
        at += size;
    }
    return "";
}

// Units per second of an mvhd or mdhd box.
double time_scale(const std::string &movie, const box &header) {
    const bool is_long = big_endian(movie, header.begin, 1) == 1;
    return static_cast<double>(big_endian(movie, header.begin + (is_long ? 20 : 12), 4));
}

// The first edits of a track: empty ones delay it, the first other one drops what comes before its
// media time. False without an edit.
bool read_edits(const std::string &movie, const box &list, double movie_scale, double media_scale,
                double &ms) {
    const bool is_long = big_endian(movie, list.begin, 1) == 1;
    const size_t field = is_long ? 8 : 4;
    ms = 0.0;
    for (size_t at = list.begin + 8; at + 2 * field + 4 <= list.end; at += 2 * field + 4) {
        const uint64_t duration = big_endian(movie, at, field);
        const uint64_t raw = big_endian(movie, at + field, field);
        const int64_t start =
            is_long ? static_cast<int64_t>(raw) : static_cast<int32_t>(static_cast<uint32_t>(raw));
        if (start >= 0) {
            ms += 1000.0 * static_cast<double>(start) / media_scale;
            return true;
        }
        ms -= 1000.0 * static_cast<double>(duration) / movie_scale;
    }
    return false;
}

// "iTunSMPB": the encoder's delay in samples as the second of its hexadecimal numbers.
double tag_offset_ms(const std::string &movie, int32_t rate) {
    const size_t name = movie.find("iTunSMPB");
    const size_t data = name == std::string::npos ? name : movie.find("data", name);
    if (data == std::string::npos || data + 12 > movie.size()) return 0.0;
    unsigned delay = 0;
    if (sscanf(movie.substr(data + 12, 64).c_str(), "%*x %x", &delay) != 1) return 0.0;
    constexpr unsigned kMostDelay = 16'384;
    return delay < kMostDelay ? 1000.0 * delay / rate : 0.0;
}

double mp4_offset_ms(file_bytes &file, int32_t rate) {
    const std::string movie = read_movie(file);
    const box all = {0, movie.size()};
    box header;
    if (!find_path(movie, all, {"mvhd"}, header)) return 0.0;
    const double movie_scale = std::max(time_scale(movie, header), 1.0);
    const double tag_ms = tag_offset_ms(movie, rate);
    box track;
    for (size_t at = 0; find_box(movie, all, "trak", at, track); at = track.end) {
        box part;
        if (!find_path(movie, track, {"mdia", "hdlr"}, part)) continue;
        if (part.begin + 12 > part.end || movie.compare(part.begin + 8, 4, "soun") != 0) continue;
        if (!find_path(movie, track, {"mdia", "mdhd"}, part)) break;
        const double media_scale = std::max(time_scale(movie, part), 1.0);
        double ms = 0.0;
        if (!find_path(movie, track, {"edts", "elst"}, part)) break;
        if (!read_edits(movie, part, movie_scale, media_scale, ms)) break;
        return tag_ms > 0.0 ? std::max(ms, tag_ms) : ms;  // players apply the longer one
    }
    return tag_ms;
}

}  // namespace

double find_player_offset_ms(const std::string &path, int32_t rate, int32_t channels) {
    file_kind kind = file_kind::unknown;
    if (rate <= 0 || recognise(path, kind) != 0) return 0.0;
    file_bytes file;
    if (!open_bytes(file, path)) return 0.0;
    double ms = 0.0;
    if (kind == file_kind::mpeg) ms = mpeg_offset_ms(file, rate, channels);
    if (kind == file_kind::mp4) ms = mp4_offset_ms(file, rate);
    close_bytes(file);
    return std::round(ms * 1000.0) / 1000.0;
}
