// Bytes at any offset of a regular file. Reading goes on after interruptions and short reads.
#ifndef TAVO_CLI_INPUT_FILE_BYTES_H
#define TAVO_CLI_INPUT_FILE_BYTES_H

#include <cstdint>
#include <string>

struct file_bytes {
    int fd = -1;
    int64_t size = 0;
    int error = 0;  // errno of the first read that failed
};

// Never blocks. False with errno set when the file cannot be opened; anything but a regular file is
// opened as an empty one.
bool open_bytes(file_bytes &file, const std::string &path);
void close_bytes(file_bytes &file);

// Up to size bytes from offset on; fewer at the file's end or after an error.
std::string read_bytes(file_bytes &file, int64_t offset, size_t size);

// Big-endian number of size bytes at offset; 0 where the text does not have them.
uint64_t big_endian(const std::string &bytes, size_t offset, size_t size);

// Offset of the first byte after the ID3v2 tags at the file's start; 0 without a tag.
int64_t id3v2_end(file_bytes &file);

#endif
