#include "cli/store/songs_table.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <ctime>
#include <nlohmann/json.hpp>

#include "cli/write/file_names.h"

namespace {

using nlohmann::json;

// A column with a part of the result, and the part's key in JSON.
struct result_column {
    const char *name;
    const char *type;  // null: the database's type for JSON
    const char *key;
    int version;  // first version of the table with this column
};
constexpr result_column kResultColumns[] = {
    {"status", "TEXT NOT NULL", "status", 1},
    {"sentence", "TEXT", "error", 1},
    {"sample_rate", "INTEGER", "sample_rate", 1},
    {"channels", "INTEGER", "channels", 1},
    {"duration_ms", "BIGINT", "duration_ms", 1},
    {"hl_pos_ms", "INTEGER", "hl_pos_ms", 1},
    {"hl_end_ms", "BIGINT", "hl_end_ms", 1},
    {"hl_refined", "INTEGER", "hl_refined", 1},
    {"bpm", "INTEGER", "bpm", 1},
    {"beats_ms", nullptr, "beats_ms", 1},
    {"cpu_ms", "BIGINT", "cpu_ms", 1},
    {"offset_ms", "DOUBLE PRECISION", "offset_ms", 2},
    {"decoder", "TEXT", "decoder", 2},
};
constexpr const char *kKey = "path, mode, length_s, max_beats";

bool is_text(const result_column &column) {
    return column.type != nullptr && std::string(column.type, 4) == "TEXT";
}

bool is_real(const result_column &column) {
    return column.type != nullptr && column.type[0] == 'D';
}

std::string declaration(const result_column &column, const database_kind &kind) {
    return std::string(column.name) + " " + (column.type == nullptr ? kind.json_type : column.type);
}

cell cell_of(const json &result, const char *key) {
    const auto found = result.find(key);
    if (found == result.end()) return std::monostate();
    if (found->is_boolean()) return int64_t{found->get<bool>() ? 1 : 0};
    if (found->is_number_integer()) return found->get<int64_t>();
    if (found->is_string()) return found->get<std::string>();
    return found->dump();
}

std::string now_text() {
    const time_t now = time(nullptr);
    tm parts{};
    gmtime_r(&now, &parts);
    std::array<char, 32> text{};
    strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%SZ", &parts);
    return text.data();
}

std::string host_name() {
    std::array<char, 256> name{};
    gethostname(name.data(), name.size() - 1);
    return as_utf8(name.data());
}

// Parses a number or a list of numbers. Drops deeper levels while reading, so that their depth
// costs nothing.
json parse_numbers(const std::string &text) {
    const auto is_flat = [](int depth, json::parse_event_t event, const json &) {
        return event == json::parse_event_t::value ||
               (depth == 0 && event != json::parse_event_t::object_start);
    };
    return json::parse(text, is_flat, false);
}

bool are_numbers(const json &value) {
    if (!value.is_array()) return value.is_number();
    return std::all_of(value.begin(), value.end(),
                       [](const json &item) { return item.is_number(); });
}

// Returns false if the cell is damaged.
bool read_cell(const cell &value, const result_column &column, json &result) {
    if (std::holds_alternative<std::monostate>(value)) return true;
    const auto *number = std::get_if<int64_t>(&value);
    const auto *text = std::get_if<std::string>(&value);
    if (number != nullptr && !is_text(column) && column.type != nullptr) {
        result[column.key] = *number;
        return true;
    }
    if (text == nullptr) return false;
    if (is_text(column)) {
        result[column.key] = as_utf8(*text);
        return true;
    }
    json numbers = parse_numbers(*text);
    const bool is_expected = are_numbers(numbers) && numbers.is_array() == !is_real(column);
    if (is_expected && (column.type == nullptr || is_real(column))) {
        result[column.key] = std::move(numbers);
        return true;
    }
    return false;
}

}  // namespace

std::vector<std::string> upgrade_statements(const database_kind &kind) {
    std::string table = "CREATE TABLE IF NOT EXISTS songs (path " + std::string(kind.bytes_type) +
                        " NOT NULL, mode TEXT NOT NULL, length_s INTEGER NOT NULL, max_beats "
                        "INTEGER NOT NULL, size BIGINT NOT NULL, mtime_ns BIGINT NOT NULL";
    std::vector<std::string> later;
    for (const result_column &column : kResultColumns) {
        if (column.version == 1) table += ", " + declaration(column, kind);
        if (column.version > 1) {
            later.push_back("ALTER TABLE songs ADD COLUMN " + declaration(column, kind));
        }
    }
    table += ", version TEXT NOT NULL, host TEXT NOT NULL, finished " +
             std::string(kind.time_type) + " NOT NULL, PRIMARY KEY (" + kKey + "))";
    later.insert(later.begin(), table);
    later.push_back(kind.set_version_statement(kTableVersion));
    return later;
}

std::string put_statement() {
    std::vector<std::string> others = {"size", "mtime_ns"};
    for (const result_column &column : kResultColumns) others.emplace_back(column.name);
    others.insert(others.end(), {"version", "host", "finished"});
    std::string names = kKey;
    std::string values = "$1, $2, $3, $4";
    std::string changes;
    for (size_t i = 0; i < others.size(); ++i) {
        names += ", " + others[i];
        values += ", $" + std::to_string(i + 5);
        changes += (i == 0 ? "" : ", ") + others[i] + " = excluded." + others[i];
    }
    return "INSERT INTO songs (" + names + ") VALUES (" + values + ") ON CONFLICT (" + kKey +
           ") DO UPDATE SET " + changes;
}

void append_result_cells(row &cells, const std::string &text) {
    const json result = json::parse(text);
    for (const result_column &column : kResultColumns) {
        cells.push_back(cell_of(result, column.key));
    }
    cells.insert(cells.end(), {std::string(TAVO_VERSION), host_name(), now_text()});
}

std::string page_query(int version) {
    std::string columns = "path";
    for (const result_column &column : kResultColumns) {
        const bool is_there = column.version <= std::max(version, 1);
        columns += std::string(", ") + (is_there ? column.name : "NULL");
    }
    return "SELECT " + columns +
           " FROM songs WHERE path > $1 AND mode = $2 AND length_s = $3 AND max_beats = $4 AND "
           "status = $5 ORDER BY path LIMIT $6";
}

failure read_result_cells(const row &cells, const std::string &mode, std::string &path,
                          std::string &result) {
    if (const auto *name = std::get_if<bytes>(&cells[0])) path = name->value;
    json object = {{"mode", mode}};
    for (size_t i = 0; i < std::size(kResultColumns); ++i) {
        if (read_cell(cells[i + 1], kResultColumns[i], object)) continue;
        return {std::string("Its row in the store is damaged: ") + kResultColumns[i].name +
                " cannot be read."};
    }
    if (object.contains("bpm") && !object.contains("beats_ms")) object["beats_ms"] = json::array();
    result = object.dump();
    return {};
}
