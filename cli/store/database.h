// The interface to a database: statements with values, rows of values. Each kind of database has a
// table of functions, so that SQL is written once; $1, $2 ... are the values.
#ifndef TAVO_CLI_STORE_DATABASE_H
#define TAVO_CLI_STORE_DATABASE_H

#include <cstdint>
#include <functional>
#include <string>
#include <variant>
#include <vector>

#include "cli/failure.h"

struct bytes {
    std::string value;  // any bytes, including NUL
};

// Null, a whole number, text in UTF-8, or bytes.
using cell = std::variant<std::monostate, int64_t, std::string, bytes>;
using row = std::vector<cell>;

struct database_kind {
    const char *bytes_type;  // SQL type names
    const char *time_type;
    const char *time_now;  // SQL for the current second
    const char *json_type;
    size_t longest_path;  // bytes, limited by the index

    const char *version_query;  // selects the version of the store's table, or 0 without a table
    const char *set_version;    // printf format of the statement that sets it
    const char *begin_upgrade;  // begins a transaction that excludes other upgrades of the table

    // The handle must be closed even if open failed. Failures have the database's own text. They
    // are permanent if the file is damaged, or if a table or a permission is missing.
    failure (*open)(const std::string &location, bool read_only, void **handle);
    failure (*run)(void *handle, const std::string &sql, const row &values,
                   const std::function<void(const row &)> &on_row);
    void (*close)(void *handle);  // accepts null
};

// Finds the kind of database for a store's URL. location receives the argument for open.
failure find_database(const std::string &url, const database_kind **kind, std::string &location);

// Returns the text without the user name and password of the URL, that is, the part between :// and
// the last @.
std::string without_credentials(const std::string &text, const std::string &url);

// Return null if the program was built without the database.
const database_kind *sqlite_database();
const database_kind *postgresql_database();

#endif
