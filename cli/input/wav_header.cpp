#include "cli/input/wav_header.h"

#include <array>
#include <cstdint>
#include <cstdio>

#include "common/limits.h"

namespace {

constexpr uint32_t kTagPcm = 1;
constexpr uint32_t kTagFloat = 3;
constexpr uint32_t kTagExtensible = 0xFFFE;

// The head of a recognised file: "fmt " is its first chunk, at byte 12.
struct wav_head {
    std::array<uint8_t, 46> bytes{};
    size_t got = 0;

    uint32_t number(size_t at, size_t size) const {  // little-endian
        uint32_t value = 0;
        for (size_t i = 0; i < size; ++i) value |= static_cast<uint32_t>(bytes[at + i]) << (8 * i);
        return value;
    }
};

std::string refused(const std::string &reason) {
    return reason + " Only 16-bit integer PCM at up to " + std::to_string(kMaxRate) +
           " Hz is read from WAV; ffmpeg -i FILE -c:a pcm_s16le -ar 44100 NEW.wav converts it.";
}

}  // namespace

std::string explain_wav(const std::string &path) {
    wav_head head;
    if (FILE *file = fopen(path.c_str(), "rb")) {
        head.got = fread(head.bytes.data(), 1, head.bytes.size(), file);
        fclose(file);
    }
    if (head.got < 36) return "The WAV file's header is cut short.";

    const uint32_t outer_tag = head.number(20, 2);
    const bool extensible = outer_tag == kTagExtensible && head.got >= 46;
    const uint32_t tag = extensible ? head.number(44, 2) : outer_tag;
    const uint32_t bits = head.number(34, 2);
    const uint32_t rate = head.number(24, 4);
    const uint32_t channels = head.number(22, 2);
    if (tag == kTagFloat) {
        return refused("The WAV file has " + std::to_string(bits) + "-bit floating-point samples.");
    }
    if (tag != kTagPcm) {
        return refused("The WAV file has compressed samples (format tag " + std::to_string(tag) +
                       ").");
    }
    if (bits != 16) return refused("The WAV file has " + std::to_string(bits) + "-bit samples.");
    if (rate > static_cast<uint32_t>(kMaxRate)) {
        return refused("The WAV file's sample rate is " + std::to_string(rate) + " Hz.");
    }
    if (channels == 0) return "The WAV file's header claims 0 channels.";
    return "The WAV file's header or its data is damaged.";
}
