#include "tests/media_source/source_case.h"

namespace {

// Ogg delivers each decoded byte, so what goes in comes out.
struct PcmQueue : SourceTest {
    std::vector<int16_t> ramp;

    void open_ramp(int32_t samples, int32_t per_frame) {
        ramp.resize(static_cast<size_t>(samples));
        for (size_t i = 0; i < ramp.size(); ++i) {
            ramp[i] = static_cast<int16_t>(i * 7919 % 65'521 - 32'000);
        }
        ASSERT_EQ(open_row(source_row_of("ogg"), scripted::song(ramp, 1, 44100, per_frame)), 0);
        scripted::forget_calls();
    }
    void expect_invariants() const {
        EXPECT_LE(src->q_base, src->q_rd);
        EXPECT_LE(src->q_rd, src->q_wr);
        EXPECT_EQ(src->q_fill, src->q_wr - src->q_rd);
        EXPECT_EQ(src->q_room, src->q_cap - (src->q_wr - src->q_base));
        EXPECT_EQ(src->q_cap, 1'048'576);
    }
    std::vector<int16_t> part(size_t from, size_t count) const {
        const auto start = ramp.begin() + static_cast<std::ptrdiff_t>(from);
        return {start, start + static_cast<std::ptrdiff_t>(count)};
    }
};

TEST_F(PcmQueue, PiecesOfAnySizeJoinUp) {
    open_ramp(5000, 576);
    std::vector<int16_t> all;
    for (const int32_t bytes : {2, 1150, 4, 3000, 1152, 4000}) {
        std::vector<int16_t> got;
        ASSERT_EQ(read(bytes, &got), 0);
        EXPECT_EQ(got.size() * 2, static_cast<size_t>(bytes));
        all.insert(all.end(), got.begin(), got.end());
        expect_invariants();
    }
    EXPECT_EQ(all, part(0, all.size()));
}

TEST_F(PcmQueue, WhatIsHeldIsDeliveredWithoutReading) {
    open_ramp(2000, 1000);
    std::vector<int16_t> got;
    EXPECT_EQ(read(0, &got), 0);
    EXPECT_TRUE(got.empty());
    EXPECT_EQ(scripted::call_names(), names{});
    EXPECT_EQ(read(100), 0);
    EXPECT_EQ(read(1900, &got), 0);
    EXPECT_EQ(got, part(50, 950));
    EXPECT_EQ(scripted::calls_of("xoggds_get_frm").size(), 1u);
    EXPECT_EQ(read(-1), -4);
    mtsrc_frame no_data = {nullptr, 0};
    EXPECT_EQ(mtsrc_getstream(src, 10, &no_data), -4);
    EXPECT_EQ(mtsrc_getstream(src, 10, nullptr), -4);
}

TEST_F(PcmQueue, TheEndDeliversTheRestAndThenNothing) {
    open_ramp(4146, 4096);
    EXPECT_EQ(read(8192), 0);
    std::vector<int16_t> got;
    EXPECT_EQ(read(8192, &got), 1);
    EXPECT_EQ(got, part(4096, 50));
    EXPECT_EQ(read(8192, &got), 1);
    EXPECT_TRUE(got.empty());
    expect_invariants();
    EXPECT_EQ(scripted::calls_of("xoggds_get_frm").size(), 4u);  // the end is asked for each time
}

TEST_F(PcmQueue, HeldBytesMoveDownWhenTheRoomIsShort) {
    open_ramp(1'500'000, 8000);
    size_t moves = 0;
    std::vector<int16_t> all;
    while (all.size() < ramp.size()) {
        const int32_t room = src->q_room;
        std::vector<int16_t> got;
        const int32_t code = read(8192, &got);
        ASSERT_GE(code, 0);
        expect_invariants();
        moves += src->q_room > room;
        EXPECT_LE(src->q_wr, src->q_base + src->q_cap);
        all.insert(all.end(), got.begin(), got.end());
    }
    EXPECT_EQ(all, ramp);
    // 3,000,000 bytes through a queue that takes in about 1,032,000 before it starts again.
    EXPECT_EQ(moves, 2u);
}

TEST_F(PcmQueue, RoomForJustOneFrameIsTooShort) {
    open_ramp(600'000, 8192);
    EXPECT_EQ(read(63 * 16'384), 0);
    EXPECT_EQ(src->q_room, 16'384);
    EXPECT_EQ(read(2), 0);
    EXPECT_EQ(src->q_room, 1'048'576 - 16'384);
}

// Room must exceed 16,384 bytes: with frames of 16,000 bytes the 65th goes in at 1,024,000 bytes
// held (room 24,576), a 66th does not (room 8,576).
TEST_F(PcmQueue, ARequestThatCannotFitIsRefusedAndNothingIsLost) {
    open_ramp(1'500'000, 8000);
    EXPECT_EQ(read(1'040'001), -4);
    EXPECT_EQ(src->q_fill, 1'040'000);
    expect_invariants();
    std::vector<int16_t> got;
    EXPECT_EQ(read(1'040'000, &got), 0);
    EXPECT_EQ(got, part(0, 520'000));
    EXPECT_EQ(read(5'000'000, &got), -4);
    EXPECT_EQ(read(8192, &got), 0);
    EXPECT_EQ(got, part(520'000, 4096));
}

TEST_F(PcmQueue, ARequestBeyondTheCapacityStillMeetsTheEnd) {
    open_ramp(3000, 576);
    std::vector<int16_t> got;
    EXPECT_EQ(read(3'000'000, &got), 1);
    EXPECT_EQ(got, ramp);
}

}  // namespace
