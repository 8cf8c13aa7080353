#include "cli/input/explain.h"

#include "cli/input/recognise.h"
#include "cli/write/value_text.h"

namespace {

// The library does not report the system's errors, so this reads the file again.
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

// Returns the reason for a tavo_probe code.
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
