#include "store/expiry_after_table.h"

#include <android-base/unique_fd.h>
#include <dlp_sdk/expiry_after_table.h>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <memory>

#include "primitives/platform_log.h"

namespace {

constexpr const char* kDatabaseDirectory = "/data/system/users/dlp";
constexpr const char* kDatabasePath = "/data/system/users/dlp/dlpinfo.db";
constexpr const char* kCreateTable = "CREATE TABLE IF NOT EXISTS dlpInfo(Id INT, Time INT);";
constexpr const char* kSelectDuration = "SELECT Id, Time FROM dlpInfo WHERE Id = ?";
constexpr int kFirstId = 100;
constexpr int kIdCount = 100;
constexpr int kEmptySlot = -1;
// What get_expiryAfter_time gives when no duration can be read: one second, failing closed.
constexpr int kUnreadableDuration = 1;
// Other processes share the file: a connection waits this long for their locks.
constexpr int kBusyTimeoutMilliseconds = 1000;

struct DatabaseCloser {
    void operator()(sqlite3* database) const { sqlite3_close(database); }
};
struct StatementFinalizer {
    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
struct SqliteFree {
    void operator()(char* text) const { sqlite3_free(text); }
};
using Database = std::unique_ptr<sqlite3, DatabaseCloser>;
using Statement = std::unique_ptr<sqlite3_stmt, StatementFinalizer>;
using SqliteText = std::unique_ptr<char, SqliteFree>;

constexpr std::array<int, kIdCount> emptyCache() {
    std::array<int, kIdCount> cache{};
    for (int& slot : cache) slot = kEmptySlot;
    return cache;
}

// Durations by id - 100; served without touching the database once filled.
std::array<int, kIdCount> expiry_after_cache GUARDED_BY(dlp::libraryLock) = emptyCache();

bool isValidId(int id) {
    return id >= kFirstId && id < kFirstId + kIdCount;
}

// id - 100 as the messages print it, wrapped as two's complement rather than overflowing.
int indexOf(int id) {
    return static_cast<int>(static_cast<unsigned int>(id) - static_cast<unsigned int>(kFirstId));
}

// `label` names the caller as its messages do ("init_table:", "set_time :", "get_time :").
Database openDatabase(const char* label) {
    sqlite3* handle = nullptr;
    int result = sqlite3_open_v2(kDatabasePath, &handle,
                                 SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOFOLLOW,
                                 nullptr);
    Database database(handle);
    if (result != SQLITE_OK) {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : %s Cannot open database: %s\n", label,
                          handle ? sqlite3_errmsg(handle) : sqlite3_errstr(result));
        return nullptr;
    }
    sqlite3_busy_timeout(database.get(), kBusyTimeoutMilliseconds);
    return database;
}

// The id's row, or a null statement when the query cannot be prepared (sqlite3_errmsg says why).
Statement selectDuration(sqlite3* database, int id) {
    sqlite3_stmt* handle = nullptr;
    int result = sqlite3_prepare_v2(database, kSelectDuration, -1, &handle, nullptr);
    Statement statement(handle);
    if (result != SQLITE_OK) return nullptr;
    sqlite3_bind_int(statement.get(), 1, id);
    return statement;
}

// Runs `sql`; on failure hands back sqlite's error text.
bool execute(sqlite3* database, const char* sql, SqliteText& error) {
    char* message = nullptr;
    int result = sqlite3_exec(database, sql, nullptr, nullptr, &message);
    error.reset(message);
    return result == SQLITE_OK;
}

// One write transaction, rolled back unless committed. IMMEDIATE takes the write lock before the
// look-up, so no other process can add the id's row between the look-up and the write.
class WriteTransaction {
  public:
    explicit WriteTransaction(sqlite3* database) : database_(database) {}
    ~WriteTransaction() {
        if (begun_) sqlite3_exec(database_, "ROLLBACK", nullptr, nullptr, nullptr);
    }
    WriteTransaction(const WriteTransaction&) = delete;
    WriteTransaction& operator=(const WriteTransaction&) = delete;

    bool begin(SqliteText& error) { return begun_ = execute(database_, "BEGIN IMMEDIATE", error); }
    bool commit(SqliteText& error) {
        if (!execute(database_, "COMMIT", error)) return false;
        begun_ = false;
        return true;
    }

  private:
    sqlite3* database_;
    bool begun_ = false;
};

// A copy of the connection's last error text, which its next call replaces.
SqliteText lastError(sqlite3* database) {
    return SqliteText(sqlite3_mprintf("%s", sqlite3_errmsg(database)));
}

// sqlite3_step's outcome for a look-up: a row, no row, or a failure whose text it hands back.
enum class LookUp { kRow, kNoRow, kFailed };

LookUp step(sqlite3* database, sqlite3_stmt* statement, SqliteText& error) {
    int result = sqlite3_step(statement);
    if (result == SQLITE_ROW) return LookUp::kRow;
    if (result == SQLITE_DONE) return LookUp::kNoRow;
    error = lastError(database);
    return LookUp::kFailed;
}

// What a file of this mode is, for the message that refuses it; null for a regular file.
const char* kindOfNonRegularFile(mode_t mode) {
    switch (mode & S_IFMT) {
        case S_IFREG:
            return nullptr;
        case S_IFDIR:
            return "a directory";
        case S_IFLNK:
            return "a symbolic link";
        case S_IFIFO:
            return "a FIFO";
        case S_IFSOCK:
            return "a socket";
        case S_IFCHR:
            return "a character device";
        case S_IFBLK:
            return "a block device";
    }
    return "of an unknown kind";
}

int initTableLocked() REQUIRES(dlp::libraryLock) {
    // What sits at the database path is looked at without following a link and opened without
    // waiting: a FIFO would otherwise hold the library lock for good.
    struct stat status {};
    if (lstat(kDatabasePath, &status) == 0) {
        if (const char* kind = kindOfNonRegularFile(status.st_mode)) {
            DLP_PRIMITIVE_LOG("DLP_LIBEPM : init_table : %s is %s, not a database file\n",
                              kDatabasePath, kind);
            return 1;
        }
        android::base::unique_fd existing(
                open(kDatabasePath, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
        if (existing.ok()) return 0;
    }
    if (mkdir(kDatabaseDirectory, 0700) == 0) {
        // The umask must not decide who may reach the durations.
        chmod(kDatabaseDirectory, 0700);
    } else if (errno != EEXIST) {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : init_table : Cannot create directory %s: %s\n",
                          kDatabaseDirectory, strerror(errno));
    }
    Database database = openDatabase("init_table:");
    if (!database) return 1;
    SqliteText error;
    if (!execute(database.get(), kCreateTable, error)) {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : init_table : SQL error: %s\n", error.get());
        return 1;
    }
    return 0;
}

}  // namespace

namespace dlp {

int setTimeLocked(int id, int time) {
    if (!isValidId(id)) {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : set_time : set_time error : id : %d, index : %d\n", id,
                          indexOf(id));
        return 1;
    }
    expiry_after_cache[id - kFirstId] = time;
    if (initTableLocked() == 1) return 1;
    Database database = openDatabase("set_time :");
    if (!database) return 1;
    // A crash between creating the file and its table leaves a file without the table; without
    // this, every later write would fail.
    SqliteText error;
    execute(database.get(), kCreateTable, error);

    // sqlite gives no text when it ran out of memory writing one.
    auto failed = [&error] {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : set_time : SQL error: %s\n",
                          error ? error.get() : "out of memory");
        return 1;
    };
    WriteTransaction transaction(database.get());
    if (!transaction.begin(error)) return failed();
    Statement select = selectDuration(database.get(), id);
    // A look-up that fails must not pass for a missing row: that would add a second row for the id.
    if (!select) {
        error = lastError(database.get());
        return failed();
    }
    LookUp found = step(database.get(), select.get(), error);
    SqliteText sql;
    if (found == LookUp::kRow) {
        sql.reset(sqlite3_mprintf("Update dlpInfo Set Time = %d Where Id = %d", time, id));
    } else if (found == LookUp::kNoRow) {
        DLP_PRIMITIVE_LOG(
                "DLP_LIBEPM : set_time : id : %d, It is not in the table. add time as %d\n", id,
                time);
        sql.reset(sqlite3_mprintf("INSERT INTO dlpInfo VALUES(%d, %d)", id, time));
    }
    if (found == LookUp::kFailed || !sql || !execute(database.get(), sql.get(), error) ||
        !transaction.commit(error)) {
        return failed();
    }
    return 0;
}

int getTimeLocked(int id) {
    if (!isValidId(id)) {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : get_time : error : id : %d, index : %d\n", id, indexOf(id));
        return -1;
    }
    int& slot = expiry_after_cache[id - kFirstId];
    if (slot != kEmptySlot) return slot;
    if (initTableLocked() == 1) return -1;
    Database database = openDatabase("get_time :");
    if (!database) return -1;
    Statement select = selectDuration(database.get(), id);
    if (!select) {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : get_time : Failed to execute statement: %s\n",
                          sqlite3_errmsg(database.get()));
    }
    SqliteText error;
    LookUp found = select ? step(database.get(), select.get(), error) : LookUp::kNoRow;
    if (found == LookUp::kRow) {
        slot = sqlite3_column_int(select.get(), 1);
        return slot;
    }
    if (found == LookUp::kFailed) {
        DLP_PRIMITIVE_LOG("DLP_LIBEPM : get_time : SQL error: %s\n", error.get());
        return -1;
    }
    DLP_PRIMITIVE_LOG("DLP_LIBEPM : get_time : No id in the list\n");
    return -1;
}

int expiryAfterTimeLocked(int id) {
    int result = getTimeLocked(id);
    if (result == -1) {
        DLP_PRIMITIVE_LOG("DLP_LOG : get id : %d is fail\n", id);
        return kUnreadableDuration;
    }
    return result;
}

int64_t adminExpiryTimeLocked(int id) {
    int64_t now = time(nullptr);
    return now + static_cast<int64_t>(expiryAfterTimeLocked(id));
}

}  // namespace dlp

int init_table() {
    dlp::LibraryLockGuard guard;
    return initTableLocked();
}

int set_time(int id, int time) {
    dlp::LibraryLockGuard guard;
    return dlp::setTimeLocked(id, time);
}

int get_time(int id) {
    dlp::LibraryLockGuard guard;
    return dlp::getTimeLocked(id);
}

int set_expiryAfter_time(int id, int time) {
    dlp::LibraryLockGuard guard;
    int result = dlp::setTimeLocked(id, time);
    if (result != 0) DLP_PRIMITIVE_LOG("DLP_LOG : set id : %d, time : %d is fail\n", id, time);
    return result;
}

int get_expiryAfter_time(int id) {
    dlp::LibraryLockGuard guard;
    return dlp::expiryAfterTimeLocked(id);
}

int64_t getITAdminExpiryTime(int id) {
    dlp::LibraryLockGuard guard;
    return dlp::adminExpiryTimeLocked(id);
}
