#include "cli/input/file_bytes.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "cli/system.h"

std::string read_bytes(const std::string &path, int64_t offset, int64_t size, int &code) {
    std::string bytes;
    int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    struct stat info {};
    code = fd < 0 || fstat(fd, &info) != 0 ? errno : 0;
    if (code == 0 && S_ISREG(info.st_mode)) {
        bytes.resize(static_cast<size_t>(std::clamp<int64_t>(info.st_size - offset, 0, size)));
    }
    size_t done = 0;
    while (code == 0 && done < bytes.size()) {
        const ssize_t got = pread(fd, bytes.data() + done, bytes.size() - done,
                                  offset + static_cast<int64_t>(done));
        if (got == 0) break;
        if (got > 0) done += static_cast<size_t>(got);
        if (got < 0 && errno != EINTR) code = errno;
    }
    bytes.resize(done);
    close_fd(fd);
    return bytes;
}

uint64_t big_endian(std::string_view bytes, size_t offset, size_t size) {
    if (offset + size > bytes.size()) return 0;
    uint64_t value = 0;
    for (size_t i = 0; i < size; ++i) value = value << 8 | static_cast<uint8_t>(bytes[offset + i]);
    return value;
}

int64_t find_id3v2_end(const std::string &path, int &code) {
    constexpr int64_t kHeaderBytes = 10;
    int64_t end = 0;
    while (true) {
        const std::string head = read_bytes(path, end, kHeaderBytes, code);
        const uint64_t length = big_endian(head, 6, 4);
        const bool is_tag = head.size() == kHeaderBytes && head.compare(0, 3, "ID3") == 0 &&
                            static_cast<uint8_t>(head[3]) < 0x10 && (length & 0x80808080u) == 0;
        if (!is_tag) return end;
        int64_t bytes = 0;  // seven bits per byte
        for (int shift = 24; shift >= 0; shift -= 8) {
            bytes = bytes << 7 | static_cast<int64_t>(length >> shift & 0x7F);
        }
        const bool has_footer = (static_cast<uint8_t>(head[5]) & 0x10) != 0;
        end += kHeaderBytes + bytes + (has_footer ? kHeaderBytes : 0);
    }
}
