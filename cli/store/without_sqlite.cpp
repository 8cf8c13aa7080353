#include "cli/store/database.h"

const database_kind *sqlite_database() {
    return nullptr;
}
