#pragma once

#include <cstring>
#include <string>

#include "support/log_capture.h"

namespace dlp::test {

// Messages that the tests of more than one unit expect.

inline LogRecord processNameMessage(int pid, const std::string& name) {
    return systemDebug("DLP_LIBDLP : <getProcessNameByPid> pid[" + std::to_string(pid) +
                       "], processName[" + name + "]");
}

inline LogRecord removeMessage(int pid) {
    return systemDebug("DLP_LIBDLP : <HashMap::remove> key[" + std::to_string(pid) + "]");
}

inline LogRecord attributeWriteFailedMessage(const std::string& path, int result, int error) {
    return mainError("DLP_LIBDLP :  Error: setxattr(" + path + ", setxattr error - " +
                     std::to_string(result) + ", " + std::to_string(error) + ", " +
                     strerror(error) + "\n");
}

inline LogRecord missingGroupMessage(const std::string& extension) {
    return systemError("DLP_LIBDLP : <HashMap::getValidMapEntryIndexForExt> record with key[" +
                       extension + "] not found.");
}

inline LogRecord emptyExtensionListMessage() {
    return systemError("DLP_LIBDLP : <getExtensions> extention list is empty \n");
}

inline LogRecord unprotectedExtensionMessage() {
    return systemError(
            "DLP_LIBDLP : <HashMap::put> extension passed is not valid. ignoring add to map");
}

}  // namespace dlp::test
