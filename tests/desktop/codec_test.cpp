#include "tests/desktop/codec_test.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <random>

namespace codec_test {

namespace {

constexpr int32_t kRequest = 8192;          // bytes, the pipeline's own
constexpr ptrdiff_t kSeamSamples = 30'000;  // compared behind each seek
constexpr size_t kSeams = 40;

// Files that the running program saved; removed when it ends.
struct saved_files {
    std::vector<std::string> paths;
    ~saved_files() {
        for (const std::string &path : paths) unlink(path.c_str());
    }
} saved;

}  // namespace

std::string fixture(const std::string &name) {
    const std::string golden = "golden/";
    const bool kept = name.compare(0, golden.size(), golden) == 0;
    return std::string(kept ? CODEC_GOLDEN : CODEC_FIXTURES) + "/" +
           (kept ? name.substr(golden.size()) : name);
}

bytes load(const std::string &path) {
    std::ifstream in(path, std::ios::binary);
    bytes contents{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    EXPECT_FALSE(contents.empty()) << path;
    return contents;
}

std::string save(const std::string &name, const bytes &contents) {
    const std::string path = testing::TempDir() + "tavo_" + std::to_string(getpid()) + "_" + name;
    std::ofstream out(path, std::ios::binary);
    out.write(reinterpret_cast<const char *>(contents.data()),
              static_cast<std::streamsize>(contents.size()));
    EXPECT_TRUE(out.good()) << path;
    saved.paths.push_back(path);
    return path;
}

bytes part(const bytes &file, size_t from, size_t to) {
    return {file.begin() + static_cast<ptrdiff_t>(from),
            file.begin() + static_cast<ptrdiff_t>(std::min(to, file.size()))};
}

bytes joined(const std::vector<bytes> &pieces) {
    bytes file;
    for (const bytes &piece : pieces) file.insert(file.end(), piece.begin(), piece.end());
    return file;
}

opened::opened(const std::string &path) {
    const mtsrc_param param = {path.c_str()};
    source = mtsrc_init(&param, &error);
    if (source != nullptr) {
        EXPECT_EQ(mtsrc_getstream_format(source, &format), 0);
    }
}

opened::~opened() {
    if (source != nullptr) {
        EXPECT_EQ(mtsrc_deinit(source), -5);
    }
}

samples read(mtsrc_ctx *source, size_t limit) {
    samples all;
    samples piece(kRequest / 2);
    bool ended = false;
    while (!ended && all.size() < limit) {
        mtsrc_frame frame = {piece.data(), 0};
        const int32_t code = mtsrc_getstream(source, kRequest, &frame);
        if (code != 0 && code != 1) {
            ADD_FAILURE() << "reading failed with " << code;
            break;
        }
        ended = code == 1;
        all.insert(all.end(), piece.begin(), piece.begin() + frame.size / 2);
    }
    all.resize(std::min(all.size(), limit));
    return all;
}

samples read_all(const std::string &path) {
    opened file(path);
    EXPECT_NE(file.source, nullptr) << path << ": " << file.error;
    return file.source != nullptr ? read(file.source, SIZE_MAX) : samples{};
}

void expect_same(const samples &got, const samples &wanted) {
    ASSERT_EQ(got.size(), wanted.size());
    const auto differs = std::mismatch(got.begin(), got.end(), wanted.begin()).first;
    EXPECT_EQ(differs - got.begin(), static_cast<ptrdiff_t>(got.size())) << "the first to differ";
}

void expect_exact_seams(const std::string &path) {
    SCOPED_TRACE(path);
    const samples linear = read_all(path);
    opened file(path);
    ASSERT_NE(file.source, nullptr) << file.error;
    ASSERT_GT(linear.size(), 0U);
    const int64_t rate = file.format.sample_rate;
    const int64_t duration = file.format.duration;
    EXPECT_EQ(duration * rate / kUnits, static_cast<int64_t>(linear.size()));
    // The stream's edges, the inside of the first frames, the last quarter, then anywhere.
    std::vector<int64_t> places = {
        0,        1,           227,         100'000,          133'000,
        200'000,  300'000,     kUnits / 50, duration / 4 * 3, duration - 1,
        duration, 2 * duration};
    std::mt19937_64 random(7);
    while (places.size() < kSeams) {
        places.push_back(static_cast<int64_t>(random() % static_cast<uint64_t>(duration)));
    }
    for (const int64_t position : places) {
        SCOPED_TRACE("seek to " + std::to_string(position));
        int64_t reached = -1;
        ASSERT_EQ(mtsrc_seekstream(file.source, position, &reached), 0);
        const int64_t sample = reached * rate / kUnits;
        const int64_t left = static_cast<int64_t>(linear.size()) - sample;
        ASSERT_GE(left, 0);
        // A position lies at most one sample before the one reached, but for the stream's end.
        ASSERT_TRUE(reached >= position || left == 0) << reached;
        ASSERT_LT(std::max<int64_t>(reached - position - 1, 0) * rate, kUnits) << reached;
        int64_t again = -1;
        ASSERT_EQ(mtsrc_seekstream(file.source, reached, &again), 0);
        ASSERT_EQ(again, reached);
        const auto from = linear.begin() + sample;
        const samples wanted(from, from + std::min<ptrdiff_t>(left, kSeamSamples));
        ASSERT_NO_FATAL_FAILURE(expect_same(read(file.source, kSeamSamples), wanted));
        if (position == duration / 4 * 3) {
            EXPECT_LE(2 * left, duration / 4 * 2 * rate / kUnits);
        }
    }
}

mtsrc_io io_for(const std::string &path) {
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.path = const_cast<char *>(path.c_str());  // read only by open
    return io;
}

}  // namespace codec_test
