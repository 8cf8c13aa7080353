#include <cstdio>
#include <cstring>

#include "tests/support/song.h"

namespace support {
namespace {

using bytes = std::vector<uint8_t>;

void put(bytes &out, size_t value, int count) {  // little-endian
    for (int i = 0; i < count; ++i) out.push_back(static_cast<uint8_t>(value >> (8 * i)));
}

// A chunk with its padding byte where the length is odd.
void put_chunk(bytes &out, const char *tag, const bytes &body) {
    out.insert(out.end(), tag, tag + 4);
    put(out, body.size(), 4);
    out.insert(out.end(), body.begin(), body.end());
    if (body.size() % 2 != 0) out.push_back(0);
}

bytes format_chunk(const wav_spec &plan) {
    // The sub-format of an extensible file: 22 bytes follow, 16 bits in use, no speakers, PCM.
    constexpr uint8_t kExtension[] = {22, 0, 16, 0, 0,    0, 0, 0,    1, 0,    0,    0,
                                      0,  0, 16, 0, 0x80, 0, 0, 0xAA, 0, 0x38, 0x9B, 0x71};
    const auto channels = static_cast<size_t>(plan.channels);
    const auto rate = static_cast<size_t>(plan.rate);
    bytes body;
    put(body, plan.extensible ? 0xFFFE : 1, 2);
    put(body, channels, 2);
    put(body, rate, 4);
    put(body, rate * 2 * channels, 4);
    put(body, 2 * channels, 2);
    put(body, 16, 2);
    if (plan.extensible) body.insert(body.end(), std::begin(kExtension), std::end(kExtension));
    return body;
}

}  // namespace

std::vector<uint8_t> wav_bytes(const std::vector<int16_t> &pcm, const wav_spec &plan) {
    const size_t real = 2 * pcm.size();
    const size_t claims[] = {real, 0, 0xFFFFFFFF, real + 1'000'000};
    bytes out = {'R', 'I', 'F', 'F', 0, 0, 0, 0, 'W', 'A', 'V', 'E'};
    if (plan.junk_first) put_chunk(out, "JUNK", bytes(27, 0x55));
    put_chunk(out, "fmt ", format_chunk(plan));
    if (plan.other_chunks) {
        // The odd bodies spell "data": a reader that forgets the padding finds a false chunk.
        put_chunk(out, "LIST", bytes{'I', 'N', 'F', 'O', 'd', 'a', 't', 'a', 1, 0, 0, 0, 7});
        put_chunk(out, "fact", bytes{0, 0, 0, 0});
        put_chunk(out, "JUNK", bytes(33, 'd'));
    }
    out.insert(out.end(), {'d', 'a', 't', 'a'});
    put(out, claims[static_cast<size_t>(plan.data_size)], 4);
    const size_t at = out.size();
    out.resize(at + real);
    if (real > 0) memcpy(&out[at], pcm.data(), real);
    if (plan.other_chunks) put_chunk(out, "LIST", bytes{'I', 'N', 'F', 'O', 9});
    bytes size;
    put(size, out.size() - 8, 4);
    std::copy(size.begin(), size.end(), out.begin() + 4);
    const auto cut = static_cast<size_t>(plan.cut_bytes);
    out.resize(cut < out.size() ? out.size() - cut : 0);
    return out;
}

bool write_bytes(const std::string &path, const std::vector<uint8_t> &content) {
    FILE *file = fopen(path.c_str(), "wb");
    if (file == nullptr) return false;
    const bool whole = fwrite(content.data(), 1, content.size(), file) == content.size();
    return fclose(file) == 0 && whole;
}

bool write_wav(const std::string &path, const song &what) {
    wav_spec plan;
    plan.rate = what.plan.rate;
    plan.channels = what.plan.channels;
    return write_bytes(path, wav_bytes(what.pcm, plan));
}

}  // namespace support
