#include "cli/input/ffmpeg.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <sstream>

#include "cli/system.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

constexpr size_t kMostMessageBytes = 65536;  // only the first line is used
// Limit on the address space. A damaged file can make ffmpeg allocate hours of silence at once.
constexpr rlim_t kMostProgramBytes = rlim_t{448} << 20;
constexpr int kReadPollMs = 1000;  // time between two checks of the clock

// Containers that hold their own audio. Playlists and scripts (HLS, concat, DASH, SDP, image
// sequences) refer to other files and are not accepted.
constexpr const char *kContainers =
    "aac,ac3,aiff,amr,amrnb,amrwb,ape,asf,au,avi,caf,dsf,dts,dtshd,eac3,flac,flv,iff,loas,matroska,"
    "mlp,mov,mp3,"
    "mpc,mpc8,mpeg,mpegts,mxf,nut,ogg,oma,rm,shn,sox,tak,truehd,tta,voc,w64,wav,wv,xwma";

struct ffmpeg_process {
    pid_t pid = -1;
    int sound_fd = -1;    // standard output
    int message_fd = -1;  // standard error
    std::string message;
};

using clock_type = std::chrono::steady_clock;

// The prefix makes ffmpeg treat any name as a file, even -x.mp3, http://x and a:b.mp3.
std::string input_name(const ffmpeg_task &task) {
    return "file:" + (task.fd >= 0 ? "/dev/stdin" : task.path);
}

std::vector<std::string> command_line(const ffmpeg_task &task) {
    // One thread: by default there is one per core, and each reserves 72 MiB of address space.
    std::vector<std::string> words = {task.program, "-nostdin", "-hide_banner", "-v", "error"};
    words.insert(words.end(), {"-threads", "1", "-filter_threads", "1"});
    words.insert(words.end(), {"-protocol_whitelist", "file", "-format_whitelist", kContainers});
    words.insert(words.end(), {"-vn", "-sn", "-dn", "-i", input_name(task)});
    words.insert(words.end(), task.arguments.begin(), task.arguments.end());
    return words;
}

// Runs in the new process, which gets its own process group so that Ctrl-C does not reach it. The
// worker decides when ffmpeg stops.
[[noreturn]] void become_ffmpeg(char *const *words, int input, int output, int messages,
                                pid_t parent) {
    setpgid(0, 0);
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(EXIT_FAILURE);
    const rlimit memory = {kMostProgramBytes, kMostProgramBytes};
    setrlimit(RLIMIT_AS, &memory);
    const bool ready = (input < 0 || dup2(input, STDIN_FILENO) >= 0) &&
                       dup2(output, STDOUT_FILENO) >= 0 && dup2(messages, STDERR_FILENO) >= 0;
    syscall(SYS_close_range, STDERR_FILENO + 1, ~0U, 0);
    if (ready) execv(words[0], words);
    _exit(EXIT_FAILURE);
}

// Returns 0 or errno.
int start_ffmpeg(const ffmpeg_task &task, ffmpeg_process &process) {
    std::vector<std::string> words = command_line(task);
    std::vector<char *> pointers(words.size() + 1, nullptr);
    std::transform(words.begin(), words.end(), pointers.begin(),
                   [](std::string &word) { return word.data(); });
    int sound[2] = {-1, -1};
    int messages[2] = {-1, -1};
    const pid_t parent = getpid();
    if (pipe2(sound, O_CLOEXEC) == 0 && pipe2(messages, O_CLOEXEC) == 0) process.pid = fork();
    if (process.pid == 0) become_ffmpeg(pointers.data(), task.fd, sound[1], messages[1], parent);
    const int code = process.pid < 0 ? errno : 0;
    close_fd(sound[1]);
    close_fd(messages[1]);
    process.sound_fd = sound[0];
    process.message_fd = messages[0];
    return code;
}

// Reads the available bytes. Closes fd at the end of the pipe or after an error.
std::string_view read_part(int &fd, std::array<char, 65536> &part) {
    const ssize_t got = read(fd, part.data(), part.size());
    if (got == 0 || (got < 0 && errno != EINTR)) close_fd(fd);
    return {part.data(), static_cast<size_t>(std::max<ssize_t>(got, 0))};
}

// Reads both pipes until they end, which they do when the process ends.
failure read_pipes(ffmpeg_process &process, int stop_fd, const byte_sink &sink) {
    std::array<char, 65536> part;
    auto deadline = clock_type::now() + std::chrono::seconds(kIdleSeconds);
    while (process.sound_fd >= 0 || process.message_fd >= 0) {
        pollfd watched[] = {
            {process.sound_fd, POLLIN, 0}, {process.message_fd, POLLIN, 0}, {stop_fd, POLLIN, 0}};
        poll(watched, std::size(watched), kReadPollMs);
        if (watched[2].revents != 0) return {"The analysis was stopped."};
        if (clock_type::now() > deadline) {
            return {"ffmpeg made no progress for " + std::to_string(kIdleSeconds) +
                    " s and was ended."};
        }
        if (watched[1].revents != 0) {
            const std::string_view text = read_part(process.message_fd, part);
            if (process.message.size() < kMostMessageBytes) process.message += text;
        }
        if (watched[0].revents != 0) {
            deadline = clock_type::now() + std::chrono::seconds(kIdleSeconds);
            if (failure failed = sink(read_part(process.sound_fd, part))) return failed;
        }
    }
    return {};
}

// Returns the first line of the messages without the names of ffmpeg's module and of the file.
std::string first_line(const ffmpeg_task &task, const std::string &message) {
    std::string line = message.substr(0, message.find('\n'));
    const size_t module_end = line.find("] ");
    if (!line.empty() && line.front() == '[' && module_end != std::string::npos) {
        line.erase(0, module_end + 2);
    }
    const std::string name = input_name(task) + ": ";
    if (line.compare(0, name.size(), name) == 0) line.erase(0, name.size());
    while (!line.empty() && (line.back() == '.' || line.back() == ' ')) line.pop_back();
    return shown(line);
}

failure explain_end(const ffmpeg_task &task, const std::string &message, int status) {
    if (WIFSIGNALED(status)) return {"ffmpeg was ended " + ending_text(status) + "."};
    const bool is_cut = message.find(strerror(EIO)) != std::string::npos;  // a bad sector
    if (WEXITSTATUS(status) == 0 && !is_cut) return {};
    const std::string line = first_line(task, message);
    return {line.empty() ? "ffmpeg ended " + ending_text(status) + "." : "ffmpeg: " + line + "."};
}

}  // namespace

std::string find_ffmpeg() {
    const char *variable = getenv("PATH");
    std::istringstream folders(variable == nullptr ? "" : variable);
    for (std::string folder; std::getline(folders, folder, ':');) {
        const std::string path = folder + "/ffmpeg";
        if (path.front() == '/' && access(path.c_str(), X_OK) == 0) return path;
    }
    return "";
}

failure run_ffmpeg(const ffmpeg_task &task, int stop_fd, const byte_sink &sink) {
    ffmpeg_process process;
    failure failed;
    if (const int code = start_ffmpeg(task, process)) {
        failed = {system_sentence("ffmpeg could not be started", code)};
    } else {
        failed = read_pipes(process, stop_fd, sink);
        if (failed) kill(process.pid, SIGKILL);
        const int status = wait_for_end(process.pid);
        if (!failed) failed = explain_end(task, process.message, status);
    }
    close_fd(process.sound_fd);
    close_fd(process.message_fd);
    return failed;
}
