#include "cli/store/database.h"

namespace {

bool starts_with(const std::string &text, const std::string &start) {
    return text.compare(0, start.size(), start) == 0;
}

bool ends_with(const std::string &text, const std::string &end) {
    return text.size() > end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

}  // namespace

const database_kind *find_database(const std::string &url, std::string &where, std::string &error) {
    where = url;
    const database_kind *kind = nullptr;
    std::string name;
    if (starts_with(url, "postgresql://") || starts_with(url, "postgres://")) {
        kind = postgresql_database();
        name = "PostgreSQL";
    } else if (starts_with(url, "sqlite:") || ends_with(url, ".db")) {
        if (starts_with(url, "sqlite:")) where = url.substr(7);
        kind = sqlite_database();
        name = "SQLite";
    } else {
        error =
            "--store takes sqlite:FILE, a file that ends in .db, or postgresql://HOST/DATABASE.";
        return nullptr;
    }
    if (kind == nullptr) error = "This tavo was built without " + name + ".";
    return kind;
}
