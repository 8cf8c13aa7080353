// Runs jobs in tests with a callback that counts its calls and copies the result.
#pragma once

#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <condition_variable>
#include <csignal>
#include <cstring>
#include <mutex>
#include <string>
#include <vector>

#include "common/tavo_ctx.h"

namespace job {

struct result {
    int calls = 0;
    int32_t hl_pos = -1;
    int32_t beat_count = -1;
    int32_t status = -2;
    bool null_beats = false;
    std::vector<float> beats;
};

inline std::mutex lock;
inline std::condition_variable changed;
inline result last;
inline void (*during_callback)(TAVO_INFO *) = nullptr;  // if set, the callback calls it

inline void callback(TAVO_INFO *info) {
    if (during_callback != nullptr) during_callback(info);
    std::lock_guard<std::mutex> guard(lock);
    ++last.calls;
    last.hl_pos = info->hl_pos;
    last.beat_count = info->beat_count;
    last.status = info->status;
    last.null_beats = info->beat_times == nullptr;
    last.beats.assign(info->beat_times, info->beat_times + info->beat_count);
    changed.notify_all();
}

inline result wait() {
    std::unique_lock<std::mutex> guard(lock);
    changed.wait(guard, [] { return last.calls > 0; });
    return last;
}

// Returns null if the result is consistent, otherwise the name of the inconsistent part.
inline const char *find_inconsistency(const result &found, int mode) {
    const auto &list = found.beats;
    const bool beats = found.status == 0 && mode != TAVO_MODE_HIGHLIGHT;
    const auto finite = [](float ms) { return std::isfinite(ms); };
    if (found.calls != 1) return "callbacks";
    if (found.status != 0 && (found.status != -1 || mode == TAVO_MODE_HIGHLIGHT)) return "status";
    if (beats != (found.beat_count > 0) || beats == found.null_beats) return "beats";
    if (!std::is_sorted(list.begin(), list.end())) return "order of the beats";
    return std::all_of(list.begin(), list.end(), finite) ? nullptr : "times of the beats";
}

inline char current_run[256];  // describes the run; printed if it crashes or takes too long

// Arranges that current_run is printed if the program crashes or an alarm() expires.
inline void report_interruptions() {
    for (const int number : {SIGALRM, SIGSEGV, SIGABRT}) {
        signal(number, [](int) {
            (void)!write(STDERR_FILENO, current_run, strlen(current_run));
            _exit(3);
        });
    }
}

// Creates an instance and clears the previous result. No job may be running.
inline TAVO_CTX *create(const std::string &path, int32_t mode, int32_t *err = nullptr) {
    last = {};
    during_callback = nullptr;
    fnamedec = "";
    const TAVO_PARAM param = {path.c_str(), mode};
    TAVO_CTX *ctx = tavo_init(&param, err);
    if (ctx != nullptr) tavo_setcallback(ctx, callback);
    return ctx;
}

}  // namespace job
