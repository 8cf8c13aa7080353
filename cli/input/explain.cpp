#include "cli/input/explain.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>

#include "cli/input/recognise.h"
#include "cli/input/wav_header.h"
#include "cli/write/value_text.h"
#include "common/limits.h"
#include "media_source/mtsrc.h"

namespace {

constexpr const char *kConvert = " ffmpeg -i FILE -ar 44100 NEW.flac converts it.";

std::string rates_text() {
    return std::to_string(kMinRate) + " to " + std::to_string(kMaxRate) + " Hz";
}

std::string seconds_text(int64_t units) {
    const int64_t ms = units / kUnitsPerMs;
    std::array<char, 32> text{};
    snprintf(text.data(), text.size(), "%lld.%03lld", static_cast<long long>(ms / 1000),
             static_cast<long long>(ms % 1000));
    return text.data();
}

// The source opened, so one of the pipeline's own limits is broken or its segments could not be
// prepared.
std::string explain_stream(const mtsrc_format &format) {
    if (format.duration <= kRefusedUnits) {
        return "The audio is too short: it lasts " + seconds_text(format.duration) +
               " s and must last more than " + std::to_string(kRefusedUnits / kUnitsPerSecond) +
               " s.";
    }
    if (format.sample_rate < kMinRate) {
        return "The sample rate is too low: it is " + std::to_string(format.sample_rate) +
               " Hz and must be at least " + std::to_string(kMinRate) + " Hz." + kConvert;
    }
    return "The file could not be prepared for decoding; there may be too little memory for audio "
           "of " +
           seconds_text(format.duration) + " s.";
}

std::string explain_refused_format(const std::string &path, int32_t type) {
    if (type == kMtsrcTypeWav) return explain_wav(path);
    if (type == kMtsrcTypeMp4) {
        return "The MP4 file's audio is neither AAC nor MP3, or its sample rate is not within " +
               rates_text() + "." + kConvert;
    }
    return std::string("The ") + type_name(type) + " file has a sample rate that is not read; " +
           rates_text() + " are." + kConvert;
}

std::string explain_source_code(const std::string &path, int32_t type, int32_t code) {
    const std::string subject = std::string("The ") + type_name(type) + " file ";
    switch (code) {
        case TAVO_ERR_MEMORY:
            return "There is not enough memory to open the file.";
        case TAVO_ERR_FORMAT:
            return explain_refused_format(path, type);
        case TAVO_ERR_OPEN:
            if (type == kMtsrcTypeOgg) {
                return "The Ogg file has no usable audio stream; only Vorbis is read from Ogg." +
                       std::string(kConvert);
            }
            return subject + "has no usable audio stream.";
        case TAVO_ERR_READ:
            return subject + "cannot be read or decoded.";
        case TAVO_ERR_CODEC:
            return subject +
                   "cannot be decoded: the codec library failed or has no decoder for it.";
        default:
            return subject + "cannot be used (code " + std::to_string(code) + ").";
    }
}

}  // namespace

std::string explain_before_open(const std::string &path) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) {
        if (errno == ENOENT) return "The file does not exist.";
        return system_sentence("The file cannot be opened", errno);
    }
    if (S_ISDIR(info.st_mode)) return "This is a folder, not a file.";
    if (!S_ISREG(info.st_mode)) return "This is a device, pipe or socket, not a file.";
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (fd < 0) return system_sentence("The file cannot be read", errno);
    char byte = 0;
    const ssize_t got = read(fd, &byte, 1);
    const int code = errno;
    close(fd);
    if (got < 0) return system_sentence("The file cannot be read", code);
    if (got == 0) return "The file is empty.";
    if (info.st_size < kHeadBytes) {
        return "The file is too short to be audio: it has " + std::to_string(info.st_size) +
               " bytes.";
    }
    return "";
}

std::string explain_unusable(const std::string &path, int32_t code, record &result) {
    if (code == TAVO_ERR_MEMORY) return "There is not enough memory to analyse the file.";
    int32_t type = kMtsrcTypeUnknown;
    const int recognised = recognise(path, type);
    if (recognised > 0) return system_sentence("The file cannot be read", recognised);
    if (recognised < 0) return "The file cannot be read far enough to recognise its format.";
    if (type == kMtsrcTypeUnknown) return "The file is not recognised as audio of a known format.";
    if (type == kMtsrcTypeAsf) {
        return std::string("The file is ") + type_name(type) + ", a format that is refused." +
               kConvert;
    }
    const mtsrc_param param{path.c_str()};
    int32_t error = 0;
    mtsrc_ctx *source = mtsrc_init(&param, &error);
    if (source == nullptr) return explain_source_code(path, type, error);
    mtsrc_format format{};
    mtsrc_getstream_format(source, &format);
    mtsrc_deinit(source);
    result.has_stream = true;
    result.sample_rate = format.sample_rate;
    result.channels = format.channels;
    result.duration_ms = format.duration / kUnitsPerMs;
    return explain_stream(format);
}
