#include "cli/store/songs_table.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <nlohmann/json.hpp>

#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

using nlohmann::json;

enum class column_type { text, whole, real, list };  // list: of numbers, as JSON

// A column for a part of the result, and the part's key in JSON.
struct result_column {
    const char *name;
    const char *key;
    column_type type;
    const char *sql;  // its declaration; null: the database's type for JSON
    int version;      // first version of the table with this column
};
constexpr result_column kResultColumns[] = {
    {"status", "status", column_type::text, "TEXT NOT NULL", 1},
    {"sentence", "error", column_type::text, "TEXT", 1},
    {"sample_rate", "sample_rate", column_type::whole, "INTEGER", 1},
    {"channels", "channels", column_type::whole, "INTEGER", 1},
    {"duration_ms", "duration_ms", column_type::whole, "BIGINT", 1},
    {"hl_pos_ms", "hl_pos_ms", column_type::whole, "INTEGER", 1},
    {"hl_end_ms", "hl_end_ms", column_type::whole, "BIGINT", 1},
    {"hl_refined", "hl_refined", column_type::whole, "INTEGER", 1},
    {"bpm", "bpm", column_type::whole, "INTEGER", 1},
    {"beats_ms", "beats_ms", column_type::list, nullptr, 1},
    {"cpu_ms", "cpu_ms", column_type::whole, "BIGINT", 1},
    {"offset_ms", "offset_ms", column_type::real, "DOUBLE PRECISION", 2},
    {"decoder", "decoder", column_type::text, "TEXT", 2},
};
constexpr const char *kKey = "path, mode, length_s, max_beats";

std::string declaration(const result_column &column, const database_kind &kind) {
    return std::string(column.name) + " " + (column.sql == nullptr ? kind.json_type : column.sql);
}

cell cell_of(const json &result, const char *key) {
    const auto found = result.find(key);
    if (found == result.end()) return std::monostate();
    if (found->is_boolean()) return int64_t{found->get<bool>() ? 1 : 0};
    if (found->is_number_integer()) return found->get<int64_t>();
    if (found->is_string()) return found->get<std::string>();
    return found->dump();
}

std::string host_name() {
    std::array<char, 256> name{};
    gethostname(name.data(), name.size() - 1);
    return as_utf8(name.data());
}

// Returns the cell as JSON, or a discarded value if it is damaged.
json value_of(const cell &value, column_type type) {
    const json damaged(json::value_t::discarded);
    const auto *number = std::get_if<int64_t>(&value);
    const auto *text = std::get_if<std::string>(&value);
    const bool is_number = type == column_type::whole || type == column_type::real;
    if (number != nullptr) return is_number ? json(*number) : damaged;
    if (text == nullptr || type == column_type::whole) return damaged;
    if (type == column_type::text) return as_utf8(*text);
    // Nested lists are not parsed, so that their depth has no cost.
    const size_t last_bracket = text->find_last_of("[{");
    if (last_bracket != std::string::npos && last_bracket > 0) return damaged;
    const json parsed = json::parse(*text, nullptr, false);
    if (type == column_type::real) return parsed.is_number() ? parsed : damaged;
    const bool is_list =
        parsed.is_array() && std::all_of(parsed.begin(), parsed.end(),
                                         [](const json &item) { return item.is_number(); });
    return is_list ? parsed : damaged;
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
    later.push_back(formatted(kind.set_version, kTableVersion));
    return later;
}

std::string put_statement(const database_kind &kind) {
    std::vector<std::string> others = {"size", "mtime_ns"};
    for (const result_column &column : kResultColumns) others.emplace_back(column.name);
    others.insert(others.end(), {"version", "host"});
    std::string names = kKey;
    std::string values = "$1, $2, $3, $4";
    std::string changes = "finished = excluded.finished";
    for (size_t i = 0; i < others.size(); ++i) {
        names += ", " + others[i];
        values += ", $" + std::to_string(i + 5);
        changes += ", " + others[i] + " = excluded." + others[i];
    }
    return "INSERT INTO songs (" + names + ", finished) VALUES (" + values + ", " + kind.time_now +
           ") ON CONFLICT (" + kKey + ") DO UPDATE SET " + changes;
}

void append_result_cells(row &cells, const std::string &text) {
    const json result = json::parse(text);
    for (const result_column &column : kResultColumns) {
        cells.push_back(cell_of(result, column.key));
    }
    cells.insert(cells.end(), {std::string(TAVO_VERSION), host_name()});
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
        const result_column &column = kResultColumns[i];
        if (std::holds_alternative<std::monostate>(cells[i + 1])) continue;
        object[column.key] = value_of(cells[i + 1], column.type);
        if (!object[column.key].is_discarded()) continue;
        return {std::string("Its row in the store is damaged: ") + column.name +
                " cannot be read."};
    }
    if (object.contains("bpm") && !object.contains("beats_ms")) object["beats_ms"] = json::array();
    result = object.dump();
    return {};
}
