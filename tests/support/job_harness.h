// Runs jobs in tests: a callback that counts and copies what it gets.
#ifndef TAVO_TESTS_SUPPORT_JOB_HARNESS_H
#define TAVO_TESTS_SUPPORT_JOB_HARNESS_H

#include <algorithm>
#include <cmath>
#include <condition_variable>
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
inline void (*inside)(TAVO_INFO *) = nullptr;  // called in the callback

inline void callback(TAVO_INFO *info) {
    if (inside != nullptr) inside(info);
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

// Null when the report is as the mode and its own status say.
inline const char *flaw_of(const result &found, int mode) {
    const auto &list = found.beats;
    const bool beats = found.status == 0 && mode != TAVO_MODE_HIGHLIGHT;
    const auto finite = [](float ms) { return std::isfinite(ms); };
    if (found.calls != 1) return "callbacks";
    if (found.status != 0 && (found.status != -1 || mode == TAVO_MODE_HIGHLIGHT)) return "status";
    if (beats != (found.beat_count > 0) || beats == found.null_beats) return "beats";
    if (!std::is_sorted(list.begin(), list.end())) return "order of the beats";
    return std::all_of(list.begin(), list.end(), finite) ? nullptr : "times of the beats";
}

// No job may run: what the one before reported is forgotten.
inline TAVO_CTX *create(const std::string &path, int32_t mode, int32_t *err = nullptr) {
    last = {};
    inside = nullptr;
    fnamedec = "";
    const TAVO_PARAM param = {path.c_str(), mode};
    TAVO_CTX *ctx = tavo_init(&param, err);
    if (ctx != nullptr) tavo_setcallback(ctx, callback);
    return ctx;
}

}  // namespace job

#endif
