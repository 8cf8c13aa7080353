// Bytes of files, and numbers in them.
#ifndef TAVO_CLI_INPUT_FILE_BYTES_H
#define TAVO_CLI_INPUT_FILE_BYTES_H

#include <cstdint>
#include <string>
#include <string_view>

// Returns up to size bytes of a regular file from offset on: fewer at the file's end or after an
// error, whose errno code receives, else 0. Any other kind of file counts as empty. Never blocks.
std::string read_bytes(const std::string &path, int64_t offset, int64_t size, int &code);

// Big-endian number of size bytes at offset; 0 if bytes does not contain them.
uint64_t big_endian(std::string_view bytes, size_t offset, size_t size);

// Offset of the first byte after the ID3v2 tags at the file's start; 0 without a tag.
int64_t find_id3v2_end(const std::string &path, int &code);

#endif
