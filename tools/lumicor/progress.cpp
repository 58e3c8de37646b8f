#include "progress.h"

namespace lumicor_tool {

Progress::Progress(size_t total, std::FILE* bar, bool enabled)
    : total_(total), bar_(bar), enabled_(enabled && total > 1), start_(std::chrono::steady_clock::now()) {}

Progress::~Progress() {
    std::lock_guard<std::mutex> lock(mutex_);
    ClearLocked();
}

std::string Progress::Bar(size_t done, size_t total, double seconds) {
    const int kWidth = 30;
    const int filled = total == 0 ? kWidth : static_cast<int>(done * kWidth / total);
    std::string bar = "[" + std::string(filled, '#') + std::string(kWidth - filled, '.') + "] ";
    char text[96];
    const double rate = seconds > 0 ? done / seconds : 0.0;
    std::snprintf(text, sizeof text, "%zu/%zu photos, %.1f photos/s", done, total, rate);
    return bar + text;
}

void Progress::Line(std::FILE* stream, const std::string& line) {
    std::lock_guard<std::mutex> lock(mutex_);
    ClearLocked();
    std::fprintf(stream, "%s\n", line.c_str());
    std::fflush(stream);
    DrawLocked();
}

void Progress::Step() {
    std::lock_guard<std::mutex> lock(mutex_);
    ++done_;
    DrawLocked();
}

void Progress::DrawLocked() {
    if (!enabled_) return;
    const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start_).count();
    std::fprintf(bar_, "\r%s\033[K", Bar(done_, total_, seconds).c_str());
    std::fflush(bar_);
    drawn_ = true;
}

void Progress::ClearLocked() {
    if (!drawn_) return;
    std::fprintf(bar_, "\r\033[K");
    std::fflush(bar_);
    drawn_ = false;
}

}  // namespace lumicor_tool
