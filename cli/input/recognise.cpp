#include "cli/input/recognise.h"

#include <cstdint>

#include "cli/input/file_bytes.h"

namespace {

using namespace std::string_view_literals;

struct signature {
    file_kind kind;
    std::string_view start;
    size_t offset = 0;  // of middle
    std::string_view middle = {};
};
constexpr signature kSignatures[] = {
    {file_kind::wav, "RIFF", 8, "WAVE"},
    {file_kind::aiff, "FORM", 8, "AIF"},
    {file_kind::flac, "fLaC"},
    {file_kind::ogg, "OggS\0"sv},
    {file_kind::mp4, "", 4, "ftyp"},
    {file_kind::mp4, "", 4, "moov"},
    {file_kind::mp4, "", 4, "mdat"},
    {file_kind::aac, "ADIF"},
    {file_kind::asf, "\x30\x26\xB2\x75\x8E\x66\xCF\x11"},
    {file_kind::matroska, "\x1A\x45\xDF\xA3"},
};

// In the order of file_kind.
constexpr const char *kNames[] = {
    "unknown",         "WAV", "AIFF", "FLAC", "Ogg", "MP4", "AAC", "MP3", "ASF (Windows Media)",
    "Matroska or WebM"};

// Recognises an MPEG audio or ADTS frame header. A UTF-16 byte order mark is not one.
file_kind recognise_frame(std::string_view head) {
    const auto byte = [&](size_t i) { return static_cast<uint8_t>(head[i]); };
    const bool has_sync = byte(0) == 0xFF && (byte(1) & 0xE0) == 0xE0 && byte(1) != 0xFE;
    if (!has_sync) return file_kind::unknown;
    const int layer = byte(1) >> 1 & 3;
    if (layer == 0) return (byte(1) & 0xF0) == 0xF0 ? file_kind::aac : file_kind::unknown;
    const bool is_valid = (byte(1) >> 3 & 3) != 1 && byte(2) >> 4 != 15 && (byte(2) >> 2 & 3) != 3;
    return is_valid ? file_kind::mpeg : file_kind::unknown;
}

}  // namespace

file_kind recognise_bytes(std::string_view head) {
    if (head.size() < kKindBytes) return file_kind::unknown;
    for (const signature &entry : kSignatures) {
        const bool is_match = head.substr(0, entry.start.size()) == entry.start &&
                              head.substr(entry.offset, entry.middle.size()) == entry.middle;
        if (is_match) return entry.kind;
    }
    if (head.substr(0, 3) == "ID3" && static_cast<uint8_t>(head[3]) < 0x10) return file_kind::mpeg;
    return recognise_frame(head);
}

int recognise(const std::string &path, file_kind &kind) {
    int code = 0;
    const int64_t start = find_id3v2_end(path, code);
    kind =
        code == 0 ? recognise_bytes(read_bytes(path, start, kKindBytes, code)) : file_kind::unknown;
    if (kind == file_kind::unknown && start > 0) kind = file_kind::mpeg;
    return code;
}

const char *kind_name(file_kind kind) {
    return kNames[static_cast<size_t>(kind)];
}
