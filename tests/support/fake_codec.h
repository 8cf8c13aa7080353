// A fake codec library that behaves as a test specifies and records its calls. A test program that
// links it calls these functions instead of those of libwexaaudio.so, and so does libtavo.so.
//
// A stream_spec describes one file: the contents of its information records and the frames that
// every reader of the file returns, each with the PCM of its decoding. Each reader starts at the
// first frame. Any thread may call the library; a test reads its state while no other thread does.
#ifndef TAVO_TESTS_SUPPORT_FAKE_CODEC_H
#define TAVO_TESTS_SUPPORT_FAKE_CODEC_H

#include <cstdint>
#include <deque>
#include <list>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "media_source/wexaaudio.h"

namespace fake_codec {

// One frame. For WAV it is a chunk whose bytes are pcm itself.
struct frame {
    std::vector<int16_t> pcm = {};  // interleaved; what the decoder writes
    int64_t start = 0;              // 100-ns units; the reader's first value
    int32_t read_result = 0;        // 0 for a frame, 1 for the end, else failure
    int32_t decode_result = 0;
    int32_t produced = 1;                    // status of the decoding
    std::optional<int32_t> bytes = {};       // reported by the decoder instead of pcm's size
    std::optional<int32_t> read_bytes = {};  // reported by the reader instead of the true size
};

// The reply to a seek. Without one, a seek moves to the last frame that starts at or before the
// position.
struct seek_reply {
    int32_t result = 0;
    std::optional<int64_t> reached = {};  // if empty, *reached is left unchanged
};

struct stream_spec {
    int32_t sample_rate = 44100, channels = 2, bits = 16;  // bits: only for WAV
    std::optional<int32_t> codec = {};                     // if empty, the source's own
    int64_t duration = 100'000'000;
    std::vector<int32_t> kinds = {kWexaKindAudio};  // of MP4 tracks or Ogg streams
    std::optional<int32_t> kind_count = {};         // reported instead of kinds.size()
    std::vector<frame> frames = {};
    frame last = {{}, 0, kWexaEndOfStream};    // read repeatedly after the frames
    std::vector<seek_reply> seeks = {};        // replies to the first seeks of each reader
    std::string setup = "123";                 // Vorbis set-up data
    std::optional<int32_t> setup_length = {};  // reported instead of setup.size()
};

// A call with copies of the records that were passed, in the order of the arguments. Pointers to
// numbers that the library only writes are not recorded.
//   *_create of readers: io, word, information record; of decoders: configuration
//   get_frm: none; seek: position, reached; get_info_aud: information record
//   decode: frame, output, status, then the compressed bytes; xaacd_info: information, frame
struct call {
    std::string name;
    int32_t number = 0;  // get_frm: size; seek: flags; xmp4fds_open, xoggds_open: index
    std::vector<std::string> records = {};
    std::vector<const void *> addresses = {};  // of the same records
};

// Replaces a value that a call is about to return. Gets the names of the function and of the value.
// Values: "result" of every function, before its other values (for a function that creates an
// object, anything except 0 makes it return null); "bytes" and "first" of reads; "reached" of
// seeks; "produced" and "bytes" of decodings; "rate", "channels", "bits", "codec", "duration",
// "count", "kind" and "length" of records that describe the file. Called with the lock held.
using replacement = int64_t (*)(const std::string &function, const std::string &value,
                                int64_t original);

// The object of a handle. reserved must come first: the FLAC source sets a flag there before every
// read, and the read clears it.
struct object {
    uint8_t reserved[4096] = {};
    std::string kind = {};  // for example "xaacfd", created by xaacfd_create
    const stream_spec *stream = nullptr;
    const object *demux = nullptr;  // of a demuxer's stream
    size_t next_frame = 0;
    size_t seeks = 0;         // replies used
    int reads_after_end = 0;  // reads of the last frame
};

struct library_state {
    std::deque<stream_spec> streams = {stream_spec()};  // a new reader uses the last one
    // Results of the next calls of a function, in order. Any result except 0 makes a function that
    // creates an object return null.
    std::map<std::string, std::deque<int32_t>> results = {};
    std::vector<call> calls = {};           // the latest ones; with replace, only the last
    std::list<object> objects = {};         // created and not deleted
    std::deque<wexa_tags> tags = {};        // returned, with all their buffers allocated
    std::vector<std::string> misuses = {};  // wrong objects, double deletions, short buffers
    replacement replace = nullptr;
};
// Reset before each case (state = {}), when no object exists.
inline library_state state;

template <typename record>
std::string bytes_of(const record &value) {
    return {reinterpret_cast<const char *>(&value), sizeof value};
}

std::vector<call> calls_of(const std::string &part);  // calls whose names contain part
std::string call_names();                             // each followed by a space
bool tags_are_empty();  // true if all buffers of the returned tag records are freed

}  // namespace fake_codec

#endif
