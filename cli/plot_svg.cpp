#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>

#include "cli/names.h"
#include "cli/plot.h"
#include "cli/svg.h"
#include "cli/words.h"

namespace {

// Pixels of the picture. From top to bottom: name, facts, the highlight's label, waveform,
// loudness, beats, time axis.
constexpr int kWidth = 1200;
constexpr int kHeight = 400;
constexpr double kLeft = 112.5;  // of the time axis; lines of one pixel lie on half pixels
constexpr double kRight = kLeft + kPlotColumns;
constexpr double kMargin = 16.0;  // where the lanes' names start
constexpr double kNameY = 25.0;
constexpr double kFactsY = 46.0;
constexpr double kLabelY = 70.0;
constexpr double kMarkY = 76.0;  // top of the highlight's triangle

struct lane {
    double top;
    double bottom;
};
constexpr lane kWaveform = {86.0, 202.0};
constexpr lane kLoudness = {214.0, 322.0};
constexpr lane kLoudnessAlone = {214.0, 358.0};  // without beats
constexpr lane kBeats = {332.0, 358.0};
constexpr double kAxisY = 362.5;
constexpr double kAxisLabelY = 383.0;

constexpr double kNameWidth = kWidth - 2 * kMargin;
constexpr double kTickSpace = 80.0;  // least distance of labels on the time axis
constexpr double kBeatSpace = 2.0;   // beats closer than that on average are stacked
constexpr double kStackWidth = 4.0;  // of a stack, with its gap
constexpr double kCharacter = 8.0;   // a generous width at kFont, in any sans-serif font
constexpr double kFont = 13.0;       // pixels
constexpr double kNameFont = 16.0;
constexpr double kSkewMs = 1000.0;  // stated and read lengths that differ more are both told
constexpr double kHourMs = 3.6e6;
constexpr double kFullScale = 32768.0;

// Okabe and Ito's colours, which differ in lightness too.
constexpr const char *kWaveformColour = "#999999";
constexpr const char *kLoudnessColour = "#0072B2";
constexpr const char *kHighlightColour = "#D55E00";
constexpr const char *kRegionColour = "#E69F00";
constexpr const char *kBeatColour = "#000000";
constexpr const char *kGridColour = "#DDDDDD";

// As much of a name as fits, at 16 pixels and bold: other scripts' characters are up to as wide as
// high.
std::string fitting(const std::string &bytes, double width) {
    std::string text = as_utf8(bytes);
    double used = 0.0;
    for (size_t i = 0; i < text.size(); ++i) {
        const auto c = static_cast<unsigned char>(text[i]);
        if ((c & 0xC0) == 0x80) continue;
        used += c < 0x80 ? 11.0 : 17.0;
        if (used > width) return text.substr(0, i) + "\xE2\x80\xA6";
    }
    return text;
}

double x_of(const plot_data &data, double ms) {
    const double part = data.length_ms > 0.0 ? ms / data.length_ms : 0.0;
    return kLeft + kPlotColumns * std::clamp(part, 0.0, 1.0);
}

std::string highlight_words(const record &result) {
    std::string words = "highlight " + clock_text(result.hl_pos_ms);
    if (result.length_s > 0) {
        words += " to " + clock_text(result.hl_pos_ms + 1000.0 * result.length_s);
    }
    return words;
}

std::string facts(const record &result, const plot_data &data) {
    std::string words = clock_text(static_cast<double>(result.duration_ms));
    if (std::fabs(data.read_ms - static_cast<double>(result.duration_ms)) > kSkewMs) {
        words += " (" + clock_text(data.read_ms) + " could be read)";
    }
    words += ", " + std::to_string(result.sample_rate) + " Hz, " + std::to_string(result.channels) +
             (result.channels == 1 ? " channel" : " channels");
    if (result.has_highlight) words += ", " + highlight_words(result);
    if (result.has_beats) {
        words += ", " + std::to_string(result.bpm) + " BPM, " +
                 std::to_string(result.beats_ms.size()) +
                 (result.beats_ms.size() == 1 ? " beat" : " beats");
    }
    return words;
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
                                {"fill", "#000000"}};
    const attributes bold = {{"x", decimal(kMargin, 1)},
                             {"y", decimal(kNameY, 1)},
                             {"font-size", decimal(kNameFont, 0)},
                             {"font-weight", "bold"},
                             {"xml:space", "preserve"}};
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n" + opened("svg", picture) + ">\n<title>" +
           xml(name) + "</title>\n<desc>" + facts(result, data) + "</desc>\n" +
           element("rect", {{"width", width}, {"height", height}, {"fill", "#FFFFFF"}}) +
           opened("text", bold) + ">" + xml(fitting(name, kNameWidth)) + "</text>\n" +
           text_at(kMargin, kFactsY, "start", facts(result, data));
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

std::string time_axis(const plot_data &data) {
    const double step = tick_step(data.length_ms);
    std::string grid;
    std::string ticks = "M" + point(kLeft, kAxisY) + "H" + decimal(kRight, 1);
    std::string labels;
    for (int k = 0; k * step <= data.length_ms; ++k) {
        const double x = x_of(data, k * step);
        grid += "M" + point(x, kWaveform.top) + "V" + decimal(kAxisY, 1);
        ticks += "M" + point(x, kAxisY) + "v5";
        labels += text_at(x, kAxisLabelY, "middle", tick_label(k * step, step, data.length_ms));
    }
    return stroke("grid", kGridColour, 1, grid) + stroke("axis", "#000000", 1, ticks) +
           "<g id=\"times\">\n" + labels + "</g>\n" +
           text_at(kMargin, kAxisLabelY, "start", data.length_ms < kHourMs ? "min:s" : "h:min:s");
}

std::string waveform(const plot_data &data) {
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
                            {"stroke-width", "0.8"},
                            {"stroke-linejoin", "round"},
                            {"d", path + "Z"}}) +
           text_at(kMargin, middle - 3, "start", "waveform") +
           text_at(kMargin, middle + 14, "start",
                   "peak " + decimal(percent, percent < 9.95 ? 1 : 0) + " %");
}

// A value stands in the middle of the 6 s that it is about.
double middle_ms(size_t index) {
    return 2000.0 * static_cast<double>(index) + 3000.0;
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
                                  {"r", "4"},
                                  {"fill", kLoudnessColour}});
    }
    std::string path;
    for (size_t k = 0; k < data.loudness.size(); ++k) {
        path += (k == 0 ? "M" : "L") + point(x_of(data, middle_ms(k)), y(k));
    }
    return stroke("loudness", kLoudnessColour, is_dense(data) ? 1 : 2, path);
}

std::string loudness(const plot_data &data, const lane &in) {
    const double middle = (in.top + in.bottom) / 2;
    const std::string name = text_at(kMargin, middle + 5, "start", "loudness");
    if (data.loudness.empty()) {
        const std::string words = "none: less than 6 s";
        const double width = kCharacter * static_cast<double>(words.size());
        return name +
               element("rect", {{"x", decimal((kLeft + kRight - width) / 2, 1)},
                                {"y", decimal(middle - 10, 1)},
                                {"width", decimal(width, 1)},
                                {"height", "20"},
                                {"fill", "#FFFFFF"}}) +
               text_at((kLeft + kRight) / 2, middle + 5, "middle", words);
    }
    const double top =
        static_cast<double>(*std::max_element(data.loudness.begin(), data.loudness.end()));
    const double scale = top > 0.0 ? (in.bottom - in.top) / top : 0.0;
    const double mean_y = in.bottom - data.mean * scale;
    const std::string frame = "M" + point(kLeft, in.top) + "H" + decimal(kRight, 1) + "M" +
                              point(kLeft, in.bottom) + "H" + decimal(kRight, 1);
    return name + stroke("scale", kGridColour, 1, frame) + loudness_line(data, in, scale) +
           (is_dense(data)
                ? element("line", line(kLeft, mean_y, kRight, mean_y, "#FFFFFF", 3, "none"))
                : "") +
           named_line("mean", line(kLeft, mean_y, kRight, mean_y, "#000000", 1, "7 4")) +
           text_at(kRight + 6, mean_y + 4.5, "start", "mean " + decimal(data.mean, 2)) +
           text_at(kLeft - 6, in.top + 9, "end", decimal(top, 2)) +
           text_at(kLeft - 6, in.bottom, "end", "0");
}

std::string region(const record &result, const plot_data &data) {
    if (!result.has_highlight || result.length_s <= 0) return "";
    const double start = x_of(data, result.hl_pos_ms);
    const double end = x_of(data, result.hl_pos_ms + 1000.0 * result.length_s);
    return element("rect", {{"id", "region"},
                            {"x", decimal(start, 2)},
                            {"y", decimal(kWaveform.top, 1)},
                            {"width", decimal(end - start, 2)},
                            {"height", decimal(kAxisY - kWaveform.top, 1)},
                            {"fill", kRegionColour},
                            {"fill-opacity", "0.25"}}) +
           named_line("region-end",
                      line(end, kWaveform.top, end, kAxisY, kHighlightColour, 2, "2 4"));
}

// The label stands at the side of the mark where there is room.
std::string highlight(const record &result, const plot_data &data) {
    if (!result.has_highlight) return "";
    const double x = x_of(data, result.hl_pos_ms);
    const std::string words = highlight_words(result);
    const bool left = x + kCharacter * static_cast<double>(words.size()) > kWidth - kMargin;
    return named_line("highlight", line(x, kMarkY, x, kAxisY, kHighlightColour, 2, "none")) +
           element("path",
                   {{"fill", kHighlightColour}, {"d", "M" + point(x - 6, kMarkY) + "h12l-6 10Z"}}) +
           text_at(left ? x + 6 : x - 6, kLabelY, left ? "end" : "start", words);
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
    const double first_line = kBeats.top + 9;
    const double second_line = kBeats.top + 25;
    const std::string names =
        text_at(kMargin, first_line, "start", "beats") +
        text_at(kMargin, second_line, "start", std::to_string(result.bpm) + " BPM");
    if (too_close(result, data)) {
        const std::vector<int> heights = stack_heights(result, data);
        const int most = *std::max_element(heights.begin(), heights.end());
        const double seconds = data.length_ms / 1000.0 * kStackWidth / kPlotColumns;
        return stroke("beats", kBeatColour, kStackWidth - 1, stacked_ticks(heights, most)) + names +
               text_at(kRight + 6, first_line, "start", "most: " + std::to_string(most)) +
               text_at(kRight + 6, second_line, "start", "in " + decimal(seconds, 1) + " s");
    }
    std::string path;
    for (const float beat : result.beats_ms) {
        path += "M" + decimal(x_of(data, static_cast<double>(beat)), 2) + " " +
                decimal(kBeats.top, 1) + "V" + decimal(kBeats.bottom, 1);
    }
    return stroke("beats", kBeatColour, 1, path) + names;
}

}  // namespace

std::string plot_svg(const record &result, const plot_data &data) {
    return head(result, data) + region(result, data) + time_axis(data) + waveform(data) +
           loudness(data, result.has_beats ? kLoudness : kLoudnessAlone) + beats(result, data) +
           highlight(result, data) + "</svg>\n";
}
