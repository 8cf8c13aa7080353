#include "desktop/wexaaudio/flac/flac_header.h"

#include <array>
#include <cstring>

namespace {

constexpr uint32_t kPoly8 = 0x07;
constexpr uint32_t kPoly16 = 0x8005;

template <typename Word>
constexpr std::array<Word, 256> make_table(uint32_t poly, int bits) {
    std::array<Word, 256> table = {};
    for (uint32_t byte = 0; byte < 256; ++byte) {
        uint32_t crc = byte << (bits - 8);
        for (int i = 0; i < 8; ++i) {
            crc = (crc >> (bits - 1) & 1) != 0 ? crc << 1 ^ poly : crc << 1;
        }
        table[byte] = static_cast<Word>(crc);
    }
    return table;
}

constexpr std::array<uint8_t, 256> kTable8 = make_table<uint8_t>(kPoly8, 8);
constexpr std::array<uint16_t, 256> kTable16 = make_table<uint16_t>(kPoly16, 16);

// By code 1 to 11; 0 is the stream's own.
constexpr int32_t kRates[12] = {0,     88200, 176400, 192000, 8000,  16000,
                                22050, 24000, 32000,  44100,  48000, 96000};
constexpr int32_t kBits[8] = {0, 8, 12, -1, 16, 20, 24, 32};

uint32_t be16(const uint8_t *p) {
    return static_cast<uint32_t>(p[0] << 8 | p[1]);
}

uint8_t crc8(const uint8_t *p, int32_t n) {
    uint8_t crc = 0;
    for (int32_t i = 0; i < n; ++i) {
        crc = kTable8[crc ^ p[i]];
    }
    return crc;
}

// The number coded as extended UTF-8 at p. Returns its bytes, 0 when it is none.
int32_t read_number(const uint8_t *p, int64_t *number) {
    int32_t ones = 0;
    while (ones < 8 && (p[0] & 0x80 >> ones) != 0) {
        ++ones;
    }
    if (ones == 1 || ones == 8) {
        return 0;
    }
    if (ones == 0) {
        *number = p[0];
        return 1;
    }
    int64_t value = p[0] & (0x7F >> ones);
    for (int32_t i = 1; i < ones; ++i) {
        if ((p[i] & 0xC0) != 0x80) {
            return 0;
        }
        value = value << 6 | (p[i] & 0x3F);
    }
    *number = value;
    return ones;
}

// Block length by its code; *at moves past what the header's end holds of it.
int32_t read_block(int32_t code, const uint8_t *p, int32_t *at) {
    if (code == 6) {
        return p[(*at)++] + 1;
    }
    if (code == 7) {
        *at += 2;
        return static_cast<int32_t>(be16(p + *at - 2)) + 1;
    }
    return code == 1 ? 192 : code < 6 ? 576 << (code - 2) : 256 << (code - 8);
}

int32_t read_rate(int32_t code, const uint8_t *p, int32_t *at) {
    if (code == 12) {
        return p[(*at)++] * 1000;
    }
    if (code > 12) {
        *at += 2;
        return static_cast<int32_t>(be16(p + *at - 2)) * (code == 14 ? 10 : 1);
    }
    return kRates[code];
}

}  // namespace

bool flac_parse_info(const uint8_t *p, flac_info *info) {
    const int32_t min_block = static_cast<int32_t>(be16(p));
    info->max_block = static_cast<int32_t>(be16(p + 2));
    info->rate = static_cast<int32_t>(be16(p + 10) << 4 | p[12] >> 4);
    info->channels = (p[12] >> 1 & 7) + 1;
    info->bits = ((p[12] & 1) << 4 | p[13] >> 4) + 1;
    info->total = static_cast<int64_t>(p[13] & 0x0F) << 32 |
                  static_cast<int64_t>(be16(p + 14)) << 16 | be16(p + 16);
    return info->max_block >= 16 && min_block <= info->max_block && info->bits >= 4 &&
           info->bits <= kFlacMaxBits;
}

bool flac_parse(const uint8_t *p, int32_t got, const flac_info *info, flac_header *h) {
    if (got < kFlacMinFrame || p[0] != 0xFF || (p[1] & 0xFE) != 0xF8) {
        return false;
    }
    uint8_t padded[kFlacMaxHeader] = {};  // the last frame may be shorter than a header can be
    if (got < kFlacMaxHeader) {
        memcpy(padded, p, static_cast<size_t>(got));
        p = padded;
    }
    const int32_t block_code = p[2] >> 4;
    const int32_t rate_code = p[2] & 0x0F;
    const int32_t channel_code = p[3] >> 4;
    const int32_t bits = kBits[p[3] >> 1 & 7];
    if (block_code == 0 || rate_code == 15 || channel_code > 10 || bits < 0 || (p[3] & 1) != 0) {
        return false;
    }
    h->variable = (p[1] & 1) != 0;
    const int32_t number_bytes = read_number(p + 4, &h->number);
    int32_t at = 4 + number_bytes;
    if (number_bytes == 0) {
        return false;
    }
    h->block = read_block(block_code, p, &at);
    const int32_t rate = read_rate(rate_code, p, &at);
    h->rate = rate_code == 0 ? info->rate : rate;
    h->channels = channel_code < 8 ? channel_code + 1 : 2;
    h->bits = bits == 0 ? info->bits : bits;
    h->bytes = at + 1;
    return h->bytes <= got && h->block <= info->max_block && crc8(p, at) == p[at];
}

int32_t flac_max_bytes(int32_t block, int32_t channels, int32_t bits) {
    // A difference channel has one bit more; each subframe adds a few bytes.
    const int64_t samples = static_cast<int64_t>(block) * channels;
    return static_cast<int32_t>(samples * (bits + 1) / 8) + kFlacMaxHeader + 16 * channels;
}

uint16_t flac_crc16(uint16_t crc, const uint8_t *p, int64_t n) {
    for (int64_t i = 0; i < n; ++i) {
        crc = static_cast<uint16_t>(crc << 8 ^ kTable16[(crc >> 8 ^ p[i]) & 0xFF]);
    }
    return crc;
}
