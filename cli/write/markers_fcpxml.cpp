// Final Cut Pro's XML, version 1.8: a project with the song as its only clip, and markers on it.
#include <algorithm>
#include <utility>

#include "cli/write/file_names.h"
#include "cli/write/frame_rate.h"
#include "cli/write/markers.h"

namespace {

typedef std::vector<std::pair<const char *, std::string>> attributes;  // values already escaped

// A start tag without its closing bracket.
std::string opened(const char *name, const attributes &values) {
    std::string out = std::string("<") + name;
    for (const auto &[key, value] : values) out += std::string(" ") + key + "=\"" + value + "\"";
    return out;
}

std::string element(const char *name, const attributes &values) {
    return opened(name, values) + "/>\n";
}

// Formats a number of video frames as a fraction of seconds.
std::string frames_text(int64_t frames, const frame_rate &rate) {
    return std::to_string(frames * rate.seconds) + "/" + std::to_string(rate.frames) + "s";
}

}  // namespace

std::string fcpxml_markers(const record &result, const frame_rate &rate) {
    const std::string name = xml_text(base_name(result.file));
    const std::string frame = frames_text(1, rate);
    const std::string length = frames_text(
        std::max<int64_t>(1, frame_at(static_cast<double>(result.duration_ms), rate)), rate);
    std::string out =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!DOCTYPE fcpxml>\n<fcpxml version=\"1.8\">\n"
        "<resources>\n" +
        element("format",
                {{"id", "r1"}, {"frameDuration", frame}, {"width", "1920"}, {"height", "1080"}}) +
        element("asset", {{"id", "r2"},
                          {"name", name},
                          {"src", file_url(result.file)},
                          {"start", "0s"},
                          {"duration", length},
                          {"hasAudio", "1"},
                          {"audioSources", "1"},
                          {"audioChannels", std::to_string(result.channels)},
                          {"audioRate", std::to_string(result.sample_rate)}}) +
        "</resources>\n" + opened("project", {{"name", name}}) + ">\n" +
        opened("sequence", {{"format", "r1"},
                            {"duration", length},
                            {"tcStart", "0s"},
                            {"tcFormat", rate.drop ? "DF" : "NDF"}}) +
        ">\n<spine>\n" +
        opened("asset-clip",
               {{"ref", "r2"}, {"name", name}, {"offset", "0s"}, {"duration", length}}) +
        ">\n";
    for (const mark &entry : marks_of(result)) {
        const int64_t start = frame_at(entry.start_ms, rate);
        const int64_t frames = std::max<int64_t>(1, frame_at(entry.end_ms, rate) - start);
        out += element("marker", {{"start", frames_text(start, rate)},
                                  {"duration", frames_text(frames, rate)},
                                  {"value", entry.name}});
    }
    return out + "</asset-clip>\n</spine>\n</sequence>\n</project>\n</fcpxml>\n";
}
