#include "desktop/wexaaudio/aac/aac_stream.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

namespace {

// The core of a stream with spectral band replication has at most half of 48,000 Hz.
constexpr int32_t kMaxSbrCore = 24000;
constexpr int32_t kSbrFrames = 8;     // decoded in search of band replication; usually all have it
constexpr int32_t kTriedFrames = 64;  // frames tried until one decodes at all

constexpr int32_t kMaxFrameSamples = 4096;  // as 16-bit pairs well within a source's frame buffer
constexpr int32_t kMaxBlockBytes = 8191;    // what an ADTS header can state, beyond any real block

// Opening a decoder costs as much as decoding several frames, which favours large groups; a seek
// decodes half a group on average, which favours small ones.
//
// One frame suffices for the overlap of low complexity. Band replication has filters and envelopes
// with a longer memory, and its header may come with every tenth frame only: with a preroll of 8
// frames the difference is audible. The prediction of other object types remembers more than one
// frame as well.
constexpr int32_t kGroup = 256;
constexpr int32_t kPreroll = 1;
constexpr int32_t kLongPreroll = 12;

struct block_output {
    int32_t samples;  // sample frames of a block; 0: it does not decode
    int32_t rate;     // Hz
    int32_t channels;
};

// Decodes a frame alone with a fresh decoder.
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

// The output of the first frames; of those that decode, the one with the highest rate.
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

bool aac_stream_complete(io_file *file, aac_config *config, stream_info *info) {
    const block_output output = find_output(file, config, &info->frames);
    if (output.rate <= 0) return false;
    const bool sbr = output.rate == 2 * aac_rate_of_index(config->rate_index);
    if (sbr) aac_config_make_sbr(config, config->channels == 1 && output.channels == 2);
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
