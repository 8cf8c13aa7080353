// Cue points for the click track, as RIFF chunks behind its sound: "cue " has their places, in
// samples, "adtl" their names and the length of the highlight's region.
#include <cmath>

#include "cli/write/markers.h"
#include "common/tavo_ctx.h"

namespace {

std::string number(uint32_t value) {  // little-endian
    std::string out;
    for (int shift = 0; shift < 32; shift += 8) out += static_cast<char>(value >> shift & 0xFF);
    return out;
}

std::string chunk(const char *name, const std::string &content) {
    const std::string padding(content.size() % 2, '\0');
    return name + number(static_cast<uint32_t>(content.size())) + content + padding;
}

uint32_t sample_at(double ms) {
    return static_cast<uint32_t>(std::llround(std::fmax(ms, 0.0) * kAnalysisRate / 1000.0));
}

}  // namespace

std::string cue_chunks(const record &result) {
    // In mode both the track starts at the highlight.
    const double start_ms = result.has_highlight ? result.hl_pos_ms : 0;
    std::string points;
    std::string names;
    std::string regions;  // behind all names: some readers stop at the first of them
    uint32_t id = 0;
    for (const mark &entry : marks_of(result)) {
        const uint32_t sample = sample_at(entry.start_ms - start_ms);
        points += number(++id) + number(sample) + "data" + number(0) + number(0) + number(sample);
        names += chunk("labl", number(id) + entry.name + '\0');
        if (entry.end_ms <= entry.start_ms) continue;
        const uint32_t length = sample_at(entry.end_ms - entry.start_ms);
        regions += chunk("ltxt", number(id) + number(length) + "rgn " + std::string(8, '\0'));
    }
    return chunk("cue ", number(id) + points) + chunk("LIST", "adtl" + names + regions);
}
