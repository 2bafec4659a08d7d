#pragma once

#include <sqlite3.h>

#include <string>
#include <utility>
#include <vector>

namespace dlp::test {

constexpr const char* kDatabasePath = "/data/system/users/dlp/dlpinfo.db";

// The database path is fixed: tests that reach it run only where /data/system/users is the
// sandbox's throwaway tmpfs, never against a real device's data.
bool databaseDirectoryIsThrowaway();

#define SKIP_UNLESS_DATABASE_IS_THROWAWAY()                                                   \
    do {                                                                                      \
        if (!::dlp::test::databaseDirectoryIsThrowaway()) {                                   \
            GTEST_SKIP() << "reaches /data/system/users: runs only inside tools/dlp-sandbox"; \
        }                                                                                     \
    } while (0)

// A connection of the test's own to the database of durations, next to the library's.
class DurationDatabase {
  public:
    explicit DurationDatabase(int flags = SQLITE_OPEN_READWRITE);
    ~DurationDatabase() { sqlite3_close(handle_); }
    DurationDatabase(const DurationDatabase&) = delete;
    DurationDatabase& operator=(const DurationDatabase&) = delete;

    int execute(const std::string& sql);
    // (Id, Time) of every row, in table order; `where` narrows them.
    std::vector<std::pair<int, int>> rows(const std::string& where = "");
    std::vector<std::pair<int, int>> rowsOf(int id) {
        return rows("WHERE Id = " + std::to_string(id));
    }
    bool hasTable(const std::string& name);

  private:
    sqlite3* handle_ = nullptr;
};

}  // namespace dlp::test
