#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>

#include "cli/report/plot.h"
#include "cli/report/svg.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

// Units of the picture's view box, three to a pixel where it is shown 400 pixels wide. From top to
// bottom: name, facts, the highlight's label, then a title and a lane each for waveform, loudness
// and beats, the time axis.
constexpr int kWidth = 1200;
constexpr int kHeight = 624;
constexpr double kLeft = 132.0;  // of the time axis
constexpr double kRight = kLeft + kPlotColumns;
constexpr double kMargin = 16.0;  // left and right of the text at the top
constexpr double kNameY = 42.0;
constexpr double kFactsY = 80.0;
constexpr double kLabelY = 126.0;
constexpr double kMarkY = 136.0;  // top of the highlight's triangle

struct lane {
    double title;  // baseline of its text
    double top;
    double bottom;
};
constexpr lane kWaveform = {182.0, 194.0, 326.0};
constexpr lane kLoudness = {366.0, 378.0, 488.0};
constexpr lane kLoudnessAlone = {366.0, 378.0, 574.0};  // without beats
constexpr lane kBeats = {528.0, 540.0, 574.0};
constexpr double kAxisY = 580.0;
constexpr double kAxisLabelY = 614.0;

constexpr double kNameWidth = kWidth - 2 * kMargin;
constexpr double kTickSpace = 150.0;  // least distance of labels on the time axis
constexpr double kBeatSpace = 4.0;    // beats closer than that on average are stacked
constexpr double kStackWidth = 6.0;   // of a stack, with its gap
constexpr double kFont = 27.0;
constexpr double kNameFont = 34.0;
constexpr double kCharacter = 0.615;  // a generous width in any sans-serif font, in font sizes
constexpr double kSkewMs = 1000.0;    // stated and read lengths that differ more are both told
constexpr double kHourMs = 3.6e6;
constexpr double kFullScale = 32768.0;

// Okabe and Ito's colours, which differ in lightness too. kDark replaces some where the viewer
// prefers a dark ground; a viewer that knows no style sheets shows the light picture.
constexpr const char *kGroundColour = "#FFFFFF";
constexpr const char *kInkColour = "#000000";
constexpr const char *kWaveformColour = "#999999";
constexpr const char *kLoudnessColour = "#0072B2";
constexpr const char *kHighlightColour = "#D55E00";
constexpr const char *kRegionColour = "#E69F00";
constexpr const char *kGridColour = "#DDDDDD";
constexpr const char *kUnsearchedColour = "#EEEEEE";
constexpr const char *kDark =
    "<style>@media (prefers-color-scheme: dark) {\n"
    "svg { fill: #EEEEEE } #ground { fill: #181818 } #unsearched { fill: #303030 }\n"
    "#grid, #scale { stroke: #484848 } #waveform { fill: #8A8A8A; stroke: #8A8A8A }\n"
    "#loudness { stroke: #56B4E9 } circle#loudness { fill: #56B4E9 }\n"
    "#mean-edge { stroke: #181818 } #axis, #beats, #mean { stroke: #EEEEEE }\n"
    "}</style>\n";

// As much of a name as fits, at kNameFont and bold: other scripts' characters are up to as wide as
// high.
std::string fitting(const std::string &bytes, double width) {
    std::string text = as_utf8(bytes);
    double used = 0.0;
    for (size_t i = 0; i < text.size(); ++i) {
        const auto c = static_cast<unsigned char>(text[i]);
        if ((c & 0xC0) == 0x80) continue;
        used += kNameFont * (c < 0x80 ? 0.69 : 1.06);
        if (used > width) return text.substr(0, i) + "\xE2\x80\xA6";
    }
    return text;
}

double x_of(const plot_data &data, double ms) {
    const double part = data.length_ms > 0.0 ? ms / data.length_ms : 0.0;
    return kLeft + kPlotColumns * std::clamp(part, 0.0, 1.0);
}

std::string highlight_words(const record &result) {
    return "highlight " + highlight_text(result);
}

std::string stream_words(const record &result, const plot_data &data) {
    std::string words = clock_text(static_cast<double>(result.duration_ms));
    if (std::fabs(data.read_ms - static_cast<double>(result.duration_ms)) > kSkewMs) {
        words += " (" + clock_text(data.read_ms) + " could be read)";
    }
    return words + ", " + std::to_string(result.sample_rate) + " Hz, " +
           count_text(static_cast<size_t>(result.channels), "channel");
}

std::string beat_words(const record &result) {
    return count_text(result.beats_ms.size(), "beat") +
           (result.has_highlight ? " from the highlight on, " : ", ") + std::to_string(result.bpm) +
           " BPM";
}

std::string description(const record &result, const plot_data &data) {
    std::string words = stream_words(result, data);
    if (result.has_highlight) words += ", " + highlight_words(result);
    if (result.has_beats) {
        words += ", " + tempo_text(result) + ", " + count_text(result.beats_ms.size(), "beat");
    }
    return words;
}

double width_of(const std::string &words) {
    return kCharacter * kFont * static_cast<double>(words.size());
}

std::string head(const record &result, const plot_data &data) {
    const std::string name = base_name(result.file);
    const std::string width = std::to_string(kWidth);
    const std::string height = std::to_string(kHeight);
    const attributes picture = {{"xmlns", "http://www.w3.org/2000/svg"},
                                {"version", "1.1"},
                                {"width", width},
                                {"height", height},
                                {"viewBox", "0 0 " + width + " " + height},
                                {"font-family", "sans-serif"},
                                {"font-size", decimal(kFont, 0)},
                                {"fill", kInkColour}};
    const attributes bold = {{"x", decimal(kMargin, 1)},
                             {"y", decimal(kNameY, 1)},
                             {"font-size", decimal(kNameFont, 0)},
                             {"font-weight", "bold"},
                             {"xml:space", "preserve"}};
    const attributes ground = {
        {"id", "ground"}, {"width", width}, {"height", height}, {"fill", kGroundColour}};
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n" + opened("svg", picture) + ">\n<title>" +
           xml(name) + "</title>\n<desc>" + description(result, data) + "</desc>\n" + kDark +
           element("rect", ground) + opened("text", bold) + ">" + xml(fitting(name, kNameWidth)) +
           "</text>\n" + text_at(kMargin, kFactsY, "start", stream_words(result, data));
}

// The title of a lane stands at the end of the lane where the highlight's line does not cross it.
std::string lane_title(const record &result, const plot_data &data, const lane &of,
                       const std::string &words) {
    const bool crossed =
        result.has_highlight && x_of(data, result.hl_pos_ms) < kLeft + width_of(words);
    return text_at(crossed ? kRight : kLeft, of.title, crossed ? "end" : "start", words);
}

// Shades the start and the end of the song, where no rise counts as the entry of a highlight.
std::string unsearched(const record &result, const plot_data &data) {
    if (!result.has_highlight || data.loudness.empty()) return "";
    const auto [from, to] = searched_span(result, data);
    const auto box = [&](double start_ms, double end_ms) {
        const double start = x_of(data, start_ms);
        return "M" + point(start, kMarkY) + "H" + decimal(x_of(data, end_ms), 1) + "V" +
               decimal(kAxisY, 1) + "H" + decimal(start, 1) + "Z";
    };
    const std::string words = "not searched";
    const double mark = x_of(data, result.hl_pos_ms);
    const double room_from = std::max(x_of(data, to), mark + width_of(highlight_words(result)));
    return element("path", {{"id", "unsearched"},
                            {"fill", kUnsearchedColour},
                            {"d", box(0.0, from) + box(to, data.length_ms)}}) +
           (kRight - room_from > width_of(words) ? text_at(kRight, kLabelY, "end", words) : "");
}

// Milliseconds between labels of the time axis.
double tick_step(double length_ms) {
    constexpr double kSteps[] = {100,    200,    500,    1'000,   2'000,   5'000,   10'000,
                                 15'000, 30'000, 60'000, 120'000, 300'000, 600'000, 900'000,
                                 1.8e6,  3.6e6,  7.2e6,  1.44e7,  2.16e7};
    const double least = length_ms * kTickSpace / kPlotColumns;
    for (const double step : kSteps) {
        if (step >= least) return step;
    }
    return std::ceil(least / 8.64e7) * 8.64e7;  // days
}

// m:ss, with tenths for steps below a second, h:mm:ss for songs of an hour.
std::string tick_label(double ms, double step, double length_ms) {
    if (step < 1000.0) return clock_text(ms);
    const long long s = std::llround(ms / 1000.0);
    std::array<char, 48> text{};
    if (length_ms >= kHourMs) {
        snprintf(text.data(), text.size(), "%lld:%02lld:%02lld", s / 3600, s / 60 % 60, s % 60);
    } else {
        snprintf(text.data(), text.size(), "%lld:%02lld", s / 60, s % 60);
    }
    return text.data();
}

std::string time_axis(const record &result, const plot_data &data) {
    const double step = tick_step(data.length_ms);
    const lane &loudness = result.has_beats ? kLoudness : kLoudnessAlone;
    std::string grid;
    std::string ticks = "M" + point(kLeft, kAxisY) + "H" + decimal(kRight, 1);
    std::string labels;
    for (int k = 0; k * step <= data.length_ms; ++k) {
        const double x = x_of(data, k * step);
        for (const lane &in : {kWaveform, loudness}) {
            grid += "M" + point(x, in.top) + "V" + decimal(in.bottom, 1);
        }
        ticks += "M" + point(x, kAxisY) + "v8";
        labels += text_at(x, kAxisLabelY, "middle", tick_label(k * step, step, data.length_ms));
    }
    return stroke("grid", kGridColour, 2, grid) + stroke("axis", kInkColour, 2, ticks) +
           "<g id=\"times\">\n" + labels + "</g>\n";
}

std::string waveform(const record &result, const plot_data &data) {
    const double middle = (kWaveform.top + kWaveform.bottom) / 2;
    const double scale = (kWaveform.bottom - kWaveform.top) / 2 / std::max(data.peak, 1);
    const auto x = [](size_t column) { return kLeft + 0.5 + static_cast<double>(column); };
    std::string path;
    const size_t count = data.waveform.size();
    for (size_t k = 0; k < count; ++k) {
        path += (k == 0 ? "M" : "L") + point(x(k), middle - data.waveform[k].high * scale);
    }
    for (size_t k = count; k-- > 0;) {
        path += "L" + point(x(k), middle - data.waveform[k].low * scale);
    }
    const double percent = 100.0 * data.peak / kFullScale;
    return element("path", {{"id", "waveform"},
                            {"fill", kWaveformColour},
                            {"stroke", kWaveformColour},  // keeps silence visible
                            {"stroke-width", "1.5"},
                            {"stroke-linejoin", "round"},
                            {"d", path + "Z"}}) +
           lane_title(result, data, kWaveform,
                      "waveform, peak " + decimal(percent, percent < 9.95 ? 1 : 0) + " %");
}

// A value stands in the middle of the 6 s that it is about.
double middle_ms(size_t index) {
    return kPointMs * static_cast<double>(index) + kWindowMs / 2;
}

// A value of the curve as the level that music has there: below full scale, of the mean square.
std::string level_text(double value) {
    const double mean_square = std::pow(10.0, value / 10.0) - 1.0;
    if (mean_square <= 0.0) return "silence";
    const double level = 10.0 * std::log10(mean_square);
    return level > -0.05 ? "0 dB" : decimal(level, level > -9.95 ? 1 : 0) + " dB";
}

// More values than a thick line could show; the mean's line needs a light edge then.
bool is_dense(const plot_data &data) {
    return data.loudness.size() > kPlotColumns / 2;
}

std::string loudness_line(const plot_data &data, const lane &in, double scale) {
    const auto y = [&](size_t k) {
        return in.bottom - static_cast<double>(data.loudness[k]) * scale;
    };
    if (data.loudness.size() == 1) {
        return element("circle", {{"id", "loudness"},
                                  {"cx", decimal(x_of(data, middle_ms(0)), 1)},
                                  {"cy", decimal(y(0), 1)},
                                  {"r", "7"},
                                  {"fill", kLoudnessColour}});
    }
    std::string path;
    for (size_t k = 0; k < data.loudness.size(); ++k) {
        path += (k == 0 ? "M" : "L") + point(x_of(data, middle_ms(k)), y(k));
    }
    return stroke("loudness", kLoudnessColour, is_dense(data) ? 1.5 : 4, path);
}

std::string loudness(const record &result, const plot_data &data) {
    const lane &in = result.has_beats ? kLoudness : kLoudnessAlone;
    if (data.loudness.empty()) {
        return lane_title(result, data, in, "loudness: none, less than 6 s");
    }
    const double top =
        static_cast<double>(*std::max_element(data.loudness.begin(), data.loudness.end()));
    const double scale = top > 0.0 ? (in.bottom - in.top) / top : 0.0;
    const double mean_y = in.bottom - data.mean * scale;
    const std::string frame = "M" + point(kLeft, in.top) + "H" + decimal(kRight, 1) + "M" +
                              point(kLeft, in.bottom) + "H" + decimal(kRight, 1);
    attributes edge = line(kLeft, mean_y, kRight, mean_y, kGroundColour, 5, "none");
    return lane_title(result, data, in, "loudness, mean " + level_text(data.mean)) +
           stroke("scale", kGridColour, 2, frame) + loudness_line(data, in, scale) +
           (is_dense(data) ? named_line("mean-edge", edge) : "") +
           named_line("mean", line(kLeft, mean_y, kRight, mean_y, kInkColour, 2, "14 8")) +
           (top > 0.0 ? text_at(kLeft - 8, in.top + 20, "end", level_text(top)) : "") +
           text_at(kLeft - 8, in.bottom, "end", level_text(0.0));
}

std::string region(const record &result, const plot_data &data) {
    if (!result.has_highlight || result.length_s <= 0) return "";
    const double start = x_of(data, result.hl_pos_ms);
    const double end = x_of(data, result.hl_pos_ms + 1000.0 * result.length_s);
    return element("rect", {{"id", "region"},
                            {"x", decimal(start, 2)},
                            {"y", decimal(kMarkY, 1)},
                            {"width", decimal(end - start, 2)},
                            {"height", decimal(kAxisY - kMarkY, 1)},
                            {"fill", kRegionColour},
                            {"fill-opacity", "0.25"}}) +
           named_line("region-end", line(end, kMarkY, end, kAxisY, kHighlightColour, 4, "4 6"));
}

// The label stands at the side of the mark where there is room.
std::string highlight(const record &result, const plot_data &data) {
    if (!result.has_highlight) return "";
    const double x = x_of(data, result.hl_pos_ms);
    const std::string words = highlight_words(result);
    const bool left = x + width_of(words) > kWidth - kMargin;
    return named_line("highlight", line(x, kMarkY, x, kAxisY, kHighlightColour, 4, "none")) +
           element("path", {{"fill", kHighlightColour},
                            {"d", "M" + point(x - 11, kMarkY) + "h22l-11 18Z"}}) +
           text_at(left ? x + 11 : x - 11, kLabelY, left ? "end" : "start", words);
}

// How many beats each stack of kStackWidth pixels holds.
std::vector<int> stack_heights(const record &result, const plot_data &data) {
    std::vector<int> heights(static_cast<size_t>(kPlotColumns / kStackWidth) + 1);
    for (const float beat : result.beats_ms) {
        const double x = x_of(data, static_cast<double>(beat)) - kLeft;
        ++heights[static_cast<size_t>(x / kStackWidth)];
    }
    return heights;
}

// Beats too close to be told apart: a stretch of the axis piles up its ticks.
std::string stacked_ticks(const std::vector<int> &heights, int most) {
    const double each = (kBeats.bottom - kBeats.top) / most;
    std::string path;
    for (size_t stack = 0; stack < heights.size(); ++stack) {
        const double x = kLeft + (static_cast<double>(stack) + 0.5) * kStackWidth;
        for (int k = 0; k < heights[stack]; ++k) {
            path += "M" + decimal(x, 1) + " " + decimal(kBeats.bottom - k * each, 2) + "v-" +
                    decimal(each, 2);
        }
    }
    return path;
}

bool too_close(const record &result, const plot_data &data) {
    if (result.beats_ms.size() < 2) return false;
    const double span = x_of(data, static_cast<double>(result.beats_ms.back())) -
                        x_of(data, static_cast<double>(result.beats_ms.front()));
    return span < kBeatSpace * static_cast<double>(result.beats_ms.size() - 1);
}

std::string beats(const record &result, const plot_data &data) {
    if (!result.has_beats) return "";
    if (too_close(result, data)) {
        const std::vector<int> heights = stack_heights(result, data);
        const int most = *std::max_element(heights.begin(), heights.end());
        const double seconds = data.length_ms / 1000.0 * kStackWidth / kPlotColumns;
        return stroke("beats", kInkColour, kStackWidth - 2, stacked_ticks(heights, most)) +
               lane_title(result, data, kBeats,
                          beat_words(result) + ", at most " + std::to_string(most) + " in " +
                              decimal(seconds, 1) + " s");
    }
    std::string path;
    for (const float beat : result.beats_ms) {
        path += "M" + decimal(x_of(data, static_cast<double>(beat)), 2) + " " +
                decimal(kBeats.top, 1) + "V" + decimal(kBeats.bottom, 1);
    }
    return stroke("beats", kInkColour, 2, path) +
           lane_title(result, data, kBeats, beat_words(result));
}

}  // namespace

std::string plot_svg(const record &result, const plot_data &data) {
    return head(result, data) + unsearched(result, data) + region(result, data) +
           time_axis(result, data) + waveform(result, data) + loudness(result, data) +
           beats(result, data) + highlight(result, data) + "</svg>\n";
}
