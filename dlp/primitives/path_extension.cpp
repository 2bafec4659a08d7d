#include "primitives/path_extension.h"

#include <cstring>

std::string getExtensionFromPath(const char* path) {
    const char* lastDot = strrchr(path, '.');
    std::string extension(lastDot != nullptr ? lastDot + 1 : path);
    for (char& byte : extension) {
        if (byte >= 'A' && byte <= 'Z') byte = static_cast<char>(byte - 'A' + 'a');
    }
    return extension;
}
