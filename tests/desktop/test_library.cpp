// libwexaaudio.so as a library: its decoders called directly, the shared object that it loads, and
// the scans that its readers share.
#include <dlfcn.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <thread>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

namespace fs = std::filesystem;

TEST(Decoder, HandsOutWhatTheReaderDecoded) {
    const struct {
        wexa_config config;  // what the source asks for
        void *(*create)(const wexa_config *, void *);
        int32_t (*decode)(void *, const wexa_frame *, wexa_output *, wexa_status *);
        void (*remove)(void *);
    } codecs[] = {
        {{1, 2, 2, 0}, xflacd_create, xflacd_decode, xflacd_delete},
        {{1, 0, 2, 0}, xmp123d_create, xmp123d_decode, xmp123d_delete},
        {{1, 1, 2, 0}, xvorbisd_create, xvorbisd_decode, xvorbisd_delete},
    };
    samples pcm = {1, -2, 3, -4};
    uint8_t setup[] = {2, 30};
    for (const auto &each : codecs) {
        wexa_config wrong = each.config;
        wrong.bytes_per_sample = 3;
        EXPECT_EQ(each.create(&wrong, nullptr), nullptr);
        void *decoder = each.create(&each.config, nullptr);
        ASSERT_NE(decoder, nullptr);
        wexa_frame frame = {};
        wexa_output output = {};
        wexa_status status = {};
        // Set-up data, which only Vorbis takes, comes without a destination.
        frame.data = setup;
        frame.bytes = sizeof setup;
        for (const uint8_t mark : {uint8_t{1}, uint8_t{2}}) {
            setup[0] = mark;
            const bool taken = mark == 2 && each.decode == xvorbisd_decode;
            EXPECT_EQ(each.decode(decoder, &frame, &output, &status) == 0, taken);
            EXPECT_EQ(status.produced, 0);
        }
        samples out(5, 99);
        frame.data = pcm.data();
        frame.bytes = 8;
        output.data = out.data();
        EXPECT_EQ(each.decode(decoder, &frame, &output, &status), 0);
        EXPECT_TRUE(status.produced != 0 && output.bytes == 8);
        EXPECT_EQ(out, (samples{1, -2, 3, -4, 99}));
        EXPECT_NE(each.decode(nullptr, &frame, &output, &status), 0);
        each.remove(decoder);
    }
}

bool has_libavcodec() {
    std::ifstream maps("/proc/self/maps");
    for (std::string line; std::getline(maps, line);) {
        if (line.find("libavcodec") != std::string::npos) return true;
    }
    return false;
}

// WAV and FLAC do without libavcodec; the first four sources that need it open at once. Behind
// other cases, in a process of its own.
TEST(Library, LoadsLibavcodecWhenNeeded) {
    if (has_libavcodec()) {
        const std::string self = fs::read_symlink("/proc/self/exe");
        const std::string again = "'" + self + "' --gtest_filter=*LoadsLibavcodec* >/dev/null";
        EXPECT_EQ(std::system(again.c_str()), 0);
        return;
    }
    for (const char *name : {"song.wav", "song.flac"}) {
        EXPECT_GT(read_all(fixture(name)).size(), 0U);
        EXPECT_FALSE(has_libavcodec()) << name;
    }
    std::vector<std::thread> threads;
    for (const char *name : {"cbr.mp3", "low.aac", "song.ogg", "first.m4a"}) {
        threads.emplace_back([name] { EXPECT_GT(read_all(fixture(name)).size(), 500'000U); });
    }
    for (std::thread &thread : threads) thread.join();
    EXPECT_TRUE(has_libavcodec());
}

// A copy of the library without the shared object beside it.
TEST(Library, NamesWhatIsMissing) {
    Dl_info info = {};
    ASSERT_NE(dladdr(reinterpret_cast<void *>(xaac_init), &info), 0);
    const fs::path folder = testing::TempDir() + "tavo_alone_" + std::to_string(getpid());
    fs::create_directory(folder);
    const std::string copy = folder / "libwexaaudio.so";
    fs::copy_file(fs::canonical(info.dli_fname), copy);
    void *library = dlopen(copy.c_str(), RTLD_NOW | RTLD_LOCAL);
    fs::remove_all(folder);
    ASSERT_NE(library, nullptr) << dlerror();
    testing::internal::CaptureStderr();
    for (const char *name : {"xaac_init", "xmp123_init", "xvorbis_init"}) {
        const auto init = reinterpret_cast<int32_t (*)()>(dlsym(library, name));
        ASSERT_NE(init, nullptr);
        EXPECT_NE(init(), 0) << name;
    }
    const auto flac_init = reinterpret_cast<int32_t (*)()>(dlsym(library, "xflac_init"));
    EXPECT_EQ(flac_init(), 0);
    const std::string said = testing::internal::GetCapturedStderr();
    EXPECT_EQ(said.compare(0, 12, "E/wexaaudio:"), 0) << said;
    EXPECT_NE(said.find("libwexaaudio_av.so"), std::string::npos) << said;
    dlclose(library);
}

// The second reader of a file that is open does not scan it again; of a file that was replaced, it
// does. Nothing is kept behind the last reader.
TEST(Library, SharesTheScanOfAFile) {
    static int64_t bytes_read;
    const std::string path = save("shared.mp3", load(fixture("cbr.mp3")));
    const auto size = static_cast<int64_t>(load(path).size());
    mtsrc_io io = io_for(path);
    io.read = [](mtsrc_file *file, void *buf, int32_t count) {
        const int64_t got = mtsrc_file_read(file, buf, count);
        bytes_read += std::max<int64_t>(got, 0);
        return got;
    };
    xmp123_info info = {};
    const auto open = [&] {
        bytes_read = 0;
        int64_t word = 0;
        void *reader = xmp123fd_create(&io, &word, &info, nullptr);
        EXPECT_NE(reader, nullptr);
        return reader;
    };
    void *first = open();
    EXPECT_GT(bytes_read, size * 9 / 10);
    void *second = open();
    EXPECT_EQ(bytes_read, 0);
    EXPECT_EQ(info.duration, opened(fixture("cbr.mp3")).format.duration);
    save("shared.mp3", load(fixture("mono.mp3")));
    void *third = open();
    EXPECT_GT(bytes_read, 0);
    EXPECT_EQ(info.duration, opened(fixture("mono.mp3")).format.duration);
    for (void *reader : {first, second, third}) xmp123fd_delete(reader);
    xmp123fd_delete(open());
    EXPECT_GT(bytes_read, 0);
}

}  // namespace
}  // namespace codec_test
