#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/process_map.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cctype>
#include <ctime>
#include <string>
#include <utility>
#include <vector>

#include "support/command_vector.h"
#include "support/duration_database.h"
#include "support/expiry_attribute_bytes.h"
#include "support/library_lock_probe.h"
#include "support/library_messages.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

// What the called units log is their own tests' business; these tests check the dispatcher's.
const std::string kPrefix = "DLP_LIBDLP : <handleDLPCommands> ";
constexpr size_t kLongestPath = 4095;

LogRecord dispatcherDebug(const std::string& text) {
    return systemDebug(kPrefix + text);
}
LogRecord dispatcherError(const std::string& text) {
    return systemError(kPrefix + text);
}

std::vector<int> recordedPids() {
    std::vector<int> pids;
    for (const auto& process : HashMap::mInternalProcessMap) pids.push_back(process.first);
    return pids;
}

class CommandDispatcherTest : public ::testing::Test {
  protected:
    // Commands 2 and 3 reach the fixed database path.
    void SetUp() override { SKIP_UNLESS_DATABASE_IS_THROWAWAY(); }

    FreshProcessMap map_;
    ScratchDirectory directory_;
    LogCapture log_;
};

TEST_F(CommandDispatcherTest, RefusesVectorWithoutCommandNumber) {
    char name[] = "dlp_command";
    char* argv[] = {name, nullptr};
    EXPECT_EQ(handleDLPCommands(0, argv), -1);
    EXPECT_EQ(handleDLPCommands(1, argv), -1);
    const std::string fatal =
            "FATAL: argument passed should at least contain the command type. number of "
            "arguments passed = ";
    expectRecords(log_, {dispatcherError(fatal + "0"), dispatcherError(fatal + "1")});
}

TEST_F(CommandDispatcherTest, IgnoresUnknownCommandNumbersSilently) {
    for (const char* command : {"0", "7", "abc", "-6"}) {
        EXPECT_EQ(runCommand({command, "100", "1"}), -1) << command;
    }
    expectRecords(log_, {});
    EXPECT_EQ(getDLPAuditLogState(), 0);
}

TEST_F(CommandDispatcherTest, RequiresExactArgumentCount) {
    std::string file = directory_.file("counted.pdf");
    EXPECT_EQ(runCommand({"1", "4242", "extra"}), -1);
    EXPECT_EQ(runCommand({"1"}), -1);
    EXPECT_EQ(runCommand({"2", "100", file}), -1);
    EXPECT_EQ(runCommand({"4", "0", "4242", file, "extra"}), -1);
    EXPECT_EQ(runCommand({"3", "100", "60", "extra"}), -1);
    EXPECT_EQ(runCommand({"5", "0"}), -1);
    EXPECT_EQ(runCommand({"6", "100", "1", "extra", "more"}), -1);

    const std::string given = "FATAL: adifferent number of paramerter given ";
    expectRecords(log_, {dispatcherError(given + "[4] != expected 3"),
                         dispatcherError(given + "[2] != expected 3"),
                         dispatcherError(given + "[4] != expected 5"),
                         dispatcherError(given + "[6] != expected 5"),
                         dispatcherError(given + "[5] != expected 4"),
                         dispatcherError(given + "[3] != expected 4"),
                         dispatcherError(given + "[6] != expected 4")});
    EXPECT_EQ(readExpiryAttribute(file), std::nullopt);
    EXPECT_THAT(HashMap::mInternalProcessMap, IsEmpty());
    EXPECT_EQ(getDLPAuditLogState(), 0);
}

TEST_F(CommandDispatcherTest, RefusesNullArguments) {
    char name[] = "dlp_command", six[] = "6", five[] = "5", four[] = "4", zero[] = "0",
         container[] = "100", state[] = "1", pid[] = "4242";
    char* noCommand[] = {name, nullptr, container, state};
    char* noState[] = {name, six, container, nullptr};
    char* noList[] = {name, five, zero, nullptr};
    char* noPath[] = {name, four, zero, pid, nullptr};
    EXPECT_EQ(handleDLPCommands(4, nullptr), -1);
    EXPECT_EQ(handleDLPCommands(4, noCommand), -1);
    EXPECT_EQ(handleDLPCommands(4, noState), -1);
    EXPECT_EQ(handleDLPCommands(4, noList), -1);
    EXPECT_EQ(handleDLPCommands(5, noPath), -1);
    expectRecords(log_, {dispatcherError("FATAL: argument vector is null"),
                         dispatcherError("FATAL: argument [1] is null"),
                         dispatcherError("FATAL: argument [3] is null"),
                         dispatcherError("FATAL: argument [3] is null"),
                         dispatcherError("FATAL: argument [4] is null")});
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
    EXPECT_EQ(runCommand({"1", "4242"}), 0);
    // A pid without records as well.
    EXPECT_EQ(runCommand({"1", "4242"}), 0);
    EXPECT_THAT(recordedPids(), ElementsAre(4343));
    expectRecords(log_, {removeMessage(4242), removeMessage(4242)});
}

TEST_F(CommandDispatcherTest, StampCommandWritesGivenExpiryForListedExtension) {
    std::string file = directory_.file("Report.PDF");
    const std::pair<const char*, long> cases[] = {
            {"1893456000", 1893456000},       {"0", 0},     {"-5", -5},
            {"4294967296000", 4294967296000}, {"0x10", 16}, {"010", 8},
    };
    for (const auto& [text, expiry] : cases) {
        EXPECT_EQ(runCommand({"2", "100", file, text}), 0) << text;
        EXPECT_EQ(readExpiryAttribute(file), expiry) << text;
        expectRecords(log_, kPrefix, {dispatcherDebug("setxattr OK\n")});
    }

    EXPECT_EQ(runCommand({"2", "100", directory_.path() + "/missing.pdf", "5"}), -1);
    expectRecords(log_, kPrefix, {dispatcherError("Error: setxattr failed with error -1\n")});
}

TEST_F(CommandDispatcherTest, StampCommandUsesContainerDurationForUnlistedExtension) {
    ASSERT_EQ(set_expiryAfter_time(120, 3600), 0);
    std::string file = directory_.file("notes.xyz");
    // No duration stored, or an id the store refuses: one second.
    const std::pair<const char*, long> cases[] = {{"120", 3600}, {"121", 1}, {"99", 1}, {"200", 1}};
    for (const auto& [container, duration] : cases) {
        long before = time(nullptr);
        EXPECT_EQ(runCommand({"2", container, file, "5"}), 0);
        long after = time(nullptr);
        long expiry = readExpiryAttribute(file).value_or(-1);
        EXPECT_GE(expiry, before + duration) << container;
        EXPECT_LE(expiry, after + duration) << container;
        expectRecords(
                log_, kPrefix,
                {dispatcherError("extension passed is not valid. setting IT Admin set Expiry"),
                 dispatcherDebug("setxattr OK\n")});
    }
}

TEST_F(CommandDispatcherTest, StampCommandTakesExtensionAfterLastDotOfWholePath) {
    std::string inDottedDirectory = directory_.file("dir.v2/file");
    std::string withoutDot = directory_.file("README");
    std::string wholePathLowered = withoutDot;
    for (char& byte : wholePathLowered) byte = static_cast<char>(tolower(byte));

    ASSERT_EQ(runCommand({"5", "0", "v2/file," + wholePathLowered}), 0);
    for (const std::string& file : {inDottedDirectory, withoutDot}) {
        EXPECT_EQ(runCommand({"2", "123", file, "777"}), 0) << file;
        EXPECT_EQ(readExpiryAttribute(file), 777) << file;
    }
    EXPECT_THAT(log_.matching("not valid"), IsEmpty());
}

TEST_F(CommandDispatcherTest, ExpiryAfterCommandStoresDuration) {
    EXPECT_EQ(runCommand({"3", "130", "7200"}), 0);
    EXPECT_THAT(DurationDatabase().rowsOf(130), ElementsAre(Pair(130, 7200)));
    EXPECT_EQ(get_expiryAfter_time(130), 7200);
    EXPECT_EQ(runCommand({"3", "99", "7200"}), -1);
    expectRecords(log_, kPrefix,
                  {dispatcherDebug("set_expiryAfter_time OK\n"),
                   dispatcherError("Error: set_expiryAfter_time failed with error 1\n")});
}

TEST_F(CommandDispatcherTest, FileOpenCommandRecordsProtectedFile) {
    long expiry = time(nullptr) + 3600;
    std::string file = directory_.stampedFile("Budget.PDF", expiry);
    // argv[2] is not read.
    EXPECT_EQ(runCommand({"4", "777", "5151", file}), 0);
    ASSERT_THAT(recordedPids(), ElementsAre(5151));
    EXPECT_EQ(HashMap::mInternalProcessMap[5151].back().value_expiry, expiry);

    // Unprotected or missing files are reported fine and recorded nowhere.
    EXPECT_EQ(runCommand({"4", "0", "5252", directory_.file("plain.pdf")}), 0);
    EXPECT_EQ(runCommand({"4", "0", "5252", directory_.path() + "/missing.pdf"}), 0);
    EXPECT_THAT(recordedPids(), ElementsAre(5151));
    const LogRecord ok = dispatcherDebug("addOrUpdateMapEntry OK\n");
    expectRecords(log_, kPrefix, {ok, ok, ok});
}

TEST_F(CommandDispatcherTest, ExtensionListCommandReplacesList) {
    const std::vector<std::string> defaults = mProcessMap.mDefaultExtensions;
    const auto groups = mProcessMap.mExtensionGroups;

    // Emptied first; pdf is built in and the second abc already listed.
    EXPECT_EQ(runCommand({"5", "0", "def"}), 0);
    EXPECT_EQ(runCommand({"5", "ignored", "pdf,abc,abc"}), 0);
    EXPECT_THAT(mProcessMap.mExtensionList, ElementsAre("abc"));
    EXPECT_EQ(runCommand({"5", "0", ""}), 0);
    EXPECT_THAT(mProcessMap.mExtensionList, IsEmpty());
    const std::string received = "Extension recieved : ";
    expectRecords(log_,
                  {dispatcherDebug(received + "def\n"), dispatcherDebug(received + "pdf,abc,abc\n"),
                   dispatcherDebug(received + "\n"), emptyExtensionListMessage()});
    EXPECT_EQ(mProcessMap.mDefaultExtensions, defaults);
    EXPECT_EQ(mProcessMap.mExtensionGroups, groups);
}

TEST_F(CommandDispatcherTest, ExtensionListCommandRefusesListOf1000BytesOrMore) {
    std::string list;
    for (int i = 0; i < 200; ++i) list += (i == 0 ? "" : ",") + std::to_string(1000 + i);
    ASSERT_EQ(list.size(), 999u);
    EXPECT_EQ(runCommand({"5", "0", list}), 0);
    log_.clear();

    EXPECT_EQ(runCommand({"5", "0", list + ","}), -1);
    EXPECT_EQ(runCommand({"5", "0", std::string(5000, 'x')}), -1);
    const LogRecord tooLong =
            dispatcherError("FATAL: extension list of 1000 bytes or more is too long");
    expectRecords(log_, {tooLong, tooLong});
    ASSERT_EQ(mProcessMap.mExtensionList.size(), 200u);
    EXPECT_EQ(mProcessMap.mExtensionList.back(), "1199");
}

TEST_F(CommandDispatcherTest, PathCommandsRefusePathOf4096BytesOrMore) {
    // Nested directories, each name far below the 255-byte limit, lead to 4095-byte paths.
    std::string name;
    auto room = [&] { return kLongestPath - directory_.path().size() - 1 - name.size(); };
    while (room() > 220) name += std::string(200, 'd') + "/";
    name += std::string(room() - 4, 'n');
    std::string stamped = directory_.file(name + ".pdf");
    std::string untouched = directory_.file(name + ".PDF");
    ASSERT_EQ(stamped.size(), kLongestPath);
    long expiry = time(nullptr) + 3600;

    EXPECT_EQ(runCommand({"2", "100", stamped, std::to_string(expiry)}), 0);
    EXPECT_EQ(readExpiryAttribute(stamped), expiry);
    EXPECT_EQ(runCommand({"4", "0", "6161", stamped}), 0);
    EXPECT_THAT(recordedPids(), ElementsAre(6161));
    log_.clear();

    // Cut to 4095 bytes, these would name the two files above.
    EXPECT_EQ(runCommand({"2", "100", untouched + "x", "5"}), -1);
    EXPECT_EQ(runCommand({"4", "0", "6262", stamped + "x"}), -1);
    EXPECT_EQ(runCommand({"2", "100", std::string(5000, 'p'), "5"}), -1);
    const LogRecord tooLong = dispatcherError("FATAL: file path of 4096 bytes or more is too long");
    expectRecords(log_, {tooLong, tooLong, tooLong});
    EXPECT_EQ(readExpiryAttribute(untouched), std::nullopt);
    EXPECT_THAT(recordedPids(), ElementsAre(6161));
}

TEST_F(CommandDispatcherTest, LogStateCommandSetsAuditLogState) {
    EXPECT_EQ(runCommand({"6", "140", "1"}), 0);
    EXPECT_EQ(getDLPAuditLogState(), 1);
    EXPECT_EQ(runCommand({"6", "abc", "0"}), 0);
    EXPECT_EQ(getDLPAuditLogState(), 0);
    const std::string command = "setDLPExpiryAfter command ";
    expectRecords(log_, {dispatcherDebug(command + "[ContainerId = 140, logState = 1]"),
                         dispatcherDebug(command + "[ContainerId = 0, logState = 0]")});
}

TEST_F(CommandDispatcherTest, WaitsForLibraryLock) {
    int result = -2;
    auto setLogState = [&] { result = runCommand({"6", "100", "1"}); };
    EXPECT_TRUE(waitsForLibraryLock(setLogState, [] { EXPECT_EQ(mProcessMap.mLogState, 0); }));
    EXPECT_EQ(result, 0);
    EXPECT_EQ(getDLPAuditLogState(), 1);

    auto setList = [&] { result = runCommand({"5", "0", "abc"}); };
    EXPECT_TRUE(waitsForLibraryLock(setList,
                                    [] { EXPECT_THAT(mProcessMap.mExtensionList, IsEmpty()); }));
    EXPECT_THAT(mProcessMap.mExtensionList, ElementsAre("abc"));
}

}  // namespace
}  // namespace dlp::test
