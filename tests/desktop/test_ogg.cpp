#include <ogg/ogg.h>

#include <algorithm>
#include <cstdlib>
#include <functional>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

constexpr size_t kLongBlock = 1024;  // samples of the packets of these files at most

struct place {
    size_t offset, size;
    int64_t granule;
};

ogg_page page_at(bytes *file, size_t offset) {
    ogg_page page = {};
    page.header = file->data() + offset;
    page.header_len = 27 + page.header[26];
    page.body = page.header + page.header_len;
    for (int i = 0; i < page.header[26]; ++i) page.body_len += page.header[27 + i];
    return page;
}

std::vector<place> pages_of(bytes file) {
    std::vector<place> pages;
    for (size_t at = 0; at < file.size();) {
        const ogg_page page = page_at(&file, at);
        const size_t size = static_cast<size_t>(page.header_len + page.body_len);
        pages.push_back({at, size, ogg_page_granulepos(&page)});
        at += size;
    }
    return pages;
}

// Adds to the granule position of every page of audio, or of the last one alone.
bytes with_granules(bytes file, int64_t more, bool last_only = false) {
    const std::vector<place> pages = pages_of(file);
    for (const place &each : pages) {
        if (each.granule <= 0 || (last_only && &each != &pages.back())) continue;
        ogg_page page = page_at(&file, each.offset);
        for (int i = 0; i < 8; ++i) {
            page.header[6 + i] = static_cast<uint8_t>((each.granule + more) >> 8 * i);
        }
        ogg_page_checksum_set(&page);
    }
    return file;
}

// Where a stream was cut out of a longer one, the positions do not start at 0; what lies before 0
// is not played, nor what lies behind the last position.
TEST(Ogg, FollowsTheGranulePositions) {
    const bytes file = load(fixture("song.ogg"));
    const samples plain = read_all(fixture("song.ogg"));
    const size_t all = plain.size();
    std::vector<changed_file> files = {{"from 50000", with_granules(file, 50'000), all, all}};
    for (const int less : {1, 700, 3000}) {
        const auto gone = static_cast<size_t>(less);
        files.push_back({"front", with_granules(file, -less), all - gone, 0, gone});
        files.push_back({"end", with_granules(file, -less, true), all - gone, all - gone});
    }
    expect_changed(plain, files);
    // More than there is, is not there; but the whole of the last block is.
    const bytes longer = with_granules(file, 5000, true);
    const size_t size = read_all(save("longer.ogg", longer)).size();
    EXPECT_GE(size, all);
    EXPECT_LT(size, all + kLongBlock);
    expect_changed(plain, {{"longer", longer, size, all}});
}

// A hole becomes silence of its own length; what lies behind it stays in its place. What a cut file
// does not hold is not there, nor a second stream that is chained to the first.
TEST(Ogg, ReadsDamagedCutAndChainedFiles) {
    const bytes file = load(fixture("song.ogg"));
    const samples plain = read_all(fixture("song.ogg"));
    const std::vector<place> pages = pages_of(file);
    const size_t middle = pages.size() / 2;
    const auto sample = [&](size_t page) { return static_cast<size_t>(pages[page].granule); };
    bytes zeros = file;
    std::fill_n(&zeros[pages[middle].offset + 10], 10'000, uint8_t{0});
    const bytes missing =
        joined({part(file, 0, pages[middle].offset), part(file, pages[middle + 3].offset)});
    const size_t all = plain.size();
    const size_t before = sample(middle - 1);
    const size_t behind = sample(middle + 3);
    const size_t silent = before + kLongBlock;
    const bytes cut = part(file, 0, pages[middle].offset + pages[middle].size / 2);
    expect_changed(plain, {{"zeros", zeros, all, before, behind, silent, sample(middle + 1)},
                           {"missing", missing, all, before, behind, silent, sample(middle + 1)},
                           {"cut", cut, before, before},
                           {"chained", joined({file, load(fixture("other.ogg"))}), all, all}});
}

// Damage that no checksum shows: the packets keep their length.
TEST(Ogg, ConcealsDamagedPackets) {
    bytes file = load(fixture("song.ogg"));
    const std::vector<place> pages = pages_of(file);
    const size_t middle = pages.size() / 2;
    for (size_t i = middle; i < middle + 3; ++i) {
        ogg_page page = page_at(&file, pages[i].offset);
        for (int k = 3; k < page.body_len; k += 7) page.body[k] ^= 0x5A;
        ogg_page_checksum_set(&page);
    }
    const std::string path = save("damaged.ogg", file);
    const auto got = static_cast<int64_t>(read_all(path).size());
    const auto plain = static_cast<int64_t>(read_all(fixture("song.ogg")).size());
    EXPECT_LT(std::abs(got - plain), 20 * kLongBlock);  // a packet's first byte says how long it is
    expect_exact_seams(path);
}

// Only set-up data sets a decoder up, and nothing is decoded before. The first packet gives no
// output.
TEST(Ogg, SetsTheDecoderUpFirst) {
    const direct_ogg file(fixture("song.ogg"));
    ASSERT_NE(file.reader, nullptr);
    void *stream = xoggds_open(file.reader, 0, nullptr);
    int32_t length = 0;
    ASSERT_EQ(xoggds_get_format(stream, nullptr, &length), 0);
    ASSERT_GT(length, 0);
    bytes setup(static_cast<size_t>(length));
    ASSERT_EQ(xoggds_get_format(stream, setup.data(), &length), 0);
    bytes packet(16384);
    int32_t size = 0;
    int64_t first = 0;
    int64_t second = 0;
    ASSERT_EQ(xoggds_get_frm(stream, packet.data(), 16384, &size, &first, &second), 0);
    EXPECT_EQ(second, 0);

    const wexa_config config = {1, 1, 2, 0};
    void *decoder = xvorbisd_create(&config, nullptr);
    bytes pcm(16384);
    wexa_output output = {};
    wexa_status status = {};
    const auto decode = [&](bytes &data, int32_t bytes, void *to) {
        wexa_frame frame = {};
        frame.data = data.data();
        frame.bytes = bytes;
        output.data = to;
        return xvorbisd_decode(decoder, &frame, &output, &status);
    };
    EXPECT_NE(decode(packet, size, pcm.data()), 0);
    EXPECT_NE(decode(setup, length / 2, nullptr), 0);
    EXPECT_EQ(decode(setup, length, nullptr), 0);
    EXPECT_EQ(status.produced, 0);
    EXPECT_EQ(decode(packet, size, pcm.data()), 0);
    EXPECT_EQ(status.produced, 0);
    xvorbisd_delete(decoder);
}

TEST(Ogg, RefusesBrokenHeads) {
    const bytes file = load(fixture("song.ogg"));
    const std::vector<place> pages = pages_of(file);
    bytes headless = file;
    std::fill_n(&headless[pages[1].offset], 200, uint8_t{0});
    for (const bytes &head : {part(file, 0, pages[1].offset), part(file, 0, pages[1].offset + 200),
                              part(file, 0, pages[2].offset), headless}) {
        EXPECT_EQ(opened(save("head.ogg", head)).error, -7) << head.size();
    }
}

}  // namespace
}  // namespace codec_test
