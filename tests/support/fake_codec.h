// A fake codec library, which behaves as a test specifies and records its calls. In a program that
// links it, the program and libtavo.so call these functions instead of those of libwexaaudio.so.
//
// A stream_spec describes a file by its properties and its frames. Each reader of the file starts
// at the first frame. Any thread may call the library, but a test may read the library's state only
// while no other thread uses it.
#pragma once

#include <cstdint>
#include <deque>
#include <list>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "media_source/wexaaudio.h"

namespace fake_codec {

// A frame and the samples that it decodes to. A WAV reader returns the samples themselves.
struct frame {
    std::vector<int16_t> pcm = {};  // interleaved; what the decoder writes
    int64_t start = 0;              // start time, 100-ns units
    int32_t read_result = 0;        // 0 for a frame, 1 for the end, otherwise a failure
    int32_t decode_result = 0;
    int32_t produced = 1;                    // the number that the decoder reports in its status
    std::optional<int32_t> bytes = {};       // false size of the samples, reported by the decoder
    std::optional<int32_t> read_bytes = {};  // false size of the frame, reported by the reader
};

// The reply to a seek. By default, a seek succeeds without reporting a position.
struct seek_reply {
    int32_t result = 0;
    std::optional<int64_t> reached = {};  // if empty, *reached is left unchanged
};

struct stream_spec {
    int32_t sample_rate = 44100, channels = 2, bits = 16;  // bits: only for WAV
    std::optional<int32_t> codec = {};                     // if empty, the usual one
    int64_t duration = 100'000'000;
    std::vector<int32_t> kinds = {kWexaKindAudio};  // of MP4 tracks or Ogg streams
    std::optional<int32_t> kind_count = {};         // false number of kinds
    std::vector<frame> frames = {};
    frame last = {{}, 0, kWexaEndOfStream};    // returned by every read after the frames
    std::vector<seek_reply> seeks = {};        // replies to the first seeks of each reader
    std::string setup = "123";                 // Vorbis set-up data
    std::optional<int32_t> setup_length = {};  // false size of the set-up data, reported first
};

// A call, with copies of the records that were passed. They are recorded in this order:
//   *_create of a reader: io, word, information record; of a decoder: configuration
//   get_frm: none; seek: position, reached; get_info_aud: information record
//   decode: frame, output, status, compressed bytes; xaacd_info: information, frame
struct call {
    std::string name;
    int32_t number = 0;  // get_frm: size; seek: flags; xmp4fds_open, xoggds_open: index
    std::vector<std::string> records = {};
    std::vector<const void *> addresses = {};  // where the records were
};

// The object of a handle. The FLAC source sets a flag in `reserved`, which must be the first field.
struct object {
    uint8_t reserved[4096] = {};
    std::string kind = {};  // for example "xaacfd", created by xaacfd_create
    const stream_spec *stream = nullptr;
    const object *demux = nullptr;  // the demuxer that opened this stream, if any
    size_t next_frame = 0;
    size_t seeks = 0;  // number of replies given
};

struct library_state {
    std::deque<stream_spec> streams = {stream_spec()};  // a new reader uses the last one
    // Results of each function's next calls. An object is created only if its result is 0.
    std::map<std::string, std::deque<int32_t>> results = {};
    std::vector<call> calls = {};           // the latest calls
    std::list<object> objects = {};         // the objects that exist
    std::deque<wexa_tags> tags = {};        // all returned tags, with allocated buffers
    std::vector<std::string> misuses = {};  // wrong objects, double deletions, short buffers
};
// Each test must start with state = {}, assigned while no object exists.
inline library_state state;

template <typename record>
std::string bytes_of(const record &value) {
    return {reinterpret_cast<const char *>(&value), sizeof value};
}

std::vector<call> calls_of(const std::string &part);  // calls whose names contain part
std::string call_names();                             // each followed by a space
bool tags_are_empty();  // true if the buffers of all returned tags were freed

}  // namespace fake_codec
