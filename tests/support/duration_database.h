#pragma once

#include <sqlite3.h>

#include <string>
#include <utility>
#include <vector>

namespace dlp::test {

constexpr const char* kDatabasePath = "/data/system/users/dlp/dlpinfo.db";

// The database path is fixed: tests that reach it run only where /data/system/users is the
// sandbox's throwaway tmpfs, never against a real device's data.
bool databaseIsThrowaway();
#define SKIP_UNLESS_DATABASE_IS_THROWAWAY()                                               \
    if (!::dlp::test::databaseIsThrowaway()) {                                            \
        GTEST_SKIP() << "reaches /data/system/users: runs only inside tools/dlp-sandbox"; \
    }

// A connection of the test's own to the database of durations, beside the library's.
class DurationDatabase {
  public:
    DurationDatabase();
    ~DurationDatabase() { sqlite3_close(handle_); }
    DurationDatabase(const DurationDatabase&) = delete;
    DurationDatabase& operator=(const DurationDatabase&) = delete;

    int execute(const std::string& sql);
    // (Id, Time) of every row in table order; `where` narrows them.
    std::vector<std::pair<int, int>> rows(const std::string& where = "");

  private:
    sqlite3* handle_ = nullptr;
};

}  // namespace dlp::test
