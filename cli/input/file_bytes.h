// Reads bytes of files, and numbers in them.
#ifndef TAVO_CLI_INPUT_FILE_BYTES_H
#define TAVO_CLI_INPUT_FILE_BYTES_H

#include <cstdint>
#include <string>
#include <string_view>

// Returns up to `size` bytes of a regular file, starting at `offset`: fewer at its end or after
// an error. code receives the errno of the error, or 0. Any other kind of file counts as empty.
// Never blocks.
std::string read_bytes(const std::string &path, int64_t offset, int64_t size, int &code);

// Returns the big-endian number of `size` bytes at `offset`; 0 past the end.
uint64_t big_endian(std::string_view bytes, size_t offset, size_t size);

// Returns the offset of the first byte after the ID3v2 tags at the start of the file, 0 without
// tags.
int64_t find_id3v2_end(const std::string &path, int &code);

#endif
