#include "tests/platform/aac_streams.h"

#include <algorithm>
#include <initializer_list>

namespace codec_test {

namespace {

constexpr size_t kHeader = 7;

struct field {
    uint32_t value;
    int width;
};

struct bits {
    bytes data;
    size_t count = 0;

    void put(std::initializer_list<field> fields) {
        for (const auto &[value, width] : fields) {
            for (int i = width - 1; i >= 0; --i, ++count) {
                if (count % 8 == 0) data.push_back(0);
                data.back() |= static_cast<uint8_t>((value >> i & 1) << (7 - count % 8));
            }
        }
    }
    void align() { count = data.size() * 8; }
    void append(const bytes &other, size_t bit_count) {
        for (size_t i = 0; i < bit_count; ++i) put({{other[i / 8] >> (7 - i % 8) & 1U, 1}});
    }
};

// A fill element with one frame of replication data for a single channel: one envelope over the
// whole frame, the one band between 9 and 10 kHz.
void put_replication(bits *out, size_t frame, bool header) {
    const auto number = static_cast<uint32_t>(frame);
    bits sbr;
    sbr.put({{13, 4}, {header ? 1U : 0U, 1}});  // plain replication data
    if (header) {
        // Resolution, start, stop an octave above, crossover at the last of eight bands.
        sbr.put({{0, 1}, {5, 4}, {14, 4}, {7, 3}, {0, 2}});
        // More follows, of which eight bands an octave.
        sbr.put({{1, 1}, {0, 1}, {3, 2}, {0, 1}, {2, 2}});
    }
    // No extra data, fixed borders, one envelope, coarse, coded along frequency.
    sbr.put({{0, 1}, {0, 2}, {0, 2}, {0, 1}, {0, 2}});
    // Inverse filtering, the envelope, the noise.
    sbr.put({{number / 3 % 4, 2}, {20 + number * 7 % 11, 7}, {3 + number % 4, 5}, {0, 2}});
    sbr.align();
    out->put({{6, 3}, {static_cast<uint32_t>(sbr.data.size()), 4}});
    out->append(sbr.data, sbr.count);
}

std::vector<bytes> raw_blocks(const bytes &adts) {
    const std::vector<size_t> at = adts_frames(adts);
    std::vector<bytes> blocks;
    for (size_t i = 0; i + 1 < at.size(); ++i) {
        blocks.push_back(part(adts, at[i] + kHeader, at[i + 1]));
    }
    return blocks;
}

// Bits of a raw block before its end mark, which is the last three bits that are set.
size_t bits_before_end(const bytes &block) {
    size_t at = block.size() * 8;
    while (at > 3 && (block[(at - 1) / 8] >> (7 - (at - 1) % 8) & 1) == 0) {
        --at;
    }
    return at - 3;
}

// The block behind a header like that of the stream's first frame, which leaves the channels to the
// blocks if told so.
bytes frame_of(const bytes &block, const bytes &adts, bool no_channels = false) {
    const size_t size = kHeader + block.size();
    bytes head = part(adts, 0, kHeader);
    if (no_channels) head[2] &= 0xFE;
    head[3] = static_cast<uint8_t>((head[3] & (no_channels ? 0x3C : 0xFC)) | size >> 11);
    head[4] = static_cast<uint8_t>(size >> 3);
    head[5] = static_cast<uint8_t>((head[5] & 0x1F) | size << 5);
    return joined({head, block});
}

// Low complexity, the rate of the stream, one front element of its channels, no mixdowns, a
// comment.
void put_program(bits *out, const bytes &adts) {
    const bool pair = (adts[3] >> 6) == 2;
    out->put({{0, 4}, {1, 2}, {adts[2] >> 2 & 15U, 4}});
    out->put({{1, 4}, {0, 4}, {0, 4}, {0, 2}, {0, 3}, {0, 4}, {0, 3}});
    out->put({{pair ? 1U : 0U, 1}, {0, 4}});
    out->align();
    out->put({{2, 8}, {'h', 8}, {'i', 8}});
}

}  // namespace

std::vector<size_t> adts_frames(const bytes &file) {
    std::vector<size_t> at;
    size_t i = 0;
    while (i + kHeader <= file.size()) {
        EXPECT_EQ(file[i], 0xFF);
        at.push_back(i);
        const size_t size = (file[i + 3] & 3U) << 11 | file[i + 4] * 8U | file[i + 5] >> 5;
        i += std::max(size, kHeader);
    }
    EXPECT_EQ(i, file.size());
    at.push_back(i);
    return at;
}

bytes with_band_replication(const bytes &adts, size_t header_every) {
    bytes out;
    size_t frame = 0;
    for (const bytes &block : raw_blocks(adts)) {
        bits changed;
        changed.append(block, bits_before_end(block));
        put_replication(&changed, frame, frame % header_every == 0);
        changed.put({{7, 3}});
        out = joined({out, frame_of(changed.data, adts)});
        ++frame;
    }
    return out;
}

bytes as_adif(const bytes &adts) {
    bits head;
    head.put({{'A', 8}, {'D', 8}, {'I', 8}, {'F', 8}});
    // No copyright, copied, home-made; variable rate, one program.
    head.put({{0, 3}, {1, 1}, {128'000, 23}, {0, 4}});
    put_program(&head, adts);
    return joined({head.data, joined(raw_blocks(adts))});
}

bytes with_program_configuration(const bytes &adts) {
    std::vector<bytes> blocks = raw_blocks(adts);
    bits first;
    first.put({{5, 3}});
    put_program(&first, adts);
    first.append(blocks[0], blocks[0].size() * 8);
    blocks[0] = first.data;
    for (bytes &block : blocks) block = frame_of(block, adts, true);
    return joined(blocks);
}

}  // namespace codec_test
