#include <sys/stat.h>

#include "tests/media_source/memory_file.h"

namespace {

TEST(FileIo, ReadWriteModeCreatesAndReadOnlyModeDoesNot) {
    std::string path = testing::TempDir() + "tavo_file_io_" + std::to_string(getpid());
    mtsrc_io io = {};
    io.path = path.data();
    EXPECT_EQ(mtsrc_file_open(&io, 0), nullptr);
    const mode_t mask = umask(0);
    mtsrc_file *writer = mtsrc_file_open(&io, 1);
    umask(mask);
    ASSERT_NE(writer, nullptr);
    EXPECT_EQ(mtsrc_file_write(writer, "0123456789", 10), 10);
    EXPECT_EQ(mtsrc_file_close(writer), 0);
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
    unlink(path.c_str());
}

TEST(FileIo, SeekSkipTellAndSize) {
    memory_file ten(zeros(10), 7);
    const int64_t one = 1;
    const int64_t zero = 0;
    const int64_t before_start = -1;
    EXPECT_EQ(ten.at(), 7);
    EXPECT_EQ(mtsrc_file_skip(&ten.file, &one), 0);
    EXPECT_EQ(mtsrc_file_skip(&ten.file, &zero), -1);
    EXPECT_EQ(mtsrc_file_skip(&ten.file, &before_start), -1);
    EXPECT_EQ(mtsrc_file_seek(&ten.file, &before_start), -1);
    EXPECT_EQ(ten.at(), 8);
    int64_t length = 0;
    EXPECT_EQ(mtsrc_file_size(&ten.file, &length), 0);
    EXPECT_EQ(length, 10);
    EXPECT_EQ(ten.at(), 8);
    const int64_t far = 5'000'000'000;  // more than 32 bits hold
    EXPECT_EQ(mtsrc_file_seek(&ten.file, &far), 0);
    EXPECT_EQ(mtsrc_file_write(&ten.file, "x", 1), 1);
    EXPECT_EQ(mtsrc_file_size(&ten.file, &length), 0);
    EXPECT_EQ(length, far + 1);
    EXPECT_EQ(ten.at(), far + 1);
}

// The rest of what was asked for may never come.
TEST(FileIo, AReadIsOneRead) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    ASSERT_EQ(write(ends[1], "123456", 6), 6);
    mtsrc_file file = {ends[0]};
    char buf[100];
    EXPECT_EQ(mtsrc_file_read(&file, buf, 100), 6);
    close(ends[0]);
    close(ends[1]);
}

TEST(FileIo, AHandleWithoutADescriptorFails) {
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
