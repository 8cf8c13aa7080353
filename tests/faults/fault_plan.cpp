#include "tests/faults/fault_plan.h"

#include <fcntl.h>
#include <pthread.h>
#include <sched.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>

#include "media_source/mtsrc.h"
#include "pcm/decode.h"

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavcodec/vorbis_parser.h>
#include <ogg/ogg.h>
}

namespace {

using fault::call;

constexpr size_t kCalls = static_cast<size_t>(call::count);

fault::plan now;  // written while no other thread of the library runs
std::atomic<int64_t> counts[kCalls];
std::atomic<int64_t> refused, plans, blocks, locks, descriptors;
std::atomic<bool> holding;

// The seek of the re-positioning, then the reads behind it.
enum { kShown, kSeekIsNext, kHidden };
std::atomic<int> landing{kShown};

bool fails(call what) {
    const int64_t place = counts[static_cast<size_t>(what)]++;
    if (what != now.what || place < now.place || (place > now.place && !now.forever)) return false;
    ++refused;
    errno = now.error;
    return true;
}

template <typename Object>
Object *made(Object *object, std::atomic<int64_t> *kind = &blocks) {
    if (object != nullptr) ++*kind;
    return object;
}

// A descriptor, or 0 for a lock that was initialised.
int opened(int result, std::atomic<int64_t> *kind) {
    if (result >= 0) ++*kind;
    return result;
}

void given_back(const void *object, std::atomic<int64_t> *kind = &blocks) {
    if (object != nullptr) --*kind;
}

}  // namespace

namespace fault {

void arm(const plan &next) {
    for (auto &each : counts) each = 0;
    refused = plans = 0;
    now = next;
}
void disarm() {
    now = {};
}
int64_t calls(call what) {
    return counts[static_cast<size_t>(what)];
}
int64_t refusals() {
    return refused;
}
holdings held() {
    return {blocks, locks, descriptors};
}
void hide_landing(bool hide) {
    landing = hide ? kSeekIsNext : kShown;
}
int64_t second_plans() {
    return plans;
}
void hold_decoding(bool hold) {
    holding = hold;
}

}  // namespace fault

extern "C" {

// Memory.
void *__real_malloc(size_t size);
void *__real_calloc(size_t count, size_t size);
void *__real_realloc(void *block, size_t size);
void __real_free(void *block);
void *__wrap_malloc(size_t size) {
    return fails(call::allocation) ? nullptr : made(__real_malloc(size));
}
void *__wrap_calloc(size_t count, size_t size) {
    return fails(call::allocation) ? nullptr : made(__real_calloc(count, size));
}
void *__wrap_realloc(void *block, size_t size) {
    if (fails(call::allocation)) return nullptr;
    void *grown = __real_realloc(block, size);
    return block == nullptr ? made(grown) : grown;
}
void __wrap_free(void *block) {
    given_back(block);
    __real_free(block);
}

// What libavutil and libavcodec allocate on our call. Blocks of av_mallocz become a
// decoder's, which releases them itself: they are not counted.
void *__real_av_malloc(size_t size);
void *__real_av_mallocz(size_t size);
void __real_av_free(void *block);
void __real_av_freep(void *place);
void *__wrap_av_malloc(size_t size) {
    return fails(call::allocation) ? nullptr : made(__real_av_malloc(size));
}
void *__wrap_av_mallocz(size_t size) {
    return fails(call::allocation) ? nullptr : __real_av_mallocz(size);
}
void __wrap_av_free(void *block) {
    given_back(block);
    __real_av_free(block);
}
void __wrap_av_freep(void *place) {
    given_back(*static_cast<void **>(place));
    __real_av_freep(place);
}

AVPacket *__real_av_packet_alloc();
void __real_av_packet_free(AVPacket **packet);
int __real_av_new_packet(AVPacket *packet, int size);
AVFrame *__real_av_frame_alloc();
void __real_av_frame_free(AVFrame **frame);
AVPacket *__wrap_av_packet_alloc() {
    return fails(call::allocation) ? nullptr : made(__real_av_packet_alloc());
}
void __wrap_av_packet_free(AVPacket **packet) {
    given_back(*packet);
    __real_av_packet_free(packet);
}
int __wrap_av_new_packet(AVPacket *packet, int size) {
    return fails(call::allocation) ? AVERROR(ENOMEM) : __real_av_new_packet(packet, size);
}
AVFrame *__wrap_av_frame_alloc() {
    return fails(call::allocation) ? nullptr : made(__real_av_frame_alloc());
}
void __wrap_av_frame_free(AVFrame **frame) {
    given_back(*frame);
    __real_av_frame_free(frame);
}

AVCodecContext *__real_avcodec_alloc_context3(const AVCodec *codec);
void __real_avcodec_free_context(AVCodecContext **ctx);
int __real_avcodec_open2(AVCodecContext *ctx, const AVCodec *codec, AVDictionary **options);
int __real_avcodec_send_packet(AVCodecContext *ctx, const AVPacket *packet);
int __real_avcodec_receive_frame(AVCodecContext *ctx, AVFrame *frame);
AVCodecContext *__wrap_avcodec_alloc_context3(const AVCodec *codec) {
    return fails(call::allocation) ? nullptr : made(__real_avcodec_alloc_context3(codec));
}
void __wrap_avcodec_free_context(AVCodecContext **ctx) {
    given_back(*ctx);
    __real_avcodec_free_context(ctx);
}
int __wrap_avcodec_open2(AVCodecContext *ctx, const AVCodec *codec, AVDictionary **options) {
    if (fails(call::allocation)) return AVERROR(ENOMEM);
    return __real_avcodec_open2(ctx, codec, options);
}
int __wrap_avcodec_send_packet(AVCodecContext *ctx, const AVPacket *packet) {
    if (fails(call::allocation)) return AVERROR(ENOMEM);
    return __real_avcodec_send_packet(ctx, packet);
}
int __wrap_avcodec_receive_frame(AVCodecContext *ctx, AVFrame *frame) {
    if (fails(call::allocation)) return AVERROR(ENOMEM);
    return __real_avcodec_receive_frame(ctx, frame);
}

AVVorbisParseContext *__real_av_vorbis_parse_init(const uint8_t *data, int bytes);
void __real_av_vorbis_parse_free(AVVorbisParseContext **parser);
char *__real_ogg_sync_buffer(ogg_sync_state *sync, long size);
AVVorbisParseContext *__wrap_av_vorbis_parse_init(const uint8_t *data, int bytes) {
    return fails(call::allocation) ? nullptr : made(__real_av_vorbis_parse_init(data, bytes));
}
void __wrap_av_vorbis_parse_free(AVVorbisParseContext **parser) {
    given_back(*parser);
    __real_av_vorbis_parse_free(parser);
}
char *__wrap_ogg_sync_buffer(ogg_sync_state *sync, long size) {
    return fails(call::allocation) ? nullptr : __real_ogg_sync_buffer(sync, size);
}

// Threads and locks.
int __real_pthread_create(pthread_t *, const pthread_attr_t *, void *(*)(void *), void *);
int __real_pthread_mutex_init(pthread_mutex_t *, const pthread_mutexattr_t *);
int __real_pthread_mutex_destroy(pthread_mutex_t *);
int __real_pthread_cond_init(pthread_cond_t *, const pthread_condattr_t *);
int __real_pthread_cond_destroy(pthread_cond_t *);
int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attributes,
                          void *(*entry)(void *), void *argument) {
    if (fails(call::thread)) return EAGAIN;
    return __real_pthread_create(thread, attributes, entry, argument);
}
int __wrap_pthread_mutex_init(pthread_mutex_t *mutex, const pthread_mutexattr_t *attributes) {
    if (fails(call::mutex)) return ENOMEM;
    return opened(__real_pthread_mutex_init(mutex, attributes), &locks);
}
int __wrap_pthread_mutex_destroy(pthread_mutex_t *mutex) {
    given_back(mutex, &locks);
    return __real_pthread_mutex_destroy(mutex);
}
int __wrap_pthread_cond_init(pthread_cond_t *cond, const pthread_condattr_t *attributes) {
    if (fails(call::condition)) return ENOMEM;
    return opened(__real_pthread_cond_init(cond, attributes), &locks);
}
int __wrap_pthread_cond_destroy(pthread_cond_t *cond) {
    given_back(cond, &locks);
    return __real_pthread_cond_destroy(cond);
}

// Files.
int __real_open(const char *path, int flags, ...);
int __real_dup(int fd);
ssize_t __real_read(int fd, void *buf, size_t count);
off64_t __real_lseek64(int fd, off64_t offset, int whence);
int __real_close(int fd);
FILE *__real_fopen(const char *path, const char *mode);
size_t __real_fwrite(const void *data, size_t size, size_t count, FILE *stream);
int __real_fclose(FILE *stream);
int __wrap_open(const char *path, int flags, ...) {
    va_list rest;
    va_start(rest, flags);
    const mode_t mode = va_arg(rest, mode_t);
    va_end(rest);
    return fails(call::open) ? -1 : opened(__real_open(path, flags, mode), &descriptors);
}
int __wrap_dup(int fd) {
    return fails(call::dup) ? -1 : opened(__real_dup(fd), &descriptors);
}
ssize_t __wrap_read(int fd, void *buf, size_t count) {
    return fails(call::read) ? -1 : __real_read(fd, buf, count);
}
off64_t __wrap_lseek64(int fd, off64_t offset, int whence) {
    return fails(call::seek) ? -1 : __real_lseek64(fd, offset, whence);
}
int __wrap_close(int fd) {
    const int result = __real_close(fd);
    if (result == 0) --descriptors;
    return fails(call::close) ? -1 : result;
}
FILE *__wrap_fopen(const char *path, const char *mode) {
    return fails(call::click_track) ? nullptr : made(__real_fopen(path, mode), &descriptors);
}
size_t __wrap_fwrite(const void *data, size_t size, size_t count, FILE *stream) {
    return fails(call::click_track) ? 0 : __real_fwrite(data, size, count, stream);
}
int __wrap_fclose(FILE *stream) {
    given_back(stream, &descriptors);
    const int result = __real_fclose(stream);
    return fails(call::click_track) ? EOF : result;
}

// Steps of the library.
int32_t __real_mtsrc_seekstream(mtsrc_ctx *source, int64_t position, int64_t *reached);
int32_t __real_mtsrc_getstream(mtsrc_ctx *source, int32_t want, mtsrc_frame *frame);
int32_t __real_construct_decbuf(TAVO_CTX *ctx, int64_t start);
void __real_decode_song(TAVO_CTX *ctx);
int32_t __wrap_mtsrc_seekstream(mtsrc_ctx *source, int64_t position, int64_t *reached) {
    if (landing != kShown) landing = landing == kSeekIsNext ? kHidden : kShown;
    return __real_mtsrc_seekstream(source, position, reached);
}
int32_t __wrap_mtsrc_getstream(mtsrc_ctx *source, int32_t want, mtsrc_frame *frame) {
    const int32_t code = __real_mtsrc_getstream(source, want, frame);
    auto *bytes = static_cast<uint8_t *>(frame->data);
    for (int32_t i = 0; code >= 0 && landing == kHidden && i < frame->size; ++i) {
        bytes[i] = static_cast<uint8_t>(i);  // in no song
    }
    return code;
}
int32_t __wrap_construct_decbuf(TAVO_CTX *ctx, int64_t start) {
    ++plans;
    return __real_construct_decbuf(ctx, start);
}
void __wrap_decode_song(TAVO_CTX *ctx) {
    while (holding && refused == 0) sched_yield();
    __real_decode_song(ctx);
}
}
