// The table of the store: its SQL, and the conversion between rows and JSON.
#ifndef TAVO_CLI_STORE_SONGS_TABLE_H
#define TAVO_CLI_STORE_SONGS_TABLE_H

#include <string>
#include <vector>

#include "cli/store/database.h"

// Version of the table. Version 2 added offset_ms and decoder; a table without a version (0) has
// the columns of version 1.
constexpr int kTableVersion = 2;

// Values: the key, the size and the time of change, $1 to $6.
constexpr const char *kStatusQuery =
    "SELECT status FROM songs WHERE path = $1 AND mode = $2 AND length_s = $3 AND max_beats = $4 "
    "AND size = $5 AND mtime_ns = $6";

// Statements that create the table or add missing columns to an older one, and set the version.
std::vector<std::string> upgrade_statements(const database_kind &kind);

// Inserts a row or replaces the one with its key. Values: the key, the size, the time of change,
// and the cells of append_result_cells.
std::string put_statement(const database_kind &kind);
void append_result_cells(row &cells, const std::string &text);

// Selects the next rows in the order of their paths. Values: the key with the last path, $1 to $4,
// the status, $5, and the number of rows, $6.
std::string page_query(int version);

// Reads a row of page_query: result is an object of --format json without the file's name. Fails
// with the name of a damaged column.
failure read_result_cells(const row &cells, const std::string &mode, std::string &path,
                          std::string &result);

#endif
