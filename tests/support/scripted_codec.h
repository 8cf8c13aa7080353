// A codec library that does what a test tells it and writes down how it was called. Linked into a
// test program, its functions come before those of libwexaaudio.so, so libtavo.so calls these.
// A script describes one file: what its information records say and the frames that every reader
// of it hands out, each with the PCM that its decoding gives. All readers play the script from its
// start, each at its own place. Any thread may call; a test looks at all while none does.
#ifndef TAVO_TESTS_SUPPORT_SCRIPTED_CODEC_H
#define TAVO_TESTS_SUPPORT_SCRIPTED_CODEC_H

#include <cstdint>
#include <deque>
#include <list>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "media_source/wexaaudio.h"

namespace scripted {

// One frame (for WAV: one chunk, whose bytes are pcm itself).
struct frame {
    std::vector<int16_t> pcm = {};           // interleaved, what its decoding writes
    int64_t start = 0;                       // 100-ns units, the reader's first value
    int32_t result = 0;                      // of the read: 0 a frame, 1 end, else failure
    int32_t decode = 0, produced = 1;        // of the decoding: result and status
    std::optional<int32_t> bytes = {};       // reported by the decoder in place of pcm's size
    std::optional<int32_t> read_bytes = {};  // reported by the reader in place of the true count
};

// One answer of a seek, in place of moving to the last frame that starts at or before the position.
struct seek {
    int32_t result = 0;
    std::optional<int64_t> reached = {};  // empty: *reached is left alone
};

struct script {
    int32_t sample_rate = 44100, channels = 2, bits = 16;  // bits: of WAV
    std::optional<int32_t> codec = {};                     // empty: the one that the source wants
    int64_t duration = 100'000'000;
    std::vector<int32_t> kinds = {kWexaKindAudio};  // MP4 tracks, Ogg streams
    std::optional<int32_t> kind_count = {};         // reported in place of kinds.size()
    std::vector<frame> frames = {};
    frame last = {{}, 0, kWexaEndOfStream};    // read again and again after the frames
    std::vector<seek> seeks = {};              // the first answers, for each reader anew
    std::string setup = "123";                 // Vorbis set-up data
    std::optional<int32_t> setup_length = {};  // reported in place of setup.size()
};

// A call: the records as they were handed over, in the order of the arguments. Pointers to 32- and
// 64-bit words that the library only writes are not recorded.
//   *_create of readers: io, word, information record; of decoders: configuration
//   get_frm: none; seek: position, reached; get_info_aud: information record
//   decode: frame, output, status, then the compressed bytes; xaacd_info: information, frame
struct call {
    std::string name;
    int32_t number = 0;  // get_frm: size; seek: flags; xmp4fds_open, xoggds_open: index
    std::vector<std::string> records = {};
    std::vector<const void *> addresses = {};  // of the same records
};

// Stands between the script and the library: is given each value that a call is about to hand back,
// with the names of the function and of the value, and answers what is handed back in its place.
// Values: "result" of every function, first of a call's (for one that creates, 0 or why it gives
// null); "bytes" and "first" of reads; "reached" of seeks; "produced" and "bytes" of decodings;
// "rate", "channels", "bits", "codec", "duration", "count", "kind" and "length" of what describes
// the file. Runs under the lock.
using tampering = int64_t (*)(const std::string &function, const std::string &value, int64_t truth);

// What a handle points to. state comes first: the FLAC source sets a flag in its reader's before
// every read, and the read clears it.
struct object {
    uint8_t state[4096] = {};
    std::string kind = {};  // "xaacfd" of "xaacfd_create"
    const script *plan = nullptr;
    const object *demux = nullptr;  // of a demuxer's stream
    size_t place = 0;               // next frame
    size_t seeks = 0;               // answers given
    int repeats = 0;                // of the script's last frame
};

struct world {
    std::deque<script> scripts = {script()};  // readers play the one that was last when they came
    // The next call of the function gives the first result (a function that creates gives null for
    // any but 0), the next again the one after.
    std::map<std::string, std::deque<int32_t>> answers = {};
    std::vector<call> calls = {};          // the latest; while tampering, the last
    std::list<object> alive = {};          // created, not deleted
    std::deque<wexa_tags> tags = {};       // given out with all their buffers allocated
    std::vector<std::string> faults = {};  // wrong objects, double deletions, short buffers
    tampering tamper = nullptr;

    void use(const script &plan) { scripts.push_back(plan); }
};
inline world all;  // to be made anew, all = {}, before each case, with no object alive

template <typename record>
std::string bytes_of(const record &from) {
    return {reinterpret_cast<const char *>(&from), sizeof from};
}

std::vector<call> calls_of(const std::string &part);  // with this in their names
std::string call_names();                             // each followed by a space
bool tags_are_empty();  // all buffers of the tag records given out are freed

}  // namespace scripted

#endif
