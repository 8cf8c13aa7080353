#include "cli/input/ffmpeg.h"

#include <strings.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "cli/input/ffmpeg_process.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr size_t kRateOffset = 24;                            // of a WAV header
constexpr size_t kHeaderBytes = 44;                           // of ffmpeg's, without tags
constexpr int64_t kMostWavBytes = (int64_t{1} << 32) - 4096;  // a WAV file has 32-bit sizes

// Sound that a file may decode to: a minute, and so many samples for each of its bytes. Silence has
// about a thousand in the most compact codecs; a time stamp hours ahead would have billions.
constexpr int64_t kMostSamplesPerByte = 2048;
constexpr int64_t kSpareSeconds = 60;

constexpr const char *kMediaSuffixes[] = {
    ".3gp", ".ac3", ".aif", ".aifc", ".aiff", ".amr",  ".ape", ".au",   ".avi",
    ".caf", ".dsf", ".dts", ".eac3", ".flv",  ".m2ts", ".m4a", ".m4b",  ".m4v",
    ".mka", ".mkv", ".mov", ".mp4",  ".mpc",  ".mpeg", ".mpg", ".opus", ".spx",
    ".tak", ".tta", ".voc", ".w64",  ".wav",  ".webm", ".wma", ".wmv",  ".wv"};

// The sound of one run as it comes.
struct decoding {
    int fd;
    int64_t most_minutes;
    int64_t file_bytes;  // of the encoded file
    std::string header;  // its first kHeaderBytes
    int64_t bytes = 0;   // written to fd
    int32_t rate = 0;    // Hz; 0 until the header is there
};

int32_t rate_of(const std::string &header) {
    uint32_t rate = 0;
    for (size_t i = 0; i < 4; ++i) {
        rate |= static_cast<uint32_t>(static_cast<uint8_t>(header[kRateOffset + i])) << (8 * i);
    }
    return static_cast<int32_t>(rate);
}

failure store_sound(decoding &sound, const char *data, size_t size) {
    for (size_t done = 0; done < size;) {
        const ssize_t got = write(sound.fd, data + done, size - done);
        if (got < 0 && errno != EINTR) {
            return {system_sentence("The decoded sound cannot be held in memory", errno)};
        }
        if (got > 0) done += static_cast<size_t>(got);
    }
    sound.bytes += static_cast<int64_t>(size);
    if (sound.rate == 0) {
        sound.header.append(data, std::min(size, kHeaderBytes - sound.header.size()));
        if (sound.header.size() < kHeaderBytes) return {};
        sound.rate = rate_of(sound.header);
        if (sound.rate < TAVO_MIN_RATE || sound.rate > TAVO_MAX_RATE) {
            return {"ffmpeg decodes it at " + std::to_string(sound.rate) +
                    " Hz, which is not read."};
        }
    }
    const int64_t samples = sound.bytes / 2;
    if (samples > sound.most_minutes * 60 * sound.rate || sound.bytes > kMostWavBytes) {
        return {"The audio is longer than " + std::to_string(sound.most_minutes) + " minutes."};
    }
    if (samples / kMostSamplesPerByte >
        sound.file_bytes + kSpareSeconds * sound.rate / kMostSamplesPerByte) {
        return {"The audio is longer than a file of its size can hold."};
    }
    return {};
}

int64_t size_of_file(const std::string &path, int fd) {
    struct stat info {};
    const int code = fd >= 0 ? fstat(fd, &info) : stat(path.c_str(), &info);
    return code == 0 ? info.st_size : 0;
}

// Without tags the header has a fixed size.
std::vector<std::string> wav_output(const std::string &filter, int32_t rate) {
    const std::string filters = kPlayerTimeFilter + filter;
    std::vector<std::string> words = {"-map",      "0:a:0", "-af",       filters,         "-ac",
                                      "1",         "-c:a",  "pcm_s16le", "-map_metadata", "-1",
                                      "-bitexact", "-f",    "wav"};
    if (rate > 0) words.insert(words.end(), {"-ar", std::to_string(rate)});
    words.emplace_back("pipe:1");
    return words;
}

failure decode_once(const ffmpeg_task &task, int stop_fd, decoding &sound) {
    if (ftruncate(sound.fd, 0) != 0 || lseek(sound.fd, 0, SEEK_SET) != 0) {
        return {system_sentence("The decoded sound cannot be held in memory", errno)};
    }
    return run_ffmpeg(task, stop_fd, [&sound](const char *data, size_t size) {
        return store_sound(sound, data, size);
    });
}

}  // namespace

failure decode_with_ffmpeg(const ffmpeg_limits &limits, const std::string &path, int fd,
                           int stop_fd, int &sound_fd) {
    sound_fd = memfd_create("sound", MFD_CLOEXEC);
    if (sound_fd < 0) return {system_sentence("The decoded sound cannot be held in memory", errno)};
    const int64_t file_bytes = size_of_file(path, fd);
    decoding sound{sound_fd, limits.minutes, file_bytes, "", 0, 0};
    failure failed =
        decode_once({limits.program, path, fd, wav_output(limits.filter, 0)}, stop_fd, sound);
    const int32_t accepted = std::clamp<int32_t>(sound.rate, TAVO_MIN_RATE, TAVO_MAX_RATE);
    if (sound.rate > 0 && sound.rate != accepted) {
        sound = {sound_fd, limits.minutes, file_bytes, "", 0, 0};
        failed = decode_once({limits.program, path, fd, wav_output(limits.filter, accepted)},
                             stop_fd, sound);
    }
    if (!failed && sound.rate == 0) failed = {"ffmpeg decodes nothing of it."};
    if (!failed) return {};
    close(sound_fd);
    sound_fd = -1;
    return failed;
}

bool has_media_suffix(const std::string &name) {
    return std::any_of(
        std::begin(kMediaSuffixes), std::end(kMediaSuffixes), [&name](const std::string &suffix) {
            return name.size() > suffix.size() &&
                   strcasecmp(name.c_str() + name.size() - suffix.size(), suffix.c_str()) == 0;
        });
}
