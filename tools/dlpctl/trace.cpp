#include "trace.h"

#include <android-base/unique_fd.h>
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/new_file_expiry.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <optional>
#include <string_view>

#include "app_processes.h"
#include "command_vector.h"
#include "expiry_text.h"
#include "file_expiry.h"
#include "replay_clock.h"

namespace {

// Thrown while a line is applied: a malformed line stops the replay, a failed one does not.
struct MalformedLine {
    std::string message;
};
struct FailedLine {
    std::string message;
};

struct Word {
    std::string text;     // the quotes taken out
    std::string written;  // as the trace writes it
    bool quoted = false;
};

struct TraceLine {
    std::vector<Word> words;
    std::optional<std::string> expected;
};

TraceLine splitLine(const std::string& line) {
    std::vector<Word> words;
    Word word;
    bool inWord = false;
    bool inQuote = false;
    for (char character : line) {
        if (!inQuote && character == '#') break;
        if (!inQuote && (character == ' ' || character == '\t' || character == '\r')) {
            if (inWord) words.push_back(std::move(word));
            word = Word{};
            inWord = false;
            continue;
        }
        inWord = true;
        word.written += character;
        if (character == '"') {
            inQuote = !inQuote;
            word.quoted = true;
        } else {
            word.text += character;
        }
    }
    if (inQuote) throw MalformedLine{"unterminated quote"};
    if (inWord) words.push_back(std::move(word));

    TraceLine parsed;
    auto arrow = std::find_if(words.begin(), words.end(),
                              [](const Word& each) { return !each.quoted && each.text == "=>"; });
    parsed.words.assign(words.begin(), arrow);
    if (arrow == words.end()) return parsed;
    if (parsed.words.empty()) throw MalformedLine{"an expectation without a line"};
    if (arrow + 1 == words.end()) throw MalformedLine{"nothing expected after '=>'"};
    parsed.expected = "";
    for (auto each = arrow + 1; each != words.end(); ++each) {
        *parsed.expected += (each == arrow + 1 ? "" : " ") + each->text;
    }
    return parsed;
}

// A decimal int, optionally signed.
std::optional<int> parseNumber(const std::string& text) {
    const char* first = text.data() + (!text.empty() && text[0] == '+' ? 1 : 0);
    const char* last = text.data() + text.size();
    int value = 0;
    auto [end, error] = std::from_chars(first, last, value);
    if (error != std::errc() || end != last || (first != text.data() && *first == '-')) {
        return std::nullopt;
    }
    return value;
}

int number(const std::string& text) {
    std::optional<int> value = parseNumber(text);
    if (!value) throw MalformedLine{"bad number '" + text + "'"};
    return *value;
}

int64_t expiry(const std::string& text) {
    std::optional<int64_t> value = parseExpiry(text, replay_clock::now());
    if (!value) throw MalformedLine{"bad expiry '" + text + "'"};
    return *value;
}

// A trace comes from elsewhere: it may name files under the working directory and /data alone.
// `workingDirectory` ends in "/".
void checkPath(const std::string& path, const std::string& workingDirectory) {
    if (("/" + path + "/").find("/../") != std::string::npos) {
        throw MalformedLine{"path '" + path + "' has a '..' component"};
    }
    if (path[0] != '/') return;
    for (std::string_view allowed :
         {std::string_view(workingDirectory), std::string_view("/data/")}) {
        if (path.compare(0, allowed.size(), allowed) == 0) return;
    }
    throw MalformedLine{"path '" + path + "' lies outside the working directory and /data"};
}

// Which word of a line names a file, 0 for none: the path of create, show, file and commands 2
// and 4.
size_t pathWord(const std::vector<Word>& words) {
    if (words.empty()) return 0;
    std::optional<int> command = parseNumber(words[0].text);
    if (words[0].text == "create" || command == 2) return 2;
    if (words[0].text == "show" || words[0].text == "file") return 1;
    return command == 4 ? 3 : 0;
}

std::string showResult(const std::string& path) {
    FileExpiryReport report = reportFileExpiry(path, replay_clock::now());
    return report.ok ? report.text : "error: " + report.text;
}

class TracePlayer {
  public:
    using Arguments = std::vector<std::string>;

    // The line's result; throws MalformedLine or FailedLine.
    std::string apply(const Arguments& words) {
        if (std::all_of(words[0].begin(), words[0].end(),
                        [](char each) { return isdigit(static_cast<unsigned char>(each)); })) {
            return commandVector(words);
        }
        static const struct {
            const char* name;
            size_t fewestWords, mostWords;
            const char* synopsis;
            std::string (TracePlayer::*apply)(const Arguments&);
        } kLineKinds[] = {
                {"create", 4, 4, "create PID PATH CONTAINER", &TracePlayer::create},
                {"show", 2, 2, "show PATH", &TracePlayer::show},
                {"process", 3, 3, "process PID NAME", &TracePlayer::process},
                {"exit", 2, 2, "exit PID", &TracePlayer::exitProcess},
                {"file", 2, 3, "file PATH [EXPIRY]", &TracePlayer::file},
                {"clock", 2, 2, "clock SECONDS|+DURATION", &TracePlayer::clock},
        };
        for (const auto& kind : kLineKinds) {
            if (words[0] != kind.name) continue;
            if (words.size() < kind.fewestWords || words.size() > kind.mostWords) {
                throw MalformedLine{std::string("wrong word count, expected: ") + kind.synopsis};
            }
            return (this->*kind.apply)(words);
        }
        throw MalformedLine{"unknown line kind '" + words[0] + "'"};
    }

  private:
    std::string commandVector(Arguments words) {
        // Where a command names a pid: argv[2] of command 1, argv[3] of command 4.
        int command = number(words[0]);
        size_t pidIndex = command == 1 ? 1 : command == 4 ? 2 : 0;
        if (pidIndex != 0 && pidIndex < words.size()) {
            std::optional<int> tracePid = parseNumber(words[pidIndex]);
            if (tracePid && processes_.realPid(*tracePid) != *tracePid) {
                words[pidIndex] = std::to_string(processes_.realPid(*tracePid));
            }
        }
        // Command 2 stamps a file: what it got shows beside the result, as for a created file.
        std::string stamped = command == 2 && words.size() == 4 ? words[2] : "";
        std::string result = std::to_string(runCommandVector(std::move(words)));
        return stamped.empty() ? result : result + " " + showResult(stamped);
    }

    // The process created PATH, so a replay away from the device makes it where it is missing.
    std::string create(const Arguments& words) {
        int pid = processes_.realPid(number(words[1]));
        int container = number(words[3]);
        std::string path = words[2];
        if (!std::filesystem::exists(path)) makeFile(path);
        int result = setExpiryforFile(pid, path.data(), container);
        return std::to_string(result) + " " + showResult(path);
    }

    std::string show(const Arguments& words) { return showResult(words[1]); }

    std::string process(const Arguments& words) {
        std::string error;
        pid_t realPid = processes_.start(number(words[1]), words[2], error);
        if (realPid < 0) throw FailedLine{"cannot start " + words[2] + ": " + error};
        return "pid " + std::to_string(realPid);
    }

    std::string exitProcess(const Arguments& words) {
        if (!processes_.stop(number(words[1]))) {
            throw FailedLine{"no running process of this trace is pid " + words[1]};
        }
        return "exited";
    }

    // Neither the file nor a directory on its way is followed when it is a symbolic link.
    static void makeFile(const std::string& path) {
        android::base::unique_fd directory(
                open(path[0] == '/' ? "/" : ".", O_PATH | O_DIRECTORY | O_CLOEXEC));
        size_t start = path.find_first_not_of('/');
        for (size_t end; (end = path.find('/', start)) != std::string::npos;
             start = path.find_first_not_of('/', end)) {
            std::string name = path.substr(start, end - start);
            mkdirat(directory.get(), name.c_str(), 0777);
            directory.reset(openat(directory.get(), name.c_str(),
                                   O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
            if (!directory.ok()) throw FailedLine{"cannot create " + path + ": " + strerror(errno)};
        }
        std::string name = start == std::string::npos ? "" : path.substr(start);
        android::base::unique_fd created(
                openat(directory.get(), name.c_str(),
                       O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0644));
        if (!created.ok()) throw FailedLine{"cannot create " + path + ": " + strerror(errno)};
    }

    std::string file(const Arguments& words) {
        const std::string& path = words[1];
        std::optional<int64_t> stamp;
        if (words.size() == 3) stamp = expiry(words[2]);
        makeFile(path);
        if (!stamp) return "created";
        if (set_dlp_file_expiry_time(path.c_str(), *stamp) != 0) {
            throw FailedLine{"cannot stamp " + path + ": " + strerror(errno)};
        }
        return showResult(path);
    }

    std::string clock(const Arguments& words) {
        replay_clock::freezeAt(expiry(words[1]));
        return std::to_string(replay_clock::now());
    }

    AppProcesses processes_;
};

// A result meets an expectation that equals it or that it begins with, followed by a blank.
bool meets(const std::string& result, const std::string& expected) {
    return result.compare(0, expected.size(), expected) == 0 &&
           (result.size() == expected.size() || result[expected.size()] == ' ');
}

}  // namespace

int replayTrace(std::istream& input, const std::string& traceName, bool echoComments) {
    TracePlayer player;
    bool allMet = true;
    auto report = [&traceName](int lineNumber, const std::string& message) {
        fflush(stdout);
        fprintf(stderr, "dlpctl: %s:%d: %s\n", traceName.c_str(), lineNumber, message.c_str());
    };
    std::vector<std::string> lines;
    for (std::string line; std::getline(input, line);) lines.push_back(std::move(line));
    if (input.bad()) {
        fprintf(stderr, "dlpctl: %s: cannot read the trace\n", traceName.c_str());
        return 1;
    }
    // Every line is parsed and its paths checked before the first is applied, so that a trace
    // that is refused has written nothing.
    std::vector<TraceLine> parsedLines;
    std::string workingDirectory = std::filesystem::current_path().string();
    if (workingDirectory.back() != '/') workingDirectory += '/';
    for (size_t index = 0; index < lines.size(); ++index) {
        try {
            const std::vector<Word>& words =
                    parsedLines.emplace_back(splitLine(lines[index])).words;
            size_t path = pathWord(words);
            if (path != 0 && path < words.size()) checkPath(words[path].text, workingDirectory);
        } catch (const MalformedLine& malformed) {
            report(static_cast<int>(index) + 1, malformed.message);
            return 2;
        }
    }
    for (int lineNumber = 1; lineNumber <= static_cast<int>(lines.size()); ++lineNumber) {
        const std::string& line = lines[lineNumber - 1];
        const TraceLine& parsed = parsedLines[lineNumber - 1];
        std::string text;
        std::string result;
        std::string failure;
        try {
            if (parsed.words.empty()) {
                size_t start = line.find_first_not_of(" \t\r");
                if (echoComments && start != std::string::npos) printf("%s\n", &line[start]);
                continue;
            }
            std::vector<std::string> words;
            for (const Word& word : parsed.words) {
                words.push_back(word.text);
                text += (text.empty() ? "" : " ") + word.written;
            }
            try {
                result = player.apply(words);
            } catch (const FailedLine& failed) {
                failure = failed.message;
                result = "error: " + failure;
            }
        } catch (const MalformedLine& malformed) {
            report(lineNumber, malformed.message);
            return 2;
        }
        printf("%d: %s -> %s\n", lineNumber, text.c_str(), result.c_str());
        if (!failure.empty()) report(lineNumber, failure);
        allMet = allMet && failure.empty();
        if (parsed.expected && !meets(result, *parsed.expected)) {
            report(lineNumber, "expected '" + *parsed.expected + "', got '" + result + "'");
            allMet = false;
        }
    }
    fflush(stdout);
    return allMet ? 0 : 1;
}
