#include <dlp_sdk/expiry_after_table.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <linux/magic.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <fstream>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "primitives/library_lock.h"
#include "support/log_capture.h"

namespace {

using dlp::test::kError;
using dlp::test::kMainBuffer;
using dlp::test::LogCapture;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

constexpr const char* kUsersDirectory = "/data/system/users";
constexpr const char* kDatabaseDirectory = "/data/system/users/dlp";
constexpr const char* kDatabasePath = "/data/system/users/dlp/dlpinfo.db";

// The database path is fixed: outside the sandbox's private tmpfs it would be the host's /data.
bool insideSandbox() {
    struct statfs info {};
    return statfs(kUsersDirectory, &info) == 0 && info.f_type == TMPFS_MAGIC;
}

bool exists(const char* path) {
    struct stat info {};
    return stat(path, &info) == 0;
}

// getITAdminExpiryTime against clock readings on either side of the call.
void expectAdminExpiry(int id, long duration) {
    long before = time(nullptr);
    long expiry = getITAdminExpiryTime(id);
    long after = time(nullptr);
    EXPECT_GE(expiry, before + duration) << id;
    EXPECT_LE(expiry, after + duration) << id;
}

void removeDatabase() {
    unlink(kDatabasePath);
    unlink((std::string(kDatabasePath) + "-journal").c_str());
    rmdir(kDatabaseDirectory);
}

// A connection of the test's own, next to the library's.
class Database {
  public:
    explicit Database(int flags = SQLITE_OPEN_READWRITE) {
        EXPECT_EQ(sqlite3_open_v2(kDatabasePath, &handle_, flags, nullptr), SQLITE_OK);
    }
    ~Database() { sqlite3_close(handle_); }
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;

    int execute(const std::string& sql) {
        return sqlite3_exec(handle_, sql.c_str(), nullptr, nullptr, nullptr);
    }

    // (Id, Time) of every row, in table order; `where` narrows them.
    std::vector<std::pair<int, int>> rows(const std::string& where = "") {
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
    std::vector<std::pair<int, int>> rowsOf(int id) {
        return rows("WHERE Id = " + std::to_string(id));
    }

    bool hasTable(const std::string& name) {
        sqlite3_stmt* statement = nullptr;
        sqlite3_prepare_v2(handle_, "SELECT 1 FROM sqlite_master WHERE type = 'table' AND name = ?",
                           -1, &statement, nullptr);
        sqlite3_bind_text(statement, 1, name.c_str(), -1, SQLITE_TRANSIENT);
        bool found = sqlite3_step(statement) == SQLITE_ROW;
        sqlite3_finalize(statement);
        return found;
    }

  private:
    sqlite3* handle_ = nullptr;
};

void createTable() {
    mkdir(kDatabaseDirectory, 0700);
    Database database(SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
    ASSERT_EQ(database.execute("CREATE TABLE IF NOT EXISTS dlpInfo(Id INT, Time INT);"), SQLITE_OK);
}

std::string notInTable(int id, int time) {
    return "DLP_LIBEPM : set_time : id : " + std::to_string(id) +
           ", It is not in the table. add time as " + std::to_string(time) + "\n";
}

// Runs `call` on another thread while this one holds the library lock, and `whileHeld` here once
// that thread sleeps on a futex. True when the call waited for the lock instead of finishing.
bool waitsForLibraryLock(
        const std::function<void()>& call, const std::function<void()>& whileHeld = [] {}) {
    auto lock = dlp::lockLibraryState();
    std::atomic<bool> started{false}, finished{false};
    char task[64] = {};
    std::thread caller([&] {
        readlink("/proc/thread-self", task, sizeof(task) - 1);
        started = true;
        call();
        finished = true;
    });
    while (!started) std::this_thread::yield();
    // No clock: the caller either finishes or sleeps in the kernel on the held lock.
    const std::string futex = std::to_string(SYS_futex);
    std::string syscall;
    while (!finished && syscall != futex) {
        std::this_thread::yield();
        std::ifstream status(std::string("/proc/") + task + "/syscall");
        if (!status) {
            ADD_FAILURE() << "cannot watch thread " << task;
            break;
        }
        status >> syscall;
    }
    bool waited = !finished;
    if (waited) whileHeld();
    lock.unlock();
    caller.join();
    return waited;
}

// Ends a death-test child, whose own failures gtest does not print: they go to stderr instead.
[[noreturn]] void exitReportingFailures() {
    const ::testing::TestResult* result =
            ::testing::UnitTest::GetInstance()->current_test_info()->result();
    for (int i = 0; i < result->total_part_count(); ++i) {
        const ::testing::TestPartResult& part = result->GetTestPartResult(i);
        if (part.failed())
            fprintf(stderr, "%s:%d: %s\n", part.file_name(), part.line_number(), part.message());
    }
    _exit(result->Failed() ? 1 : 0);
}

class ExpiryAfterTableTest : public ::testing::Test {
  protected:
    void SetUp() override {
        if (!insideSandbox()) GTEST_SKIP() << "needs the private /data of tools/dlp-sandbox";
    }

    // Texts of the messages since the last call; every store message is an error on the main
    // buffer.
    std::vector<std::string> takeMessages() {
        std::vector<std::string> texts;
        for (const dlp::test::LogRecord& record : log_.records()) {
            EXPECT_EQ(record.buffer, kMainBuffer) << record.text;
            EXPECT_EQ(record.priority, kError) << record.text;
            texts.push_back(record.text);
        }
        log_.clear();
        return texts;
    }

    void expectNoDuration(int id) {
        takeMessages();
        const std::string noId = "DLP_LIBEPM : get_time : No id in the list\n";
        EXPECT_EQ(get_time(id), -1);
        EXPECT_THAT(takeMessages(), ElementsAre(noId));
        EXPECT_EQ(get_expiryAfter_time(id), 1);
        EXPECT_THAT(takeMessages(),
                    ElementsAre(noId, "DLP_LOG : get id : " + std::to_string(id) + " is fail\n"));
        expectAdminExpiry(id, 1);
    }

    LogCapture log_;
};

TEST_F(ExpiryAfterTableTest, CreatesMissingDirectoryFileAndTable) {
    removeDatabase();
    ASSERT_FALSE(exists(kDatabaseDirectory));

    // Without a usable PATH, a shell command could not create the directory.
    const std::string path = getenv("PATH") != nullptr ? getenv("PATH") : "";
    setenv("PATH", "/nonexistent", 1);
    EXPECT_EQ(init_table(), 0);
    setenv("PATH", path.c_str(), 1);
    struct stat info {};
    ASSERT_EQ(stat(kDatabaseDirectory, &info), 0);
    EXPECT_TRUE(S_ISDIR(info.st_mode));
    {
        Database database;
        EXPECT_TRUE(database.hasTable("dlpInfo"));
        EXPECT_THAT(database.rows(), IsEmpty());
    }
    EXPECT_THAT(takeMessages(), IsEmpty());

    removeDatabase();
    EXPECT_EQ(set_time(101, 3600), 0);
    EXPECT_THAT(takeMessages(), ElementsAre(notInTable(101, 3600)));
    Database database;
    EXPECT_THAT(database.rows(), ElementsAre(Pair(101, 3600)));
}

TEST_F(ExpiryAfterTableTest, SetTimeAddsTableMissingFromExistingFile) {
    removeDatabase();
    ASSERT_EQ(mkdir(kDatabaseDirectory, 0700), 0);
    std::ofstream(kDatabasePath) << "not a database";
    EXPECT_EQ(init_table(), 0);
    std::string content;
    std::getline(std::ifstream(kDatabasePath), content);
    EXPECT_EQ(content, "not a database");
    ASSERT_EQ(unlink(kDatabasePath), 0);
    {
        Database database(SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
        ASSERT_EQ(database.execute("CREATE TABLE other(x INT)"), SQLITE_OK);
    }

    EXPECT_EQ(init_table(), 0);
    EXPECT_FALSE(Database().hasTable("dlpInfo"));
    EXPECT_EQ(get_time(102), -1);
    EXPECT_THAT(takeMessages(),
                ElementsAre("DLP_LIBEPM : get_time : Failed to execute statement: no such table: "
                            "dlpInfo\n",
                            "DLP_LIBEPM : get_time : No id in the list\n"));

    EXPECT_EQ(set_time(102, 77), 0);
    EXPECT_THAT(takeMessages(), ElementsAre(notInTable(102, 77)));
    Database database;
    EXPECT_THAT(database.rows(), ElementsAre(Pair(102, 77)));
    EXPECT_TRUE(database.hasTable("other"));
}

TEST_F(ExpiryAfterTableTest, SetTimeUpdatesPresentRow) {
    EXPECT_EQ(set_time(103, 10), 0);
    EXPECT_THAT(takeMessages(), ElementsAre(notInTable(103, 10)));
    EXPECT_EQ(set_time(103, 20), 0);
    EXPECT_THAT(takeMessages(), IsEmpty());
    Database database;
    EXPECT_THAT(database.rowsOf(103), ElementsAre(Pair(103, 20)));
    EXPECT_EQ(get_time(103), 20);

    // Written by another process: the row decides, not this process's empty cache slot.
    ASSERT_EQ(database.execute("INSERT INTO dlpInfo VALUES(104, 5)"), SQLITE_OK);
    EXPECT_EQ(set_time(104, 6), 0);
    EXPECT_THAT(takeMessages(), IsEmpty());
    EXPECT_THAT(database.rowsOf(104), ElementsAre(Pair(104, 6)));
}

TEST_F(ExpiryAfterTableTest, LockedDatabaseFailsAtOnce) {
    createTable();
    Database holder;
    ASSERT_EQ(holder.execute("BEGIN EXCLUSIVE"), SQLITE_OK);
    // Releases the lock when told to, or on its own long after any call that did not wait for it.
    std::mutex releaseMutex;
    std::condition_variable releaseWanted;
    bool releaseNow = false;
    std::atomic<bool> released{false};
    std::thread releaser([&] {
        std::unique_lock<std::mutex> guard(releaseMutex);
        releaseWanted.wait_for(guard, std::chrono::seconds(10), [&] { return releaseNow; });
        holder.execute("ROLLBACK");
        released = true;
    });

    int setResult = set_time(105, 50);
    std::vector<std::string> setMessages = takeMessages();
    int getResult = get_time(106);
    std::vector<std::string> getMessages = takeMessages();
    int cachedResult = get_time(105);
    bool lockStillHeld = !released;
    {
        std::lock_guard<std::mutex> guard(releaseMutex);
        releaseNow = true;
    }
    releaseWanted.notify_one();
    releaser.join();

    EXPECT_TRUE(lockStillHeld) << "the calls waited for the lock";
    EXPECT_EQ(setResult, 1);
    EXPECT_THAT(setMessages,
                ElementsAre("DLP_LIBEPM : set_time : Failed to execute statement: database is "
                            "locked\n",
                            notInTable(105, 50),
                            "DLP_LIBEPM : set_time : SQL error: database is locked\n"));
    EXPECT_EQ(getResult, -1);
    EXPECT_THAT(getMessages,
                ElementsAre("DLP_LIBEPM : get_time : Failed to execute statement: database is "
                            "locked\n",
                            "DLP_LIBEPM : get_time : No id in the list\n"));
    // The failed write still reached the cache.
    EXPECT_EQ(cachedResult, 50);
    EXPECT_THAT(takeMessages(), IsEmpty());
    EXPECT_THAT(Database().rows("WHERE Id IN (105, 106)"), IsEmpty());
}

TEST_F(ExpiryAfterTableTest, CacheServesValueAfterDatabaseDeleted) {
    ASSERT_EQ(set_time(107, 900), 0);
    removeDatabase();
    takeMessages();

    EXPECT_EQ(get_time(107), 900);
    EXPECT_EQ(get_expiryAfter_time(107), 900);
    expectAdminExpiry(107, 900);
    EXPECT_THAT(takeMessages(), IsEmpty());
    EXPECT_FALSE(exists(kDatabaseDirectory));
}

TEST_F(ExpiryAfterTableTest, StoredMinusOneReadsAsFailure) {
    EXPECT_EQ(set_expiryAfter_time(108, -1), 0);
    Database database;
    EXPECT_THAT(database.rowsOf(108), ElementsAre(Pair(108, -1)));
    takeMessages();

    EXPECT_EQ(get_time(108), -1);
    EXPECT_THAT(takeMessages(), IsEmpty());
    EXPECT_EQ(get_expiryAfter_time(108), 1);
    EXPECT_THAT(takeMessages(), ElementsAre("DLP_LOG : get id : 108 is fail\n"));

    // -1 marks an empty slot, so the table is read again every time.
    ASSERT_EQ(database.execute("UPDATE dlpInfo SET Time = 42 WHERE Id = 108"), SQLITE_OK);
    EXPECT_EQ(get_time(108), 42);
}

TEST_F(ExpiryAfterTableTest, StoredZeroIsADuration) {
    EXPECT_EQ(set_time(109, 0), 0);
    Database database;
    EXPECT_THAT(database.rowsOf(109), ElementsAre(Pair(109, 0)));
    takeMessages();

    EXPECT_EQ(get_time(109), 0);
    EXPECT_EQ(get_expiryAfter_time(109), 0);
    expectAdminExpiry(109, 0);
    EXPECT_THAT(takeMessages(), IsEmpty());

    // A 0 read from the table is cached like one written here.
    ASSERT_EQ(database.execute("INSERT INTO dlpInfo VALUES(110, 0)"), SQLITE_OK);
    EXPECT_EQ(get_time(110), 0);
    ASSERT_EQ(database.execute("UPDATE dlpInfo SET Time = 7 WHERE Id = 110"), SQLITE_OK);
    EXPECT_EQ(get_time(110), 0);
    EXPECT_THAT(takeMessages(), IsEmpty());
}

TEST_F(ExpiryAfterTableTest, AcceptsOnlyContainerIds100To199) {
    EXPECT_EQ(set_time(99, 5), 1);
    EXPECT_EQ(set_time(200, 5), 1);
    EXPECT_EQ(get_time(99), -1);
    EXPECT_EQ(get_time(200), -1);
    EXPECT_THAT(takeMessages(),
                ElementsAre("DLP_LIBEPM : set_time : set_time error : id : 99, index : -1\n",
                            "DLP_LIBEPM : set_time : set_time error : id : 200, index : 100\n",
                            "DLP_LIBEPM : get_time : error : id : 99, index : -1\n",
                            "DLP_LIBEPM : get_time : error : id : 200, index : 100\n"));

    EXPECT_EQ(set_expiryAfter_time(200, 5), 1);
    EXPECT_EQ(get_expiryAfter_time(99), 1);
    EXPECT_THAT(takeMessages(),
                ElementsAre("DLP_LIBEPM : set_time : set_time error : id : 200, index : 100\n",
                            "DLP_LOG : set id : 200, time : 5 is fail\n",
                            "DLP_LIBEPM : get_time : error : id : 99, index : -1\n",
                            "DLP_LOG : get id : 99 is fail\n"));
    expectAdminExpiry(200, 1);
    takeMessages();

    EXPECT_EQ(set_time(100, 1000), 0);
    EXPECT_EQ(set_expiryAfter_time(199, 1999), 0);
    EXPECT_THAT(takeMessages(), ElementsAre(notInTable(100, 1000), notInTable(199, 1999)));
    EXPECT_EQ(get_time(100), 1000);
    EXPECT_EQ(get_expiryAfter_time(199), 1999);
    EXPECT_THAT(Database().rows("WHERE Id IN (99, 100, 199, 200) ORDER BY Id"),
                ElementsAre(Pair(100, 1000), Pair(199, 1999)));
}

TEST_F(ExpiryAfterTableTest, NeverWrittenIdReadsAsOneSecondInFreshProcess) {
    createTable();
    // Re-executed, so the cache starts empty whatever the other tests stored.
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
            {
                expectNoDuration(150);
                exitReportingFailures();
            },
            ::testing::ExitedWithCode(0), "");
}

TEST_F(ExpiryAfterTableTest, EntryPointsWaitForLibraryLock) {
    createTable();
    int result = 0;
    // This thread may still call in: the lock is recursive.
    auto nothingStored = [](int id) { return [id] { EXPECT_EQ(get_time(id), -1); }; };
    EXPECT_TRUE(waitsForLibraryLock([&] { result = init_table(); }));
    EXPECT_TRUE(waitsForLibraryLock([&] { result = set_time(111, 11); }, nothingStored(111)));
    EXPECT_EQ(result, 0);
    EXPECT_TRUE(waitsForLibraryLock([&] { result = get_time(111); }));
    EXPECT_EQ(result, 11);
    EXPECT_TRUE(waitsForLibraryLock([&] { result = set_expiryAfter_time(112, 12); },
                                    nothingStored(112)));
    EXPECT_EQ(result, 0);
    EXPECT_TRUE(waitsForLibraryLock([&] { result = get_expiryAfter_time(112); }));
    EXPECT_EQ(result, 12);
    long expiry = 0;
    EXPECT_TRUE(waitsForLibraryLock([&] { expiry = getITAdminExpiryTime(112); }));
    EXPECT_GT(expiry, 12);
}

}  // namespace
