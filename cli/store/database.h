// A database as the store sees it: statements with values, rows of values. One table of functions
// per kind of database, so that SQL is written once; $1, $2 ... stand for the values.
#ifndef TAVO_CLI_STORE_DATABASE_H
#define TAVO_CLI_STORE_DATABASE_H

#include <cstdint>
#include <functional>
#include <string>
#include <variant>
#include <vector>

#include "cli/failure.h"

struct bytes {
    std::string value;  // any bytes, NUL included
};

// Null, a whole number, text in UTF-8, or bytes.
using cell = std::variant<std::monostate, int64_t, std::string, bytes>;
using row = std::vector<cell>;

struct database_kind {
    const char *bytes_type;  // SQL type names
    const char *time_type;
    const char *json_type;
    size_t longest_path;  // bytes that an index takes

    // The version of the store's table, 0 where there is none.
    const char *version_query;
    std::string (*set_version_statement)(int version);
    // Makes other commands that upgrade the table wait until the transaction's end.
    const char *begin_upgrade[2];

    // Sentences are the database's own text. A failure that a new attempt cannot overcome is
    // permanent: a damaged file, a missing table or right.
    failure (*open)(const std::string &location, bool read_only, void **handle);
    failure (*run)(void *handle, const std::string &sql, const row &values,
                   const std::function<void(const row &)> &on_row);
    void (*close)(void *handle);  // accepts null
};

// Finds the kind of database that a store's URL names and, in location, the argument of its open.
failure find_database(const std::string &url, const database_kind **kind, std::string &location);

// The text without any part of the user and password in the URL: what is between :// and the last
// @.
std::string without_credentials(const std::string &text, const std::string &url);

// Null where the program was built without that database.
const database_kind *sqlite_database();
const database_kind *postgresql_database();

#endif
