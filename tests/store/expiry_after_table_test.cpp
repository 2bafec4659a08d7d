#include <dlp_sdk/expiry_after_table.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <fstream>
#include <mutex>
#include <string>
#include <thread>

#include "support/duration_database.h"
#include "support/library_lock_probe.h"
#include "support/log_capture.h"

namespace dlp::test {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

constexpr const char* kDatabaseDirectory = "/data/system/users/dlp";
const LogRecord kNoId = mainError("DLP_LIBEPM : get_time : No id in the list\n");

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

void createTable() {
    mkdir(kDatabaseDirectory, 0700);
    DurationDatabase database(SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
    ASSERT_EQ(database.execute("CREATE TABLE IF NOT EXISTS dlpInfo(Id INT, Time INT);"), SQLITE_OK);
}

LogRecord notInTableMessage(int id, int time) {
    return mainError("DLP_LIBEPM : set_time : id : " + std::to_string(id) +
                     ", It is not in the table. add time as " + std::to_string(time) + "\n");
}
LogRecord getFailedMessage(int id) {
    return mainError("DLP_LOG : get id : " + std::to_string(id) + " is fail\n");
}
LogRecord lockedMessage(const std::string& caller) {
    return mainError("DLP_LIBEPM : " + caller +
                     " : Failed to execute statement: database is locked\n");
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
    void SetUp() override { SKIP_UNLESS_DATABASE_IS_THROWAWAY(); }

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
        DurationDatabase database;
        EXPECT_TRUE(database.hasTable("dlpInfo"));
        EXPECT_THAT(database.rows(), IsEmpty());
    }
    expectRecords(log_, {});

    removeDatabase();
    EXPECT_EQ(set_time(101, 3600), 0);
    expectRecords(log_, {notInTableMessage(101, 3600)});
    DurationDatabase database;
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
        DurationDatabase database(SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
        ASSERT_EQ(database.execute("CREATE TABLE other(x INT)"), SQLITE_OK);
    }

    EXPECT_EQ(init_table(), 0);
    EXPECT_FALSE(DurationDatabase().hasTable("dlpInfo"));
    EXPECT_EQ(get_time(102), -1);
    expectRecords(log_, {mainError("DLP_LIBEPM : get_time : Failed to execute statement: no such "
                                   "table: dlpInfo\n"),
                         kNoId});

    EXPECT_EQ(set_time(102, 77), 0);
    expectRecords(log_, {notInTableMessage(102, 77)});
    DurationDatabase database;
    EXPECT_THAT(database.rows(), ElementsAre(Pair(102, 77)));
    EXPECT_TRUE(database.hasTable("other"));
}

TEST_F(ExpiryAfterTableTest, SetTimeUpdatesPresentRow) {
    EXPECT_EQ(set_time(103, 10), 0);
    EXPECT_EQ(set_time(103, 20), 0);
    expectRecords(log_, {notInTableMessage(103, 10)});
    DurationDatabase database;
    EXPECT_THAT(database.rowsOf(103), ElementsAre(Pair(103, 20)));
    EXPECT_EQ(get_time(103), 20);

    // Written by another process: the row decides, not this process's empty cache slot.
    ASSERT_EQ(database.execute("INSERT INTO dlpInfo VALUES(104, 5)"), SQLITE_OK);
    EXPECT_EQ(set_time(104, 6), 0);
    expectRecords(log_, {});
    EXPECT_THAT(database.rowsOf(104), ElementsAre(Pair(104, 6)));
}

TEST_F(ExpiryAfterTableTest, LockedDatabaseFailsAtOnce) {
    createTable();
    DurationDatabase holder;
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
    int getResult = get_time(106);
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
    EXPECT_EQ(getResult, -1);
    // The failed write still reached the cache.
    EXPECT_EQ(cachedResult, 50);
    expectRecords(log_, {mainError("DLP_LIBEPM : set_time : SQL error: database is locked\n"),
                         lockedMessage("get_time"), kNoId});
    EXPECT_THAT(DurationDatabase().rows("WHERE Id IN (105, 106)"), IsEmpty());
}

TEST_F(ExpiryAfterTableTest, CacheServesValueAfterDatabaseDeleted) {
    ASSERT_EQ(set_time(107, 900), 0);
    removeDatabase();
    log_.clear();

    EXPECT_EQ(get_time(107), 900);
    EXPECT_EQ(get_expiryAfter_time(107), 900);
    expectAdminExpiry(107, 900);
    expectRecords(log_, {});
    EXPECT_FALSE(exists(kDatabaseDirectory));
}

TEST_F(ExpiryAfterTableTest, StoredMinusOneReadsAsFailure) {
    EXPECT_EQ(set_expiryAfter_time(108, -1), 0);
    DurationDatabase database;
    EXPECT_THAT(database.rowsOf(108), ElementsAre(Pair(108, -1)));
    log_.clear();

    EXPECT_EQ(get_time(108), -1);
    EXPECT_EQ(get_expiryAfter_time(108), 1);
    expectRecords(log_, {getFailedMessage(108)});

    // -1 marks an empty slot, so the table is read again every time.
    ASSERT_EQ(database.execute("UPDATE dlpInfo SET Time = 42 WHERE Id = 108"), SQLITE_OK);
    EXPECT_EQ(get_time(108), 42);
}

TEST_F(ExpiryAfterTableTest, StoredZeroIsADuration) {
    EXPECT_EQ(set_time(109, 0), 0);
    DurationDatabase database;
    EXPECT_THAT(database.rowsOf(109), ElementsAre(Pair(109, 0)));
    log_.clear();

    EXPECT_EQ(get_time(109), 0);
    EXPECT_EQ(get_expiryAfter_time(109), 0);
    expectAdminExpiry(109, 0);

    // A 0 read from the table is cached like one written here.
    ASSERT_EQ(database.execute("INSERT INTO dlpInfo VALUES(110, 0)"), SQLITE_OK);
    EXPECT_EQ(get_time(110), 0);
    ASSERT_EQ(database.execute("UPDATE dlpInfo SET Time = 7 WHERE Id = 110"), SQLITE_OK);
    EXPECT_EQ(get_time(110), 0);
    expectRecords(log_, {});
}

TEST_F(ExpiryAfterTableTest, AcceptsOnlyContainerIds100To199) {
    EXPECT_EQ(set_time(99, 5), 1);
    EXPECT_EQ(set_time(200, 5), 1);
    EXPECT_EQ(get_time(99), -1);
    EXPECT_EQ(get_time(200), -1);
    EXPECT_EQ(set_expiryAfter_time(200, 5), 1);
    EXPECT_EQ(get_expiryAfter_time(99), 1);
    const LogRecord set99 =
            mainError("DLP_LIBEPM : set_time : set_time error : id : 99, index : -1\n");
    const LogRecord set200 =
            mainError("DLP_LIBEPM : set_time : set_time error : id : 200, index : 100\n");
    const LogRecord get99 = mainError("DLP_LIBEPM : get_time : error : id : 99, index : -1\n");
    expectRecords(log_, {set99, set200, get99,
                         mainError("DLP_LIBEPM : get_time : error : id : 200, index : 100\n"),
                         set200, mainError("DLP_LOG : set id : 200, time : 5 is fail\n"), get99,
                         getFailedMessage(99)});
    expectAdminExpiry(200, 1);
    log_.clear();

    EXPECT_EQ(set_time(100, 1000), 0);
    EXPECT_EQ(set_expiryAfter_time(199, 1999), 0);
    expectRecords(log_, {notInTableMessage(100, 1000), notInTableMessage(199, 1999)});
    EXPECT_EQ(get_time(100), 1000);
    EXPECT_EQ(get_expiryAfter_time(199), 1999);
    EXPECT_THAT(DurationDatabase().rows("WHERE Id IN (99, 100, 199, 200) ORDER BY Id"),
                ElementsAre(Pair(100, 1000), Pair(199, 1999)));
}

TEST_F(ExpiryAfterTableTest, NeverWrittenIdReadsAsOneSecondInFreshProcess) {
    createTable();
    // Re-executed, so the cache starts empty whatever the other tests stored.
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
            {
                EXPECT_EQ(get_time(150), -1);
                EXPECT_EQ(get_expiryAfter_time(150), 1);
                expectRecords(log_, {kNoId, kNoId, getFailedMessage(150)});
                expectAdminExpiry(150, 1);
                exitReportingFailures();
            },
            ::testing::ExitedWithCode(0), "");
}

TEST_F(ExpiryAfterTableTest, EntryPointsWaitForLibraryLock) {
    createTable();
    int result = 0;
    // This thread may still call in: the lock is recursive.
    auto nothingStored = [](int id) {
        return [id] { EXPECT_TRUE(DurationDatabase().rowsOf(id).empty()); };
    };
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
}  // namespace dlp::test
