#include "cli/input/list_reader.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>

#include "cli/input/recognise.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

constexpr size_t kReadBytes = 65'536;
constexpr size_t kMostNameBytes = PATH_MAX;  // the system opens nothing longer
constexpr const char *kByteOrderMark = "\xEF\xBB\xBF";

bool is_readable(int fd) {
    pollfd watched = {fd, POLLIN, 0};
    return poll(&watched, 1, 0) > 0;
}

failure read_more(list_reader &list) {
    std::array<char, kReadBytes> part{};
    const ssize_t got = read(list.fd, part.data(), part.size());
    if (got < 0) {
        if (errno == EINTR || errno == EAGAIN) return {};
        return {system_sentence("The list of files cannot be read", errno)};
    }
    list.ended = got == 0;
    list.text.append(part.data(), static_cast<size_t>(got));
    return {};
}

// A song given in the place of a list would make thousands of names.
failure check_list(const list_reader &list, char separator) {
    const file_kind kind = recognise_bytes(list.text);
    if (kind != file_kind::unknown) {
        const std::string subject = list.name == "-" ? "Standard input" : "The list";
        return {subject + " holds sound (" + kind_name(kind) + "), not a list of names; " +
                (list.name == "-" ? "save it to a file first." : "name it as FILE.")};
    }
    if (separator != '\0' && list.text.find('\0') != std::string::npos) {
        return {"The list holds NUL bytes: give -0 when its names end with them."};
    }
    return {};
}

bool is_comment(const std::string &line) {
    struct stat info {};
    return line[0] == '#' && lstat(line.c_str(), &info) != 0;
}

// Takes what comes before the separator. False when the separator is not there yet.
bool take_line(list_reader &list, char separator, std::string &line) {
    const size_t end = list.text.find(separator);
    if (end == std::string::npos && (!list.ended || list.text.empty())) return false;
    line = list.text.substr(0, end);
    list.text.erase(0, end == std::string::npos ? end : end + 1);
    if (separator == '\n' && !line.empty() && line.back() == '\r') line.pop_back();
    return true;
}

}  // namespace

failure open_list(list_reader &list, const std::string &name) {
    list = list_reader{};
    list.name = name;
    list.fd = name == "-" ? STDIN_FILENO : open(name.c_str(), O_RDONLY | O_CLOEXEC);
    if (list.fd >= 0) return {};
    return {system_sentence("The list of files cannot be read", errno)};
}

list_state next_name(list_reader &list, char separator, std::string &name, failure &failed) {
    while (true) {
        if (!list.begun && !list.text.empty()) {
            list.begun = true;
            failed = check_list(list, separator);
            if (failed) return list_state::failed;
            if (list.text.compare(0, 3, kByteOrderMark) == 0) list.text.erase(0, 3);
        }
        while (take_line(list, separator, name)) {
            if (name.empty() || (separator == '\n' && is_comment(name))) continue;
            ++list.names;
            return list_state::name;
        }
        if (list.text.size() > kMostNameBytes) {
            failed = {"The list holds a name of more than " + std::to_string(kMostNameBytes) +
                      " bytes; is it a list of names?"};
            return list_state::failed;
        }
        if (list.ended) return list_state::ended;
        if (!is_readable(list.fd)) return list_state::waiting;
        failed = read_more(list);
        if (failed) return list_state::failed;
    }
}

void close_list(list_reader &list) {
    if (list.fd > STDIN_FILENO) close(list.fd);
    list.fd = -1;
}

std::string list_text(const list_reader &list) {
    return list.name == "-" ? "the list on standard input" : "the list " + shown(list.name);
}
