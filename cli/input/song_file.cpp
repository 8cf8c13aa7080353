#include "cli/input/song_file.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <string_view>

#include "cli/input/ffmpeg.h"
#include "cli/input/recognise.h"
#include "cli/system.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr off_t kMostPipeBytes = off_t{4} << 30;  // memory for data from a pipe

// Returns the descriptor that a path such as /dev/stdin refers to, or -1.
int named_descriptor(const std::string &path) {
    int fd = -1;
    if (path == "/dev/stdin") return STDIN_FILENO;
    for (const std::string_view folder : {"/dev/fd/", "/proc/self/fd/"}) {
        const char *end = path.data() + path.size();
        if (path.compare(0, folder.size(), folder) != 0) continue;
        if (std::from_chars(path.data() + folder.size(), end, fd).ptr == end) return fd;
    }
    return -1;
}

// True for a pipe or socket that the command inherited. Its own are close-on-exec.
bool is_inherited_pipe(int fd) {
    struct stat info {};
    return fd >= 0 && fstat(fd, &info) == 0 && (S_ISFIFO(info.st_mode) || S_ISSOCK(info.st_mode)) &&
           (fcntl(fd, F_GETFD) & FD_CLOEXEC) == 0;
}

// Copies a pipe to its end. Returns 0 or errno; ECANCELED after a stop.
int copy_pipe(int source, int target, int stop_fd) {
    std::array<char, 65536> part;
    for (off_t bytes = 0; bytes <= kMostPipeBytes;) {
        std::array<pollfd, 2> watched = {{{source, POLLIN, 0}, {stop_fd, POLLIN, 0}}};
        if (poll(watched.data(), watched.size(), -1) < 0) continue;  // EINTR
        if (watched[1].revents != 0) return ECANCELED;
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

failure read_inherited_pipe(int pipe_fd, int stop_fd, song_file &song) {
    int fd = memfd_create("song", MFD_CLOEXEC);
    const int code = fd < 0 ? errno : copy_pipe(pipe_fd, fd, stop_fd);
    const off_t size = lseek(fd, 0, SEEK_CUR);
    if (code == 0 && size >= TAVO_MIN_FILE_BYTES) {
        song = song_at(fd, fd, false);
        return {};
    }
    close_fd(fd);
    if (code == ECANCELED) return {"The analysis was stopped."};
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
    int code = 0;
    const size_t size = read_bytes(path, 0, TAVO_MIN_FILE_BYTES, code).size();
    if (code != 0) return {system_sentence("The file cannot be read", code)};
    if (size == 0) return {"The file is empty."};
    if (size == TAVO_MIN_FILE_BYTES) return {};
    return {"The file is too short to be audio: it has " + std::to_string(size) + " bytes."};
}

}  // namespace

failure open_song(const std::string &path, int stop_fd, song_file &song) {
    const int inherited = named_descriptor(path);
    if (is_inherited_pipe(inherited)) return read_inherited_pipe(inherited, stop_fd, song);
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
    int sound_fd = -1;
    const failure failed = decode_with_ffmpeg(opts, path, song.fd, "", stop_fd, sound_fd);
    if (!failed) song = song_at(sound_fd, song.fd, true);
    return failed;
}

failure raise_song(const std::string &path, const options &opts, int stop_fd, const song_file &song,
                   double gain, double offset_ms, song_file &raised) {
    file_kind kind = file_kind::unknown;
    if (!song.by_ffmpeg) recognise(song.path, kind);
    const bool is_mean =  // of all channels; the library reads the first one of other files
        song.by_ffmpeg || kind == file_kind::mpeg || kind == file_kind::ogg;
    std::string filter = is_mean ? "" : ",pan=mono|c0=c0";
    filter += ",volume=" + std::to_string(gain) + ":precision=double";
    if (offset_ms > 0.0) filter += ",adelay=" + std::to_string(offset_ms) + ":all=1";
    if (offset_ms < 0.0) filter += ",atrim=start=" + std::to_string(-offset_ms / 1000.0);
    int fd = song.by_ffmpeg ? song.source_fd : song.fd;
    const failure failed = decode_with_ffmpeg(opts, path, fd, filter, stop_fd, fd);
    if (!failed) raised = song_at(fd, -1, true);
    return failed;
}

void close_song(song_file &song) {
    if (song.source_fd == song.fd) song.source_fd = -1;
    close_fd(song.fd);
    close_fd(song.source_fd);
}
