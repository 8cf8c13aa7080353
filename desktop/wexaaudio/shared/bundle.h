// What a reader hands to the decoder of the same codec in place of a bare frame. The decoder's
// output must be a function of the place in the file alone, so a frame may carry frames that come
// before it (decoded, their output dropped), the codec's set-up data and the length that its output
// must have. The bytes between reader and decoder are private to this library.
//
//   bundle_head | setup bytes | frames x int32 length | the frames' bytes, in the order of decoding
#ifndef WEXAAUDIO_BUNDLE_H
#define WEXAAUDIO_BUNDLE_H

#include <cstddef>
#include <cstdint>

// Starts with a byte that no frame of the codecs served here starts with.
constexpr uint8_t kBundleMark[8] = {0x01, 'w', 'e', 'x', 'a', 'b', 'd', 'l'};

constexpr int32_t kBundleFresh = 1;  // drop the decoder's state before the first frame
constexpr int32_t kBundlePcm = 2;    // the one frame is finished 16-bit PCM
constexpr int32_t kBundleLost = 4;   // the frame itself is lost: silence; any frames are for state

struct bundle_head {
    uint8_t mark[8];
    int32_t flags;     // kBundle*
    int32_t channels;  // of the output; 0: the decoder's own choice
    int32_t samples;   // sample frames of the output, silence where the last frame gives fewer;
                       // 0: the frames are decoded for the decoder's state alone
    int32_t skip;      // sample frames cut from the front of the last frame's output
    int32_t setup;     // bytes of set-up data
    int32_t frames;    // may be 0: silence
};
static_assert(sizeof(bundle_head) == 32);

// Writing, into a buffer of cap bytes. begin announces how many frames will be added and how long
// each is, so that the space is known; add copies or lets the caller fill the space in.
struct bundle_writer {
    uint8_t *buf;
    int32_t cap;    // bytes
    int32_t used;   // bytes written; the bundle's size once every frame is in
    int32_t slot;   // offset of the next length
    int32_t slots;  // lengths still to be written
    bool failed;    // it did not fit
};

// Bytes of a bundle around a payload of frames.
int64_t bundle_size(int32_t setup, int32_t frames, int64_t payload);

// Writes the head (its mark is set here) and the set-up data.
void bundle_begin(bundle_writer *w, void *buf, int32_t cap, bundle_head head, const void *setup);

// Room for the next frame of bytes; the caller fills it. Null when it does not fit.
uint8_t *bundle_add(bundle_writer *w, int32_t bytes);

// Size of the finished bundle, -1 when something did not fit or is missing.
int32_t bundle_end(const bundle_writer *w);

// Reading.
struct bundle_view {
    bundle_head head;
    const uint8_t *setup;   // [head.setup]
    const uint8_t *length;  // next length
    const uint8_t *data;    // next frame
    int32_t left;           // frames not yet taken
};

// False when data is no bundle (a bare frame) or not a whole one.
bool bundle_open(bundle_view *v, const void *data, int32_t bytes);

// The next frame; null after the last. left is 0 once the last one has been taken.
const uint8_t *bundle_next(bundle_view *v, int32_t *bytes);

#endif
