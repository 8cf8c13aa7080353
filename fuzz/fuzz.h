// Shared by the fuzzers. Each turns bytes into arguments that a caller may pass and aborts if a
// promise is broken. Choices come from an input's end, so that an audio file can be an input.
#ifndef TAVO_FUZZ_FUZZ_H
#define TAVO_FUZZ_FUZZ_H

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

// Ends the program when holds is false: libFuzzer keeps the input and names it.
inline void must(bool holds, const char *promise) {
    if (holds) return;
    fprintf(stderr, "fuzz: broken: %s\n", promise);
    abort();
}

// At most count values, by one of three scales: small whole numbers, among them equal ones; 0 to 1;
// any bits, among them infinities and NaN.
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

// As values, but count of them, the rest zeros.
template <typename T>
std::vector<T> exactly(input *in, size_t count) {
    std::vector<T> list = values<T>(in, count);
    list.resize(count);
    return list;
}

// One of the functions, chosen by the input.
template <size_t count>
void run_one(void (*const (&functions)[count])(input *), const uint8_t *data, size_t size) {
    input in(data, size);
    functions[in.ConsumeIntegralInRange<size_t>(0, count - 1)](&in);
}

// Makes these bytes a file's contents.
inline void fill(int fd, const std::vector<uint8_t> &bytes) {
    must(ftruncate(fd, 0) == 0, "a file is emptied");
    must(pwrite(fd, bytes.data(), bytes.size(), 0) == static_cast<ssize_t>(bytes.size()),
         "a file is written");
}

// Path of a file of these bytes, which replaces the one before.
inline std::string file_of(const std::vector<uint8_t> &bytes) {
    static const int fd = memfd_create("input", MFD_CLOEXEC);
    fill(fd, bytes);
    return "/proc/self/fd/" + std::to_string(fd);
}

}  // namespace fuzz

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size);

#endif
