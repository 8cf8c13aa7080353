// A connection to a database. The SQL of the store is written once; database_kind holds what
// differs between SQLite and PostgreSQL.
//
// Input: a location, statements and their values. Output: rows. Used by store/store.h.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "cli/failure.h"

// The value of a column: null, UTF-8 text, a number as text, or the bytes of a path.
using cell = std::optional<std::string>;
using row = std::vector<cell>;
using row_reader = std::function<void(const row &)>;  // may be null

// An open connection. Runs a statement with `values` as $1, $2 and so on, and calls on_row for each
// row of the result. $1 is always a path, and a query with values selects only paths and texts. A
// failure has the database's message and is permanent if the file is damaged or a table or
// permission is missing.
using connection =
    std::function<failure(const std::string &sql, const row &values, const row_reader &on_row)>;

struct database_kind {
    const char *version_query;  // selects the version of the store's table, or 0 without a table
    const char *set_version;    // printf format of the statement that sets it
    const char *begin_upgrade;  // begins a transaction that excludes other upgrades of the table

    // Messages do not show a URL's user name and password, that is, what is between :// and the
    // last @. A location that is only read must exist.
    failure (*open)(const std::string &location, bool read_only, connection &out);
};

// In sqlite.cpp; has a null address if the program was built without SQLite.
extern const database_kind sqlite_database __attribute__((weak));
