// A progress bar with photos per second for long runs of the lumicor tool,
// drawn only when the error stream is a terminal. Result lines printed
// through it do not get mixed up with the bar. Safe to use from several
// threads.
#ifndef LUMICOR_TOOL_PROGRESS_H
#define LUMICOR_TOOL_PROGRESS_H

#include <chrono>
#include <cstdio>
#include <mutex>
#include <string>

namespace lumicor_tool {

class Progress {
public:
    // The bar is drawn on `bar` when enabled (callers pass whether that is a terminal).
    Progress(size_t total, std::FILE* bar, bool enabled);
    ~Progress();
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    // Prints one line (a result on stdout or an error on stderr) above the bar.
    void Line(std::FILE* stream, const std::string& line);
    // Counts one finished item.
    void Step();
    // The bar's text for `done` of `total` after `seconds`.
    static std::string Bar(size_t done, size_t total, double seconds);

private:
    void DrawLocked();
    void ClearLocked();

    const size_t total_;
    std::FILE* const bar_;
    const bool enabled_;
    size_t done_ = 0;
    bool drawn_ = false;
    std::chrono::steady_clock::time_point start_;
    std::mutex mutex_;
};

}  // namespace lumicor_tool

#endif
