// A database as the store sees it: statements with values, rows of values. One table of functions
// per kind of database, so that SQL is written once; $1, $2 ... stand for the values.
#ifndef TAVO_CLI_STORE_DATABASE_H
#define TAVO_CLI_STORE_DATABASE_H

#include <cstdint>
#include <functional>
#include <string>
#include <variant>
#include <vector>

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

    // These return an empty string or the database's own words.
    std::string (*open)(const std::string &where, void **handle);
    std::string (*run)(void *handle, const std::string &sql, const row &values,
                       const std::function<void(const row &)> &on_row);
    void (*close)(void *handle);  // accepts null
};

// The kind that a store's URL names and, in where, what its open takes. Null with a sentence in
// error when the URL is of no kind, or of one that this program was built without.
const database_kind *find_database(const std::string &url, std::string &where, std::string &error);

// Null where the program was built without.
const database_kind *sqlite_database();
const database_kind *postgresql_database();

#endif
