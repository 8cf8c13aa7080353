#include <ogg/ogg.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <functional>

#include "media_source/wexaaudio.h"
#include "tests/platform/codec_test.h"

namespace {

using codec_test::bytes;
using codec_test::fixture;
using codec_test::kUnits;
using codec_test::load;
using codec_test::read_all;
using codec_test::samples;
using codec_test::save;

constexpr int64_t kLongBlock = 1024;  // samples of the packets of these files at most

using direct = codec_test::direct<xogg_info, int64_t, xoggd_create, xoggd_delete>;

struct place {
    size_t offset, size;
    int64_t granule;
};

ogg_page page_at(bytes *file, size_t offset) {
    ogg_page page = {};
    page.header = file->data() + offset;
    page.header_len = 27 + page.header[26];
    page.body = page.header + page.header_len;
    for (int i = 0; i < page.header[26]; ++i) {
        page.body_len += page.header[27 + i];
    }
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

// Changes the granule position of every page of audio.
bytes with_granules(bytes file, const std::function<int64_t(int64_t granule, bool last)> &change) {
    const std::vector<place> pages = pages_of(file);
    for (const place &each : pages) {
        if (each.granule > 0) {
            ogg_page page = page_at(&file, each.offset);
            const int64_t granule = change(each.granule, &each == &pages.back());
            for (int i = 0; i < 8; ++i) {
                page.header[6 + i] = static_cast<uint8_t>(granule >> 8 * i);
            }
            ogg_page_checksum_set(&page);
        }
    }
    return file;
}

// Vorbis has no delay: as many samples as were encoded, each in its place, the channels' mean.
TEST(Ogg, DeliversTheMeanOfTheChannels) {
    for (const char *name : {"song", "mono", "six"}) {
        SCOPED_TRACE(name);
        const bytes wav = load(fixture(std::string(name) + ".wav"));
        const size_t channels = wav[22];
        const samples got = read_all(fixture(std::string(name) + ".ogg"));
        ASSERT_EQ(got.size(), (wav.size() - 44) / 2 / channels);
        double error = 0;
        double power = 0;
        for (size_t i = 0; i < got.size(); ++i) {
            double sum = 0;
            for (size_t c = 0; c < channels; ++c) {
                int16_t sample = 0;
                memcpy(&sample, wav.data() + 44 + 2 * (i * channels + c), 2);
                sum += sample;
            }
            const double mean = sum / static_cast<double>(channels);
            error += (got[i] - mean) * (got[i] - mean);
            power += mean * mean;
        }
        EXPECT_LT(error, power / 20);
    }
}

TEST(Ogg, GivesTheSameSamplesBesideAnotherStream) {
    EXPECT_EQ(read_all(fixture("video.ogv")), read_all(fixture("song.ogg")));
    direct file(fixture("video.ogv"));
    ASSERT_NE(file.reader, nullptr);
    ASSERT_EQ(file.info.stream_count, 2);
    EXPECT_NE(file.info.kind[0], kWexaKindAudio);
    EXPECT_EQ(file.info.kind[1], kWexaKindAudio);
    EXPECT_EQ(xoggds_open(file.reader, 0, nullptr), nullptr);
    EXPECT_NE(xoggds_open(file.reader, 1, nullptr), nullptr);
}

TEST(Ogg, StopsWhereASecondStreamIsChained) {
    bytes file = load(fixture("song.ogg"));
    const bytes other = load(fixture("other.ogg"));
    file.insert(file.end(), other.begin(), other.end());
    const std::string path = save("chained.ogg", file);
    EXPECT_EQ(read_all(path), read_all(fixture("song.ogg")));
    codec_test::expect_exact_seams(path);
}

// Where a stream was cut out of a longer one, the positions do not start at 0.
TEST(Ogg, FollowsTheFirstGranulePosition) {
    const bytes file = load(fixture("song.ogg"));
    const samples plain = read_all(fixture("song.ogg"));
    const auto moved = [&](int64_t by) {
        return save("moved.ogg",
                    with_granules(file, [by](int64_t granule, bool) { return granule + by; }));
    };
    EXPECT_EQ(read_all(moved(50000)), plain);
    codec_test::expect_exact_seams(moved(50000));
    // What lies before 0 is not played.
    for (const int64_t before : {1, 700, 3000}) {
        const samples got = read_all(moved(-before));
        EXPECT_EQ(got, samples(plain.begin() + before, plain.end())) << before;
        codec_test::expect_exact_seams(moved(-before));
    }
}

TEST(Ogg, CutsTheEndToTheLastGranulePosition) {
    const bytes file = load(fixture("song.ogg"));
    const samples plain = read_all(fixture("song.ogg"));
    for (const int64_t less : {1, 300, 2000}) {
        const std::string path =
            save("shorter.ogg", with_granules(file, [less](int64_t granule, bool last) {
                     return last ? granule - less : granule;
                 }));
        const samples got = read_all(path);
        EXPECT_EQ(got, samples(plain.begin(), plain.end() - less));
        codec_test::expect_exact_seams(path);
    }
    // More than there is, is not there; but the whole of the last block is.
    const std::string path = save("longer.ogg", with_granules(file, [](int64_t granule, bool last) {
                                      return last ? granule + 5000 : granule;
                                  }));
    const samples got = read_all(path);
    ASSERT_GE(got.size(), plain.size());
    EXPECT_LT(got.size(), plain.size() + kLongBlock);
    EXPECT_TRUE(std::equal(plain.begin(), plain.end(), got.begin()));
    codec_test::expect_exact_seams(path);
}

// A hole becomes silence of its own length; what lies behind it stays in its place.
TEST(Ogg, FillsHolesWithSilence) {
    const bytes file = load(fixture("song.ogg"));
    const samples plain = read_all(fixture("song.ogg"));
    const std::vector<place> pages = pages_of(file);
    const size_t middle = pages.size() / 2;
    const auto sample = [&](size_t page) { return static_cast<ptrdiff_t>(pages[page].granule); };
    bytes zeros = file;
    std::fill_n(zeros.begin() + static_cast<ptrdiff_t>(pages[middle].offset) + 10, 10000,
                uint8_t{0});
    bytes missing(file.begin(), file.begin() + static_cast<ptrdiff_t>(pages[middle].offset));
    missing.insert(missing.end(), file.begin() + static_cast<ptrdiff_t>(pages[middle + 3].offset),
                   file.end());
    for (const bytes &damaged : {zeros, missing}) {
        const std::string path = save("hole.ogg", damaged);
        const samples got = read_all(path);
        ASSERT_EQ(got.size(), plain.size());
        const ptrdiff_t before = sample(middle - 1);
        EXPECT_TRUE(std::equal(got.begin(), got.begin() + before, plain.begin()));
        const ptrdiff_t after = sample(middle + 3);
        EXPECT_TRUE(std::equal(got.begin() + after, got.end(), plain.begin() + after));
        EXPECT_TRUE(std::all_of(got.begin() + before + kLongBlock, got.begin() + sample(middle + 1),
                                [](int16_t s) { return s == 0; }));
        codec_test::expect_exact_seams(path);
    }
}

// Damage that no checksum shows: the packets keep their length.
TEST(Ogg, ConcealsDamagedPackets) {
    bytes file = load(fixture("song.ogg"));
    const samples plain = read_all(fixture("song.ogg"));
    const std::vector<place> pages = pages_of(file);
    const size_t middle = pages.size() / 2;
    for (size_t i = middle; i < middle + 3; ++i) {
        ogg_page page = page_at(&file, pages[i].offset);
        for (int k = 0; k < page.body_len; ++k) {
            page.body[k] = static_cast<uint8_t>(page.body[k] ^ (k % 7 == 3 ? 0x5A : 0));
        }
        ogg_page_checksum_set(&page);
    }
    const std::string path = save("damaged.ogg", file);
    const samples got = read_all(path);
    const auto close = std::abs(static_cast<int64_t>(got.size() - plain.size()));
    EXPECT_LT(close, 20 * kLongBlock);  // a packet's first byte says how long it is
    codec_test::expect_exact_seams(path);
}

TEST(Ogg, CountsWhatACutFileHolds) {
    bytes file = load(fixture("song.ogg"));
    const samples plain = read_all(fixture("song.ogg"));
    const std::vector<place> pages = pages_of(file);
    const size_t middle = pages.size() / 2;
    file.resize(pages[middle].offset + pages[middle].size / 2);
    const std::string path = save("cut.ogg", file);
    const samples got = read_all(path);
    EXPECT_EQ(static_cast<int64_t>(got.size()), pages[middle - 1].granule);
    EXPECT_TRUE(std::equal(got.begin(), got.end(), plain.begin()));
}

TEST(Ogg, FillsTheRecords) {
    direct file(fixture("song.ogg"));
    ASSERT_NE(file.reader, nullptr);
    EXPECT_EQ(file.info.duration, 12 * kUnits);
    void *stream = xoggds_open(file.reader, 0, nullptr);
    xogg_stream info = {};
    ASSERT_EQ(xoggds_get_info_aud(stream, &info), 0);
    EXPECT_EQ(info.codec, 323);
    EXPECT_EQ(info.sample_rate, 44100);
    int32_t length = 0;
    ASSERT_EQ(xoggds_get_format(stream, nullptr, &length), 0);
    ASSERT_GT(length, 0);
    bytes setup(static_cast<size_t>(length));
    ASSERT_EQ(xoggds_get_format(stream, setup.data(), &length), 0);
    // Only set-up data sets a decoder up, and nothing is decoded before.
    const wexa_config config = {1, 1, 2, 0};
    void *decoder = xvorbisd_create(&config, nullptr);
    wexa_frame frame = {};
    wexa_output output = {};
    wexa_status status = {};
    bytes buf(16384);
    bytes pcm(16384);
    int64_t first = 0;
    int64_t second = 0;
    frame.data = buf.data();
    ASSERT_EQ(xoggds_get_frm(stream, buf.data(), 16384, &frame.bytes, &first, &second), 0);
    EXPECT_EQ(second, 0);  // the stream's first packet, which gives no output
    output.data = pcm.data();
    EXPECT_NE(xvorbisd_decode(decoder, &frame, &output, &status), 0);
    wexa_frame setup_frame = {};
    setup_frame.data = setup.data();
    setup_frame.bytes = length / 2;
    output.data = nullptr;
    EXPECT_NE(xvorbisd_decode(decoder, &setup_frame, &output, &status), 0);
    setup_frame.bytes = length;
    EXPECT_EQ(xvorbisd_decode(decoder, &setup_frame, &output, &status), 0);
    EXPECT_EQ(status.produced, 0);
    output.data = pcm.data();
    EXPECT_EQ(xvorbisd_decode(decoder, &frame, &output, &status), 0);
    EXPECT_EQ(status.produced, 0);
    ASSERT_EQ(xoggds_get_frm(stream, buf.data(), 16384, &frame.bytes, &first, &second), 0);
    EXPECT_EQ(xvorbisd_decode(decoder, &frame, &output, &status), 0);
    EXPECT_EQ(output.bytes / 2, second * 44100 / kUnits);
    EXPECT_NE(status.produced, 0);
    xvorbisd_delete(decoder);
}

TEST(Ogg, RefusesOtherCodecsAndBrokenHeads) {
    EXPECT_EQ(codec_test::opened(fixture("opus.ogg")).error, -7);
    const bytes file = load(fixture("song.ogg"));
    const std::vector<place> pages = pages_of(file);
    for (const size_t size : {pages[1].offset, pages[1].offset + 200, pages[2].offset}) {
        const bytes head(file.begin(), file.begin() + static_cast<ptrdiff_t>(size));
        EXPECT_EQ(codec_test::opened(save("head.ogg", head)).error, -7) << size;
    }
    bytes headless = file;
    std::fill_n(headless.begin() + static_cast<ptrdiff_t>(pages[1].offset), 200, uint8_t{0});
    EXPECT_EQ(codec_test::opened(save("head.ogg", headless)).error, -7);
}

}  // namespace
