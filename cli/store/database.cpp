#include "cli/store/database.h"

#include <dlfcn.h>

#include <cctype>
#include <regex>
#include <set>

namespace {

// Returns null if the program was built without PostgreSQL. PostgreSQL's client library depends on
// two dozen others, so the module that needs it is loaded on demand.
const database_kind *postgresql_database() {
    void *module = dlopen("libtavo_postgresql.so", RTLD_NOW | RTLD_LOCAL);
    if (module == nullptr) return nullptr;
    return static_cast<const database_kind *>(dlsym(module, "tavo_postgresql_database"));
}

std::string percent_decoded(const std::string &text) {
    std::string out;
    for (size_t i = 0; i < text.size(); ++i) {
        const bool escaped = text[i] == '%' && i + 2 < text.size() &&
                             isxdigit(static_cast<unsigned char>(text[i + 1])) != 0 &&
                             isxdigit(static_cast<unsigned char>(text[i + 2])) != 0;
        out += escaped ? static_cast<char>(std::stoi(text.substr(i + 1, 2), nullptr, 16)) : text[i];
        if (escaped) i += 2;
    }
    return out;
}

}  // namespace

failure find_database(const std::string &url, const database_kind **kind, std::string &location) {
    const bool is_file = url.size() > 3 && url.substr(url.size() - 3) == ".db";
    location = url;
    std::string name;
    if (url.rfind("postgresql://", 0) == 0 || url.rfind("postgres://", 0) == 0) {
        *kind = postgresql_database();
        name = "PostgreSQL";
    } else if (url.rfind("sqlite:", 0) == 0 || is_file) {
        if (url.rfind("sqlite:", 0) == 0) location = url.substr(7);
        if (location.empty()) return {"sqlite: is followed by the name of a file."};
        *kind = sqlite_database();
        name = "SQLite";
    } else {
        return {
            "--store takes sqlite:FILE, a file that ends in .db, or postgresql://HOST/DATABASE."};
    }
    return {*kind == nullptr ? "This tavo was built without " + name + "." : ""};
}

std::string without_credentials(const std::string &text, const std::string &url) {
    static const std::regex word("[^:/@?#&=%\"'(),; \n]+");
    const size_t start = url.find("://");
    const size_t end = url.rfind('@');
    if (start == std::string::npos || end == std::string::npos || end < start) return text;
    const std::string credentials = url.substr(start + 3, end - start - 3);
    const std::string words = credentials + " " + percent_decoded(credentials);
    const std::set<std::string> secret(std::sregex_token_iterator(words.begin(), words.end(), word),
                                       std::sregex_token_iterator());
    std::string out;
    auto copied = text.begin();
    for (std::sregex_iterator found(text.begin(), text.end(), word), last; found != last; ++found) {
        if (secret.count(found->str()) == 0) continue;
        out.append(copied, (*found)[0].first).append("***");
        copied = (*found)[0].second;
    }
    return out.append(copied, text.end());
}
