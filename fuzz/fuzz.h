// What the fuzzers share: taking an input apart, and saying what must hold.
#ifndef TAVO_FUZZ_FUZZ_H
#define TAVO_FUZZ_FUZZ_H

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace fuzz {

// Ends the program when holds is false: libFuzzer keeps the input and names it.
inline void must(bool holds, const char *what) {
    if (holds) return;
    fprintf(stderr, "fuzz: broken: %s\n", what);
    abort();
}

// An input taken from its front. What lies behind its end reads as 0.
struct input {
    const uint8_t *at;
    size_t left;

    template <typename T>
    T take() {
        T value = {};
        const size_t got = left < sizeof(T) ? left : sizeof(T);
        memcpy(&value, at, got);
        at += got;
        left -= got;
        return value;
    }

    // From lowest to highest, both included.
    int32_t take_from(int32_t lowest, int32_t highest) {
        const uint32_t span = static_cast<uint32_t>(highest) - static_cast<uint32_t>(lowest);
        const uint32_t value = span < 256 ? take<uint8_t>() : take<uint32_t>();
        return static_cast<int32_t>(static_cast<uint32_t>(lowest) +
                                    (span == UINT32_MAX ? value : value % (span + 1)));
    }

    // Fills values[count] by one of three scales, the first byte's choice: small whole numbers,
    // among them equal ones; bytes as they come, among them infinities and what is no number; the
    // usual ones among 0 to 1.
    template <typename T>
    void take_values(T *values, size_t count) {
        const uint8_t scale = take<uint8_t>() % 3;
        for (size_t i = 0; i < count; ++i) {
            if (scale == 0) {
                values[i] = static_cast<T>(take<int8_t>());
            } else if (scale == 1) {
                values[i] = take<T>();
            } else {
                values[i] = static_cast<T>(take<uint16_t>()) / static_cast<T>(65535);
            }
        }
    }
};

}  // namespace fuzz

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size);

#endif
