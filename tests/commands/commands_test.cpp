#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/process_map.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "command_vector.h"
#include "support/duration_database.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

const std::string kOwn = "DLP_LIBDLP : <handleDLPCommands> ";
const std::string kFatal = kOwn + "FATAL: ";

std::vector<LogRecord> errors(std::vector<std::string> texts) {
    std::vector<LogRecord> records;
    for (std::string& text : texts) records.push_back(systemError(kFatal + text));
    return records;
}

TEST(handleDLPCommands, RefusesMalformedVectorsAndChangesNothing) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    FreshProcessMap map;
    LogCapture log;
    const std::string given = "adifferent number of paramerter given ";
    // Beyond int, atoi would wrap these into command 1, container 150, a state of 1, pid 0.
    const std::pair<std::vector<std::string>, std::vector<std::string>> cases[] = {
            {{},
             {"argument passed should at least contain the command type. number of "
              "arguments passed = 1"}},
            {{"0", "1"}, {}},
            {{"7", "1"}, {}},
            {{"1"}, {given + "[2] != expected 3"}},
            {{"4", "0", "4242", "f.pdf", "x"}, {given + "[6] != expected 5"}},
            {{"5", "0"}, {given + "[3] != expected 4"}},
            {{"4294967297", "1"}, {"argument [1] is out of range: 4294967297"}},
            {{"3", "4294967446", "60"}, {"argument [2] is out of range: 4294967446"}},
            {{"6", "150", " 4294967297"}, {"argument [3] is out of range:  4294967297"}},
            {{"4", "0", "-2147483649", "f.pdf"}, {"argument [3] is out of range: -2147483649"}},
            {{"1", "2147483648"}, {"argument [2] is out of range: 2147483648"}},
            {{"2", "150", "f.pdf", "9223372036854775808"},
             {"argument [4] is out of range: 9223372036854775808"}},
    };
    for (const auto& [words, messages] : cases) {
        EXPECT_EQ(runCommandVector(words), -1) << ::testing::PrintToString(words);
        EXPECT_EQ(log.take(), errors(messages)) << ::testing::PrintToString(words);
    }
    char six[] = "6";
    char* noState[] = {six, six, six, nullptr};
    EXPECT_EQ(handleDLPCommands(4, nullptr), -1);
    EXPECT_EQ(handleDLPCommands(4, noState), -1);
    EXPECT_EQ(log.take(), errors({"argument vector is null", "argument [3] is null"}));
    EXPECT_EQ(getDLPAuditLogState(), 0);
    EXPECT_TRUE(HashMap::mInternalProcessMap.empty());
    ASSERT_EQ(init_table(), 0);
    EXPECT_TRUE(DurationDatabase().rows("WHERE Id = 150").empty());
}

TEST(handleDLPCommands, ReadsNumbersAsAtoiDoes) {
    const std::pair<const char*, int> cases[] = {{"-2147483648", -2147483647 - 1},
                                                 {" \t-12abc", -12},
                                                 {"x", 0},
                                                 {"2147483647", 2147483647},
                                                 {"+00000000000000000007", 7}};
    for (const auto& [text, state] : cases) {
        EXPECT_EQ(runCommandVector({"6", "150", text}), 0) << text;
        EXPECT_EQ(getDLPAuditLogState(), state) << text;
    }
}

// Each command's own messages, its callees' left out; what the commands do to files shows in
// commands.trace.
TEST(handleDLPCommands, LogsEachCommandsOutcome) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    FreshProcessMap map;
    ScratchDirectory directory;
    LogCapture log;
    std::vector<int> results;
    for (const std::vector<std::string>& words :
         {std::vector<std::string>{"2", "150", directory.file("a.pdf"), "5"},
          {"2", "150", directory.file("a.xyz"), "5"},
          {"2", "150", directory.path() + "/missing.pdf", "5"},
          {"3", "150", "60"},
          {"3", "99", "60"},
          {"4", "0", "4242", directory.file("b.pdf", 4102444800)},
          {"5", "0", "pdf,abc,abc,"},
          {"6", "140", "2"},
          {"1", "4242"}}) {
        results.push_back(runCommandVector(words));
    }
    // A failed store is the dispatcher's -1, as every failure of its own.
    EXPECT_EQ(results, (std::vector<int>{0, 0, -1, 0, -1, 0, 0, 0, 0}));
    std::vector<LogRecord> own;
    for (LogRecord& record : log.take()) {
        if (record.text.find("<handleDLPCommands>") != std::string::npos) own.push_back(record);
    }
    auto debug = [](const std::string& text) { return systemDebug(kOwn + text); };
    auto error = [](const std::string& text) { return systemError(kOwn + text); };
    EXPECT_EQ(own, (std::vector<LogRecord>{
                           debug("setxattr OK\n"),
                           error("extension passed is not valid. setting IT Admin set Expiry"),
                           debug("setxattr OK\n"), error("Error: setxattr failed with error -1\n"),
                           debug("set_expiryAfter_time OK\n"),
                           error("Error: set_expiryAfter_time failed with error 1\n"),
                           debug("addOrUpdateMapEntry OK\n"),
                           debug("Extension recieved : pdf,abc,abc,\n"),
                           debug("setDLPExpiryAfter command [ContainerId = 140, logState = 2]")}));
    EXPECT_TRUE(HashMap::mInternalProcessMap.empty());
    EXPECT_EQ(mProcessMap.mExtensionList, (std::vector<std::string>{"abc", ""}));
    EXPECT_EQ(getDLPAuditLogState(), 2);
}

// Cut to 4095 bytes, the path and the list would name another file and other extensions.
TEST(handleDLPCommands, RefusesTextsThatWouldBeCut) {
    FreshProcessMap map;
    const std::string longest = "/" + std::string(4094, 'p'), list = std::string(999, 'a');
    LogCapture log;
    EXPECT_EQ(runCommandVector({"2", "150", longest, "7"}), -1);  // as far as the attribute
    EXPECT_EQ(runCommandVector({"4", "0", "4242", longest}), 0);  // a file without an expiry
    EXPECT_EQ(runCommandVector({"5", "0", list}), 0);
    EXPECT_EQ(runCommandVector({"2", "150", longest + "x", "7"}), -1);
    EXPECT_EQ(runCommandVector({"4", "0", "4242", longest + "x"}), -1);
    EXPECT_EQ(runCommandVector({"5", "0", list + "b"}), -1);
    std::vector<LogRecord> refusals;
    for (LogRecord& record : log.take()) {
        if (record.text.find("FATAL") != std::string::npos) refusals.push_back(record);
    }
    EXPECT_EQ(refusals, errors({"file path of 4096 bytes or more is too long",
                                "file path of 4096 bytes or more is too long",
                                "extension list of 1000 bytes or more is too long"}));
    EXPECT_EQ(mProcessMap.mExtensionList, std::vector<std::string>{list});
}

}  // namespace
}  // namespace dlp::test
