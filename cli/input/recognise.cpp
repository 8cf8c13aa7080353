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

// Limits of find_read_error, which reads a file again because the library reports no errno.
constexpr int64_t kHeadBytes = 1 << 20;         // enough to recognise a format
constexpr int64_t kDescribedBytes = 128 << 20;  // enough to find the description of most streams

// Reads at most the first `most_bytes` bytes. Returns 0, or the errno of the first error.
int find_read_error(const std::string &path, int64_t most_bytes) {
    int code = 0;
    for (int64_t at = 0; at < most_bytes; at += kHeadBytes) {
        if (read_bytes(path, at, kHeadBytes, code).empty() || code != 0) break;
    }
    return code;
}

std::string unreadable(int code) {
    return system_sentence("The file cannot be read", code);
}

std::string explain_format(file_kind kind) {
    const std::string name = kind_name(kind);
    const std::string highest = std::to_string(TAVO_MAX_RATE) + " Hz";
    const std::string rates = std::to_string(TAVO_MIN_RATE) + " to " + highest;
    switch (kind) {
        case file_kind::unknown:
            return "The file is not recognised as audio of a known format.";
        case file_kind::wav:
            return "The WAV file is damaged or is not 16-bit integer PCM at up to " + highest +
                   ", which is all that is read.";
        case file_kind::mp4:
            return "The MP4 file's audio is neither AAC nor MP3, or its sample rate is not " +
                   rates + ".";
        case file_kind::asf:
        case file_kind::aiff:
        case file_kind::matroska:
            return "The file is " + name + ", a format that is not read.";
        default:
            return "The " + name + " file has a sample rate that is not read; " + rates + " are.";
    }
}

// Returns a sentence that explains a result of tavo_probe.
std::string explain_code(file_kind kind, int32_t code, const TAVO_STREAM &stream) {
    const std::string subject = std::string("The ") + kind_name(kind) + " file ";
    switch (code) {
        case TAVO_OK:  // see tavo_init
        case TAVO_ERR_MEMORY:
            return "There is not enough memory to analyse the file.";
        case TAVO_ERR_FORMAT:
            return explain_format(kind);
        case TAVO_ERR_OPEN:
            return subject + "has no usable audio stream" +
                   (kind == file_kind::ogg ? "; only Vorbis is read from Ogg." : ".");
        case TAVO_ERR_CODEC:
            return subject + "cannot be decoded: no decoder accepts its audio.";
        case TAVO_ERR_SHORT:
            return "The audio is too short: it lasts " +
                   formatted("%.3f", static_cast<double>(stream.duration_ms) / 1000) +
                   " s and must last more than 1 s.";
        case TAVO_ERR_LOW_RATE:
            return "The sample rate is too low: it is " + std::to_string(stream.rate) +
                   " Hz and must be at least " + std::to_string(TAVO_MIN_RATE) + " Hz.";
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

const char *kind_name(file_kind kind) {
    return kNames[static_cast<size_t>(kind)];
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
    int64_t end = 0;
    while (true) {
        const std::string head = read_bytes(path, end, kHeaderBytes, code);
        const uint64_t length = big_endian(head, 6, 4);
        const bool is_tag = head.size() == kHeaderBytes && head.compare(0, 3, "ID3") == 0 &&
                            static_cast<uint8_t>(head[3]) < 0x10 && (length & 0x80808080u) == 0;
        if (!is_tag) return end;
        int64_t bytes = 0;  // seven bits per byte
        for (int shift = 24; shift >= 0; shift -= 8) {
            bytes = bytes << 7 | static_cast<int64_t>(length >> shift & 0x7F);
        }
        const bool has_footer = (static_cast<uint8_t>(head[5]) & 0x10) != 0;
        end += kHeaderBytes + bytes + (has_footer ? kHeaderBytes : 0);
    }
}

std::string explain_refusal(const std::string &path, int32_t code, const TAVO_STREAM &stream) {
    file_kind kind = file_kind::unknown;
    int read_error = recognise(path, kind);
    if (read_error == 0 && stream.rate == 0) {
        read_error = find_read_error(path, code == TAVO_ERR_FORMAT ? kHeadBytes : kDescribedBytes);
    }
    return read_error != 0 ? unreadable(read_error) : explain_code(kind, code, stream);
}

std::string explain_lost_audio(const std::string &path, bool has_audio) {
    if (const int code = find_read_error(path, INT64_MAX)) return unreadable(code);
    return has_audio ? "The file could not be read to its end."
                     : "No audio could be decoded from the file.";
}
