#include "cli/input/song_file.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>

#include "cli/input/ffmpeg.h"
#include "cli/input/recognise.h"
#include "cli/system.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr off_t kMostPipeBytes = off_t{4} << 30;  // memory for data from a pipe

constexpr off_t kRateOffset = 24;                             // of the rate in a WAV header
constexpr int64_t kHeaderBytes = 44;                          // of ffmpeg's header without tags
constexpr int64_t kMostWavBytes = (int64_t{1} << 32) - 4096;  // a WAV file has 32-bit sizes

// Limit on decoded sound: one minute plus this many samples per byte of the file. The most compact
// codecs reach about 1000 for silence. Without a limit, a wrong time stamp could add hours.
constexpr int64_t kMostSamplesPerByte = 2048;
constexpr int64_t kSpareSeconds = 60;

// Returns the inherited pipe or socket that a path such as /dev/stdin refers to, or -1. The
// command's own pipes are close-on-exec.
int inherited_pipe(const std::string &path) {
    int fd = STDIN_FILENO;
    char rest = '\0';
    const bool is_number = sscanf(path.c_str(), "/dev/fd/%d%c", &fd, &rest) == 1 ||
                           sscanf(path.c_str(), "/proc/self/fd/%d%c", &fd, &rest) == 1;
    struct stat info {};
    if ((!is_number && path != "/dev/stdin") || fstat(fd, &info) != 0) return -1;
    const bool is_pipe = S_ISFIFO(info.st_mode) || S_ISSOCK(info.st_mode);
    return is_pipe && (fcntl(fd, F_GETFD) & FD_CLOEXEC) == 0 ? fd : -1;
}

// Copies a pipe until it ends. Returns 0 or errno: ECANCELED after a stop, EFBIG for too much data.
int copy_pipe(int source, int target, int stop_fd) {
    std::array<char, 65536> part;
    for (off_t bytes = 0; bytes <= kMostPipeBytes;) {
        std::array<pollfd, 2> watched = {{{source, POLLIN, 0}, {stop_fd, POLLIN, 0}}};
        if (poll(watched.data(), watched.size(), -1) < 0 && errno != EINTR) return errno;
        if (watched[1].revents != 0) return ECANCELED;
        if (watched[0].revents == 0) continue;
        const ssize_t got = read(source, part.data(), part.size());
        if (got == 0) return 0;
        if (got < 0 && errno != EINTR && errno != EAGAIN) return errno;
        if (got < 0) continue;
        const int code = write_all(target, {part.data(), static_cast<size_t>(got)});
        if (code != 0) return code;
        bytes += got;
    }
    return EFBIG;
}

// Returns a song that is read through a descriptor.
song_file song_at(int fd, int source_fd, bool by_ffmpeg) {
    return {"/proc/self/fd/" + std::to_string(fd), fd, source_fd, by_ffmpeg};
}

failure read_pipe(int pipe_fd, int stop_fd, song_file &song) {
    int fd = memfd_create("song", MFD_CLOEXEC);
    const int code = fd < 0 ? errno : copy_pipe(pipe_fd, fd, stop_fd);
    const off_t size = lseek(fd, 0, SEEK_CUR);
    if (code == 0 && size >= TAVO_MIN_FILE_BYTES) {
        song = song_at(fd, fd, false);
        return {};
    }
    close_fd(fd);
    if (code != 0) return {system_sentence("The pipe cannot be read into memory", code)};
    return {"Only " + std::to_string(size) + " bytes came through the pipe."};
}

// Checks that the file is a readable regular file of sufficient size. Never blocks.
failure check_file(const std::string &path) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) {
        if (errno == ENOENT) return {"The file does not exist."};
        return {system_sentence("The file cannot be opened", errno)};
    }
    if (S_ISDIR(info.st_mode)) return {"This is a folder, not a file."};
    if (!S_ISREG(info.st_mode)) return {"This is a device, pipe or socket, not a file."};
    if (access(path.c_str(), R_OK) != 0) return {system_sentence("The file cannot be read", errno)};
    if (info.st_size >= TAVO_MIN_FILE_BYTES) return {};
    return {"The file is too short to be audio: it has " + std::to_string(info.st_size) +
            " bytes."};
}

// Checks the part of a WAV file that ffmpeg has written so far. Stores the sample rate once the
// header is complete. `file_bytes` is the size of the encoded file.
failure check_sound(int fd, int64_t bytes, int64_t file_bytes, int64_t most_minutes,
                    int32_t &rate) {
    // The field is little-endian, as is every processor that the command runs on.
    if (bytes < kHeaderBytes || pread(fd, &rate, sizeof rate, kRateOffset) < 0) return {};
    if (rate < TAVO_MIN_RATE || rate > TAVO_MAX_RATE) {
        return {"ffmpeg decodes it at " + std::to_string(rate) + " Hz, which is not read."};
    }
    const int64_t samples = bytes / 2;
    if (samples > most_minutes * 60 * rate || bytes > kMostWavBytes) {
        return {"The audio is longer than " +
                count_text(static_cast<size_t>(most_minutes), "minute") + "."};
    }
    if (samples / kMostSamplesPerByte > file_bytes + kSpareSeconds * rate / kMostSamplesPerByte) {
        return {"The audio is longer than a file of its size can hold."};
    }
    return {};
}

// Decodes the first audio stream of a file to a 16-bit mono WAV file in memory. Reads source_fd or,
// if that is negative, `path`. Keeps the sample rate, or uses the nearest supported one. Without
// `filter`, times in the WAV file are player times.
failure decode(const std::string &path, const options &opts, int stop_fd, int source_fd,
               const std::string &filter, song_file &song) {
    struct stat info {};
    const int code = source_fd >= 0 ? fstat(source_fd, &info) : stat(path.c_str(), &info);
    const int64_t file_bytes = code == 0 ? info.st_size : 0;
    // Without tags the header has a fixed size.
    ffmpeg_task task = {opts.ffmpeg,
                        path,
                        source_fd,
                        {"-map", "0:a:0", "-af", kPlayerTimeFilter + filter, "-ac", "1", "-c:a",
                         "pcm_s16le", "-map_metadata", "-1", "-bitexact", "-f", "wav", "pipe:1"}};
    int fd = -1;
    int32_t rate = 0;
    const auto check = [&](int output, int64_t bytes) {
        return check_sound(output, bytes, file_bytes, opts.max_minutes, rate);
    };
    failure failed = run_ffmpeg(task, stop_fd, check, fd);
    const int32_t accepted = std::clamp<int32_t>(rate, TAVO_MIN_RATE, TAVO_MAX_RATE);
    if (rate > 0 && rate != accepted) {
        task.arguments.insert(task.arguments.begin(), {"-ar", std::to_string(accepted)});
        close_fd(fd);
        rate = 0;
        failed = run_ffmpeg(task, stop_fd, check, fd);
    }
    if (!failed && rate == 0) failed = {"ffmpeg decodes nothing of it."};
    if (failed) {
        close_fd(fd);
    } else {
        song = song_at(fd, source_fd, true);
    }
    return failed;
}

}  // namespace

failure open_song(const std::string &path, int stop_fd, song_file &song) {
    const int pipe_fd = inherited_pipe(path);
    if (pipe_fd >= 0) return read_pipe(pipe_fd, stop_fd, song);
    if (failure failed = check_file(path)) return failed;
    song = {path == "fd" ? "./fd" : path};  // the library takes "fd" for a descriptor
    if (path.size() < TAVO_PATH_BYTES) return {};
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (fd < 0) return {system_sentence("The file cannot be opened", errno)};
    song = song_at(fd, fd, false);
    return {};
}

failure decode_song(const std::string &path, const options &opts, int stop_fd, song_file &song) {
    if (opts.ffmpeg.empty()) {
        return {"ffmpeg, which may read it, is not installed or is switched off."};
    }
    return decode(path, opts, stop_fd, song.fd, "", song);
}

failure raise_song(const std::string &path, const options &opts, int stop_fd, const song_file &song,
                   double gain, double offset_ms, song_file &raised) {
    file_kind kind = file_kind::unknown;
    if (!song.by_ffmpeg) recognise(song.path, kind);
    const bool is_mean =  // the library averages the channels; of other files it takes the first
        song.by_ffmpeg || kind == file_kind::mpeg || kind == file_kind::ogg;
    std::string filter = is_mean ? "" : ",pan=mono|c0=c0";
    filter += ",volume=" + std::to_string(gain) + ":precision=double";
    if (offset_ms > 0.0) filter += ",adelay=" + std::to_string(offset_ms) + ":all=1";
    if (offset_ms < 0.0) filter += ",atrim=start=" + std::to_string(-offset_ms / 1000.0);
    const int source_fd = song.by_ffmpeg ? song.source_fd : song.fd;
    const failure failed = decode(path, opts, stop_fd, source_fd, filter, raised);
    raised.source_fd = -1;  // it belongs to `song`
    return failed;
}

void close_song(song_file &song) {
    if (song.source_fd == song.fd) song.source_fd = -1;
    close_fd(song.fd);
    close_fd(song.source_fd);
}
