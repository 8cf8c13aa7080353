#include "cli/store/database.h"

#include <dlfcn.h>

#include <filesystem>

namespace {

// Returns null if the program was built without PostgreSQL. PostgreSQL's client library depends on
// two dozen others, so the module that needs it is loaded on demand.
const database_kind *postgresql_database() {
    void *module = dlopen("libtavo_postgresql.so", RTLD_NOW | RTLD_LOCAL);
    if (module == nullptr) return nullptr;
    return static_cast<const database_kind *>(dlsym(module, "tavo_postgresql_database"));
}

}  // namespace

failure find_database(const std::string &url, const database_kind **kind, std::string &location) {
    location = url;
    if (url.rfind("postgresql://", 0) == 0 || url.rfind("postgres://", 0) == 0) {
        *kind = postgresql_database();
        return {*kind == nullptr ? "This tavo was built without PostgreSQL." : ""};
    }
    if (url.rfind("sqlite:", 0) == 0) {
        location = url.substr(7);
    } else if (std::filesystem::path(url).extension() != ".db") {
        return {
            "--store takes sqlite:FILE, a file that ends in .db, or postgresql://HOST/DATABASE."};
    }
    *kind = &sqlite_database;
    return {*kind == nullptr ? "This tavo was built without SQLite." : ""};
}
