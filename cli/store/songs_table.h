// The table of the store: its SQL, and its rows as results in JSON.
#ifndef TAVO_CLI_STORE_SONGS_TABLE_H
#define TAVO_CLI_STORE_SONGS_TABLE_H

#include <string>
#include <vector>

#include "cli/store/database.h"

// The table's version: 2 added offset_ms and decoder; 0 is a table without a number, of the same
// columns as 1.
constexpr int kTableVersion = 2;

// Of a key, a size and a time of change, $1 to $6.
constexpr const char *kStatusQuery =
    "SELECT status FROM songs WHERE path = $1 AND mode = $2 AND length_s = $3 AND max_beats = $4 "
    "AND size = $5 AND mtime_ns = $6";

// Make the table, or add the columns that an older one lacks, and set the version.
std::vector<std::string> upgrade_statements(const database_kind &kind);

// Inserts a row, or replaces the one with its key: the key's four values, size, mtime_ns, and what
// append_result_cells adds.
std::string put_statement();
void append_result_cells(row &cells, const std::string &json);

// The rows of a key after its path, $1 to $4, with a status, $5: at most $6, in order.
std::string page_query(int version);

// Reads a row of page_query: result becomes an object of --format json without the file's name.
// Fails with the name of a column that no tavo wrote.
failure read_result_cells(const row &cells, const std::string &mode, std::string &path,
                          std::string &result);

#endif
