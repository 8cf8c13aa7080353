#include "cli/store/database.h"

#include <algorithm>
#include <cctype>
#include <set>

namespace {

constexpr const char *kDelimiters = ":/@?#&=%\"'(),; \n";

bool starts_with(const std::string &text, const std::string &start) {
    return text.compare(0, start.size(), start) == 0;
}

bool ends_with(const std::string &text, const std::string &end) {
    return text.size() > end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

// Calls on_word for each run of characters that are not delimiters, with its place in the text.
void for_each_word(const std::string &text, const std::function<void(size_t, size_t)> &on_word) {
    size_t start = text.find_first_not_of(kDelimiters);
    while (start != std::string::npos) {
        const size_t end = std::min(text.find_first_of(kDelimiters, start), text.size());
        on_word(start, end - start);
        start = text.find_first_not_of(kDelimiters, end);
    }
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
    location = url;
    std::string name;
    if (starts_with(url, "postgresql://") || starts_with(url, "postgres://")) {
        *kind = postgresql_database();
        name = "PostgreSQL";
    } else if (starts_with(url, "sqlite:") || ends_with(url, ".db")) {
        if (starts_with(url, "sqlite:")) location = url.substr(7);
        if (location.empty()) return {"sqlite: is followed by the name of a file."};
        *kind = sqlite_database();
        name = "SQLite";
    } else {
        return {
            "--store takes sqlite:FILE, a file that ends in .db, or postgresql://HOST/DATABASE."};
    }
    if (*kind == nullptr) return {"This tavo was built without " + name + "."};
    return {};
}

std::string without_credentials(const std::string &text, const std::string &url) {
    const size_t scheme = url.find("://");
    const size_t last_at = url.rfind('@');
    if (scheme == std::string::npos || last_at == std::string::npos || last_at < scheme) {
        return text;
    }
    const std::string credentials = url.substr(scheme + 3, last_at - scheme - 3);
    std::set<std::string> secret;
    for (const std::string &form : {credentials, percent_decoded(credentials)}) {
        for_each_word(form, [&](size_t at, size_t size) { secret.insert(form.substr(at, size)); });
    }
    std::string out;
    size_t copied = 0;
    for_each_word(text, [&](size_t at, size_t size) {
        if (secret.count(text.substr(at, size)) == 0) return;
        out += text.substr(copied, at - copied) + "***";
        copied = at + size;
    });
    return out + text.substr(copied);
}
