#include "tools/welcomer/terminal/ProgressLine.h"

#include "tools/welcomer/terminal/Printable.h"

#include <algorithm>
#include <iostream>
#include <unistd.h>

namespace welcomer::tool {

namespace {

constexpr std::size_t kBarWidth = 40;
constexpr std::size_t kUsualWidth = 80; // of a terminal that does not say

} // namespace

ProgressLine::ProgressLine() : _visible(isatty(STDERR_FILENO) == 1) {}

ProgressLine::~ProgressLine() {
    clear();
}

void ProgressLine::show(const std::string& text) {
    if (!_visible) {
        return;
    }
    const std::size_t width = std::max<std::size_t>(terminalWidth(STDERR_FILENO).value_or(kUsualWidth), 2);
    std::cout.flush();
    // One column stays free: a full line would wrap and could not be written over.
    std::cerr << '\r' << cutTo(printable(text), width - 1) << "\x1b[K" << std::flush;
    _shown = true;
}

void ProgressLine::clear() {
    if (_shown) {
        std::cerr << "\r\x1b[K" << std::flush;
        _shown = false;
    }
}

std::string ProgressLine::bar(double done) {
    const auto filled = static_cast<std::size_t>(std::clamp(done, 0.0, 1.0) * kBarWidth);
    return "[" + std::string(filled, '#') + std::string(kBarWidth - filled, '-') + "]";
}

} // namespace welcomer::tool
