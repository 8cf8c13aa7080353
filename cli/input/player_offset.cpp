#include "cli/input/player_offset.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <filesystem>

#include "cli/input/recognise.h"

namespace {

constexpr int64_t kDecoderDelay = 529;  // samples, in every Layer III decoder
constexpr int32_t kDropRate = 44'100;   // Hz; rate at which the library drops the delay in stereo
constexpr int64_t kLayer1Samples = 384;

// Returns the number of samples that players drop, as stated by the LAME header; 0 without that
// header. `frame` starts with the first compressed frame.
int64_t samples_dropped(std::string_view frame) {
    const auto byte = [&](size_t i) { return static_cast<uint8_t>(frame[i]); };
    const bool is_mpeg1 = (byte(1) >> 3 & 3) == 3;
    const bool is_mono = byte(3) >> 6 == 3;
    const size_t side_bytes = is_mpeg1 ? (is_mono ? 17 : 32) : (is_mono ? 9 : 17);
    for (const size_t tag : {4 + side_bytes, 6 + side_bytes}) {
        if (tag + 8 > frame.size()) break;
        const std::string_view name = frame.substr(tag, 4);
        if (name != "Xing" && name != "Info") continue;
        const uint64_t flags = big_endian(frame, tag + 4, 4);
        size_t encoder = tag + 8;
        const size_t field_bytes[] = {4, 4, 100, 4};  // frames, bytes, table of contents, quality
        for (size_t i = 0; i < 4; ++i) encoder += (flags >> i & 1) != 0 ? field_bytes[i] : 0;
        const std::string_view maker = frame.substr(std::min(encoder, frame.size()), 4);
        if (maker != "LAME" && maker != "Lavf" && maker != "Lavc") return 0;
        return static_cast<int64_t>(big_endian(frame, encoder + 21, 3) >> 12) + kDecoderDelay;
    }
    return 0;
}

double mpeg_offset_ms(const std::string &path, int32_t rate, int32_t channels) {
    constexpr int64_t kSearchedBytes = 4096;  // searched for the first frame, after the tags
    int code = 0;
    const std::string bytes = read_bytes(path, find_id3v2_end(path, code), kSearchedBytes, code);
    int64_t dropped = 0;  // samples that players drop
    int64_t library_drops = 0;
    for (std::string_view rest = bytes; rest.size() >= kKindBytes && dropped == 0;
         rest.remove_prefix(1)) {
        if (recognise_bytes(rest) != file_kind::mpeg) continue;
        const bool is_layer1 = (rest[1] & 6) == 6;
        if (library_drops == 0) library_drops = is_layer1 ? kLayer1Samples : kDecoderDelay;
        dropped = samples_dropped(rest);
    }
    if (rate == kDropRate && channels == 2) dropped -= library_drops;
    return 1000.0 * static_cast<double>(dropped) / rate;
}

// Returns the content of the first box of this type. Removes that box and all boxes before it. If
// there is no such box, or a box before it is damaged, returns nothing and removes all boxes.
std::string_view next_box(std::string_view &boxes, std::string_view type) {
    while (!boxes.empty()) {
        const uint64_t size = big_endian(boxes, 0, 4);
        if (size < 8 || size > boxes.size()) break;
        const std::string_view first = boxes.substr(0, size);
        boxes.remove_prefix(size);
        if (first.substr(4, 4) == type) return first.substr(8);
    }
    boxes = {};
    return {};
}

std::string_view find_box(std::string_view boxes, std::string_view type) {
    return next_box(boxes, type);
}

// Returns the content of the movie box, or an empty string.
std::string read_movie(const std::string &path) {
    constexpr int64_t kMostBytes = 256 << 20;
    int code = 0;
    std::error_code unknown_size;
    const auto end = static_cast<int64_t>(std::filesystem::file_size(path, unknown_size));
    for (int64_t at = 0; at < end;) {
        const std::string head = read_bytes(path, at, 16, code);
        auto size = static_cast<int64_t>(big_endian(head, 0, 4));
        const int64_t head_bytes = size == 1 ? 16 : 8;
        if (size == 1) size = static_cast<int64_t>(big_endian(head, 8, 8));
        if (size == 0) size = end - at;
        if (size < head_bytes || size > end - at) break;
        if (head.compare(4, 4, "moov") == 0 && size <= kMostBytes) {
            return read_bytes(path, at + head_bytes, size - head_bytes, code);
        }
        at += size;
    }
    return "";
}

// Returns the time scale of an mvhd or mdhd box in units per second.
double time_scale(std::string_view header) {
    const bool is_long = big_endian(header, 0, 1) == 1;
    return std::max(static_cast<double>(big_endian(header, is_long ? 20 : 12, 4)), 1.0);
}

// Computes a track's offset from its edit list. Empty edits delay the track; the first non-empty
// edit drops everything before its media time. Returns false if all edits are empty.
bool read_edits(std::string_view list, double movie_scale, double media_scale, double &ms) {
    const bool is_long = big_endian(list, 0, 1) == 1;
    const size_t field = is_long ? 8 : 4;
    ms = 0.0;
    for (size_t at = 8; at + 2 * field + 4 <= list.size(); at += 2 * field + 4) {
        const uint64_t duration = big_endian(list, at, field);
        const uint64_t raw = big_endian(list, at + field, field);
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

// Reads the encoder delay from "iTunSMPB": the second hexadecimal number, in samples.
double tag_offset_ms(const std::string &movie, int32_t rate) {
    const size_t name = movie.find("iTunSMPB");
    const size_t data = name == std::string::npos ? name : movie.find("data", name);
    if (data == std::string::npos || data + 12 > movie.size()) return 0.0;
    unsigned delay = 0;
    if (sscanf(movie.substr(data + 12, 64).c_str(), "%*x %x", &delay) != 1) return 0.0;
    constexpr unsigned kMostDelay = 16'384;
    return delay < kMostDelay ? 1000.0 * delay / rate : 0.0;
}

double mp4_offset_ms(const std::string &path, int32_t rate) {
    constexpr uint64_t kSound = 0x736F756E;  // "soun"
    const std::string movie = read_movie(path);
    const double movie_scale = time_scale(find_box(movie, "mvhd"));
    const double tag_ms = tag_offset_ms(movie, rate);
    for (std::string_view boxes = movie; !boxes.empty();) {
        const std::string_view track = next_box(boxes, "trak");
        const std::string_view media = find_box(track, "mdia");
        if (big_endian(find_box(media, "hdlr"), 8, 4) != kSound) continue;
        const std::string_view edits = find_box(find_box(track, "edts"), "elst");
        double ms = 0.0;
        if (!read_edits(edits, movie_scale, time_scale(find_box(media, "mdhd")), ms)) break;
        return tag_ms > 0.0 ? std::max(ms, tag_ms) : ms;  // players apply the longer one
    }
    return tag_ms;
}

}  // namespace

double find_player_offset_ms(const std::string &path, int32_t rate, int32_t channels) {
    file_kind kind = file_kind::unknown;
    if (rate <= 0 || recognise(path, kind) != 0) return 0.0;
    double ms = 0.0;
    if (kind == file_kind::mpeg) ms = mpeg_offset_ms(path, rate, channels);
    if (kind == file_kind::mp4) ms = mp4_offset_ms(path, rate);
    return std::round(ms * 1000.0) / 1000.0;
}
