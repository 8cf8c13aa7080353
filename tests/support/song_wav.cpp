#include <cerrno>
#include <cstdio>
#include <cstring>

#include "tests/support/song.h"

namespace support {
namespace {

using bytes = std::vector<uint8_t>;

constexpr uint32_t kTagPcm = 1;
constexpr uint32_t kTagFloat = 3;
constexpr uint32_t kTagExtensible = 0xFFFE;
// The last 14 bytes of every sub-format identifier of an extensible file.
constexpr uint8_t kSubFormatTail[14] = {0x00, 0x00, 0x00, 0x00, 0x10, 0x00, 0x80,
                                        0x00, 0x00, 0xAA, 0x00, 0x38, 0x9B, 0x71};

void put(bytes &out, uint32_t value, int count) {  // little-endian
    for (int i = 0; i < count; ++i) out.push_back(static_cast<uint8_t>(value >> (8 * i)));
}

void put_tag(bytes &out, const char *tag) {
    for (int i = 0; i < 4; ++i) out.push_back(static_cast<uint8_t>(tag[i]));
}

// A chunk with its padding byte where the length is odd.
void put_chunk(bytes &out, const char *tag, const bytes &body) {
    put_tag(out, tag);
    put(out, static_cast<uint32_t>(body.size()), 4);
    out.insert(out.end(), body.begin(), body.end());
    if (body.size() % 2 != 0) out.push_back(0);
}

int bytes_per_sample(wav_coding coding) {
    return coding == wav_coding::float32 ? 4 : static_cast<int>(coding);
}

void put_sample(bytes &out, int16_t sample, wav_coding coding) {
    const int size = bytes_per_sample(coding);
    if (coding == wav_coding::pcm8) {
        out.push_back(static_cast<uint8_t>((sample >> 8) + 128));
    } else if (coding == wav_coding::float32) {
        const float value = static_cast<float>(sample) / 32768.0F;
        uint32_t bits = 0;
        memcpy(&bits, &value, sizeof(bits));
        put(out, bits, size);
    } else {
        put(out, static_cast<uint32_t>(sample) << (8 * size - 16), size);
    }
}

bytes format_chunk(const wav_spec &plan) {
    const uint32_t size = static_cast<uint32_t>(bytes_per_sample(plan.coding));
    const uint32_t tag = plan.coding == wav_coding::float32 ? kTagFloat : kTagPcm;
    const uint32_t frame = size * static_cast<uint32_t>(plan.channels);
    bytes body;
    put(body, plan.extensible ? kTagExtensible : tag, 2);
    put(body, static_cast<uint32_t>(plan.channels), 2);
    put(body, static_cast<uint32_t>(plan.rate), 4);
    put(body, static_cast<uint32_t>(plan.rate) * frame, 4);
    put(body, frame, 2);
    put(body, size * 8, 2);
    if (plan.extensible) {
        put(body, 22, 2);                            // bytes that follow
        put(body, size * 8, 2);                      // bits in use
        put(body, plan.channels == 1 ? 4U : 3U, 4);  // front centre, or left and right
        put(body, tag, 2);
        body.insert(body.end(), kSubFormatTail, kSubFormatTail + sizeof(kSubFormatTail));
    }
    return body;
}

uint32_t claimed_size(wav_data_size claim, uint32_t real) {
    if (claim == wav_data_size::zero) return 0;
    if (claim == wav_data_size::all_ones) return 0xFFFFFFFFU;
    return claim == wav_data_size::too_large ? real + 1'000'000U : real;
}

}  // namespace

std::vector<uint8_t> wav_bytes(const std::vector<int16_t> &pcm, const wav_spec &plan) {
    bytes data;
    data.reserve(pcm.size() * static_cast<size_t>(bytes_per_sample(plan.coding)));
    for (int16_t sample : pcm) put_sample(data, sample, plan.coding);

    bytes out;
    put_tag(out, "RIFF");
    put(out, 0, 4);
    put_tag(out, "WAVE");
    if (plan.junk_first) put_chunk(out, "JUNK", bytes(27, 0x55));
    put_chunk(out, "fmt ", format_chunk(plan));
    if (plan.other_chunks) {
        // The odd bodies spell "data": a reader that forgets the padding finds a false chunk.
        put_chunk(out, "LIST", bytes{'I', 'N', 'F', 'O', 'd', 'a', 't', 'a', 1, 0, 0, 0, 7});
        put_chunk(out, "fact", bytes{0, 0, 0, 0});
        put_chunk(out, "JUNK", bytes(33, 'd'));
    }
    put_tag(out, "data");
    const uint32_t real = static_cast<uint32_t>(data.size());
    put(out, claimed_size(plan.data_size, real), 4);
    out.insert(out.end(), data.begin(), data.end());
    if (data.size() % 2 != 0) out.push_back(0);
    if (plan.other_chunks) put_chunk(out, "LIST", bytes{'I', 'N', 'F', 'O', 9});

    const uint32_t riff = static_cast<uint32_t>(out.size() - 8);
    for (size_t i = 0; i < 4; ++i) out[4 + i] = static_cast<uint8_t>(riff >> (8 * i));
    const size_t cut = static_cast<size_t>(plan.cut_bytes);
    out.resize(cut < out.size() ? out.size() - cut : 0);
    return out;
}

bool write_bytes(const std::string &path, const std::vector<uint8_t> &content) {
    FILE *file = fopen(path.c_str(), "wb");
    if (file == nullptr) return false;
    const bool whole = content.empty() || fwrite(content.data(), content.size(), 1, file) == 1;
    return (fclose(file) == 0) && whole;
}

bool write_wav(const std::string &path, const song &what) {
    wav_spec plan;
    plan.rate = what.plan.rate;
    plan.channels = what.plan.channels;
    return write_bytes(path, wav_bytes(what.pcm, plan));
}

}  // namespace support
