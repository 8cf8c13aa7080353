#include "cli/input/recognise.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>

#include "cli/input/file_bytes.h"

namespace {

bool has(const std::string &head, size_t at, const char *text, size_t size) {
    return head.compare(at, size, text, size) == 0;
}

// An MPEG audio or ADTS frame header. A byte order mark of UTF-16 is not taken for one.
file_kind recognise_frame(const std::string &head) {
    const auto byte = [&](size_t i) { return static_cast<uint8_t>(head[i]); };
    const bool has_sync = byte(0) == 0xFF && (byte(1) & 0xE0) == 0xE0 && byte(1) != 0xFE;
    if (!has_sync) return file_kind::unknown;
    const int layer = byte(1) >> 1 & 3;
    if (layer == 0) return (byte(1) & 0xF0) == 0xF0 ? file_kind::aac : file_kind::unknown;
    const bool is_valid = (byte(1) >> 3 & 3) != 1 && byte(2) >> 4 != 15 && (byte(2) >> 2 & 3) != 3;
    return is_valid ? file_kind::mpeg : file_kind::unknown;
}

}  // namespace

file_kind recognise_bytes(const std::string &head) {
    if (head.size() < kKindBytes) return file_kind::unknown;
    if (has(head, 0, "RIFF", 4) && has(head, 8, "WAVE", 4)) return file_kind::wav;
    if (has(head, 0, "FORM", 4) && has(head, 8, "AIF", 3)) return file_kind::aiff;
    if (has(head, 0, "fLaC", 4)) return file_kind::flac;
    if (has(head, 0, "OggS\0", 5)) return file_kind::ogg;
    for (const char *box : {"ftyp", "moov", "mdat"}) {
        if (has(head, 4, box, 4)) return file_kind::mp4;
    }
    if (has(head, 0, "ADIF", 4)) return file_kind::aac;
    if (has(head, 0, "\x30\x26\xB2\x75\x8E\x66\xCF\x11", 8)) return file_kind::asf;
    if (has(head, 0, "\x1A\x45\xDF\xA3", 4)) return file_kind::matroska;
    if (has(head, 0, "ID3", 3) && static_cast<uint8_t>(head[3]) < 0x10) return file_kind::mpeg;
    return recognise_frame(head);
}

int recognise(const std::string &path, file_kind &kind) {
    kind = file_kind::unknown;
    file_bytes file;
    if (!open_bytes(file, path)) return errno;
    const int64_t start = id3v2_end(file);
    kind = recognise_bytes(read_bytes(file, start, kKindBytes));
    if (kind == file_kind::unknown && start > 0) kind = file_kind::mpeg;
    close_bytes(file);
    return file.error;
}

const char *kind_name(file_kind kind) {
    switch (kind) {
        case file_kind::unknown:
            break;
        case file_kind::wav:
            return "WAV";
        case file_kind::aiff:
            return "AIFF";
        case file_kind::flac:
            return "FLAC";
        case file_kind::ogg:
            return "Ogg";
        case file_kind::mp4:
            return "MP4";
        case file_kind::aac:
            return "AAC";
        case file_kind::mpeg:
            return "MP3";
        case file_kind::asf:
            return "ASF (Windows Media)";
        case file_kind::matroska:
            return "Matroska or WebM";
    }
    return "unknown";
}
