#include "tests/platform/aac_streams.h"

#include <algorithm>

namespace codec_test {

namespace {

constexpr size_t kHeader = 7;

struct bits {
    bytes data;
    size_t count = 0;

    void put(uint32_t value, int width) {
        for (int i = width - 1; i >= 0; --i, ++count) {
            if (count % 8 == 0) {
                data.push_back(0);
            }
            data.back() = static_cast<uint8_t>(data.back() | (value >> i & 1) << (7 - count % 8));
        }
    }
    void align() { count = data.size() * 8; }
    void append(const bytes &other, size_t from, size_t bit_count) {
        for (size_t i = from; i < from + bit_count; ++i) {
            put(other[i / 8] >> (7 - i % 8) & 1U, 1);
        }
    }
};

// A fill element with one frame of replication data for a single channel: one envelope over the
// whole frame, the one band between 9 and 10 kHz.
void put_replication(bits *out, size_t frame, bool header) {
    bits sbr;
    sbr.put(13, 4);  // plain replication data
    sbr.put(header ? 1 : 0, 1);
    if (header) {
        sbr.put(0, 1);   // resolution
        sbr.put(5, 4);   // start
        sbr.put(14, 4);  // stop: an octave above
        sbr.put(7, 3);   // crossover: the last of eight bands
        sbr.put(0, 2);
        sbr.put(1, 1);  // more follows
        sbr.put(0, 1);
        sbr.put(3, 2);  // eight bands an octave
        sbr.put(0, 1);
        sbr.put(2, 2);
    }
    sbr.put(0, 1);                                     // no extra data
    sbr.put(0, 2);                                     // fixed borders
    sbr.put(0, 2);                                     // one envelope
    sbr.put(0, 1);                                     // coarse
    sbr.put(0, 2);                                     // coded along frequency
    sbr.put(static_cast<uint32_t>(frame / 3 % 4), 2);  // inverse filtering
    sbr.put(static_cast<uint32_t>(20 + frame * 7 % 11), 7);
    sbr.put(static_cast<uint32_t>(3 + frame % 4), 5);  // noise
    sbr.put(0, 2);
    sbr.align();
    out->put(6, 3);
    out->put(static_cast<uint32_t>(sbr.data.size()), 4);
    out->append(sbr.data, 0, sbr.data.size() * 8);
}

bytes raw_block(const bytes &file, size_t from, size_t to) {
    return {file.begin() + static_cast<ptrdiff_t>(from + kHeader),
            file.begin() + static_cast<ptrdiff_t>(to)};
}

// Bits of a raw block before its end mark, which is the last three bits that are set.
size_t bits_before_end(const bytes &block) {
    size_t at = block.size() * 8;
    while (at > 3 && (block[(at - 1) / 8] >> (7 - (at - 1) % 8) & 1) == 0) {
        --at;
    }
    return at - 3;
}

void put_frame(bytes *file, const uint8_t *header, const bytes &block) {
    const size_t size = kHeader + block.size();
    bytes head(header, header + kHeader);
    head[3] = static_cast<uint8_t>((head[3] & 0xFC) | size >> 11);
    head[4] = static_cast<uint8_t>(size >> 3);
    head[5] = static_cast<uint8_t>((head[5] & 0x1F) | size << 5);
    file->insert(file->end(), head.begin(), head.end());
    file->insert(file->end(), block.begin(), block.end());
}

// Low complexity, the header's rate, one front element of the header's channels.
void put_program(bits *out, const uint8_t *header) {
    const bool pair = (header[3] >> 6) == 2;
    out->put(0, 4);
    out->put(1, 2);
    out->put(header[2] >> 2 & 15U, 4);
    out->put(1, 4);  // front
    out->put(0, 4);
    out->put(0, 4);
    out->put(0, 2);
    out->put(0, 3);
    out->put(0, 4);
    out->put(0, 3);  // no mixdowns
    out->put(pair ? 1 : 0, 1);
    out->put(0, 4);
    out->align();
    out->put(2, 8);
    out->put('h', 8);  // a comment
    out->put('i', 8);
}

}  // namespace

std::vector<size_t> adts_frames(const bytes &file) {
    std::vector<size_t> at;
    size_t i = 0;
    while (i + kHeader <= file.size()) {
        EXPECT_EQ(file[i], 0xFF);
        at.push_back(i);
        const size_t size = (file[i + 3] & 3U) << 11 | file[i + 4] * 8U | file[i + 5] >> 5;
        if (size < kHeader) {
            ADD_FAILURE() << "no ADTS frame at " << i;
            break;
        }
        i += size;
    }
    EXPECT_EQ(i, file.size());
    at.push_back(i);
    return at;
}

bytes with_band_replication(const bytes &adts, size_t header_every) {
    const std::vector<size_t> at = adts_frames(adts);
    bytes out;
    for (size_t i = 0; i + 1 < at.size(); ++i) {
        const bytes block = raw_block(adts, at[i], at[i + 1]);
        bits changed;
        changed.append(block, 0, bits_before_end(block));
        put_replication(&changed, i, i % header_every == 0);
        changed.put(7, 3);
        put_frame(&out, adts.data() + at[i], changed.data);
    }
    return out;
}

bytes as_adif(const bytes &adts) {
    const std::vector<size_t> at = adts_frames(adts);
    bits head;
    for (const char c : {'A', 'D', 'I', 'F'}) {
        head.put(static_cast<uint8_t>(c), 8);
    }
    head.put(0, 3);  // no copyright, copied, home-made
    head.put(1, 1);  // variable rate
    head.put(128000, 23);
    head.put(0, 4);
    put_program(&head, adts.data());
    bytes out = head.data;
    for (size_t i = 0; i + 1 < at.size(); ++i) {
        const bytes block = raw_block(adts, at[i], at[i + 1]);
        out.insert(out.end(), block.begin(), block.end());
    }
    return out;
}

bytes with_program_configuration(const bytes &adts) {
    const std::vector<size_t> at = adts_frames(adts);
    bytes out;
    for (size_t i = 0; i + 1 < at.size(); ++i) {
        bytes block = raw_block(adts, at[i], at[i + 1]);
        if (i == 0) {
            bits changed;
            changed.put(5, 3);
            put_program(&changed, adts.data());
            changed.append(block, 0, block.size() * 8);
            block = changed.data;
        }
        bytes header(adts.begin() + static_cast<ptrdiff_t>(at[i]),
                     adts.begin() + static_cast<ptrdiff_t>(at[i] + kHeader));
        header[2] &= 0xFE;
        header[3] &= 0x3F;
        put_frame(&out, header.data(), block);
    }
    return out;
}

}  // namespace codec_test
