#include "cli/input/recognise.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "cli/system.h"
#include "cli/write/value_text.h"

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
    {file_kind::flac, "fLaC"},
    {file_kind::ogg, "OggS\0"sv},
    {file_kind::mp4, "", 4, "ftyp"},
    {file_kind::mp4, "", 4, "moov"},
    {file_kind::mp4, "", 4, "mdat"},
    {file_kind::aac, "ADIF"},
    {file_kind::aiff, "FORM", 8, "AIF"},
    {file_kind::asf, "\x30\x26\xB2\x75\x8E\x66\xCF\x11"},
    {file_kind::matroska, "\x1A\x45\xDF\xA3"},
};

// The format's name and the codings that the library reads in it, in the order of file_kind. The
// library reads none of the last three formats.
struct kind_text {
    const char *name;
    const char *codings;
};
constexpr kind_text kKinds[] = {{"audio", "MPEG"},     {"WAV", "16-bit integer PCM"},
                                {"FLAC", "FLAC"},      {"Ogg", "Vorbis"},
                                {"MP4", "AAC or MP3"}, {"AAC", "AAC"},
                                {"MP3", "MPEG"},       {"AIFF", ""},
                                {"Windows Media", ""}, {"Matroska", ""}};

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

// Reads the start of a file again, because the library reports no errno. Returns 0, or the errno of
// the first error.
int find_read_error(const std::string &path) {
    constexpr int64_t kPartBytes = 1 << 20;
    constexpr int64_t kMostBytes = 128 << 20;  // enough for most songs
    int code = 0;
    for (int64_t at = 0; at < kMostBytes && code == 0; at += kPartBytes) {
        if (read_bytes(path, at, kPartBytes, code).empty()) break;
    }
    return code;
}

// Returns a sentence that explains a result of tavo_probe.
std::string explain_code(file_kind kind, int32_t code, const TAVO_STREAM &stream) {
    const kind_text &text = kKinds[static_cast<size_t>(kind)];
    const std::string subject = std::string("The ") + text.name + " file ";
    const std::string lowest = std::to_string(TAVO_MIN_RATE);
    switch (code) {
        case TAVO_OK:  // see tavo_init
        case TAVO_ERR_MEMORY:
            return "There is not enough memory to analyse the file.";
        case TAVO_ERR_FORMAT:
            if (kind == file_kind::unknown) {
                return "The file is not recognised as audio of a known format.";
            }
            if (text.codings[0] == '\0') return subject + "has a format that only ffmpeg reads.";
            return subject + "is damaged or is not " + text.codings + " audio at " + lowest +
                   " to " + std::to_string(TAVO_MAX_RATE) + " Hz, which is all that is read.";
        case TAVO_ERR_OPEN:
            return subject + "has no usable " + text.codings + " audio.";
        case TAVO_ERR_SHORT:
            return "The audio is too short: it lasts " +
                   formatted("%.3f", static_cast<double>(stream.duration_ms) / 1000) +
                   " s and must last more than 1 s.";
        case TAVO_ERR_LOW_RATE:
            return "The sample rate is too low: it is " + std::to_string(stream.rate) +
                   " Hz and must be at least " + lowest + " Hz.";
        default:
            return subject + "cannot be used: " + tavo_error_text(code) + ".";
    }
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

std::string read_bytes(const std::string &path, int64_t offset, int64_t size, int &code) {
    std::string bytes;
    int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    struct stat info {};
    code = fd < 0 || fstat(fd, &info) != 0 ? errno : 0;
    if (code == 0 && S_ISREG(info.st_mode)) {
        bytes.resize(static_cast<size_t>(std::clamp<int64_t>(info.st_size - offset, 0, size)));
    }
    size_t done = 0;
    while (code == 0 && done < bytes.size()) {
        const ssize_t got = pread(fd, bytes.data() + done, bytes.size() - done,
                                  offset + static_cast<int64_t>(done));
        if (got == 0) break;
        if (got > 0) done += static_cast<size_t>(got);
        if (got < 0 && errno != EINTR) code = errno;
    }
    bytes.resize(done);
    close_fd(fd);
    return bytes;
}

uint64_t big_endian(std::string_view bytes, size_t offset, size_t size) {
    if (offset + size > bytes.size()) return 0;
    uint64_t value = 0;
    for (size_t i = 0; i < size; ++i) value = value << 8 | static_cast<uint8_t>(bytes[offset + i]);
    return value;
}

int64_t find_id3v2_end(const std::string &path, int &code) {
    constexpr int64_t kHeaderBytes = 10;
    constexpr int kMostTags = 100;  // files have one or two
    int64_t end = 0;
    for (int tags = 0; tags < kMostTags; ++tags) {
        const std::string head = read_bytes(path, end, kHeaderBytes, code);
        const uint64_t length = big_endian(head, 6, 4);
        const bool is_tag = head.size() == kHeaderBytes && head.compare(0, 3, "ID3") == 0 &&
                            static_cast<uint8_t>(head[3]) < 0x10 && (length & 0x80808080u) == 0;
        if (!is_tag) break;
        int64_t bytes = 0;  // seven bits per byte
        for (int shift = 24; shift >= 0; shift -= 8) {
            bytes = bytes << 7 | static_cast<int64_t>(length >> shift & 0x7F);
        }
        const bool has_footer = (static_cast<uint8_t>(head[5]) & 0x10) != 0;
        end += kHeaderBytes + bytes + (has_footer ? kHeaderBytes : 0);
    }
    return end;
}

std::string explain_refusal(const std::string &path, int32_t code, const TAVO_STREAM &stream) {
    file_kind kind = file_kind::unknown;
    int read_error = recognise(path, kind);
    if (read_error == 0 && stream.rate == 0) read_error = find_read_error(path);
    if (read_error == 0) return explain_code(kind, code, stream);
    return system_sentence("The file cannot be read", read_error);
}

std::string explain_lost_audio(const std::string &path, bool has_audio) {
    if (const int code = find_read_error(path)) {
        return system_sentence("The file cannot be read", code);
    }
    return has_audio ? "The file could not be read to its end."
                     : "No audio could be decoded from the file.";
}
