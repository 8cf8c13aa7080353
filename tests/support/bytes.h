// Helpers that make byte strings, random numbers and files for tests.
#pragma once

#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <string>

namespace support {

inline std::string zeros(size_t count) {
    return std::string(count, '\0');
}

// Returns random bytes. No sequence of 200 bytes occurs twice.
inline std::string noise(size_t count, std::mt19937::result_type seed) {
    std::string bytes(count, '\0');
    std::mt19937 random(seed);
    for (char &byte : bytes) byte = static_cast<char>(random() >> 11);
    return bytes;
}

// Returns a random number from -1 to 1.
inline double uniform(std::mt19937 *random) {
    return static_cast<double>((*random)()) / 2147483648.0 - 1.0;
}

// Returns the items `first` to `end` - 1 of a string or vector.
template <typename list>
list slice(const list &items, int64_t first, int64_t end) {
    return {items.begin() + first, items.begin() + end};
}

inline std::string contents_of(const std::string &path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// A path used only by the running program. The destructor deletes the file.
struct temporary_file {
    std::string path;

    explicit temporary_file(const std::string &name)
        : path(std::filesystem::temp_directory_path() /
               ("tavo_" + std::to_string(getpid()) + "_" + name)) {}
    ~temporary_file() { unlink(path.c_str()); }
    temporary_file(const temporary_file &) = delete;
};

}  // namespace support
