#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/process_map.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <vector>

#include "support/command_vector.h"
#include "support/duration_database.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

const std::string kFatal = "DLP_LIBDLP : <handleDLPCommands> FATAL: ";

// The dispatcher's own messages; the callees' are their own tests' business.
std::vector<LogRecord> dispatcherMessages(LogCapture& log) {
    std::vector<LogRecord> own;
    for (LogRecord& record : log.take()) {
        if (record.text.find("<handleDLPCommands>") != std::string::npos) own.push_back(record);
    }
    return own;
}

TEST(handleDLPCommands, RefusesMalformedVectorsAndChangesNothing) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    FreshProcessMap map;
    LogCapture log;
    const std::string count = kFatal + "adifferent number of paramerter given ";
    const struct {
        std::vector<std::string> words;
        std::optional<LogRecord> message;
    } cases[] = {
            {{},
             systemError(kFatal + "argument passed should at least contain the command "
                                  "type. number of arguments passed = 1")},
            {{"0", "1"}, {}},
            {{"7", "1"}, {}},
            {{"abc", "1"}, {}},
            {{"-6", "1"}, {}},
            {{"1"}, systemError(count + "[2] != expected 3")},
            {{"1", "4242", "x"}, systemError(count + "[4] != expected 3")},
            {{"2", "150", "f.pdf"}, systemError(count + "[4] != expected 5")},
            {{"4", "0", "4242", "f.pdf", "x"}, systemError(count + "[6] != expected 5")},
            {{"3", "150", "60", "x"}, systemError(count + "[5] != expected 4")},
            {{"5", "0"}, systemError(count + "[3] != expected 4")},
            {{"6", "150", "1", "x", "y"}, systemError(count + "[6] != expected 4")},
            // Wrapped, these would run command 1, and store for container 150 or state 1.
            {{"4294967297", "1"}, systemError(kFatal + "argument [1] is out of range: 4294967297")},
            {{"3", "4294967446", "60"},
             systemError(kFatal + "argument [2] is out of range: 4294967446")},
            {{"3", "150", "-2147483649"},
             systemError(kFatal + "argument [3] is out of range: -2147483649")},
            {{"6", "150", " 4294967297"},
             systemError(kFatal + "argument [3] is out of range:  4294967297")},
            {{"4", "0", "2147483648", "f.pdf"},
             systemError(kFatal + "argument [3] is out of range: 2147483648")},
            {{"2", "150", "f.pdf", "9223372036854775808"},
             systemError(kFatal + "argument [4] is out of range: 9223372036854775808")},
    };
    for (const auto& [words, message] : cases) {
        SCOPED_TRACE(::testing::PrintToString(words));
        EXPECT_EQ(runCommand(words), -1);
        std::vector<LogRecord> expected;
        if (message) expected.push_back(*message);
        EXPECT_EQ(log.take(), expected);
    }
    EXPECT_EQ(getDLPAuditLogState(), 0);
    EXPECT_TRUE(HashMap::mInternalProcessMap.empty());
    ASSERT_EQ(init_table(), 0);
    EXPECT_TRUE(DurationDatabase().rows("WHERE Id = 150").empty());
}

TEST(handleDLPCommands, RefusesNullArguments) {
    LogCapture log;
    char six[] = "6", state[] = "1";
    char* noCommand[] = {six, nullptr, six, state};
    char* noState[] = {six, six, six, nullptr};
    EXPECT_EQ(handleDLPCommands(4, nullptr), -1);
    EXPECT_EQ(handleDLPCommands(4, noCommand), -1);
    EXPECT_EQ(handleDLPCommands(4, noState), -1);
    EXPECT_EQ(log.take(), (std::vector<LogRecord>{systemError(kFatal + "argument vector is null"),
                                                  systemError(kFatal + "argument [1] is null"),
                                                  systemError(kFatal + "argument [3] is null")}));
    EXPECT_EQ(getDLPAuditLogState(), 0);
}

TEST(handleDLPCommands, ReadsNumbersAsAtoiDoes) {
    const std::pair<const char*, int> cases[] = {
            {"0", 0}, {"-2147483648", -2147483648}, {" \t+12abc", 12},
            {"x", 0}, {"2147483647", 2147483647},   {"00000000000000000007", 7},
    };
    for (const auto& [text, state] : cases) {
        EXPECT_EQ(runCommand({"6", "150", text}), 0) << text;
        EXPECT_EQ(getDLPAuditLogState(), state) << text;
    }
    runCommand({"6", "150", "0"});
}

TEST(handleDLPCommands, LogsEachCommandsOutcome) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    FreshProcessMap map;
    ScratchDirectory directory;
    LogCapture log;
    const std::string own = "DLP_LIBDLP : <handleDLPCommands> ";
    const struct {
        std::vector<std::string> words;
        int result;
        std::vector<LogRecord> messages;
    } cases[] = {
            {{"2", "150", directory.file("a.pdf"), "5"}, 0, {systemDebug(own + "setxattr OK\n")}},
            {{"2", "150", directory.file("a.xyz"), "5"},
             0,
             {systemError(own + "extension passed is not valid. setting IT Admin set Expiry"),
              systemDebug(own + "setxattr OK\n")}},
            {{"2", "150", directory.path() + "/missing.pdf", "5"},
             -1,
             {systemError(own + "Error: setxattr failed with error -1\n")}},
            {{"3", "150", "60"}, 0, {systemDebug(own + "set_expiryAfter_time OK\n")}},
            {{"3", "99", "60"},
             -1,
             {systemError(own + "Error: set_expiryAfter_time failed with error 1\n")}},
            {{"4", "0", "4242", directory.file("b.pdf", 4102444800)},
             0,
             {systemDebug(own + "addOrUpdateMapEntry OK\n")}},
            {{"5", "0", "pdf,abc,abc"},
             0,
             {systemDebug(own + "Extension recieved : pdf,abc,abc\n")}},
            {{"6", "140", "2"},
             0,
             {systemDebug(own + "setDLPExpiryAfter command [ContainerId = 140, logState = 2]")}},
            {{"1", "4242"}, 0, {}},
    };
    for (const auto& [words, result, messages] : cases) {
        SCOPED_TRACE(::testing::PrintToString(words));
        EXPECT_EQ(runCommand(words), result);
        EXPECT_EQ(dispatcherMessages(log), messages);
    }
    EXPECT_EQ(mProcessMap.mExtensionList, (std::vector<std::string>{"abc"}));
    EXPECT_EQ(getDLPAuditLogState(), 2);
    EXPECT_TRUE(HashMap::mInternalProcessMap.empty());
    EXPECT_EQ(runCommand({"5", "0", "x,y,"}), 0);
    EXPECT_EQ(mProcessMap.mExtensionList, (std::vector<std::string>{"x", "y", ""}));
}

TEST(handleDLPCommands, RefusesTextsThatWouldBeCut) {
    FreshProcessMap map;
    ScratchDirectory directory;
    LogCapture log;
    // Nested directories, each name far below the 255-byte limit, lead to a 4095-byte path.
    std::string name;
    auto room = [&] { return 4095 - directory.path().size() - 1 - name.size(); };
    while (room() > 220) name += std::string(200, 'd') + "/";
    name += std::string(room() - 4, 'n') + ".pdf";
    std::string longest = directory.file(name);
    ASSERT_EQ(longest.size(), 4095u);
    std::string list;
    for (int i = 0; i < 200; ++i) list += (i == 0 ? "" : ",") + std::to_string(1000 + i);
    ASSERT_EQ(list.size(), 999u);
    EXPECT_EQ(runCommand({"2", "150", longest, "4102444800"}), 0);
    EXPECT_EQ(readExpiry(longest), 4102444800);
    EXPECT_EQ(runCommand({"5", "0", list}), 0);
    EXPECT_EQ(mProcessMap.mExtensionList.size(), 200u);
    log.take();

    const LogRecord tooLongPath =
            systemError(kFatal + "file path of 4096 bytes or more is too long");
    EXPECT_EQ(runCommand({"2", "150", longest + "x", "7"}), -1);
    EXPECT_EQ(runCommand({"4", "0", "4242", longest + "x"}), -1);
    EXPECT_EQ(runCommand({"5", "0", list + ","}), -1);
    EXPECT_EQ(log.take(),
              (std::vector<LogRecord>{
                      tooLongPath, tooLongPath,
                      systemError(kFatal + "extension list of 1000 bytes or more is too long")}));
    EXPECT_EQ(mProcessMap.mExtensionList.size(), 200u);
    EXPECT_TRUE(HashMap::mInternalProcessMap.empty());
}

}  // namespace
}  // namespace dlp::test
