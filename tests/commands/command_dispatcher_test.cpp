#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/process_map.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <linux/magic.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/syscall.h>
#include <sys/time.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cctype>
#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "primitives/library_lock.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace {

using dlp::test::kDebug;
using dlp::test::kError;
using dlp::test::kMainBuffer;
using dlp::test::kSystemBuffer;
using dlp::test::LogCapture;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using Message = std::pair<int, std::string>;

constexpr const char* kAttribute = "user.zorvat_dlp";
constexpr const char* kDatabasePath = "/data/system/users/dlp/dlpinfo.db";
const std::string kPrefix = "DLP_LIBDLP : <handleDLPCommands> ";
constexpr size_t kLongestPath = 4095;

// Commands 2 and 3 reach the fixed database path: only ever the sandbox's private tmpfs.
bool insideSandbox() {
    struct statfs info {};
    return statfs("/data/system/users", &info) == 0 && info.f_type == TMPFS_MAGIC;
}

// A command vector as callers build it; argv[0] is never read.
int dispatch(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "dlp_command");
    std::vector<char*> argv;
    for (std::string& argument : arguments) argv.push_back(argument.data());
    argv.push_back(nullptr);
    return handleDLPCommands(static_cast<int>(arguments.size()), argv.data());
}

long wallClockSeconds() {
    timeval now{};
    gettimeofday(&now, nullptr);
    return now.tv_sec;
}

bool hasAttribute(const std::string& path) {
    return getxattr(path.c_str(), kAttribute, nullptr, 0) >= 0;
}

// The expiry in bytes 0-7 of the 16-byte attribute.
long storedExpiry(const std::string& path) {
    unsigned char value[32] = {};
    EXPECT_EQ(getxattr(path.c_str(), kAttribute, value, sizeof(value)), 16) << path;
    uint64_t bits = 0;
    for (int i = 0; i < 8; ++i) bits |= static_cast<uint64_t>(value[i]) << (8 * i);
    return static_cast<long>(bits);
}

void writeExpiry(const std::string& path, long expiry) {
    unsigned char value[16] = {};
    for (int i = 0; i < 8; ++i) value[i] = static_cast<unsigned char>(expiry >> (8 * i));
    ASSERT_EQ(setxattr(path.c_str(), kAttribute, value, sizeof(value), 0), 0) << path;
}

// Command 2 on `file`, which must then expire `duration` seconds after a clock reading around it.
void expectStampedAfter(const std::string& container, const std::string& file, long duration) {
    long before = time(nullptr);
    EXPECT_EQ(dispatch({"2", container, file, "5"}), 0);
    long after = time(nullptr);
    long expiry = storedExpiry(file);
    EXPECT_GE(expiry, before + duration) << container << " " << file;
    EXPECT_LE(expiry, after + duration) << container << " " << file;
}

std::vector<std::pair<int, int>> durationRows(int id) {
    std::vector<std::pair<int, int>> rows;
    sqlite3* database = nullptr;
    sqlite3_stmt* statement = nullptr;
    EXPECT_EQ(sqlite3_open_v2(kDatabasePath, &database, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
    sqlite3_prepare_v2(database, "SELECT Id, Time FROM dlpInfo WHERE Id = ?", -1, &statement,
                       nullptr);
    sqlite3_bind_int(statement, 1, id);
    while (sqlite3_step(statement) == SQLITE_ROW) {
        rows.emplace_back(sqlite3_column_int(statement, 0), sqlite3_column_int(statement, 1));
    }
    sqlite3_finalize(statement);
    sqlite3_close(database);
    return rows;
}

std::vector<int> recordedPids() {
    std::vector<int> pids;
    for (const auto& process : HashMap::mInternalProcessMap) pids.push_back(process.first);
    return pids;
}

// Runs `call` on another thread while this one holds the library lock, and `whileHeld` here once
// that thread sleeps on a futex. True when the call waited for the lock instead of finishing.
bool waitsForLibraryLock(const std::function<void()>& call,
                         const std::function<void()>& whileHeld) {
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

class CommandDispatcherTest : public ::testing::Test {
  protected:
    void SetUp() override {
        if (!insideSandbox()) GTEST_SKIP() << "needs the private /data of tools/dlp-sandbox";
        dlp::test::resetProcessMap();
        // No "." in the directory: the extension rules look at the whole path.
        char pattern[] = "/tmp/command_dispatcher_test_XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        directory_ = pattern;
        log_.clear();
    }
    void TearDown() override {
        if (!directory_.empty()) std::filesystem::remove_all(directory_);
        dlp::test::resetProcessMap();
    }

    std::string createFile(const std::string& name) {
        std::string path = directory_ + "/" + name;
        std::ofstream(path) << "content";
        EXPECT_EQ(access(path.c_str(), F_OK), 0) << path;
        return path;
    }

    // Messages since the last call, all on the system buffer, where the dispatcher writes.
    std::vector<Message> takeMessages() {
        for (const dlp::test::LogRecord& record : log_.records()) {
            EXPECT_EQ(record.buffer, kSystemBuffer) << record.text;
        }
        return takeSystemMessages();
    }
    // The same, leaving out the main buffer, where the store and the attribute write.
    std::vector<Message> takeSystemMessages() {
        std::vector<Message> messages;
        for (const dlp::test::LogRecord& record : log_.records()) {
            if (record.buffer == kSystemBuffer) messages.emplace_back(record.priority, record.text);
        }
        log_.clear();
        return messages;
    }

    // A refused vector: one error on the system buffer and nothing else.
    void expectOneErrorOnly() {
        std::vector<dlp::test::LogRecord> records = log_.records();
        ASSERT_EQ(records.size(), 1u);
        EXPECT_EQ(records[0].buffer, kSystemBuffer);
        EXPECT_EQ(records[0].priority, kError);
        log_.clear();
    }

    LogCapture log_;
    std::string directory_;
};

TEST_F(CommandDispatcherTest, RefusesVectorWithoutCommandNumber) {
    char name[] = "dlp_command";
    char* argv[] = {name, nullptr};
    EXPECT_EQ(handleDLPCommands(0, argv), -1);
    EXPECT_EQ(handleDLPCommands(1, argv), -1);
    const std::string fatal = kPrefix +
                              "FATAL: argument passed should at least contain the command type. "
                              "number of arguments passed = ";
    EXPECT_THAT(takeMessages(), ElementsAre(Pair(kError, fatal + "0"), Pair(kError, fatal + "1")));
}

TEST_F(CommandDispatcherTest, IgnoresUnknownCommandNumbersSilently) {
    EXPECT_EQ(dispatch({"0", "100", "1"}), -1);
    EXPECT_EQ(dispatch({"7", "100", "1"}), -1);
    EXPECT_EQ(dispatch({"abc", "100", "1"}), -1);
    EXPECT_EQ(dispatch({"-6", "100", "1"}), -1);
    EXPECT_THAT(log_.records(), IsEmpty());
    EXPECT_EQ(getDLPAuditLogState(), 0);
}

TEST_F(CommandDispatcherTest, RequiresExactArgumentCount) {
    std::string file = createFile("counted.pdf");
    EXPECT_EQ(dispatch({"1", "4242", "extra"}), -1);
    EXPECT_EQ(dispatch({"1"}), -1);
    EXPECT_EQ(dispatch({"2", "100", file}), -1);
    EXPECT_EQ(dispatch({"4", "0", "4242", file, "extra"}), -1);
    EXPECT_EQ(dispatch({"3", "100", "60", "extra"}), -1);
    EXPECT_EQ(dispatch({"5", "0"}), -1);
    EXPECT_EQ(dispatch({"6", "100", "1", "extra", "more"}), -1);

    const std::string given = kPrefix + "FATAL: adifferent number of paramerter given ";
    EXPECT_THAT(takeMessages(), ElementsAre(Pair(kError, given + "[4] != expected 3"),
                                            Pair(kError, given + "[2] != expected 3"),
                                            Pair(kError, given + "[4] != expected 5"),
                                            Pair(kError, given + "[6] != expected 5"),
                                            Pair(kError, given + "[5] != expected 4"),
                                            Pair(kError, given + "[3] != expected 4"),
                                            Pair(kError, given + "[6] != expected 4")));
    EXPECT_FALSE(hasAttribute(file));
    EXPECT_THAT(HashMap::mInternalProcessMap, IsEmpty());
    EXPECT_EQ(getDLPAuditLogState(), 0);
}

TEST_F(CommandDispatcherTest, RefusesNullArguments) {
    char name[] = "dlp_command", six[] = "6", five[] = "5", four[] = "4", zero[] = "0",
         container[] = "100", state[] = "1", pid[] = "4242";
    EXPECT_EQ(handleDLPCommands(4, nullptr), -1);
    expectOneErrorOnly();
    char* noCommand[] = {name, nullptr, container, state};
    EXPECT_EQ(handleDLPCommands(4, noCommand), -1);
    expectOneErrorOnly();
    char* noState[] = {name, six, container, nullptr};
    EXPECT_EQ(handleDLPCommands(4, noState), -1);
    expectOneErrorOnly();
    char* noList[] = {name, five, zero, nullptr};
    EXPECT_EQ(handleDLPCommands(4, noList), -1);
    expectOneErrorOnly();
    char* noPath[] = {name, four, zero, pid, nullptr};
    EXPECT_EQ(handleDLPCommands(5, noPath), -1);
    expectOneErrorOnly();
    EXPECT_EQ(getDLPAuditLogState(), 0);
    EXPECT_THAT(mProcessMap.mExtensionList, IsEmpty());
    EXPECT_THAT(HashMap::mInternalProcessMap, IsEmpty());

    char* noName[] = {nullptr, six, container, state};
    EXPECT_EQ(handleDLPCommands(4, noName), 0);
    EXPECT_EQ(getDLPAuditLogState(), 1);
}

TEST_F(CommandDispatcherTest, RemoveCommandForgetsProcess) {
    HashMap::mInternalProcessMap[4242] = {MapEntry{4242, "pdf", 2000000000, 1700000000}};
    HashMap::mInternalProcessMap[4343] = {MapEntry{4343, "doc", 2000000000, 1700000000}};
    mProcessMap.mRejectList[4242] = "com.example.rejected";
    mProcessMap.mFileManagerPid = 4242;

    EXPECT_EQ(dispatch({"1", "4242"}), 0);
    EXPECT_THAT(recordedPids(), ElementsAre(4343));
    EXPECT_THAT(mProcessMap.mRejectList, IsEmpty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
    EXPECT_EQ(dispatch({"1", "4242"}), 0);
    EXPECT_THAT(recordedPids(), ElementsAre(4343));
    EXPECT_THAT(takeMessages(),
                ElementsAre(Pair(kDebug, "DLP_LIBDLP : <HashMap::remove> key[4242]"),
                            Pair(kDebug, "DLP_LIBDLP : <HashMap::remove> key[4242]")));
}

TEST_F(CommandDispatcherTest, StampCommandWritesGivenExpiryForListedExtension) {
    std::string file = createFile("Report.PDF");
    const std::pair<const char*, long> cases[] = {
            {"1893456000", 1893456000},       {"0", 0},     {"-5", -5},
            {"4294967296000", 4294967296000}, {"0x10", 16}, {"010", 8},
    };
    for (const auto& [text, expiry] : cases) {
        EXPECT_EQ(dispatch({"2", "100", file, text}), 0) << text;
        EXPECT_EQ(storedExpiry(file), expiry) << text;
        EXPECT_THAT(takeSystemMessages(), ElementsAre(Pair(kDebug, kPrefix + "setxattr OK\n")))
                << text;
    }

    std::string missing = directory_ + "/missing.pdf";
    EXPECT_EQ(dispatch({"2", "100", missing, "5"}), -1);
    EXPECT_THAT(takeSystemMessages(),
                ElementsAre(Pair(kError, kPrefix + "Error: setxattr failed with error -1\n")));
}

TEST_F(CommandDispatcherTest, StampCommandUsesContainerDurationForUnlistedExtension) {
    ASSERT_EQ(set_expiryAfter_time(120, 3600), 0);
    std::string file = createFile("notes.xyz");
    const std::string notValid =
            kPrefix + "extension passed is not valid. setting IT Admin set Expiry";

    expectStampedAfter("120", file, 3600);
    EXPECT_THAT(takeSystemMessages(),
                ElementsAre(Pair(kError, notValid), Pair(kDebug, kPrefix + "setxattr OK\n")));

    // No duration stored, or an id the store refuses: one second.
    for (const std::string container : {"121", "99", "200"}) {
        expectStampedAfter(container, file, 1);
        EXPECT_TRUE(log_.contains(kMainBuffer, kError,
                                  "DLP_LOG : get id : " + container + " is fail\n"));
        EXPECT_THAT(takeSystemMessages(),
                    ElementsAre(Pair(kError, notValid), Pair(kDebug, kPrefix + "setxattr OK\n")));
    }
}

TEST_F(CommandDispatcherTest, StampCommandTakesExtensionAfterLastDotOfWholePath) {
    ASSERT_EQ(set_expiryAfter_time(123, 7200), 0);
    ASSERT_EQ(mkdir((directory_ + "/dir.v2").c_str(), 0700), 0);
    std::string inDottedDirectory = createFile("dir.v2/file");
    std::string withoutDot = createFile("README");
    std::string wholePathLowered = withoutDot;
    for (char& byte : wholePathLowered) byte = static_cast<char>(tolower(byte));

    expectStampedAfter("123", inDottedDirectory, 7200);
    expectStampedAfter("123", withoutDot, 7200);

    ASSERT_EQ(dispatch({"5", "0", "v2/file," + wholePathLowered}), 0);
    for (const std::string& file : {inDottedDirectory, withoutDot}) {
        EXPECT_EQ(dispatch({"2", "123", file, "777"}), 0) << file;
        EXPECT_EQ(storedExpiry(file), 777) << file;
    }
}

TEST_F(CommandDispatcherTest, ExpiryAfterCommandStoresDuration) {
    EXPECT_EQ(dispatch({"3", "130", "7200"}), 0);
    EXPECT_THAT(durationRows(130), ElementsAre(Pair(130, 7200)));
    EXPECT_EQ(dispatch({"3", "130", "60"}), 0);
    EXPECT_THAT(durationRows(130), ElementsAre(Pair(130, 60)));
    EXPECT_EQ(get_expiryAfter_time(130), 60);
    EXPECT_THAT(takeSystemMessages(),
                ElementsAre(Pair(kDebug, kPrefix + "set_expiryAfter_time OK\n"),
                            Pair(kDebug, kPrefix + "set_expiryAfter_time OK\n")));

    const Message failed(kError, kPrefix + "Error: set_expiryAfter_time failed with error 1\n");
    EXPECT_EQ(dispatch({"3", "99", "7200"}), -1);
    EXPECT_TRUE(log_.contains(kMainBuffer, kError, "DLP_LOG : set id : 99, time : 7200 is fail\n"));
    EXPECT_THAT(takeSystemMessages(), ElementsAre(failed));

    // A write that the database refuses fails the same way.
    sqlite3* holder = nullptr;
    ASSERT_EQ(sqlite3_open(kDatabasePath, &holder), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(holder, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr), SQLITE_OK);
    EXPECT_EQ(dispatch({"3", "131", "5"}), -1);
    sqlite3_exec(holder, "ROLLBACK", nullptr, nullptr, nullptr);
    sqlite3_close(holder);
    EXPECT_THAT(takeSystemMessages(), ElementsAre(failed));
    EXPECT_THAT(durationRows(131), IsEmpty());
}

TEST_F(CommandDispatcherTest, FileOpenCommandRecordsProtectedFile) {
    std::string file = createFile("Budget.PDF");
    long expiry = time(nullptr) + 3600;
    writeExpiry(file, expiry);

    long before = wallClockSeconds();
    EXPECT_EQ(dispatch({"4", "777", "5151", file}), 0);
    long after = wallClockSeconds();
    ASSERT_THAT(recordedPids(), ElementsAre(5151));
    const std::vector<MapEntry>& entries = HashMap::mInternalProcessMap[5151];
    ASSERT_EQ(entries.size(), 1u);
    EXPECT_EQ(entries[0].value_pid, 5151);
    EXPECT_EQ(entries[0].value_extension, "pdf");
    EXPECT_EQ(entries[0].value_expiry, expiry);
    EXPECT_GE(entries[0].value_opentime, before);
    EXPECT_LE(entries[0].value_opentime, after);
    std::vector<Message> messages = takeSystemMessages();
    ASSERT_FALSE(messages.empty());
    EXPECT_EQ(messages.back(), Message(kDebug, kPrefix + "addOrUpdateMapEntry OK\n"));
    EXPECT_EQ(std::count_if(messages.begin(), messages.end(),
                            [](const Message& message) { return message.first == kError; }),
              0);

    // Unprotected, expired or missing files are reported fine and recorded nowhere.
    std::string expired = createFile("expired.pdf");
    writeExpiry(expired, time(nullptr) - 60);
    for (const std::string& path :
         {createFile("plain.pdf"), expired, directory_ + "/missing.pdf"}) {
        EXPECT_EQ(dispatch({"4", "0", "5252", path}), 0) << path;
        EXPECT_EQ(takeSystemMessages().back(),
                  Message(kDebug, kPrefix + "addOrUpdateMapEntry OK\n"));
    }
    EXPECT_THAT(recordedPids(), ElementsAre(5151));
}

TEST_F(CommandDispatcherTest, ExtensionListCommandReplacesList) {
    const std::vector<std::string> defaults = mProcessMap.mDefaultExtensions;
    const auto groups = mProcessMap.mExtensionGroups;

    EXPECT_EQ(dispatch({"5", "0", "pdf,abc,abc"}), 0);
    EXPECT_THAT(mProcessMap.mExtensionList, ElementsAre("abc"));
    EXPECT_THAT(takeMessages(),
                ElementsAre(Pair(kDebug, kPrefix + "Extension recieved : pdf,abc,abc\n")));

    EXPECT_EQ(dispatch({"5", "ignored", "one,two,"}), 0);
    EXPECT_THAT(mProcessMap.mExtensionList, ElementsAre("one", "two", ""));

    log_.clear();
    EXPECT_EQ(dispatch({"5", "0", ""}), 0);
    EXPECT_THAT(mProcessMap.mExtensionList, IsEmpty());
    EXPECT_THAT(
            takeMessages(),
            ElementsAre(Pair(kDebug, kPrefix + "Extension recieved : \n"),
                        Pair(kError, "DLP_LIBDLP : <getExtensions> extention list is empty \n")));
    EXPECT_EQ(mProcessMap.mDefaultExtensions, defaults);
    EXPECT_EQ(mProcessMap.mExtensionGroups, groups);
}

TEST_F(CommandDispatcherTest, ExtensionListCommandRefusesListOf1000BytesOrMore) {
    std::string list;
    for (int i = 0; i < 200; ++i) list += (i == 0 ? "" : ",") + std::to_string(1000 + i);
    ASSERT_EQ(list.size(), 999u);

    EXPECT_EQ(dispatch({"5", "0", list}), 0);
    ASSERT_EQ(mProcessMap.mExtensionList.size(), 200u);
    EXPECT_EQ(mProcessMap.mExtensionList.back(), "1199");
    log_.clear();

    EXPECT_EQ(dispatch({"5", "0", list + ","}), -1);
    expectOneErrorOnly();
    EXPECT_EQ(dispatch({"5", "0", std::string(5000, 'x')}), -1);
    expectOneErrorOnly();
    ASSERT_EQ(mProcessMap.mExtensionList.size(), 200u);
    EXPECT_EQ(mProcessMap.mExtensionList.back(), "1199");
}

TEST_F(CommandDispatcherTest, PathCommandsRefusePathOf4096BytesOrMore) {
    // Nested directories, each name far below the 255-byte limit, lead to 4095-byte paths.
    std::string deep = directory_;
    while (kLongestPath - deep.size() > 220) {
        deep += "/" + std::string(200, 'd');
        ASSERT_EQ(mkdir(deep.c_str(), 0700), 0);
    }
    const size_t nameLength = kLongestPath - deep.size() - 1 - 4;
    std::string stamped = deep + "/" + std::string(nameLength, 's') + ".pdf";
    std::string untouched = deep + "/" + std::string(nameLength, 'u') + ".pdf";
    ASSERT_EQ(stamped.size(), kLongestPath);
    std::ofstream(stamped) << "content";
    std::ofstream(untouched) << "content";
    long expiry = time(nullptr) + 3600;

    EXPECT_EQ(dispatch({"2", "100", stamped, std::to_string(expiry)}), 0);
    EXPECT_EQ(storedExpiry(stamped), expiry);
    EXPECT_EQ(dispatch({"4", "0", "6161", stamped}), 0);
    EXPECT_THAT(recordedPids(), ElementsAre(6161));
    log_.clear();

    // Cut to 4095 bytes, these would name the two files above.
    EXPECT_EQ(dispatch({"2", "100", untouched + "x", "5"}), -1);
    expectOneErrorOnly();
    EXPECT_FALSE(hasAttribute(untouched));
    EXPECT_EQ(dispatch({"4", "0", "6262", stamped + "x"}), -1);
    expectOneErrorOnly();
    EXPECT_EQ(dispatch({"2", "100", std::string(5000, 'p'), "5"}), -1);
    expectOneErrorOnly();
    EXPECT_THAT(recordedPids(), ElementsAre(6161));
}

TEST_F(CommandDispatcherTest, LogStateCommandSetsAuditLogState) {
    EXPECT_EQ(dispatch({"6", "140", "1"}), 0);
    EXPECT_EQ(getDLPAuditLogState(), 1);
    EXPECT_EQ(dispatch({"6", "abc", "0"}), 0);
    EXPECT_EQ(getDLPAuditLogState(), 0);
    const std::string command = kPrefix + "setDLPExpiryAfter command ";
    EXPECT_THAT(takeMessages(),
                ElementsAre(Pair(kDebug, command + "[ContainerId = 140, logState = 1]"),
                            Pair(kDebug, command + "[ContainerId = 0, logState = 0]")));
}

TEST_F(CommandDispatcherTest, WaitsForLibraryLock) {
    int result = -2;
    auto setLogState = [&] { result = dispatch({"6", "100", "1"}); };
    EXPECT_TRUE(waitsForLibraryLock(setLogState, [] { EXPECT_EQ(getDLPAuditLogState(), 0); }));
    EXPECT_EQ(result, 0);
    EXPECT_EQ(getDLPAuditLogState(), 1);

    auto setList = [&] { result = dispatch({"5", "0", "abc"}); };
    EXPECT_TRUE(waitsForLibraryLock(setList,
                                    [] { EXPECT_THAT(mProcessMap.mExtensionList, IsEmpty()); }));
    EXPECT_THAT(mProcessMap.mExtensionList, ElementsAre("abc"));
}

}  // namespace
