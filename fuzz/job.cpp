// A whole job: any file, any mode, with all its threads.
//
// Input: mode, highlight length, beat limit, when to stop, how many bytes to append; then the file.
// Bytes made up behind the input let a short one be a song of minutes.
#include <semaphore.h>
#include <sys/mman.h>
#include <unistd.h>

#include <atomic>
#include <string>

#include "common/tavo_ctx.h"
#include "fuzz/fuzz.h"

namespace {

constexpr int32_t kPadBytes = 1024;  // per unit of the padding's byte
constexpr int32_t kMostPads = 255;

std::atomic<int> calls;
sem_t called;
TAVO_INFO last;

void on_result(TAVO_INFO *info) {
    ++calls;
    last = *info;
    for (int32_t i = 0; i < info->beat_count; ++i) {
        fuzz::must(info->beat_times[i] >= 0.0f, "a beat has a time");
    }
    sem_post(&called);
}

void write_all(int fd, const uint8_t *data, size_t size) {
    while (size > 0) {
        const ssize_t written = write(fd, data, size);
        fuzz::must(written > 0, "the file can be written");
        data += written;
        size -= static_cast<size_t>(written);
    }
}

// Clicks over a quiet noise, as 16-bit samples and as any other bytes.
const uint8_t *padding() {
    static uint8_t bytes[kMostPads * kPadBytes];
    if (bytes[0] == 0) {
        uint32_t noise = 1;
        for (int32_t i = 0; i < kMostPads * kPadBytes; i += 2) {
            noise = noise * 1664525u + 1013904223u;
            const bool loud = i / 8192 % 5 >= 2 && i % 8192 < 600;
            bytes[i] = static_cast<uint8_t>(noise >> 24);
            bytes[i + 1] = static_cast<uint8_t>(loud ? noise >> 16 : 0);
        }
        bytes[0] = 1;
    }
    return bytes;
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    static const int fd = memfd_create("song", MFD_CLOEXEC);
    static const std::string path = "/proc/self/fd/" + std::to_string(fd);
    fuzz::input in = {data, size};
    const int32_t mode = in.take<uint8_t>() % 3;
    const int32_t length = in.take<int8_t>();
    const int32_t max_beats = in.take<int8_t>();
    const bool stop = in.take<uint8_t>() % 4 == 3;
    const int32_t pads = in.take<uint8_t>();
    fuzz::must(fd >= 0 && ftruncate(fd, 0) == 0 && lseek(fd, 0, SEEK_SET) == 0, "a file is there");
    write_all(fd, in.at, in.left);
    write_all(fd, padding(), static_cast<size_t>(pads * kPadBytes));

    fnamedec = "";
    calls = 0;
    last = {};
    sem_init(&called, 0, 0);
    int32_t err = INT32_MIN;
    const TAVO_PARAM param = {path.c_str(), mode};
    TAVO_CTX *tavo = tavo_init(&param, &err);
    if (tavo == nullptr) {
        fuzz::must(err == TAVO_ERR_HANDLE, "a file that cannot be used is refused");
        return 0;
    }
    fuzz::must(err == 0, "an instance has no error");
    tavo_setcallback(tavo, on_result);
    fuzz::must(tavo_analyze(tavo, length, max_beats, 0) == 0, "a job starts");
    if (!stop) {
        sem_wait(&called);
        fuzz::must(last.status == 0 || last.status == -1, "a result or a failure");
        fuzz::must(last.status == 0 || (mode != 0 && last.beat_count == 0),
                   "a failure has no beats");
    }
    const int64_t duration_ms = tavo->duration / kUnitsPerMs;
    fuzz::must(last.hl_pos >= 0 && last.hl_pos <= duration_ms, "a highlight starts in the song");
    fuzz::must(tavo_deinit(tavo) == 0, "a release is done");
    fuzz::must(calls == 1, "a job reports once");
    sem_destroy(&called);
    return 0;
}
