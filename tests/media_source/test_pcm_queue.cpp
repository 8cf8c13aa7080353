#include "tests/media_source/source_case.h"

namespace {

// Ogg delivers each decoded byte, so what goes in comes out.
struct PcmQueue : SourceTest {
    samples ramp;

    void open_ramp(int32_t count, int32_t per_frame) {
        ramp.resize(static_cast<size_t>(count));
        for (size_t i = 0; i < ramp.size(); ++i) {
            ramp[i] = static_cast<int16_t>(i * 7919 % 65'521 - 32'000);
        }
        ASSERT_EQ(open_row(source_row_of("ogg"), scripted::song(ramp, 1, 44100, per_frame)), 0);
        scripted::forget_calls();
    }
    // Reads so many bytes: the result is the ramp's part from sample `from` to before `to`.
    void expect_read(int32_t bytes, int32_t code, size_t from, size_t to) const {
        samples got;
        EXPECT_EQ(read(bytes, &got), code);
        const auto at = [this](size_t i) { return ramp.begin() + static_cast<std::ptrdiff_t>(i); };
        EXPECT_EQ(got, samples(at(from), at(to)));
        EXPECT_LE(src->q_base, src->q_rd);
        EXPECT_LE(src->q_rd, src->q_wr);
        EXPECT_LE(src->q_wr, src->q_base + src->q_cap);
        EXPECT_EQ(src->q_fill, src->q_wr - src->q_rd);
        EXPECT_EQ(src->q_room, src->q_cap - (src->q_wr - src->q_base));
        EXPECT_EQ(src->q_cap, 1'048'576);
    }
};

TEST_F(PcmQueue, WhatIsHeldIsDeliveredWithoutReading) {
    open_ramp(2000, 1000);
    expect_read(0, 0, 0, 0);
    EXPECT_EQ(scripted::call_names(), names{});
    expect_read(2, 0, 0, 1);
    expect_read(98, 0, 1, 50);
    expect_read(1900, 0, 50, 1000);
    EXPECT_EQ(scripted::calls_of("xoggds_get_frm").size(), 1u);
    EXPECT_EQ(read(-1), -4);
    mtsrc_frame no_data = {nullptr, 0};
    EXPECT_EQ(mtsrc_getstream(src, 10, &no_data), -4);
    EXPECT_EQ(mtsrc_getstream(src, 10, nullptr), -4);
}

TEST_F(PcmQueue, TheEndDeliversTheRestAndThenNothing) {
    open_ramp(4146, 4096);
    expect_read(8192, 0, 0, 4096);
    expect_read(8192, 1, 4096, 4146);
    expect_read(3'000'000, 1, 4146, 4146);                       // more than the queue could hold
    EXPECT_EQ(scripted::calls_of("xoggds_get_frm").size(), 4u);  // the end is asked for each time
}

TEST_F(PcmQueue, HeldBytesMoveDownWhenTheRoomIsShort) {
    open_ramp(1'500'000, 8000);
    int moves = 0;
    for (size_t at = 0; at + 4096 <= ramp.size(); at += 4096) {
        const int32_t room = src->q_room;
        expect_read(8192, 0, at, at + 4096);
        moves += src->q_room > room;
    }
    // 3,000,000 bytes through a queue that takes in about 1,032,000 before it starts again.
    EXPECT_EQ(moves, 2);
}

TEST_F(PcmQueue, RoomForJustOneFrameIsTooShort) {
    open_ramp(600'000, 8192);
    expect_read(63 * 16'384, 0, 0, 63 * 8192);
    EXPECT_EQ(src->q_room, 16'384);
    expect_read(2, 0, 63 * 8192, 63 * 8192 + 1);
    EXPECT_EQ(src->q_room, 1'048'576 - 16'384);
}

// Room must exceed 16,384 bytes: with frames of 16,000 bytes the 65th goes in at 1,024,000 bytes
// held (room 24,576), a 66th does not (room 8,576).
TEST_F(PcmQueue, ARequestThatCannotFitIsRefusedAndNothingIsLost) {
    open_ramp(1'500'000, 8000);
    expect_read(1'040'001, -4, 0, 0);
    EXPECT_EQ(src->q_fill, 1'040'000);
    expect_read(1'040'000, 0, 0, 520'000);
    expect_read(5'000'000, -4, 0, 0);
    expect_read(8192, 0, 520'000, 524'096);
}

}  // namespace
