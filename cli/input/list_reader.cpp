#include "cli/input/list_reader.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>

#include "cli/input/recognise.h"
#include "cli/system.h"
#include "cli/write/value_text.h"

namespace {

constexpr size_t kReadBytes = 65'536;
constexpr size_t kMostNameBytes = PATH_MAX;  // the system opens no longer path
constexpr const char *kByteOrderMark = "\xEF\xBB\xBF";

failure read_more(list_reader &list) {
    std::array<char, kReadBytes> part;
    const ssize_t got = read(list.fd, part.data(), part.size());
    if (got < 0 && errno != EINTR && errno != EAGAIN) {
        return {system_sentence("The list of files cannot be read", errno)};
    }
    list.ended = got == 0;
    if (got > 0) list.text.append(part.data(), static_cast<size_t>(got));
    return {};
}

// Refuses a song that is passed as a list by mistake: it would give thousands of names.
failure check_start(const list_reader &list) {
    const file_kind kind = recognise_bytes(list.text);
    if (kind != file_kind::unknown) {
        const std::string subject = list.name == "-" ? "Standard input" : "The list";
        return {subject + " holds sound (" + kind_name(kind) + "), not a list of names; " +
                (list.name == "-" ? "save it to a file first." : "name it as FILE.")};
    }
    if (list.separator != '\0' && list.text.find('\0') != std::string::npos) {
        return {"The list holds NUL bytes: give -0 when its names end with them."};
    }
    return {};
}

bool is_comment(const std::string &line) {
    struct stat info {};
    return line[0] == '#' && lstat(line.c_str(), &info) != 0;
}

// Removes the next line from the text and returns it. Returns nothing if its separator has not
// arrived, unless the list has ended.
std::optional<std::string> read_line(list_reader &list) {
    const size_t end = list.text.find(list.separator);
    if (end == std::string::npos && (!list.ended || list.text.empty())) return std::nullopt;
    std::string line = list.text.substr(0, end);
    list.text.erase(0, end == std::string::npos ? end : end + 1);
    if (list.separator == '\n' && !line.empty() && line.back() == '\r') line.pop_back();
    return line;
}

}  // namespace

failure open_list(list_reader &list, const std::string &name, char separator) {
    list = {};
    list.name = name;
    list.separator = separator;
    list.fd = name == "-" ? STDIN_FILENO : open(name.c_str(), O_RDONLY | O_CLOEXEC);
    if (list.fd >= 0) return {};
    return {system_sentence("The list of files cannot be read", errno)};
}

failure read_name(list_reader &list, std::optional<std::string> &name) {
    while (true) {
        if (!list.begun && !list.text.empty()) {
            list.begun = true;
            if (failure failed = check_start(list)) return failed;
            if (list.text.compare(0, 3, kByteOrderMark) == 0) list.text.erase(0, 3);
        }
        while ((name = read_line(list))) {
            if (name->empty() || (list.separator == '\n' && is_comment(*name))) continue;
            ++list.names;
            return {};
        }
        if (list.text.size() > kMostNameBytes) {
            return {"The list holds a name of more than " + std::to_string(kMostNameBytes) +
                    " bytes; is it a list of names?"};
        }
        if (list.ended || !is_readable(list.fd)) return {};
        if (failure failed = read_more(list)) return failed;
    }
}

void close_list(list_reader &list) {
    if (list.fd > STDIN_FILENO) close(list.fd);
    list.fd = -1;
}
