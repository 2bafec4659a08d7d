#include "support/duration_database.h"

#include <gtest/gtest.h>
#include <linux/magic.h>
#include <sys/statfs.h>

namespace dlp::test {

bool databaseIsThrowaway() {
    struct statfs fileSystem {};
    return statfs("/data/system/users", &fileSystem) == 0 && fileSystem.f_type == TMPFS_MAGIC;
}

DurationDatabase::DurationDatabase() {
    EXPECT_EQ(sqlite3_open_v2(kDatabasePath, &handle_, SQLITE_OPEN_READWRITE, nullptr), SQLITE_OK);
}

int DurationDatabase::execute(const std::string& sql) {
    return sqlite3_exec(handle_, sql.c_str(), nullptr, nullptr, nullptr);
}

std::vector<std::pair<int, int>> DurationDatabase::rows(const std::string& where) {
    std::vector<std::pair<int, int>> found;
    sqlite3_stmt* statement = nullptr;
    std::string sql = "SELECT Id, Time FROM dlpInfo " + where;
    EXPECT_EQ(sqlite3_prepare_v2(handle_, sql.c_str(), -1, &statement, nullptr), SQLITE_OK)
            << sqlite3_errmsg(handle_);
    while (statement != nullptr && sqlite3_step(statement) == SQLITE_ROW) {
        found.emplace_back(sqlite3_column_int(statement, 0), sqlite3_column_int(statement, 1));
    }
    sqlite3_finalize(statement);
    return found;
}

}  // namespace dlp::test
