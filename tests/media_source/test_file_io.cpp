#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "media_source/mtsrc_io.h"

namespace {

struct FileIo : testing::Test {
    std::string path = testing::TempDir() + "tavo_file_io_" + std::to_string(getpid());
    mtsrc_io io = {};
    mtsrc_file *file = nullptr;

    void SetUp() override { io.path = path.data(); }
    void TearDown() override {
        if (file) {
            EXPECT_EQ(mtsrc_file_close(file), 0);
        }
        unlink(path.c_str());
    }
    void make(const std::string &content) {
        file = mtsrc_file_open(&io, 1);
        ASSERT_NE(file, nullptr);
        ASSERT_EQ(mtsrc_file_write(file, content.data(), static_cast<int32_t>(content.size())),
                  static_cast<int64_t>(content.size()));
    }
    int64_t at() const {
        int64_t offset = -1;
        EXPECT_EQ(mtsrc_file_tell(file, &offset), 0);
        return offset;
    }
};

TEST_F(FileIo, ReadWriteModeCreatesAndReadOnlyModeDoesNot) {
    EXPECT_EQ(mtsrc_file_open(&io, 0), nullptr);
    const mode_t mask = umask(0);
    make("0123456789");
    umask(mask);
    struct stat status = {};
    ASSERT_EQ(stat(path.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777, 0644u);
    mtsrc_file *reader = mtsrc_file_open(&io, 2);  // bit 0 alone decides
    ASSERT_NE(reader, nullptr);
    char buf[16] = {};
    EXPECT_EQ(mtsrc_file_write(reader, "x", 1), -1);
    EXPECT_EQ(mtsrc_file_read(reader, buf, 16), 10);
    EXPECT_STREQ(buf, "0123456789");
    EXPECT_EQ(mtsrc_file_read(reader, buf, 16), 0);
    EXPECT_EQ(mtsrc_file_read(reader, buf, -1), -1);
    EXPECT_EQ(mtsrc_file_close(reader), 0);
}

TEST_F(FileIo, SeekSkipTellAndSize) {
    make("0123456789");
    const int64_t four = 4;
    const int64_t zero = 0;
    const int64_t before_start = -1;
    EXPECT_EQ(mtsrc_file_seek(file, &four), 0);
    EXPECT_EQ(mtsrc_file_skip(file, &four), 0);
    EXPECT_EQ(at(), 8);
    EXPECT_EQ(mtsrc_file_skip(file, &zero), -1);
    EXPECT_EQ(mtsrc_file_skip(file, &before_start), -1);
    EXPECT_EQ(mtsrc_file_seek(file, &before_start), -1);
    EXPECT_EQ(at(), 8);
    int64_t length = 0;
    EXPECT_EQ(mtsrc_file_size(file, &length), 0);
    EXPECT_EQ(length, 10);
    EXPECT_EQ(at(), 8);
    const int64_t far = 5'000'000'000;  // more than 32 bits hold
    EXPECT_EQ(mtsrc_file_seek(file, &far), 0);
    EXPECT_EQ(mtsrc_file_write(file, "x", 1), 1);
    EXPECT_EQ(mtsrc_file_size(file, &length), 0);
    EXPECT_EQ(length, far + 1);
    EXPECT_EQ(at(), far + 1);
}

TEST_F(FileIo, AHandleWithoutADescriptorFails) {
    mtsrc_file none = {-1};
    int64_t value = 77;
    char byte = 0;
    EXPECT_EQ(mtsrc_file_read(&none, &byte, 1), -1);
    EXPECT_EQ(mtsrc_file_tell(&none, &value), -1);
    EXPECT_EQ(mtsrc_file_size(&none, &value), -1);
    EXPECT_EQ(mtsrc_file_tell(nullptr, &value), -1);
    EXPECT_EQ(value, 77);
    auto *cell = static_cast<mtsrc_file *>(malloc(sizeof(mtsrc_file)));
    cell->fd = -1;
    EXPECT_EQ(mtsrc_file_close(cell), 0);
}

}  // namespace
