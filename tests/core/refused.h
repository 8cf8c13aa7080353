// Thread starts and lock initialisations that fail. Bit i of a mask stands for the i-th call after
// the mask was set.
#ifndef TAVO_TESTS_CORE_REFUSED_H
#define TAVO_TESTS_CORE_REFUSED_H

#include <atomic>
#include <cstdint>

namespace refused {

using calls = std::atomic<uint32_t>;

inline calls threads{0};     // pthread_create
inline calls mutexes{0};     // pthread_mutex_init
inline calls conditions{0};  // pthread_cond_init

// Whether the call that is being made fails.
inline bool next(calls *mask) {
    const uint32_t now = *mask;
    *mask = now >> 1;
    return (now & 1u) != 0;
}

}  // namespace refused

#endif
