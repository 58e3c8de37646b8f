// Limits and diagnostics shared by the entry points of the attention library.
//
// The library reports every refused argument and every failed step with one
// line on standard error; hosts and field logs grep for these exact forms.
#ifndef LUMICOR_CALIB_CALIB_CA_COMMON_H
#define LUMICOR_CALIB_CALIB_CA_COMMON_H

#include <cstdint>
#include <cstdio>

// Smallest photo side the library works on, in pixels.
constexpr uint32_t MIN_LENGTH = 240;

namespace CA {

// Source tag printed by the argument checks of the entry points.
constexpr const char kEntrySource[] = "src/CALib";

// "[file(line)] function recieved invalid params ( condition )"
inline void ReportInvalidParams(const char* file, int line, const char* function,
                                const char* condition) {
    std::fprintf(stderr, "[%s(%d)] %s recieved invalid params ( %s )\n", file, line, function,
                 condition);
}

// "[function(line)] step failed"
inline void ReportFailed(const char* function, int line, const char* step) {
    std::fprintf(stderr, "[%s(%d)] %s failed\n", function, line, step);
}

// "[function(line)] text"
inline void ReportMessage(const char* function, int line, const char* text) {
    std::fprintf(stderr, "[%s(%d)] %s\n", function, line, text);
}

}  // namespace CA

#endif
