#include "progress.h"

#include <unistd.h>

#include <algorithm>

namespace varnel::cli {

namespace {
constexpr int kBarWidth = 30;
}

Progress::Style Progress::styleFor(std::FILE* stream, bool quiet) {
    if (quiet) return Style::none;
    return isatty(fileno(stream)) ? Style::bar : Style::lines;
}

void Progress::start(const std::string& label) {
    finish();
    label_ = label;
    last_ = -1;
}

void Progress::update(int percent) {
    percent = std::clamp(percent, 0, 100);
    // The component repeats values while a transfer waits; show each value once.
    if (style_ == Style::none || percent == last_) return;
    last_ = percent;
    draw(percent);
}

void Progress::finish() {
    if (drawn_) std::fputc('\n', stream_);
    drawn_ = false;
    std::fflush(stream_);
}

void Progress::complete() {
    if (last_ >= 0) update(100);
    finish();
}

void Progress::draw(int percent) {
    if (style_ == Style::lines) {
        std::fprintf(stream_, "%s %d%%\n", label_.c_str(), percent);
        std::fflush(stream_);
        return;
    }
    const int filled = percent * kBarWidth / 100;
    std::string bar(static_cast<std::size_t>(filled), '#');
    bar.append(static_cast<std::size_t>(kBarWidth - filled), '-');
    std::fprintf(stream_, "\r%-9s [%s] %3d%%", label_.c_str(), bar.c_str(), percent);
    std::fflush(stream_);
    drawn_ = true;
}

}  // namespace varnel::cli
