// Video frames and their timecode, for the formats that count in frames.
#ifndef TAVO_CLI_WRITE_FRAME_RATE_H
#define TAVO_CLI_WRITE_FRAME_RATE_H

#include <cstdint>
#include <string>
#include <vector>

struct frame_rate {
    const char *name;  // as in --fps
    int32_t frames;    // during these seconds:
    int32_t seconds;
    int32_t base;  // frame numbers per second of timecode
    bool drop;     // the timecode skips frame numbers to match the clock
};

// Returns null for any other name.
const frame_rate *find_frame_rate(const std::string &name);

// Returns the names of all rates, in order.
std::vector<std::string> frame_rate_names();

// Returns the nearest video frame.
int64_t frame_at(double ms, const frame_rate &rate);

// Formats a timecode hh:mm:ss:ff, with a semicolon before the frames for drop-frame timecode. The
// time line starts at one hour, as those of editors do.
std::string timecode(int64_t frame, const frame_rate &rate);

#endif
