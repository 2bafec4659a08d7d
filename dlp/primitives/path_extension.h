#pragma once

#include <string>

// The text after the last "." of the whole path, ASCII-lower-cased; the whole path when it has
// no ".".
std::string getExtensionFromPath(const char* path);
