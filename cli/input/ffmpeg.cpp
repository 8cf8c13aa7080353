#include "cli/input/ffmpeg.h"

#include <strings.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "cli/input/ffmpeg_process.h"
#include "cli/system.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr size_t kRateOffset = 24;                            // of a WAV header
constexpr size_t kHeaderBytes = 44;                           // of ffmpeg's header without tags
constexpr int64_t kMostWavBytes = (int64_t{1} << 32) - 4096;  // a WAV file has 32-bit sizes

// Limit on a file's decoded sound: one minute plus this many samples per byte. Silence has about a
// thousand in the most compact codecs. Without the limit a wrong time stamp could add hours.
constexpr int64_t kMostSamplesPerByte = 2048;
constexpr int64_t kSpareSeconds = 60;

constexpr const char *kMediaSuffixes[] = {
    ".3gp", ".ac3", ".aif", ".aifc", ".aiff", ".amr",  ".ape", ".au",   ".avi",
    ".caf", ".dsf", ".dts", ".eac3", ".flv",  ".m2ts", ".m4a", ".m4b",  ".m4v",
    ".mka", ".mkv", ".mov", ".mp4",  ".mpc",  ".mpeg", ".mpg", ".opus", ".spx",
    ".tak", ".tta", ".voc", ".w64",  ".wav",  ".webm", ".wma", ".wmv",  ".wv"};

// The output of one ffmpeg run.
struct decoding {
    int fd;              // destination
    int64_t file_bytes;  // of the encoded file
    int64_t most_minutes;
    std::string header = {};  // first kHeaderBytes of the sound
    int64_t bytes = 0;
    int32_t rate = 0;  // Hz; 0 until the header is complete
};

int32_t read_rate(const std::string &header) {
    uint32_t rate = 0;
    for (size_t i = 4; i-- > 0;) rate = rate << 8 | static_cast<uint8_t>(header[kRateOffset + i]);
    return static_cast<int32_t>(rate);
}

failure cannot_hold(int code) {
    return {system_sentence("The decoded sound cannot be held in memory", code)};
}

failure store_sound(decoding &sound, std::string_view part) {
    if (const int code = write_all(sound.fd, part)) return cannot_hold(code);
    sound.bytes += static_cast<int64_t>(part.size());
    if (sound.rate == 0) {
        sound.header += part.substr(0, kHeaderBytes - sound.header.size());
        if (sound.header.size() < kHeaderBytes) return {};
        sound.rate = read_rate(sound.header);
        if (sound.rate < TAVO_MIN_RATE || sound.rate > TAVO_MAX_RATE) {
            return {"ffmpeg decodes it at " + std::to_string(sound.rate) +
                    " Hz, which is not read."};
        }
    }
    const int64_t samples = sound.bytes / 2;
    if (samples > sound.most_minutes * 60 * sound.rate || sound.bytes > kMostWavBytes) {
        return {"The audio is longer than " +
                count_text(static_cast<size_t>(sound.most_minutes), "minute") + "."};
    }
    if (samples / kMostSamplesPerByte >
        sound.file_bytes + kSpareSeconds * sound.rate / kMostSamplesPerByte) {
        return {"The audio is longer than a file of its size can hold."};
    }
    return {};
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
    if (ftruncate(sound.fd, 0) != 0 || lseek(sound.fd, 0, SEEK_SET) != 0) return cannot_hold(errno);
    return run_ffmpeg(task, stop_fd,
                      [&sound](std::string_view part) { return store_sound(sound, part); });
}

}  // namespace

failure decode_with_ffmpeg(const options &opts, const std::string &path, int fd,
                           const std::string &filter, int stop_fd, int &sound_fd) {
    sound_fd = memfd_create("sound", MFD_CLOEXEC);
    if (sound_fd < 0) return cannot_hold(errno);
    struct stat info {};
    const int code = fd >= 0 ? fstat(fd, &info) : stat(path.c_str(), &info);
    const decoding start = {sound_fd, code == 0 ? info.st_size : 0, opts.max_minutes};
    decoding sound = start;
    failure failed = decode_once({opts.ffmpeg, path, fd, wav_output(filter, 0)}, stop_fd, sound);
    const int32_t accepted = std::clamp<int32_t>(sound.rate, TAVO_MIN_RATE, TAVO_MAX_RATE);
    if (sound.rate > 0 && sound.rate != accepted) {
        sound = start;
        failed = decode_once({opts.ffmpeg, path, fd, wav_output(filter, accepted)}, stop_fd, sound);
    }
    if (!failed && sound.rate == 0) failed = {"ffmpeg decodes nothing of it."};
    if (failed) close_fd(sound_fd);
    return failed;
}

bool has_media_suffix(const std::string &name) {
    return std::any_of(
        std::begin(kMediaSuffixes), std::end(kMediaSuffixes), [&name](const std::string &suffix) {
            return name.size() > suffix.size() &&
                   strcasecmp(name.c_str() + name.size() - suffix.size(), suffix.c_str()) == 0;
        });
}
