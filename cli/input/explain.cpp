#include "cli/input/explain.h"

#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>

#include "cli/input/file_bytes.h"
#include "cli/input/recognise.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr int64_t kMsPerMinute = 60'000;

std::string seconds_text(int64_t ms) {
    std::array<char, 32> text{};
    snprintf(text.data(), text.size(), "%.3f", static_cast<double>(ms) / 1000);
    return text.data();
}

// Reads the start and the end of the file, where its format is described, to find a read error that
// the library's code does not name. Returns errno or 0.
int find_read_error(const std::string &path) {
    constexpr int64_t kReadBytes = 64 << 20;  // at each end
    int code = 0;
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return errno;
    read_bytes(path, 0, kReadBytes, code);
    const int64_t end_start = std::max(info.st_size - kReadBytes, kReadBytes);
    if (code == 0) read_bytes(path, end_start, kReadBytes, code);
    return code;
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

// Returns the reason for a code of tavo_probe.
std::string explain_code(file_kind kind, int32_t code, const TAVO_STREAM &stream) {
    const std::string subject = std::string("The ") + kind_name(kind) + " file ";
    switch (code) {
        case TAVO_OK:
            return "The file could not be read when its decoding was prepared.";
        case TAVO_ERR_MEMORY:
            return "There is not enough memory to open the file.";
        case TAVO_ERR_FORMAT:
            return explain_format(kind);
        case TAVO_ERR_OPEN:
            return subject + "has no usable audio stream" +
                   (kind == file_kind::ogg ? "; only Vorbis is read from Ogg." : ".");
        case TAVO_ERR_READ:
            return subject + "cannot be read or decoded.";
        case TAVO_ERR_CODEC:
            return subject + "cannot be decoded: no decoder accepts its audio.";
        case TAVO_ERR_SHORT:
            return "The audio is too short: it lasts " + seconds_text(stream.duration_ms) +
                   " s and must last more than 1 s.";
        case TAVO_ERR_LOW_RATE:
            return "The sample rate is too low: it is " + std::to_string(stream.rate) +
                   " Hz and must be at least " + std::to_string(TAVO_MIN_RATE) + " Hz.";
        default:
            return subject + "cannot be used: " + tavo_error_text(code) + ".";
    }
}

}  // namespace

failure check_file(const std::string &path) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) {
        if (errno == ENOENT) return {"The file does not exist."};
        return {system_sentence("The file cannot be opened", errno)};
    }
    if (S_ISDIR(info.st_mode)) return {"This is a folder, not a file."};
    if (!S_ISREG(info.st_mode)) return {"This is a device, pipe or socket, not a file."};
    int code = 0;
    const size_t size = read_bytes(path, 0, TAVO_MIN_FILE_BYTES, code).size();
    if (code != 0) return {system_sentence("The file cannot be read", code)};
    if (size == 0) return {"The file is empty."};
    if (size == TAVO_MIN_FILE_BYTES) return {};
    return {"The file is too short to be audio: it has " + std::to_string(size) + " bytes."};
}

failure explain_refusal(const std::string &path, int32_t code, record &result) {
    if (code == TAVO_ERR_MEMORY) return {"There is not enough memory to analyse the file."};
    TAVO_STREAM stream{};
    code = tavo_probe(path.c_str(), &stream);
    result.has_stream = stream.rate > 0;
    result.sample_rate = stream.rate;
    result.channels = stream.channels;
    result.duration_ms = stream.duration_ms;
    file_kind kind = file_kind::unknown;
    int read_error = recognise(path, kind);
    if (read_error == 0 && code != TAVO_ERR_FORMAT && !result.has_stream) {
        read_error = find_read_error(path);
    }
    if (read_error != 0) return {system_sentence("The file cannot be read", read_error)};
    return {explain_code(kind, code, stream)};
}

failure check_duration(int64_t duration_ms, int32_t max_minutes) {
    if (duration_ms <= max_minutes * kMsPerMinute) return {};
    return {"The audio lasts " + whole_clock_text(static_cast<double>(duration_ms)) +
            ", as the file states; the limit is --max-minutes " + std::to_string(max_minutes) +
            "."};
}
