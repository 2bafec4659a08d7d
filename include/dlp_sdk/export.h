#pragma once

// Symbols of the library's public interface; everything else stays hidden.
#define DLP_EXPORT __attribute__((visibility("default")))
