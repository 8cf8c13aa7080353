// A codec library that does what a test tells it and writes down how it was called. Linked into a
// test program, its functions come before those of libwexaaudio.so, so libtavo.so calls these.
//
// A script describes one file: what its information records say and the frames that every reader
// of it hands out, each with the PCM that its decoding gives. All readers play the script from its
// start, each at its own place. Any thread may call; one lock guards everything.
#ifndef TAVO_TESTS_SUPPORT_SCRIPTED_CODEC_H
#define TAVO_TESTS_SUPPORT_SCRIPTED_CODEC_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "media_source/wexaaudio.h"

namespace scripted {

// One frame (for WAV: one chunk, whose bytes are pcm itself).
struct frame {
    std::vector<int16_t> pcm = {};           // interleaved, what its decoding writes
    int64_t start = -1;                      // 100-ns units, the reader's first value; -1: index
    int32_t result = 0;                      // of the read: 0 a frame, 1 end, else failure
    int32_t decode = 0;                      // of the decoding
    int32_t produced = 1;                    // status of the decoding
    std::optional<int32_t> bytes = {};       // reported by the decoder in place of pcm's size
    std::optional<int32_t> read_bytes = {};  // reported by the reader in place of the true count
};

// One answer of a seek, in place of moving to the last frame that starts at or before the position.
struct seek {
    int32_t result = 0;
    std::optional<int64_t> reached = {};  // empty: *reached is left alone
};

struct script {
    int32_t sample_rate = 44100;
    int32_t channels = 2;
    int32_t bits = 16;                  // WAV
    std::optional<int32_t> codec = {};  // empty: the one that the source wants
    int64_t duration = 100'000'000;
    std::vector<int32_t> kinds = {kWexaKindAudio};  // MP4 tracks, Ogg streams
    std::optional<int32_t> kind_count = {};         // reported in place of kinds.size()
    std::vector<frame> frames = {};  // after the last one: end of stream, again and again
    int64_t blanks = 0;  // empty frames that each reader hands out first, their calls not recorded
    std::vector<seek> seeks = {};              // the first answers, for each reader anew
    bool tags = false;                         // give a tag record with all 42 buffers allocated
    std::vector<uint8_t> setup = {1, 2, 3};    // Vorbis set-up data
    std::optional<int32_t> setup_length = {};  // reported in place of setup.size()
};

// A call: the records as they were handed over, in the order of the arguments. Pointers to 32- and
// 64-bit words that the library only writes are not recorded.
//   *_create of readers: io, word, information record; of decoders: configuration
//   get_frm: none; seek: position, reached; get_info_aud: information record
//   decode: frame, output, status, then the compressed bytes; xaacd_info: information, frame
struct call {
    std::string name;
    // get_frm: size; seek: flags; xmp4fds_open, xoggds_open: index; xoggds_get_format: bytes that
    // the buffer has
    int32_t number = 0;
    std::vector<std::vector<uint8_t>> records = {};
    std::vector<const void *> addresses = {};  // of the same records
};

// Stands between the script and the library: is given each value that a call is about to hand back,
// with the names of the function and of the value, and answers what is handed back in its place.
// Values: "result" of every function, first of a call's (for one that creates, 0 or why it gives
// null); "bytes" and "first" of reads; "reached" of seeks; "produced" and "bytes" of decodings;
// "rate", "channels", "bits", "codec", "duration", "count", "kind" and "length" of what describes
// the file. Runs under the lock.
using tampering = int64_t (*)(const std::string &function, const std::string &value, int64_t truth);

// From now on until the next reset; of the calls, only the last is kept meanwhile.
void tamper(tampering with);

// Forgets scripts, calls and answers. To be called before each case, with no object alive.
void reset();

// The script of readers created from now on.
void use(const script &what);

// The next call of the function gives this result (a function that creates gives null for any but
// 0), the next again the one after.
void answer(const std::string &name, const std::vector<int32_t> &results);

std::vector<call> calls_of(const std::string &name);
std::vector<std::string> call_names();
void forget_calls();

int live_objects();                 // created, not deleted
int tag_buffers_left();             // pointers not null in the tag records given out
std::vector<std::string> faults();  // wrong objects, double deletions, short buffers, flags unset

// A script of PCM cut into frames of frame_samples (per channel), each starting at its time.
script song(const std::vector<int16_t> &interleaved, int32_t channels, int32_t sample_rate,
            int32_t frame_samples);

}  // namespace scripted

#endif
