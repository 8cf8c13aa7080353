// Loads the module with PostgreSQL's client library on demand, because that library depends on two
// dozen others.
#include <dlfcn.h>

#include "cli/store/database.h"

const database_kind *postgresql_database() {
    void *module = dlopen("libtavo_postgresql.so", RTLD_NOW | RTLD_LOCAL);
    if (module == nullptr) return nullptr;
    using find = const database_kind *(*)();
    const auto function = reinterpret_cast<find>(dlsym(module, "tavo_postgresql_database"));
    return function == nullptr ? nullptr : function();
}
