// Code that the fuzzers share. A fuzzer turns an input into valid arguments and aborts if the
// library breaks a promise. Any audio file can be an input. Its last bytes select the arguments.
#pragma once

#include <fuzzer/FuzzedDataProvider.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

namespace fuzz {

using input = FuzzedDataProvider;

// Prints the promise and aborts if `condition` is false. libFuzzer then stores the input.
inline void must(bool condition, const char *promise) {
    if (condition) return;
    fprintf(stderr, "fuzz: broken: %s\n", promise);
    abort();
}

// Reads at most `count` values of one kind: small integers, values from 0 to 1, or arbitrary bit
// patterns, which include infinities and NaN.
template <typename T>
std::vector<T> values(input *in, size_t count) {
    const int scale = in->ConsumeIntegralInRange(0, 2);
    std::vector<T> list(std::min(count, in->remaining_bytes() / (scale == 0 ? 1 : sizeof(T))));
    for (T &value : list) {
        if (scale == 0) value = static_cast<T>(in->ConsumeIntegral<int8_t>());
        if (scale == 1) value = in->ConsumeProbability<T>();
        if (scale == 2) in->ConsumeData(&value, sizeof(T));
    }
    return list;
}

// Reads up to `count` values and appends zeros until there are `count`.
template <typename T>
std::vector<T> padded_values(input *in, size_t count) {
    std::vector<T> list = values<T>(in, count);
    list.resize(count);
    return list;
}

// Runs the function that the input selects.
template <size_t count>
void run_one(void (*const (&functions)[count])(input *), const uint8_t *data, size_t size) {
    input in(data, size);
    functions[in.ConsumeIntegralInRange<size_t>(0, count - 1)](&in);
}

inline void replace_contents(int fd, const std::vector<uint8_t> &bytes) {
    must(ftruncate(fd, 0) == 0, "a file is emptied");
    must(pwrite(fd, bytes.data(), bytes.size(), 0) == static_cast<ssize_t>(bytes.size()),
         "a file is written");
}

// Writes the bytes to a file in memory and returns its path. The next call overwrites the file.
inline std::string write_file(const std::vector<uint8_t> &bytes) {
    static const int fd = memfd_create("input", MFD_CLOEXEC);
    replace_contents(fd, bytes);
    return "/proc/self/fd/" + std::to_string(fd);
}

}  // namespace fuzz

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size);
