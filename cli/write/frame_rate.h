// Video frames and their timecode, for the formats that count in frames.
#ifndef TAVO_CLI_WRITE_FRAME_RATE_H
#define TAVO_CLI_WRITE_FRAME_RATE_H

#include <cstdint>
#include <string>
#include <vector>

struct frame_rate {
    const char *name;  // as --fps has it
    int32_t frames;    // in so many seconds:
    int32_t seconds;
    int32_t base;  // frame numbers of a second in the timecode
    bool drop;     // the timecode leaves out frame numbers, so that it keeps up with the clock
};

// Returns null for another name.
const frame_rate *find_frame_rate(const std::string &name);

// Their names, in order.
std::vector<std::string> frame_rate_names();

// The nearest frame.
int64_t frame_at(double ms, const frame_rate &rate);

// hh:mm:ss:ff, with a semicolon before the frames of a drop-frame timecode. Of a time line that
// starts at one hour, as editors' do.
std::string timecode(int64_t frame, const frame_rate &rate);

#endif
