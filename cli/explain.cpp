#include "cli/explain.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <system_error>

#include "cli/wav_header.h"
#include "core/tavo.h"
#include "media_source/mtsrc.h"

namespace {

constexpr int64_t kShortestFile = 16;  // bytes: recognition reads that many
constexpr int64_t kShortestMs = 1000;  // a stream must last longer
constexpr int32_t kLowestRate = 8000;  // Hz
constexpr int64_t kUnitsPerMillisecond = 10'000;

struct type_name {
    int32_t type;
    const char *name;
};
constexpr type_name kTypeNames[] = {
    {kMtsrcTypeMp4, "MP4"},
    {kMtsrcTypeAsf, "ASF (Windows Media)"},
    {kMtsrcTypeOgg, "Ogg"},
    {kMtsrcTypeWav, "WAV"},
    {kMtsrcTypeAac, "AAC"},
    {kMtsrcTypeMpegLayer1, "MPEG audio Layer I"},
    {kMtsrcTypeMpegLayer2, "MPEG audio Layer II"},
    {kMtsrcTypeMpegLayer3, "MP3"},
    {kMtsrcTypeFlac, "FLAC"},
};

std::string name_of(int32_t type) {
    for (const type_name &entry : kTypeNames) {
        if (entry.type == type) return entry.name;
    }
    return "unknown";
}

mtsrc_io file_callbacks(char *path) {
    mtsrc_io io{};
    mtsrc_file_callbacks(&io);
    io.path = path;
    return io;
}

// As recognise, on a descriptor.
int recognise_open(int fd, int32_t &type) {
    char by_descriptor[] = "fd";  // the name under which the record's descriptor is duplicated
    mtsrc_io io = file_callbacks(by_descriptor);
    io.fd = fd;
    mtsrc_file *file = io.open(&io, 0);
    if (file == nullptr) return errno == 0 ? EIO : errno;
    const int32_t code = mtsrc_get_file_type(&io, file, &type);
    io.close(file);
    return code == 0 ? 0 : -1;
}

std::string seconds(int64_t ms) {
    std::array<char, 32> text{};
    snprintf(text.data(), text.size(), "%lld.%03lld", static_cast<long long>(ms / 1000),
             static_cast<long long>(ms % 1000));
    return text.data();
}

// The source opened: the pipeline's own limits are left, or it could not prepare its segments.
std::string explain_stream(const mtsrc_format &format) {
    const int64_t ms = format.duration / kUnitsPerMillisecond;
    if (format.duration <= kShortestMs * kUnitsPerMillisecond) {
        return "The audio is too short: it lasts " + seconds(ms) +
               " s and must last more than 1 s.";
    }
    if (format.sample_rate < kLowestRate) {
        return "The sample rate is too low: it is " + std::to_string(format.sample_rate) +
               " Hz and must be at least " + std::to_string(kLowestRate) + " Hz.";
    }
    return "The file could not be prepared for decoding; there may be too little memory for audio "
           "of " +
           seconds(ms) + " s.";
}

std::string explain_source_code(const std::string &path, int32_t type, int32_t code) {
    const std::string what = "The " + name_of(type) + " file ";
    switch (code) {
        case TAVO_ERR_MEMORY:
            return "There is not enough memory to open the file.";
        case TAVO_ERR_FORMAT:
            if (type == kMtsrcTypeWav) return explain_wav(path);
            if (type == kMtsrcTypeMp4) {
                return "The MP4 file's audio is neither AAC nor MP3, or its sample rate is not "
                       "within 8000 to 48000 Hz.";
            }
            return what + "has a sample rate that is not read; 8000 to 48000 Hz are.";
        case TAVO_ERR_OPEN:
            if (type == kMtsrcTypeOgg) {
                return "The Ogg file has no usable audio stream; only Vorbis is read from Ogg.";
            }
            return what + "has no usable audio stream.";
        case TAVO_ERR_READ:
            return what + "cannot be read or decoded.";
        case TAVO_ERR_CODEC:
            return what + "cannot be decoded: the codec library failed or has no decoder for it.";
        default:
            return what + "cannot be used (code " + std::to_string(code) + ").";
    }
}

}  // namespace

std::string system_sentence(const std::string &what, int code) {
    std::string reason = std::generic_category().message(code);
    if (!reason.empty() && reason[0] >= 'A' && reason[0] <= 'Z' && reason.size() > 1 &&
        reason[1] >= 'a') {
        reason[0] = static_cast<char>(reason[0] - 'A' + 'a');
    }
    return what + ": " + reason + ".";
}

int recognise(const std::string &path, int32_t &type) {
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (fd < 0) return errno;
    struct stat info {};
    int code = fstat(fd, &info) == 0 && S_ISREG(info.st_mode) ? 0 : -1;
    if (code == 0) code = recognise_open(fd, type);
    close(fd);
    return code;
}

bool is_audio(int32_t type) {
    return type != kMtsrcTypeUnknown;
}

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
    if (info.st_size < kShortestFile) {
        return "The file is too short to be audio: it has " + std::to_string(info.st_size) +
               " bytes.";
    }
    return "";
}

std::string explain_unusable(const std::string &library_path, int32_t code, record &about) {
    if (code == TAVO_ERR_MEMORY) return "There is not enough memory to analyse the file.";
    int32_t type = kMtsrcTypeUnknown;
    const int recognised = recognise(library_path, type);
    if (recognised > 0) return system_sentence("The file cannot be read", recognised);
    if (recognised < 0) return "The file cannot be read far enough to tell what it is.";
    if (type == kMtsrcTypeUnknown) return "The file is not recognised as audio of a known format.";
    if (type == kMtsrcTypeAsf)
        return "The file is " + name_of(type) + ", a format that is refused.";

    const mtsrc_param param{library_path.c_str()};
    int32_t error = 0;
    mtsrc_ctx *source = mtsrc_init(&param, &error);
    if (source == nullptr) return explain_source_code(library_path, type, error);
    mtsrc_format format{};
    mtsrc_getstream_format(source, &format);
    mtsrc_deinit(source);
    about.has_stream = true;
    about.sample_rate = format.sample_rate;
    about.channels = format.channels;
    about.duration_ms = format.duration / kUnitsPerMillisecond;
    return explain_stream(format);
}
