#include "cli/input/recognise.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "media_source/mtsrc.h"

namespace {

struct named_type {
    int32_t type;
    const char *name;
};
constexpr named_type kTypes[] = {
    {kMtsrcTypeMp4, "MP4"},
    {kMtsrcTypeAsf, "ASF (Windows Media)"},
    {kMtsrcTypeOgg, "Ogg"},
    {kMtsrcTypeWav, "WAV"},
    {kMtsrcTypeAac, "AAC"},
    {kMtsrcTypeMpegLayer1, "MPEG audio Layer I"},
    {kMtsrcTypeMpegLayer2, "MPEG audio Layer II"},
    {kMtsrcTypeMpegLayer3, "MP3"},
    {kMtsrcTypeFlac, "FLAC"},
};

int recognise_open(int fd, int32_t &type) {
    char by_descriptor[] = "fd";  // the name under which the record's descriptor is duplicated
    mtsrc_io io{};
    mtsrc_file_callbacks(&io);
    io.path = by_descriptor;
    io.fd = fd;
    mtsrc_file *file = io.open(&io, 0);
    if (file == nullptr) return errno == 0 ? EIO : errno;
    const int32_t code = mtsrc_get_file_type(&io, file, &type);
    io.close(file);
    return code == 0 ? 0 : -1;
}

}  // namespace

int recognise(const std::string &path, int32_t &type) {
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (fd < 0) return errno;
    struct stat info {};
    int code = fstat(fd, &info) == 0 && S_ISREG(info.st_mode) ? 0 : -1;
    if (code == 0) code = recognise_open(fd, type);
    close(fd);
    return code;
}

int recognise_bytes(const std::string &bytes, int32_t &type) {
    const int fd = memfd_create("head", MFD_CLOEXEC);
    if (fd < 0) return errno;
    const bool written =
        write(fd, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size());
    const int code = written ? recognise_open(fd, type) : EIO;
    close(fd);
    return code;
}

const char *type_name(int32_t type) {
    for (const named_type &entry : kTypes) {
        if (entry.type == type) return entry.name;
    }
    return "unknown";
}
