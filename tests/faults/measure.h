// Time and memory of a trial: a watch that ends the program when a run takes too long, and the
// most memory that the process has held.
#ifndef TAVO_TESTS_FAULTS_MEASURE_H
#define TAVO_TESTS_FAULTS_MEASURE_H

#include <unistd.h>

#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

// Sanitizers bring these; without them they are null.
extern "C" {
__attribute__((weak)) int __sanitizer_install_malloc_and_free_hooks(
    void (*allocated)(const volatile void *, size_t), void (*freed)(const volatile void *));
__attribute__((weak)) size_t __sanitizer_get_allocated_size(const volatile void *);
}

namespace trial {

inline bool sanitized() {
    return __sanitizer_install_malloc_and_free_hooks != nullptr;
}

// Ends the program, naming the run, when it is not called again within so many seconds.
inline void watch(unsigned seconds, const std::string &run) {
    static char name[512];
    snprintf(name, sizeof(name), "trial: hangs: %s\n", run.c_str());
    signal(SIGALRM, [](int) {
        (void)!write(STDERR_FILENO, name, strlen(name));
        _exit(3);
    });
    alarm(seconds);
}

inline double ms_since(std::chrono::steady_clock::time_point start) {
    using ms = std::chrono::duration<double, std::milli>;
    return ms(std::chrono::steady_clock::now() - start).count();
}

// Value of a line "NAME: n kB" of the process's status, in MiB.
inline double status_mib(const char *name) {
    double kib = 0.0;
    char line[256];
    FILE *file = fopen("/proc/self/status", "r");
    while (file != nullptr && fgets(line, sizeof(line), file) != nullptr) {
        if (strncmp(line, name, strlen(name)) == 0) kib = atof(line + strlen(name) + 1);
    }
    if (file != nullptr) fclose(file);
    return kib / 1024.0;
}

// The most memory held since start(): resident pages, or, where a sanitizer keeps freed memory for
// a while, what was allocated and not yet freed.
struct peak {
    static inline std::atomic<int64_t> held{0};
    static inline std::atomic<int64_t> most{0};

    static void start() {
        if (!sanitized()) {
            FILE *file = fopen("/proc/self/clear_refs", "w");
            if (file != nullptr) {
                fputs("5", file);  // VmHWM starts anew
                fclose(file);
            }
            return;
        }
        static const int installed = __sanitizer_install_malloc_and_free_hooks(
            [](const volatile void *, size_t size) {
                const int64_t now = held += static_cast<int64_t>(size);
                for (int64_t before = most; before < now;) most.compare_exchange_weak(before, now);
            },
            [](const volatile void *place) {
                held -= static_cast<int64_t>(__sanitizer_get_allocated_size(place));
            });
        (void)installed;
        most = held.load();
    }
    static double mib() {
        return sanitized() ? static_cast<double>(most) / 1048576.0 : status_mib("VmHWM");
    }
};

}  // namespace trial

#endif
