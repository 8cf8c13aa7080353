// Real files at the borders of what is accepted: lengths, rates, paths, claims and sizes beyond
// what 31 and 32 bits count. Each goes through its source and the whole job in every mode.
#include <fcntl.h>

#include <algorithm>
#include <cmath>
#include <filesystem>

#include "tests/desktop/codec_test.h"
#include "tests/faults/encode.h"
#include "tests/faults/measure.h"
#include "tests/faults/trial.h"
#include "tests/support/job_harness.h"

namespace {

using codec_test::bytes;

constexpr unsigned kLongest = 900;  // seconds of one file
constexpr int64_t kGiB = int64_t{1} << 30;
constexpr int64_t kUnits = 10'000'000;  // per second
constexpr double kOrdinaryMib = 256.0;  // for files of a few seconds

const std::string folder = testing::TempDir() + "tavo_limits_" + std::to_string(getpid()) + "/";

support::song song_of(int32_t rate, int32_t channels, double seconds) {
    support::song_spec plan;
    plan.rate = rate;
    plan.channels = channels;
    plan.seconds = seconds;
    plan.loud_at = seconds / 2.0;
    plan.tail_at = seconds;
    return support::make_song(plan);
}

struct answer {
    std::string text;
    int64_t units = 0;
    double ms = 0.0;
    double mib = 0.0;
};

// What the source and the library answer to a file: "source:CODE,init:CODE", and where it is
// accepted the segments, the jobs that reported once as they should, and the samples that follow
// the last whole second of a very long file.
answer ask(const std::string &path, bool jobs = true, bool tail = false) {
    trial::watch(kLongest, path);
    trial::peak::start();
    const auto start = std::chrono::steady_clock::now();
    answer got;
    {
        const codec_test::opened file(path);
        got.text = "source:" + std::to_string(file.error);
        got.units = file.format.duration;
        int64_t reached = -1;
        if (tail && file.source != nullptr) {
            const int64_t last = got.units / kUnits * kUnits - kUnits;
            EXPECT_EQ(mtsrc_seekstream(file.source, last, &reached), 0);
            EXPECT_EQ(reached, last);
            const std::vector<int16_t> end = codec_test::read(file.source, SIZE_MAX);
            got.text += ",tail:" + std::to_string(std::count(end.begin(), end.end(), 1000));
        }
    }
    int32_t segments = 0;
    int reports = 0;
    int32_t err = 99;
    for (int32_t mode = 0; mode <= 2 && err != TAVO_ERR_HANDLE; ++mode) {
        TAVO_CTX *ctx = job::create(path, mode, &err);
        if (ctx == nullptr) continue;
        segments = ctx->seg_count;
        if (jobs) {
            EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), TAVO_OK);
            const job::result result = job::wait();
            const bool good = result.status == 0 || (mode != 0 && result.status == -1);
            reports += good && (result.status == 0) == (load_flag(&ctx->state) == 3) ? 1 : 0;
        }
        EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
        EXPECT_EQ(job::last.calls, jobs ? 1 : 0);
    }
    got.text += ",init:" + std::to_string(err);
    if (err == 0) got.text += ",segments:" + std::to_string(segments);
    if (err == 0 && jobs) got.text += ",jobs:" + std::to_string(reports);
    got.ms = trial::ms_since(start);
    got.mib = trial::peak::mib();
    alarm(0);
    return got;
}

void expect(const std::string &name, const answer &got, const std::string &expected,
            double most_mib = kOrdinaryMib) {
    EXPECT_EQ(got.text, expected) << name;
    EXPECT_LT(got.mib, most_mib) << name;
    trial::figure("limits", {{"case", name},
                             {"answer", got.text},
                             {"expected", expected},
                             {"ms", std::to_string(lround(got.ms))},
                             {"mib", std::to_string(lround(got.mib))}});
}

constexpr char kAccepted[] = "source:0,init:0,segments:1,jobs:3";
constexpr char kInFour[] = "source:0,init:0,segments:4,jobs:3";
constexpr char kRefusedByPlan[] = "source:0,init:-4";
constexpr char kRefusedBySource[] = "source:-3,init:-4";

class Limits : public testing::Test {
 protected:
    Limits() { std::filesystem::create_directories(folder); }
    ~Limits() override { std::filesystem::remove_all(folder); }

    static std::string wav(const char *name, int32_t rate, size_t samples) {
        support::song song = song_of(rate, 1, 6.0);
        song.pcm.resize(samples);
        EXPECT_TRUE(support::write_wav(folder + name, song));
        return folder + name;
    }
};

// More than one second is accepted, more than five are decoded in four parts.
TEST_F(Limits, Lengths) {
    expect("1_s_at_8000_Hz", ask(wav("a.wav", 8000, 8000)), kRefusedByPlan);
    expect("1_s_and_a_sample_at_8000_Hz", ask(wav("a.wav", 8000, 8001)), kAccepted);
    expect("1_s_less_a_sample_at_48000_Hz", ask(wav("a.wav", 48'000, 47'999)), kRefusedByPlan);
    expect("1_s_at_48000_Hz", ask(wav("a.wav", 48'000, 48'000)), kRefusedByPlan);
    expect("1_s_and_a_sample_at_48000_Hz", ask(wav("a.wav", 48'000, 48'001)), kAccepted);
    expect("5_s_at_8000_Hz", ask(wav("a.wav", 8000, 40'000)), kAccepted);
    expect("5_s_and_a_sample_at_8000_Hz", ask(wav("a.wav", 8000, 40'001)), kInFour);
    expect("5_s_at_48000_Hz", ask(wav("a.wav", 48'000, 240'000)), kAccepted);
    expect("5_s_and_a_sample_at_48000_Hz", ask(wav("a.wav", 48'000, 240'001)), kInFour);
}

TEST_F(Limits, Rates) {
    struct {
        const char *format;
        int32_t rate;
        const char *expected;
    } const cases[] = {
        {"wav", 7999, kRefusedByPlan},
        {"wav", 8000, kAccepted},
        {"wav", 48'000, kAccepted},
        {"wav", 48'001, kRefusedBySource},
        {"wav", 192'000, kRefusedBySource},
        {"flac", 7999, kRefusedBySource},
        {"flac", 8000, kAccepted},
        {"flac", 48'000, kAccepted},
        {"flac", 48'001, kAccepted},
        {"flac", 192'000, kAccepted},
        {"flac", 192'001, kRefusedBySource},
        {"ogg", 7999, kRefusedByPlan},
        {"ogg", 8000, kAccepted},
        {"ogg", 48'000, kAccepted},
        {"ogg", 48'001, kRefusedBySource},
        {"ogg", 192'000, kRefusedBySource},
        {"aac", 7350, kRefusedBySource},
        {"aac", 8000, kAccepted},
        {"aac", 48'000, kAccepted},
        {"aac", 64'000, kRefusedBySource},
        {"m4a", 7350, kRefusedBySource},
        {"m4a", 8000, kAccepted},
        {"m4a", 48'000, kAccepted},
        {"m4a", 64'000, kRefusedBySource},
        {"mp3", 8000, kAccepted},
        {"mp3", 48'000, kAccepted},
    };
    for (const auto &each : cases) {
        const std::string path = folder + "rate." + each.format;
        ASSERT_NO_FATAL_FAILURE(trial::encode(song_of(each.rate, 1, 2.0), path));
        expect(std::string(each.format) + "_at_" + std::to_string(each.rate) + "_Hz", ask(path),
               each.expected);
    }
}

TEST_F(Limits, Paths) {
    std::string path = wav("a.wav", 8000, 16'000);
    path.insert(folder.size(), std::string(511 - path.size(), '/'));
    expect("path_of_511_bytes", ask(path), kAccepted);
    path.insert(folder.size(), "/");
    expect("path_of_512_bytes", ask(path), kRefusedBySource);
}

// Puts value at offset bytes behind each place where the four letters stand.
void patch(bytes *file, const std::string &letters, size_t offset, uint32_t value, bool little) {
    int found = 0;
    for (auto at = file->begin();
         (at = std::search(at, file->end(), letters.begin(), letters.end())) != file->end(); ++at) {
        for (int i = 0; i < 4; ++i) {
            at[static_cast<std::ptrdiff_t>(offset) + i] =
                static_cast<uint8_t>(value >> 8 * (little ? i : 3 - i));
        }
        ++found;
    }
    EXPECT_GT(found, 0) << letters;
}

uint32_t big_endian(const uint8_t *at) {
    return static_cast<uint32_t>(at[0]) << 24 | static_cast<uint32_t>(at[1]) << 16 |
           static_cast<uint32_t>(at[2]) << 8 | at[3];
}

// A header that claims more than 31 or 32 bits count: only what is there counts.
TEST_F(Limits, Claims) {
    struct {
        const char *name;
        const char *format;
        const char *letters;
        size_t offset;
        std::vector<uint32_t> claims;
    } const cases[] = {
        {"wav_data_size", "wav", "data", 4, {0x7FFFFFFF, 0x80000000, 0xFFFFFFFE, 0xFFFFFFFF}},
        {"flac_sample_count", "flac", "fLaC", 22, {0x7FFFFFFF, 0x80000000, 0xFFFFFFFF}},
        {"m4a_track_duration", "m4a", "mdhd", 20, {0x7FFFFFFF, 0x80000000, 0xFFFFFFFE}},
        {"m4a_frame_duration", "m4a", "stts", 16, {0x7FFFFFFF, 0x80000000, 0xFFFFFFFF}},
    };
    for (const auto &each : cases) {
        const std::string path = folder + "claim." + each.format;
        ASSERT_NO_FATAL_FAILURE(trial::encode(song_of(8000, 1, 2.0), path));
        const int64_t units = ask(path).units;
        const bytes honest = codec_test::load(path);
        for (const uint32_t claim : each.claims) {
            bytes file = honest;
            patch(&file, each.letters, each.offset, claim, path.back() == 'v');
            const answer got = ask(codec_test::save(std::string("claim.") + each.format, file));
            EXPECT_EQ(got.units, units) << each.name;
            char name[64];
            snprintf(name, sizeof(name), "%s_%08X", each.name, claim);
            expect(name, got, kAccepted);
        }
    }
}

// A WAV file of so many bytes of samples, a hole but for its last second, whose samples are 1000.
std::string sparse_wav(int32_t rate, int32_t channels, int64_t data) {
    support::song tail;
    tail.plan.rate = rate;
    tail.plan.channels = channels;
    tail.pcm.assign(static_cast<size_t>(rate) * static_cast<size_t>(channels), 1000);
    const std::string path = folder + "sparse.wav";
    EXPECT_TRUE(support::write_wav(path, tail));
    bytes file = codec_test::load(path);
    constexpr std::ptrdiff_t kHead = 44;
    const int64_t claim = std::min<int64_t>(data, 0xFFFFFFFF);
    for (int i = 0; i < 4; ++i)
        file[40 + static_cast<size_t>(i)] = static_cast<uint8_t>(claim >> 8 * i);
    const int fd = open(path.c_str(), O_RDWR | O_TRUNC);
    const size_t rest = file.size() - kHead;
    EXPECT_EQ(pwrite(fd, file.data(), kHead, 0), kHead);
    EXPECT_EQ(pwrite(fd, file.data() + kHead, rest, kHead + data - static_cast<int64_t>(rest)),
              static_cast<ssize_t>(rest));
    close(fd);
    return path;
}

// Files beyond 2 and 4 GiB. Their jobs, which read all of it, are for the full tier.
TEST_F(Limits, LargeFiles) {
    const bool jobs = trial::full();
    const std::string expected =
        "source:0,tail:48000,init:0,segments:4" + std::string(jobs ? ",jobs:3" : "");
    constexpr int64_t kSecond = 48'000 * 8 * 2;  // bytes
    for (const int64_t gib : {2, 4}) {
        const int64_t seconds = gib * kGiB / kSecond + 2;
        const answer got = ask(sparse_wav(48'000, 8, seconds * kSecond), jobs, true);
        EXPECT_EQ(got.units, seconds * kUnits);
        expect("wav_beyond_" + std::to_string(gib) + "_GiB", got, expected, 4096.0);
    }
    if (!jobs) return;
    // One channel: the PCM itself has more bytes than 31 bits count.
    const int64_t seconds = 2 * kGiB / 96'000 + 2;
    const answer got = ask(sparse_wav(48'000, 1, seconds * 96'000), true, true);
    EXPECT_EQ(got.units, seconds * kUnits);
    expect("pcm_beyond_2_GiB", got, expected, 10'240.0);
}

// An MP4 file whose frames lie behind a hole of 3 GiB: 32-bit offsets have no sign.
TEST_F(Limits, FarFrames) {
    constexpr uint32_t kHole = 0xC0000000;
    const std::string near = folder + "near.m4a";
    ASSERT_NO_FATAL_FAILURE(trial::encode(song_of(8000, 1, 2.0), near));
    bytes file = codec_test::load(near);
    const std::string letters[] = {"stco", "mdat"};
    const auto table = std::search(file.begin(), file.end(), letters[0].begin(), letters[0].end());
    const auto data = std::search(file.begin(), file.end(), letters[1].begin(), letters[1].end());
    ASSERT_TRUE(table < data && data < file.end());
    const uint32_t entries = big_endian(&table[8]);
    for (std::ptrdiff_t i = 0; i < entries; ++i) {
        const uint32_t offset = big_endian(&table[12 + 4 * i]) + kHole;
        for (int k = 0; k < 4; ++k)
            table[12 + 4 * i + k] = static_cast<uint8_t>(offset >> (24 - 8 * k));
    }
    const auto cut = static_cast<size_t>(data - file.begin()) - 4;
    const std::string far = folder + "far.m4a";
    const int fd = open(far.c_str(), O_RDWR | O_CREAT, 0600);
    const uint8_t hole[] = {0xC0, 0, 0, 0, 'f', 'r', 'e', 'e'};
    ASSERT_EQ(pwrite(fd, file.data(), cut, 0), static_cast<ssize_t>(cut));
    ASSERT_EQ(pwrite(fd, hole, 8, static_cast<off_t>(cut)), 8);
    ASSERT_EQ(pwrite(fd, file.data() + cut, file.size() - cut, static_cast<off_t>(cut) + kHole),
              static_cast<ssize_t>(file.size() - cut));
    close(fd);
    EXPECT_EQ(codec_test::read_all(far), codec_test::read_all(near));
    expect("m4a_frames_beyond_3_GiB", ask(far), kAccepted);
}

// Three hours, a minute again and again.
TEST_F(Limits, ThreeHours) {
    if (!trial::full()) return;
    const std::string wav = folder + "long.wav";
    const support::song minute = song_of(44'100, 2, 60.0);
    const bytes file = support::wav_bytes(minute.pcm, {});
    constexpr size_t kHead = 44;
    const auto data = static_cast<uint32_t>((file.size() - kHead) * 180);
    bytes head(file.begin(), file.begin() + kHead);
    for (size_t i = 0; i < 4; ++i) {
        head[40 + i] = static_cast<uint8_t>(data >> 8 * i);
        head[4 + i] = static_cast<uint8_t>((data + 36) >> 8 * i);
    }
    FILE *out = fopen(wav.c_str(), "wb");
    ASSERT_NE(out, nullptr);
    ASSERT_EQ(fwrite(head.data(), 1, kHead, out), kHead);
    for (int i = 0; i < 180; ++i) {
        ASSERT_EQ(fwrite(file.data() + kHead, 1, file.size() - kHead, out), file.size() - kHead);
    }
    fclose(out);
    const answer plain = ask(wav);
    EXPECT_EQ(plain.units, 10'800 * kUnits);
    expect("wav_of_3_h", plain, kInFour, 4096.0);
    const std::string mp3 = folder + "long.mp3";
    ASSERT_EQ(system(("lame --quiet -f -b 128 '" + wav + "' '" + mp3 + "'").c_str()), 0);
    std::filesystem::remove(wav);
    const answer encoded = ask(mp3);
    EXPECT_NEAR(static_cast<double>(encoded.units), 10'800.0 * kUnits, kUnits);
    expect("mp3_of_3_h", encoded, kInFour, 4096.0);
}

}  // namespace
