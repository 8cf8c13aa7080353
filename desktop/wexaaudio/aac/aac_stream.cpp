#include "desktop/wexaaudio/aac/aac_stream.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

namespace {

constexpr int32_t kRates[] = {96000, 88200, 64000, 48000, 44100, 32000, 24000,
                              22050, 16000, 12000, 11025, 8000,  7350};
constexpr int32_t kRateCount = sizeof kRates / sizeof kRates[0];
constexpr int32_t kMixdownBits[] = {4, 4, 3};  // of the mono, stereo and matrix mixdown fields
constexpr int32_t kIdentifierBits = 3;         // of an element in a raw block
constexpr int32_t kPlainBytes = 2;             // of a configuration without a program element
constexpr int32_t kRateEscape = 15;            // the rate follows in 24 bits
constexpr int32_t kObjectEscape = 31;          // 6 more bits follow

// Spectral band replication doubles the core rate, to at most 48,000 Hz.
constexpr int32_t kMaxSbrCore = 24000;
constexpr int32_t kSbrFrames = 8;     // frames searched for band replication; usually all have it
constexpr int32_t kTriedFrames = 64;  // frames tried until one can be decoded

constexpr int32_t kMaxFrameSamples = 4096;  // 16 KiB of PCM, well within a source's frame buffer
constexpr int32_t kMaxBlockBytes = 8191;  // limit of the ADTS length field; real blocks are smaller

// A decoder's noise generator is stateful, so each group of frames starts with a fresh decoder.
// Opening a decoder costs as much as decoding several frames, which favours large groups. A seek
// decodes half a group on average, which favours small ones.
//
// In low-complexity AAC, one earlier frame covers the overlap. Band replication needs more: its
// filters and envelopes have a longer memory, and its header may occur only in every tenth frame.
// With a preroll of 8 frames, the difference from a linear read is audible. Prediction, which other
// object types use, also has a longer memory.
constexpr int32_t kGroup = 256;
constexpr int32_t kPreroll = 1;
constexpr int32_t kLongPreroll = 12;

struct bit_reader {
    const uint8_t *data;
    int64_t bits;  // size of data
    int64_t at;    // exceeds `bits` after a read past the end
};

// Reads the next `count` bits. Bits past the end are 0.
uint32_t get(bit_reader *r, int32_t count) {
    uint32_t value = 0;
    for (const int64_t end = r->at + count; r->at < end; ++r->at) {
        const uint32_t byte = r->at < r->bits ? r->data[r->at / 8] : 0;
        value = value << 1 | (byte >> (7 - r->at % 8) & 1U);
    }
    return value;
}

struct bit_writer {
    uint8_t *data;  // zeroed
    int64_t at;     // stays below kAacMaxConfig * 8: the longest element has 400 bits
};

uint32_t put(bit_writer *w, uint32_t value, int32_t count) {
    for (int32_t i = count - 1; i >= 0; --i) {
        const uint32_t bit = value >> i & 1U;
        w->data[w->at / 8] = static_cast<uint8_t>(w->data[w->at / 8] | bit << (7 - w->at % 8));
        ++w->at;
    }
    return value;
}

// Copies `count` bits and returns them.
uint32_t copy(bit_reader *r, bit_writer *w, int32_t count) {
    return put(w, get(r, count), count);
}

void put_core(bit_writer *w, const aac_config &config) {
    put(w, static_cast<uint32_t>(config.object_type), 5);
    put(w, static_cast<uint32_t>(config.rate_index), 4);
    put(w, static_cast<uint32_t>(config.channels), 4);
}

void put_general(bit_writer *w, const aac_config &config) {
    put(w, config.short_frames ? 1 : 0, 1);
    put(w, 0, 2);  // no core coder, no extension
}

// Adds spectral band replication and, if `parametric`, parametric stereo to the configuration.
// Without this, a decoder that starts at a frame without such data would never apply them. Does
// nothing unless the object type is low complexity.
void state_sbr(aac_config *config, bool parametric) {
    // Twice the core's rate is three entries earlier in the table.
    const int32_t extension = config->rate_index - 3;
    if (config->object_type != kAacLowComplexity || config->channels == 0 ||
        aac_rate_of_index(extension) != 2 * aac_rate_of_index(config->rate_index)) {
        return;
    }
    config->object_type = parametric ? kAacPs : kAacSbr;
    memset(config->bytes, 0, sizeof config->bytes);
    bit_writer w = {config->bytes, 0};
    put_core(&w, *config);
    put(&w, static_cast<uint32_t>(extension), 4);
    put(&w, kAacLowComplexity, 5);
    put_general(&w, *config);
    config->size = static_cast<int32_t>((w.at + 7) / 8);
}

struct block_output {
    int32_t samples;  // sample frames of a block; 0 if it cannot be decoded
    int32_t rate;     // Hz
    int32_t channels;
};

// Decodes a single compressed frame with a fresh decoder.
block_output decode_alone(io_file *file, const aac_config *config, const frame_entry &entry) {
    const codec_library *library = codec_library_get();
    block_output got = {};
    av_decoder *d = library->open("aac", config->bytes, config->size);
    uint8_t *packet = d != nullptr && entry.bytes > 0 && entry.bytes <= kMaxBlockBytes
                          ? library->packet(d, entry.bytes)
                          : nullptr;
    if (packet != nullptr && io_file_read(file, entry.offset, packet, entry.bytes) == entry.bytes) {
        got.samples = library->decode(d);
        library->format(d, &got.rate, &got.channels);
    }
    library->close(d);
    return got;
}

// Decodes the first frames. Returns the format of the output with the highest rate.
block_output find_output(io_file *file, const aac_config *config, const frame_index *frames) {
    block_output best = {};
    const int32_t core_rate = aac_rate_of_index(config->rate_index);
    const bool may_have_sbr =
        config->object_type == kAacLowComplexity && core_rate > 0 && core_rate <= kMaxSbrCore;
    for (int64_t k = 0; k < std::min<int64_t>(frames->count, kTriedFrames); ++k) {
        const block_output got = decode_alone(file, config, frames->entry[k]);
        if (got.samples > 0 && got.samples <= kMaxFrameSamples && got.rate > best.rate) best = got;
        const bool sure = !may_have_sbr || best.rate > core_rate || k + 1 >= kSbrFrames;
        if (best.rate > 0 && sure) break;
    }
    return best;
}

}  // namespace

int32_t aac_rate_of_index(int32_t index) {
    return index >= 0 && index < kRateCount ? kRates[index] : 0;
}

void aac_config_make(aac_config *config, int32_t object_type, int32_t rate_index,
                     int32_t channels) {
    *config = {{}, kPlainBytes, object_type, rate_index, channels, false};
    bit_writer w = {config->bytes, 0};
    put_core(&w, *config);
    put_general(&w, *config);
}

bool aac_config_add_program(aac_config *config, const uint8_t *data, int32_t bytes) {
    bit_reader r = {data, int64_t{bytes} * 8, kIdentifierBits};
    bit_writer w = {config->bytes, kPlainBytes * 8};
    copy(&r, &w, 10);  // instance tag, object type, rate index
    const uint32_t front = copy(&r, &w, 4);
    const uint32_t side = copy(&r, &w, 4);
    const uint32_t back = copy(&r, &w, 4);
    const uint32_t low = copy(&r, &w, 2);
    const uint32_t data_elements = copy(&r, &w, 3);
    const uint32_t coupling = copy(&r, &w, 4);
    for (const int32_t bits : kMixdownBits) {
        if (copy(&r, &w, 1) != 0) copy(&r, &w, bits);
    }
    for (uint32_t i = 0; i < front + side + back; ++i) copy(&r, &w, 5);
    for (uint32_t i = 0; i < low + data_elements; ++i) copy(&r, &w, 4);
    for (uint32_t i = 0; i < coupling; ++i) copy(&r, &w, 5);
    r.at = (r.at + 7) / 8 * 8;
    r.at += static_cast<int64_t>(get(&r, 8)) * 8;  // a comment, which is not copied
    w.at = (w.at + 7) / 8 * 8;
    put(&w, 0, 8);
    config->size = static_cast<int32_t>(w.at / 8);
    return r.at <= r.bits;
}

bool aac_config_read(aac_config *config, const void *data, int32_t bytes) {
    *config = {};
    if (data == nullptr || bytes < 2 || bytes > kAacMaxConfig) return false;
    memcpy(config->bytes, data, static_cast<size_t>(bytes));
    config->size = bytes;
    bit_reader r = {config->bytes, int64_t{bytes} * 8, 0};
    config->object_type = static_cast<int32_t>(get(&r, 5));
    if (config->object_type == kObjectEscape) {
        config->object_type = 32 + static_cast<int32_t>(get(&r, 6));
    }
    config->rate_index = static_cast<int32_t>(get(&r, 4));
    if (config->rate_index == kRateEscape) get(&r, 24);
    config->channels = static_cast<int32_t>(get(&r, 4));
    config->short_frames = config->object_type == kAacLowComplexity && get(&r, 1) != 0;
    return r.at <= r.bits;
}

bool aac_stream_complete(io_file *file, aac_config *config, stream_info *info) {
    const block_output output = find_output(file, config, &info->frames);
    if (output.rate <= 0) return false;
    const bool sbr = output.rate == 2 * aac_rate_of_index(config->rate_index);
    if (sbr) state_sbr(config, config->channels == 1 && output.channels == 2);
    int64_t first = 0;
    for (int64_t i = 0; i < info->frames.count; ++i) {
        frame_entry &entry = info->frames.entry[i];
        entry.first = first;
        entry.samples = output.samples;
        if (entry.bytes > kMaxBlockBytes) entry.bytes = 0;
        first += output.samples;
    }
    info->codec = "aac";
    info->rate = output.rate;
    info->channels = output.channels;
    info->out_channels = 2;
    info->group = kGroup;
    const bool plain = config->object_type == kAacLowComplexity && !sbr;
    info->preroll = plain ? kPreroll : kLongPreroll;
    const auto bytes = static_cast<size_t>(config->size);
    info->setup_bytes = config->size;
    info->setup = static_cast<uint8_t *>(malloc(bytes));
    if (info->setup != nullptr) memcpy(info->setup, config->bytes, bytes);
    return info->setup != nullptr;
}
