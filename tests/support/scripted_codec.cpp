#include "tests/support/scripted_codec.h"

#include <algorithm>
#include <cstdlib>

#include "tests/support/scripted_world.h"

namespace scripted {

void reset() {
    const lock held(guard);
    for (wexa_tags *tags : all.tags) free(tags);
    for (object *left : all.alive) delete left;
    all = {};
}

void tamper(tampering with) {
    const lock held(guard);
    all.tamper = with;
}

void use(const script &plan) {
    const lock held(guard);
    all.scripts.push_back(plan);
}

void answer(const std::string &name, const std::vector<int32_t> &results) {
    const lock held(guard);
    all.answers[name].assign(results.begin(), results.end());
}

std::vector<call> calls_of(const std::string &name) {
    const lock held(guard);
    std::vector<call> found;
    for (const call &each : all.calls) {
        if (each.name == name) found.push_back(each);
    }
    return found;
}

std::vector<std::string> call_names() {
    const lock held(guard);
    std::vector<std::string> names;
    for (const call &each : all.calls) names.push_back(each.name);
    return names;
}

void forget_calls() {
    const lock held(guard);
    all.calls.clear();
}

int live_objects() {
    const lock held(guard);
    return static_cast<int>(all.alive.size());
}

int tag_buffers_left() {
    const lock held(guard);
    int count = 0;
    for (wexa_tags *tags : all.tags) {
        for (void **place : buffers_of(tags)) count += *place != nullptr;
    }
    return count;
}

std::vector<std::string> faults() {
    const lock held(guard);
    return all.faults;
}

script song(const std::vector<int16_t> &interleaved, int32_t channels, int32_t sample_rate,
            int32_t frame_samples) {
    script made;
    made.sample_rate = sample_rate;
    made.channels = channels;
    const auto total = static_cast<int64_t>(interleaved.size()) / channels;
    made.duration = total * 10'000'000 / sample_rate;
    for (int64_t at = 0; at < total; at += frame_samples) {
        const int64_t end = std::min(total, at + frame_samples);
        frame cut;
        cut.pcm.assign(interleaved.begin() + at * channels, interleaved.begin() + end * channels);
        cut.start = at * 10'000'000 / sample_rate;
        made.frames.push_back(cut);
    }
    return made;
}

}  // namespace scripted
