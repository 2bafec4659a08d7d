#include <dlp_sdk/expiry_after_table.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <climits>
#include <ctime>
#include <fstream>
#include <functional>
#include <utility>

#include "support/duration_database.h"
#include "support/log_capture.h"

namespace dlp::test {

using Rows = std::vector<std::pair<int, int>>;
using Log = std::vector<LogRecord>;
using Results = std::vector<int>;

// Runs each job in a child process, all released at once; their wait statuses. A child that
// reads an id this process never cached reads it afresh.
Results inProcesses(const std::vector<std::function<int()>>& jobs) {
    int gate[2];
    EXPECT_EQ(pipe(gate), 0);
    Results children, statuses;
    for (const auto& job : jobs) {
        char none;
        if (children.emplace_back(fork()) == 0) {
            _exit(close(gate[1]) == 0 && read(gate[0], &none, 1) == 0 ? job() : 99);
        }
    }
    close(gate[0]), close(gate[1]);
    for (int child : children) waitpid(child, &statuses.emplace_back(), 0);
    return statuses;
}

// set_time for each id of [first, last]; how many failed.
int storeEach(int first, int last, int duration) {
    int failed = 0;
    for (int id = first; id <= last; ++id) failed += set_time(id, duration);
    return failed;
}

const auto store = [](const std::string& text) { return mainError("DLP_LIBEPM : " + text); };

// SQLite's allocation this many calls from now fails, once; 0 fails none. Set before SQLite starts.
int allocationsToFailure = 0;
const auto failsNow = [] { return allocationsToFailure > 0 && --allocationsToFailure == 0; };
sqlite3_mem_methods standard, failing;
const bool kFailingAllocator = [] {
    sqlite3_config(SQLITE_CONFIG_GETMALLOC, &standard);
    failing = standard;
    failing.xMalloc = [](int size) { return failsNow() ? nullptr : standard.xMalloc(size); };
    failing.xRealloc = [](void* block, int size) {
        return failsNow() ? nullptr : standard.xRealloc(block, size);
    };
    return sqlite3_config(SQLITE_CONFIG_MALLOC, &failing) == SQLITE_OK;
}();

// The tests share one database, in this order; the first finds none.
TEST(set_time, AcceptsIds100To199AndKeepsOneRowEach) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    for (int id : {100, 199}) {
        LogCapture log;
        EXPECT_EQ((Results{set_time(id, 3600), set_time(id, 7200), get_time(id)}),
                  (Results{0, 0, 7200}));
        EXPECT_EQ(log.take(), Log{store("set_time : id : " + std::to_string(id) +
                                        ", It is not in the table. add time as 3600\n")});
        EXPECT_EQ(DurationDatabase().rows("WHERE Id = " + std::to_string(id)), (Rows{{id, 7200}}));
    }
    // The id and its index as the messages print them.
    for (const auto& [id, printed] :
         {std::pair(99, "99, index : -1"), std::pair(200, "200, index : 100"),
          std::pair(INT_MIN, "-2147483648, index : 2147483548"),
          std::pair(INT_MAX, "2147483647, index : 2147483547")}) {
        LogCapture log;
        EXPECT_EQ((Results{set_time(id, 3600), get_time(id)}), (Results{1, -1}));
        EXPECT_EQ(log.take(),
                  (Log{store(std::string("set_time : set_time error : id : ") + printed + "\n"),
                       store(std::string("get_time : error : id : ") + printed + "\n")}));
    }
}

// A lock held for less than the store waits is waited out; one held longer fails the write.
TEST(set_time, WaitsForALockedDatabaseOnlySoLong) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    ASSERT_EQ(DurationDatabase().execute("INSERT INTO dlpInfo VALUES(108, 40)"), SQLITE_OK);
    const auto holdLock = [] {
        DurationDatabase holder;
        int begun = holder.execute("BEGIN EXCLUSIVE");
        usleep(300000);
        return begun + holder.execute("ROLLBACK");
    };
    // The reader, a fresh process, comes while the third holds the lock.
    const auto readLater = [] {
        usleep(50000);
        return get_time(108);
    };
    EXPECT_EQ(inProcesses({holdLock, readLater}), (Results{0, 40 << 8}));
    DurationDatabase holder;
    ASSERT_EQ(holder.execute("BEGIN IMMEDIATE"), SQLITE_OK);
    LogCapture log;
    EXPECT_EQ((Results{set_time(109, 2), get_time(109)}), (Results{1, 2}));
    EXPECT_EQ(log.take(), Log{store("set_time : SQL error: database is locked\n")});
    EXPECT_EQ(holder.execute("ROLLBACK"), SQLITE_OK);
    EXPECT_EQ(holder.rows("WHERE Id = 109"), Rows{});
}

// Two processes adding one new id at once, then rewriting one id beside a writer of others:
// never a second row, and a fresh process reads what a returned 0 promised.
TEST(set_time, ConcurrentWritersKeepOneRowPerId) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    for (int id = 140; id < 170; ++id) {
        EXPECT_EQ(inProcesses({[id] { return set_time(id, 1); }, [id] { return set_time(id, 2); }}),
                  (Results{0, 0}));
        EXPECT_EQ(DurationDatabase().rows("WHERE Id = " + std::to_string(id)).size(), 1u) << id;
    }
    for (int round = 1; round <= 5; ++round) {
        EXPECT_EQ(inProcesses({[round] { return storeEach(170, 170, round); },
                               [round] { return storeEach(171, 190, round); }}),
                  (Results{0, 0}));
        EXPECT_EQ(inProcesses({[] { return get_time(170); }}), Results{round << 8});
    }
    EXPECT_EQ(DurationDatabase().rows("WHERE Id = 170"), (Rows{{170, 5}}));
}

// Whichever allocation fails: a 0 is the new value alone on disk, a 1 the old one; a read in a
// fresh process gives the stored value or -1.
TEST(set_time, AFailedAllocationNeverAddsARow) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    ASSERT_TRUE(kFailingAllocator);
    for (int nth = 1, left = 0; left == 0; ++nth) {
        DurationDatabase().execute(
                "DELETE FROM dlpInfo WHERE Id<102; INSERT INTO dlpInfo VALUES(100,111),(101,33)");
        LogCapture log;
        allocationsToFailure = nth;
        int result = set_time(100, 222);
        left = std::exchange(allocationsToFailure, 0);
        EXPECT_EQ(DurationDatabase().rows("WHERE Id = 100"), (Rows{{100, result ? 111 : 222}}))
                << nth;
        int read = inProcesses({[nth] { return allocationsToFailure = nth, get_time(101); }})[0];
        EXPECT_TRUE(read == 33 << 8 || read == 255 << 8) << nth << ": " << (read >> 8);
    }
}

TEST(set_time, KilledAmidWritesLeavesOneRowPerId) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    ASSERT_EQ(inProcesses({[] { return storeEach(100, 199, 1111); }}), Results{0});
    for (int round = 1; round <= 10; ++round) {
        pid_t writer = fork();
        ASSERT_GE(writer, 0);
        while (writer == 0) storeEach(100, 199, 2222), storeEach(100, 199, 1111);
        usleep(round * 3000);
        kill(writer, SIGKILL);
        waitpid(writer, nullptr, 0);
        DurationDatabase database;
        // Every id once with either duration, as long as the file is whole.
        EXPECT_EQ(database.rows("WHERE (SELECT * FROM pragma_integrity_check) = 'ok' AND Time IN "
                                "(1111, 2222) GROUP BY Id HAVING COUNT(*) = 1")
                          .size(),
                  100u);
        EXPECT_EQ(database.rows().size(), 100u);
    }
    // The tests after this one start without a database.
    ASSERT_EQ(unlink(kDatabasePath), 0);
}

// What is not a regular file at its path is refused at once, never followed or waited for; its
// directory is its owner's alone whatever the umask.
TEST(init_table, RefusesWhatIsNotARegularFile) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    setenv("DATABASE", kDatabasePath, 1);
    for (const auto& [make, kind] :
         {std::pair("mkfifo $DATABASE", "a FIFO"), std::pair("mkdir $DATABASE", "a directory"),
          std::pair("ln -s elsewhere.db $DATABASE", "a symbolic link")}) {
        LogCapture log;
        EXPECT_EQ((Results{system(make), init_table(), remove(kDatabasePath)}), (Results{0, 1, 0}));
        EXPECT_EQ(log.take(), Log{store(std::string("init_table : ") + kDatabasePath + " is " +
                                        kind + ", not a database file\n")});
    }
    for (mode_t mask : {0777, 0}) {
        ASSERT_EQ(system("rm -r /data/system/users/dlp"), 0);
        mode_t old = umask(mask);
        EXPECT_EQ(init_table(), 0);
        umask(old);
        struct stat made {};
        EXPECT_EQ(stat("/data/system/users/dlp", &made) == 0 ? made.st_mode & 07777 : 0, 0700u);
    }
}

TEST(init_table, TakesAnExistingFileWithoutTheTableAsReady) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    // An empty file is an empty database.
    std::ofstream{kDatabasePath};
    LogCapture log;
    EXPECT_EQ((Results{init_table(), get_time(104), set_time(104, 5)}), (Results{0, -1, 0}));
    EXPECT_EQ(log.take(),
              (Log{store("get_time : Failed to execute statement: no such table: dlpInfo\n"),
                   store("get_time : No id in the list\n"),
                   store("set_time : id : 104, It is not in the table. add time as 5\n")}));
    EXPECT_EQ(DurationDatabase().rows(), (Rows{{104, 5}}));
    // A write the database refuses is a failure, its new value still cached.
    ASSERT_EQ(DurationDatabase().execute("CREATE TRIGGER refuse BEFORE INSERT ON dlpInfo BEGIN "
                                         "SELECT RAISE(ABORT, 'refused'); END"),
              SQLITE_OK);
    EXPECT_EQ((Results{set_time(106, 7), get_time(106)}), (Results{1, 7}));
    EXPECT_EQ(log.take().back(), store("set_time : SQL error: refused\n"));
    EXPECT_EQ(DurationDatabase().execute("DROP TRIGGER refuse"), SQLITE_OK);
}

// The database out of reach: a cached duration is still served, a write still reaches the
// cache, anything else fails.
TEST(init_table, ReportsADirectoryThatCannotBeCreated) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    ASSERT_EQ(set_time(101, 0), 0);
    ASSERT_EQ(mount("dlp-read-only", "/data/system/users", "tmpfs", MS_RDONLY, nullptr), 0);
    LogCapture log;
    EXPECT_EQ((Results{get_time(101), init_table(), set_expiryAfter_time(105, 60), get_time(105)}),
              (Results{0, 1, 1, 60}));
    EXPECT_EQ(umount2("/data/system/users", 0), 0);
    const LogRecord cannotCreate = store(
            "init_table : Cannot create directory /data/system/users/dlp: Read-only file system\n");
    const LogRecord cannotOpen =
            store("init_table: Cannot open database: unable to open database file\n");
    EXPECT_EQ(log.take(), (Log{cannotCreate, cannotOpen, cannotCreate, cannotOpen,
                               mainError("DLP_LOG : set id : 105, time : 60 is fail\n")}));
    // Room for the file but not for its table.
    ASSERT_EQ(mount("dlp-full", "/data/system/users", "tmpfs", 0, "size=4k"), 0);
    EXPECT_EQ((Results{init_table(), umount2("/data/system/users", 0)}), (Results{1, 0}));
    EXPECT_EQ(log.take(), Log{store("init_table : SQL error: database or disk is full\n")});
}

TEST(get_expiryAfter_time, StoredMinusOneIsAFailureAndZeroADuration) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    ASSERT_EQ(set_time(102, -1), 0);
    DurationDatabase database;
    ASSERT_EQ(database.execute("INSERT INTO dlpInfo VALUES(103, 0)"), SQLITE_OK);
    LogCapture log;
    EXPECT_EQ((Results{get_time(102), get_expiryAfter_time(102), get_expiryAfter_time(103)}),
              (Results{-1, 1, 0}));
    const int64_t now = time(nullptr), expiry = getITAdminExpiryTime(102);
    EXPECT_TRUE(expiry >= now + 1 && expiry <= time(nullptr) + 1) << expiry - now;
    EXPECT_EQ(log.take(), Log(2, mainError("DLP_LOG : get id : 102 is fail\n")));
    EXPECT_EQ(database.rows("WHERE Id = 102"), (Rows{{102, -1}}));
    // A stored -1 is never cached: the next read finds what replaced it.
    ASSERT_EQ(database.execute("UPDATE dlpInfo SET Time = 9 WHERE Id = 102"), SQLITE_OK);
    EXPECT_EQ(get_time(102), 9);
}

}  // namespace dlp::test
