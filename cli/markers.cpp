#include "cli/markers.h"

#include <array>
#include <climits>
#include <cstdio>

#include "cli/names.h"

namespace {

struct marker_format {
    result_format format;
    const char *suffix;  // of the file's name
    std::string (*content)(const record &result, const options &opts);
};
constexpr marker_format kMarkerFormats[] = {
    {result_format::labels, ".labels.txt", label_track},
};
constexpr int32_t kUsualLengthSeconds = 30;  // marked without --length: a preview's

const marker_format *find_format(result_format format) {
    for (const marker_format &entry : kMarkerFormats) {
        if (entry.format == format) return &entry;
    }
    return nullptr;
}

// FNV-1a
uint32_t hash_of(const std::string &bytes) {
    uint32_t hash = 2'166'136'261u;
    for (const char byte : bytes) hash = (hash ^ static_cast<uint8_t>(byte)) * 16'777'619u;
    return hash;
}

std::string fitting_name(const std::string &name, const std::string &suffix) {
    if (name.size() + suffix.size() <= NAME_MAX) return name + suffix;
    std::array<char, 16> number{};
    snprintf(number.data(), number.size(), "~%08x", hash_of(name));
    size_t kept = NAME_MAX - suffix.size() - 9;
    while (kept > 0 && (static_cast<uint8_t>(name[kept]) & 0xC0) == 0x80) --kept;  // in a character
    return name.substr(0, kept) + number.data() + suffix;
}

}  // namespace

bool writes_files(result_format format) {
    return find_format(format) != nullptr;
}

std::string marker_path(const std::string &input, const options &opts) {
    const std::string name = base_name(input);
    const std::string folder = opts.output_dir.empty()
                                   ? input.substr(0, input.size() - name.size())
                                   : opts.output_dir + (opts.output_dir.back() == '/' ? "" : "/");
    return folder + fitting_name(name, find_format(opts.format)->suffix);
}

std::string marker_content(const record &result, const options &opts) {
    return find_format(opts.format)->content(result, opts);
}

double region_end_ms(const record &result) {
    return highlight_end_ms(result, result.length_s > 0 ? result.length_s : kUsualLengthSeconds);
}
