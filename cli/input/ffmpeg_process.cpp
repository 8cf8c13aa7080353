#include "cli/input/ffmpeg_process.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
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

#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

constexpr size_t kMostMessageBytes = 65536;  // of the program's messages; the first line counts
// Address space: a damaged file makes it allocate hours of silence at once.
constexpr rlim_t kMostProgramBytes = rlim_t{768} << 20;
constexpr int kEndPollMs = 10;  // between two looks at a program that is ending

// Containers that hold their sound themselves. Playlists and scripts (HLS, concat, DASH, SDP, image
// sequences), which name other files, are not among them.
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

void close_fd(int &fd) {
    if (fd >= 0) close(fd);
    fd = -1;
}

// The prefix makes any name a file's: -x.mp3, http://x, a:b.mp3.
std::string input_name(const ffmpeg_task &task) {
    return "file:" + (task.fd >= 0 ? "/dev/stdin" : task.path);
}

std::vector<std::string> command_line(const ffmpeg_task &task) {
    std::vector<std::string> words = {
        task.program, "-nostdin",          "-hide_banner", "-v",  "error", "-protocol_whitelist",
        "file",       "-format_whitelist", kContainers,    "-vn", "-sn",   "-dn",
        "-i",         input_name(task)};
    words.insert(words.end(), task.arguments.begin(), task.arguments.end());
    return words;
}

// In the new process. A group of its own keeps Ctrl-C from it: the worker decides.
[[noreturn]] void become_ffmpeg(char *const *words, int input, int output, int messages,
                                pid_t parent) {
    setpgid(0, 0);
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(EXIT_FAILURE);
    const rlimit memory = {kMostProgramBytes, kMostProgramBytes};
    setrlimit(RLIMIT_AS, &memory);
    const bool ready = dup2(input, STDIN_FILENO) >= 0 && dup2(output, STDOUT_FILENO) >= 0 &&
                       dup2(messages, STDERR_FILENO) >= 0;
    syscall(SYS_close_range, STDERR_FILENO + 1, ~0U, 0);
    if (ready) execv(words[0], words);
    _exit(EXIT_FAILURE);
}

// Returns 0 or errno.
int start_ffmpeg(const ffmpeg_task &task, ffmpeg_process &process) {
    std::vector<std::string> words = command_line(task);
    std::vector<char *> pointers;
    for (std::string &word : words) pointers.push_back(word.data());
    pointers.push_back(nullptr);
    int sound[2] = {-1, -1};
    int messages[2] = {-1, -1};
    int input =
        task.fd >= 0 ? fcntl(task.fd, F_DUPFD_CLOEXEC, 0) : open("/dev/null", O_RDONLY | O_CLOEXEC);
    const bool opened =
        input >= 0 && pipe2(sound, O_CLOEXEC) == 0 && pipe2(messages, O_CLOEXEC) == 0;
    const pid_t parent = getpid();
    if (opened) process.pid = fork();
    if (process.pid == 0) become_ffmpeg(pointers.data(), input, sound[1], messages[1], parent);
    const int code = process.pid < 0 ? errno : 0;
    for (int *fd : {&input, &sound[1], &messages[1]}) close_fd(*fd);
    process.sound_fd = sound[0];
    process.message_fd = messages[0];
    return code;
}

// Hands over what has come. Closes the descriptor at its end.
failure read_sound(ffmpeg_process &process, const byte_sink &sink) {
    std::array<char, 65536> part;
    const ssize_t got = read(process.sound_fd, part.data(), part.size());
    if (got > 0) return sink(part.data(), static_cast<size_t>(got));
    if (got == 0 || errno != EINTR) close_fd(process.sound_fd);
    return {};
}

void read_message(ffmpeg_process &process) {
    std::array<char, 1024> part;
    const ssize_t got = read(process.message_fd, part.data(), part.size());
    if (got == 0 || (got < 0 && errno != EINTR)) close_fd(process.message_fd);
    if (got > 0 && process.message.size() < kMostMessageBytes) {
        process.message.append(part.data(), static_cast<size_t>(got));
    }
}

failure ended_idle() {
    return {"ffmpeg made no progress for " + std::to_string(kIdleSeconds) + " s and was ended."};
}

// Reads both pipes until they end.
failure read_pipes(ffmpeg_process &process, int stop_fd, const byte_sink &sink) {
    auto deadline = clock_type::now() + std::chrono::seconds(kIdleSeconds);
    while (process.sound_fd >= 0 || process.message_fd >= 0) {
        std::array<pollfd, 3> watched = {
            {{process.sound_fd, POLLIN, 0}, {process.message_fd, POLLIN, 0}, {stop_fd, POLLIN, 0}}};
        const auto left =
            std::chrono::ceil<std::chrono::milliseconds>(deadline - clock_type::now());
        if (left.count() <= 0) return ended_idle();
        if (poll(watched.data(), watched.size(), static_cast<int>(left.count())) < 0) continue;
        if (watched[2].revents != 0) return {"The analysis was stopped."};
        if (watched[1].revents != 0) read_message(process);
        if (watched[0].revents == 0) continue;
        deadline = clock_type::now() + std::chrono::seconds(kIdleSeconds);
        if (failure failed = read_sound(process, sink)) return failed;
    }
    return {};
}

// The process has closed its pipes and ends. Returns false if it does not in time.
bool wait_for_end(ffmpeg_process &process, int stop_fd, int &status) {
    const auto deadline = clock_type::now() + std::chrono::seconds(kIdleSeconds);
    pollfd watched = {stop_fd, POLLIN, 0};
    while (waitpid(process.pid, &status, WNOHANG) == 0) {
        if (clock_type::now() > deadline || poll(&watched, 1, kEndPollMs) > 0) return false;
    }
    process.pid = -1;
    return true;
}

// Harmless after the end.
void kill_ffmpeg(ffmpeg_process &process) {
    close_fd(process.sound_fd);
    close_fd(process.message_fd);
    if (process.pid < 0) return;
    kill(process.pid, SIGKILL);
    while (waitpid(process.pid, nullptr, 0) < 0 && errno == EINTR) {
    }
    process.pid = -1;
}

// The first line of the messages, without the module's address and the file's name.
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
    if (WIFSIGNALED(status)) {
        const int number = WTERMSIG(status);
        return {"ffmpeg was ended by signal " + std::to_string(number) + " (" + strsignal(number) +
                ")."};
    }
    const bool is_cut = message.find(strerror(EIO)) != std::string::npos;  // a bad sector
    if (WEXITSTATUS(status) == 0 && !is_cut) return {};
    const std::string line = first_line(task, message);
    if (line.empty())
        return {"ffmpeg ended with status " + std::to_string(WEXITSTATUS(status)) + "."};
    return {"ffmpeg: " + line + "."};
}

}  // namespace

std::string find_ffmpeg() {
    const char *variable = getenv("PATH");
    const std::string folders = variable == nullptr ? "" : variable;
    for (size_t start = 0; start < folders.size();) {
        const size_t end = std::min(folders.find(':', start), folders.size());
        const std::string path = folders.substr(start, end - start) + "/ffmpeg";
        struct stat info {};
        if (path.front() == '/' && stat(path.c_str(), &info) == 0 && S_ISREG(info.st_mode) &&
            access(path.c_str(), X_OK) == 0) {
            return path;
        }
        start = end + 1;
    }
    return "";
}

failure run_ffmpeg(const ffmpeg_task &task, int stop_fd, const byte_sink &sink) {
    ffmpeg_process process;
    const int code = start_ffmpeg(task, process);
    failure failed;
    if (code != 0) failed = {system_sentence("ffmpeg could not be started", code)};
    if (!failed) failed = read_pipes(process, stop_fd, sink);
    int status = 0;
    if (!failed) {
        failed = wait_for_end(process, stop_fd, status) ? explain_end(task, process.message, status)
                                                        : ended_idle();
    }
    kill_ffmpeg(process);
    return failed;
}

bool is_stop_requested(int stop_fd) {
    pollfd watched = {stop_fd, POLLIN, 0};
    return poll(&watched, 1, 0) > 0;
}
