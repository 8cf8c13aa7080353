#include "cli/input/file_bytes.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

bool open_bytes(file_bytes &file, const std::string &path) {
    file.fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    struct stat info {};
    if (file.fd < 0) return false;
    if (fstat(file.fd, &info) == 0 && S_ISREG(info.st_mode)) file.size = info.st_size;
    return true;
}

void close_bytes(file_bytes &file) {
    if (file.fd >= 0) close(file.fd);
    file.fd = -1;
}

std::string read_bytes(file_bytes &file, int64_t offset, size_t size) {
    std::string bytes;
    if (offset < 0 || offset >= file.size) return bytes;
    bytes.resize(size);
    size_t done = 0;
    while (done < size) {
        const ssize_t got =
            pread(file.fd, bytes.data() + done, size - done, offset + static_cast<int64_t>(done));
        if (got < 0 && errno == EINTR) continue;
        if (got < 0 && file.error == 0) file.error = errno;
        if (got <= 0) break;
        done += static_cast<size_t>(got);
    }
    bytes.resize(done);
    return bytes;
}

uint64_t big_endian(const std::string &bytes, size_t offset, size_t size) {
    if (offset + size > bytes.size()) return 0;
    uint64_t value = 0;
    for (size_t i = 0; i < size; ++i) value = value << 8 | static_cast<uint8_t>(bytes[offset + i]);
    return value;
}

int64_t id3v2_end(file_bytes &file) {
    constexpr int64_t kHeaderBytes = 10;
    int64_t end = 0;
    while (true) {
        const std::string head = read_bytes(file, end, kHeaderBytes);
        const uint64_t length = big_endian(head, 6, 4);
        const bool is_tag = head.size() == kHeaderBytes && head.compare(0, 3, "ID3") == 0 &&
                            static_cast<uint8_t>(head[3]) < 0x10 && (length & 0x80808080u) == 0;
        if (!is_tag) return end;
        int64_t bytes = 0;  // seven bits each
        for (int shift = 24; shift >= 0; shift -= 8) {
            bytes = bytes << 7 | static_cast<int64_t>(length >> shift & 0x7F);
        }
        const bool has_footer = (static_cast<uint8_t>(head[5]) & 0x10) != 0;
        end += kHeaderBytes + bytes + (has_footer ? kHeaderBytes : 0);
    }
}
