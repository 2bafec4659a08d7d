// dlpctl: looks at and stamps the expiry of files, sends command vectors to the library and
// replays traces of what a device saw.
#include <android-base/unique_fd.h>
#include <android/log.h>
#include <dlp_sdk/expiry_attribute.h>
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "command_vector.h"
#include "demo.h"
#include "expiry_text.h"
#include "file_expiry.h"
#include "replay_clock.h"
#include "sandbox_check.h"
#include "trace.h"

namespace {

constexpr int kSuccess = 0;
constexpr int kFailure = 1;
constexpr int kUsageError = 2;

struct Options {
    bool showLog = false;
    bool useSystemPaths = false;
};

using Arguments = std::vector<std::string>;

struct Verb {
    const char* name;
    const char* synopsis;
    const char* summary;
    const char* description;
    // Refused outside dlp-sandbox without --system: it can reach the fixed database path.
    bool reachesDatabase;
    int (*run)(const Verb&, const Arguments&, const Options&);
};

int usageError(const Verb& verb, const std::string& message) {
    if (!message.empty()) fprintf(stderr, "dlpctl: %s: %s\n", verb.name, message.c_str());
    fprintf(stderr, "usage: dlpctl [--log] [--system] %s %s\n", verb.name, verb.synopsis);
    return kUsageError;
}

bool printReport(const std::string& path, int64_t now) {
    FileExpiryReport report = reportFileExpiry(path, now);
    if (report.ok) {
        printf("%s: %s\n", path.c_str(), report.text.c_str());
    } else {
        fflush(stdout);
        fprintf(stderr, "dlpctl: %s: %s\n", path.c_str(), report.text.c_str());
    }
    return report.ok;
}

int runShow(const Verb& verb, const Arguments& arguments, const Options&) {
    if (arguments.empty()) return usageError(verb, "no file given");
    int64_t now = replay_clock::now();
    bool allShown = true;
    for (const std::string& path : arguments) allShown = printReport(path, now) && allShown;
    return allShown ? kSuccess : kFailure;
}

int runStamp(const Verb& verb, const Arguments& arguments, const Options&) {
    if (arguments.size() != 2) return usageError(verb, "wrong number of arguments");
    // One clock reading for the expiry and for the distance printed after it.
    int64_t now = replay_clock::now();
    std::optional<int64_t> expiry = parseExpiry(arguments[1], now);
    if (!expiry) return usageError(verb, "bad expiry '" + arguments[1] + "'");
    if (set_dlp_file_expiry_time(arguments[0].c_str(), *expiry) != 0) {
        fprintf(stderr, "dlpctl: %s: %s\n", arguments[0].c_str(), strerror(errno));
        return kFailure;
    }
    return printReport(arguments[0], now) ? kSuccess : kFailure;
}

int runCommand(const Verb& verb, const Arguments& arguments, const Options&) {
    if (arguments.empty()) return usageError(verb, "no command number given");
    int result = runCommandVector(arguments);
    printf("%d\n", result);
    return result == 0 ? kSuccess : kFailure;
}

int runReplay(const Verb& verb, const Arguments& arguments, const Options&) {
    if (arguments.size() != 1) return usageError(verb, "give one trace");
    const std::string& traceName = arguments[0];
    if (traceName == "-") return replayTrace(std::cin, traceName, false);
    // Read whole through a descriptor of its own, which the trace's app processes must not inherit.
    android::base::unique_fd file(open(traceName.c_str(), O_RDONLY | O_CLOEXEC));
    std::string text;
    char buffer[4096];
    ssize_t length = !file.ok() ? -1 : 0;
    while (file.ok() && (length = read(file.get(), buffer, sizeof(buffer))) > 0) {
        text.append(buffer, static_cast<size_t>(length));
    }
    if (length < 0) {
        fprintf(stderr, "dlpctl: %s: %s\n", traceName.c_str(), strerror(errno));
        return kFailure;
    }
    std::istringstream trace(text);
    return replayTrace(trace, traceName, false);
}

int runDemoVerb(const Verb& verb, const Arguments& arguments, const Options& options) {
    if (!arguments.empty()) return usageError(verb, "takes no arguments");
    return runDemo(options.showLog, options.useSystemPaths);
}

const Verb kVerbs[] = {
        {"show", "FILE...", "print the expiry of each file",
         "Prints one line per file, \"FILE: RESULT\". RESULT is the expiry in seconds since the\n"
         "epoch with its local time and how far away it is (\"in 1d 2h 3m 4s\", \"expired 5m 0s\n"
         "ago\"), \"no expiry\", or \"no expiry (stored T)\" for a stored time of 0 or less. A\n"
         "missing file or a malformed value is reported on stderr, the other files are still\n"
         "shown, and the exit status is 1.\n",
         false, runShow},
        {"stamp", "FILE EXPIRY", "stamp a file with an expiry",
         "Writes EXPIRY into the expiry attribute of FILE and prints the file's line as show\n"
         "does. EXPIRY is seconds since the epoch, or +DURATION from now: a whole number with\n"
         "an optional unit s, m, h or d (+3600, +90m, +1d).\n",
         false, runStamp},
        {"cmd", "N ARGS...", "run one command vector",
         "Runs one command vector through the library (argv[0] \"dlpctl\", argv[1] N, then ARGS)\n"
         "and prints its result; the exit status is 0 when the result is 0, else 1.\n"
         "  1 PID                    forget the process\n"
         "  2 CONTAINER PATH EXPIRY  stamp a file (the container's duration for an unlisted\n"
         "                           extension)\n"
         "  3 CONTAINER SECONDS      store the container's expiry-after duration\n"
         "  4 UNUSED PID PATH        record that the process opened the file\n"
         "  5 UNUSED EXTENSIONS      replace the administrator's extension list (a,b,c)\n"
         "  6 CONTAINER STATE        set the audit-log state\n"
         "Commands 2 and 3 reach the database /data/system/users/dlp/dlpinfo.db: cmd runs only\n"
         "inside dlp-sandbox, or with --system on this machine's own database.\n",
         true, runCommand},
        {"replay", "TRACE", "replay a trace (a file, or - for stdin)",
         "Applies TRACE line by line in one library instance and prints one line per applied\n"
         "trace line, \"LINENO: TEXT -> RESULT\". Words are separated by blanks; a word in\n"
         "double quotes may hold blanks; # starts a comment. The first word decides:\n"
         "  N ARGS...                  a command vector as for cmd; RESULT its result (for\n"
         "                             command 2, then the file's expiry as show prints it)\n"
         "  create PID PATH CONTAINER  PID created PATH (made empty when missing):\n"
         "                             setExpiryforFile; RESULT its result, then PATH's\n"
         "                             expiry as show prints it\n"
         "  show PATH                  RESULT as show prints it, errors as \"error: ...\"\n"
         "  process PID NAME           starts a child whose argv[0] is NAME; from now on it\n"
         "                             stands for PID in create and in commands 1 and 4;\n"
         "                             RESULT \"pid REALPID\"\n"
         "  exit PID                   that child ends; RESULT \"exited\"\n"
         "  file PATH [EXPIRY]         creates PATH empty, stamped with EXPIRY (as for stamp)\n"
         "                             when given; RESULT \"created\" or its show line\n"
         "  clock SECONDS|+DURATION    the clock that the library and the trace read stands\n"
         "                             still at SECONDS, or moves on; RESULT the second\n"
         "A line may end with \"=> EXPECTED\": RESULT must equal EXPECTED or begin with it and a\n"
         "blank. Before the first clock line the real clock runs; +DURATION counts from the\n"
         "trace's clock. Relative paths are taken from the working directory. A path must lie\n"
         "under the working directory or /data, with no \"..\" component: a trace that names\n"
         "any other is malformed and none of its lines is applied. file follows no symbolic link.\n"
         "Exit status: 0 when every line was applied and met its expectation, 1 when one was\n"
         "not, 2 when a malformed line stopped the replay. A trace can reach the database\n"
         "/data/system/users/dlp/dlpinfo.db: replay runs only inside dlp-sandbox, or with\n"
         "--system on this machine's own database.\n",
         true, runReplay},
        {"demo", "", "replay the built-in example",
         "Replays the built-in example trace with its comments in a scratch directory under\n"
         "/tmp, which it removes afterwards: an administrator's duration, a stamped report that\n"
         "an office suite and another app open, the new files they and the file manager create,\n"
         "and the expiry each file got. It writes the database /data/system/users/dlp/dlpinfo.db:\n"
         "outside dlp-sandbox it runs itself through dlp-sandbox, unless --system is given.\n",
         false, runDemoVerb},
};

void printOverview() {
    printf("usage: dlpctl [--log] [--system] VERB ARGS...\n\n"
           "Looks at and stamps the expiry of protected files, runs command vectors of\n"
           "libdlp_sdk and replays traces of what a device saw.\n\nVerbs:\n");
    for (const Verb& verb : kVerbs) {
        std::string usage = std::string(verb.name) + " " + verb.synopsis;
        printf("  %-20s %s\n", usage.c_str(), verb.summary);
    }
    printf("\nOptions:\n"
           "  --log     show the library's log on stderr\n"
           "  --system  let cmd, replay and demo use this machine's own\n"
           "            /data/system/users/dlp/dlpinfo.db outside dlp-sandbox\n\n"
           "dlpctl VERB --help describes a verb. Exit status: 0 success, 1 a failed operation,\n"
           "2 a usage error.\n");
}

char priorityLetter(int priority) {
    static const char kLetters[] = "VDIWEF";
    return priority >= ANDROID_LOG_VERBOSE && priority <= ANDROID_LOG_FATAL
                   ? kLetters[priority - ANDROID_LOG_VERBOSE]
                   : '\0';
}

void printLogMessage(const __android_logger_data* data, const char* message) {
    int savedErrno = errno;
    std::string text = message != nullptr ? message : "";
    if (!text.empty() && text.back() == '\n') text.pop_back();
    std::string buffer = data->buffer_id == LOG_ID_MAIN     ? "main"
                         : data->buffer_id == LOG_ID_SYSTEM ? "system"
                                                            : std::to_string(data->buffer_id);
    char letter = priorityLetter(data->priority);
    std::string priority = letter != '\0' ? std::string(1, letter) : std::to_string(data->priority);
    fflush(stdout);
    fprintf(stderr, "log: %s/%s %s\n", buffer.c_str(), priority.c_str(), text.c_str());
    errno = savedErrno;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    int next = 1;
    for (; next < argc && strncmp(argv[next], "--", 2) == 0; ++next) {
        std::string option = argv[next];
        if (option == "--log") {
            options.showLog = true;
        } else if (option == "--system") {
            options.useSystemPaths = true;
        } else if (option == "--help") {
            printOverview();
            return kSuccess;
        } else {
            fprintf(stderr, "dlpctl: unknown option %s (dlpctl --help lists them)\n",
                    option.c_str());
            return kUsageError;
        }
    }
    if (next == argc) {
        fprintf(stderr, "usage: dlpctl [--log] [--system] VERB ARGS... (dlpctl --help)\n");
        return kUsageError;
    }
    const Verb* verb = nullptr;
    for (const Verb& each : kVerbs) {
        if (argv[next] == std::string(each.name)) verb = &each;
    }
    if (verb == nullptr) {
        fprintf(stderr, "dlpctl: unknown verb %s (dlpctl --help lists them)\n", argv[next]);
        return kUsageError;
    }
    Arguments arguments(argv + next + 1, argv + argc);
    if (!arguments.empty() && arguments[0] == "--help") {
        printf("usage: dlpctl [--log] [--system] %s %s\n\n%s", verb->name, verb->synopsis,
               verb->description);
        return kSuccess;
    }

    if (options.showLog) {
        __android_log_set_logger(printLogMessage);
        __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    } else {
        __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
    }
    if (verb->reachesDatabase && !options.useSystemPaths && !insideSandbox()) {
        fprintf(stderr,
                "dlpctl: %s can reach /data/system/users/dlp/dlpinfo.db: run it inside "
                "dlp-sandbox (dlp-sandbox dlpctl %s ...), or pass --system to use this "
                "machine's own\n",
                verb->name, verb->name);
        return kUsageError;
    }
    return verb->run(*verb, arguments, options);
}
