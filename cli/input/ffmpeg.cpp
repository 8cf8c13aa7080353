#include "cli/input/ffmpeg.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
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
#include <iterator>
#include <sstream>
#include <utility>

#include "cli/system.h"
#include "cli/write/value_text.h"

namespace {

constexpr size_t kMostMessageBytes = 65536;  // only the first line is used
// Limit on the address space. A damaged file can make ffmpeg allocate hours of silence at once.
constexpr rlim_t kMostProgramBytes = rlim_t{448} << 20;
constexpr rlim_t kMostOutputBytes = rlim_t{4} << 30;
constexpr int kCheckMs = 50;  // time between two checks of the output and the clock

// Containers that hold their own audio. Playlists and scripts (HLS, concat, DASH, SDP, image
// sequences) refer to other files and are not accepted.
constexpr const char *kContainers =
    "aac,ac3,aiff,amr,amrnb,amrwb,ape,asf,au,avi,caf,dsf,dts,dtshd,eac3,flac,flv,iff,loas,matroska,"
    "mlp,mov,mp3,"
    "mpc,mpc8,mpeg,mpegts,mxf,nut,ogg,oma,rm,shn,sox,tak,truehd,tta,voc,w64,wav,wv,xwma";

struct ffmpeg_process {
    pid_t pid = -1;
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
    const rlimit file = {kMostOutputBytes, kMostOutputBytes};
    setrlimit(RLIMIT_AS, &memory);
    setrlimit(RLIMIT_FSIZE, &file);
    const bool ready = (input < 0 || dup2(input, STDIN_FILENO) >= 0) &&
                       dup2(output, STDOUT_FILENO) >= 0 && dup2(messages, STDERR_FILENO) >= 0;
    syscall(SYS_close_range, STDERR_FILENO + 1, ~0U, 0);
    if (ready) execv(words[0], words);
    _exit(EXIT_FAILURE);
}

// Returns 0 or errno.
int start_ffmpeg(const ffmpeg_task &task, ffmpeg_process &process, int &output) {
    std::vector<std::string> words = command_line(task);
    std::vector<char *> pointers(words.size() + 1, nullptr);
    std::transform(words.begin(), words.end(), pointers.begin(),
                   [](std::string &word) { return word.data(); });
    int messages[2] = {-1, -1};
    const pid_t parent = getpid();
    output = memfd_create("output", MFD_CLOEXEC);
    if (output >= 0 && pipe2(messages, O_CLOEXEC) == 0) process.pid = fork();
    if (process.pid == 0) become_ffmpeg(pointers.data(), task.fd, output, messages[1], parent);
    const int code = process.pid < 0 ? errno : 0;
    close_fd(messages[1]);
    process.message_fd = messages[0];
    return code;
}

// Reads the messages until they end, which they do when the process ends, and checks the output.
failure watch(ffmpeg_process &process, int stop_fd, const output_check &check, int output) {
    std::array<char, 65536> part;
    struct stat file {};
    auto deadline = clock_type::now() + std::chrono::seconds(kIdleSeconds);
    while (true) {
        pollfd watched[] = {{process.message_fd, POLLIN, 0}, {stop_fd, POLLIN, 0}};
        poll(watched, std::size(watched), process.message_fd < 0 ? 1 : kCheckMs);
        if (watched[1].revents != 0) return {"The analysis was stopped."};
        siginfo_t end{};
        if (process.message_fd < 0) {
            waitid(P_PID, static_cast<id_t>(process.pid), &end, WEXITED | WNOHANG | WNOWAIT);
        }
        const off_t before = std::exchange(file.st_size, 0);
        fstat(output, &file);
        if (file.st_size > before) {
            deadline = clock_type::now() + std::chrono::seconds(kIdleSeconds);
            const failure failed = check ? check(output, file.st_size) : failure();
            if (failed) return failed;
        } else if (clock_type::now() > deadline) {
            return {"ffmpeg made no progress for " + std::to_string(kIdleSeconds) +
                    " s and was ended."};
        }
        if (end.si_pid != 0) return {};
        if (watched[0].revents == 0) continue;
        const ssize_t got = read(process.message_fd, part.data(), part.size());
        if (got == 0 || (got < 0 && errno != EINTR)) close_fd(process.message_fd);
        if (got < 0 || process.message.size() >= kMostMessageBytes) continue;
        process.message.append(part.data(), static_cast<size_t>(got));
    }
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
        if (path.front() == '/' && access(path.c_str(), X_OK) == 0 &&
            access((path + "/.").c_str(), F_OK) != 0) {  // not a folder
            return path;
        }
    }
    return "";
}

failure run_ffmpeg(const ffmpeg_task &task, int stop_fd, const output_check &check, int &output) {
    ffmpeg_process process;
    failure failed;
    if (const int code = start_ffmpeg(task, process, output)) {
        failed = {system_sentence("ffmpeg could not be started", code)};
    } else {
        failed = watch(process, stop_fd, check, output);
        if (failed) kill(process.pid, SIGKILL);
        const int status = wait_for_end(process.pid);
        if (!failed) failed = explain_end(task, process.message, status);
    }
    close_fd(process.message_fd);
    return failed;
}
