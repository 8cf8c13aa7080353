// Tests that libwexaaudio.so loads libwexaaudio_av.so on demand and that readers share scans.
#include <dlfcn.h>

#include <cstring>
#include <thread>

#include "tests/desktop/codec_test.h"

namespace {

using namespace std::string_literals;

bool has_libavcodec() {
    return load("/proc/self/maps").find("libavcodec") != std::string::npos;
}

// WAV and FLAC do not need libavcodec. Four sources that need it may be opened at the same time.
TEST(Library, LoadsLibavcodecWhenNeeded) {
    ASSERT_FALSE(has_libavcodec()) << "run this test in a process of its own, as CTest does";
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

// A copy of libwexaaudio.so in another folder cannot find libwexaaudio_av.so.
TEST(Library, LogsAMissingSharedObject) {
    Dl_info info = {};
    ASSERT_NE(dladdr(reinterpret_cast<void *>(xaac_init), &info), 0);
    const std::string copy = save("libwexaaudio.so", load(info.dli_fname));
    void *library = dlopen(copy.c_str(), RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(library, nullptr) << dlerror();
    testing::internal::CaptureStderr();
    for (const char *name : {"xaac_init", "xmp123_init", "xvorbis_init", "xflac_init"}) {
        const auto init = reinterpret_cast<int32_t (*)()>(dlsym(library, name));
        ASSERT_NE(init, nullptr);
        EXPECT_EQ(init() == 0, strcmp(name, "xflac_init") == 0) << name;
    }
    const std::string log = testing::internal::GetCapturedStderr();
    EXPECT_EQ(log.compare(0, 12, "E/wexaaudio:"), 0) << log;
    EXPECT_NE(log.find("libwexaaudio_av.so"), std::string::npos) << log;
    dlclose(library);
}

// Readers of a file share one scan until the file is replaced. The scan is kept when they are
// closed, unless the file was written just before the scan.
TEST(ScanCache, ScansAFileOnce) {
    static int64_t bytes_read;
    std::string tags;  // many short tags after the audio
    for (int i = 0; i < 5000; ++i) tags += "APETAGEX\xD0\7\0\0 \0\0\0"s + support::zeros(16);
    std::string path = save("shared.mp3", load(fixture("cbr.mp3")) + tags);
    const auto size = static_cast<int64_t>(load(path).size());
    mtsrc_io io = io_for(path);
    const auto read = [](mtsrc_file *file, void *buf, int32_t count) {
        const int64_t got = mtsrc_file_read(file, buf, count);
        bytes_read += std::max<int64_t>(got, 0);
        return got;
    };
    io.read = read;
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
    EXPECT_LT(bytes_read, size * 5 / 4);
    void *second = open();
    EXPECT_EQ(bytes_read, 0);
    save("shared.mp3", load(fixture("lsf.mp3")));
    void *third = open();
    EXPECT_GT(bytes_read, 0);
    EXPECT_EQ(info.sample_rate, 22050);
    for (void *reader : {first, second, third}) xmp123fd_delete(reader);
    for (const bool fresh : {true, false}) {
        if (!fresh) path = fixture("cbr.mp3");
        io = io_for(path);
        io.read = read;
        xmp123fd_delete(open());
        xmp123fd_delete(open());
        EXPECT_EQ(bytes_read > 0, fresh);
    }
}

}  // namespace
