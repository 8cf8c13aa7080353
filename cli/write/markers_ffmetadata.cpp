// FFmpeg's metadata file with chapters; docs/EDITORS.md shows its use.
#include <algorithm>
#include <cmath>

#include "cli/write/markers.h"

namespace {

struct chapter {
    long long start_ms;
    std::string title;
};

// Chapters have no gaps: what comes before the highlight and after its end has one too.
std::vector<chapter> chapters_of(const record &result) {
    std::vector<chapter> chapters;
    for (const mark &entry : marks_of(result)) {
        chapters.push_back({std::llround(entry.start_ms), entry.name});
        if (!result.has_beats) chapters.push_back({std::llround(entry.end_ms), "after"});
    }
    if (chapters.empty() || chapters[0].start_ms > 0) {
        chapters.insert(chapters.begin(), {0, "start"});
    }
    return chapters;
}

}  // namespace

std::string ffmetadata_chapters(const record &result, const options & /*opts*/) {
    const auto duration_ms = static_cast<double>(result.duration_ms);
    const std::vector<chapter> chapters = chapters_of(result);
    std::string out = ";FFMETADATA1\n";
    for (size_t i = 0; i < chapters.size(); ++i) {
        const long long end_ms =
            i + 1 < chapters.size()
                ? chapters[i + 1].start_ms
                : std::max(chapters[i].start_ms, std::llround(player_ms(result, duration_ms)));
        if (end_ms <= chapters[i].start_ms) continue;
        out += "[CHAPTER]\nTIMEBASE=1/1000\nSTART=" + std::to_string(chapters[i].start_ms) +
               "\nEND=" + std::to_string(end_ms) + "\ntitle=" + chapters[i].title + "\n";
    }
    return out;
}
