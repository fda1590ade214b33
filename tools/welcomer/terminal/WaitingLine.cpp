#include "tools/welcomer/terminal/WaitingLine.h"

#include <chrono>
#include <utility>

namespace welcomer::tool {

namespace {

constexpr std::chrono::milliseconds kUntilShown{500};
constexpr std::chrono::milliseconds kBetweenUpdates{200};

} // namespace

WaitingLine::WaitingLine(std::string what, bool visible) : _what(std::move(what)) {
    if (visible && _line.visible()) {
        _thread = std::thread([this] { _show(); });
    }
}

WaitingLine::~WaitingLine() {
    if (_thread.joinable()) {
        {
            const std::lock_guard lock(_mutex);
            _hasEnded = true;
        }
        _ended.notify_one();
        _thread.join();
    }
}

void WaitingLine::_show() {
    const auto started = std::chrono::steady_clock::now();
    std::unique_lock lock(_mutex);
    auto next = started + kUntilShown;
    while (!_ended.wait_until(lock, next, [this] { return _hasEnded; })) {
        const auto passed =
            std::chrono::duration_cast<std::chrono::seconds>(std::chrono::steady_clock::now() - started);
        _line.show(_what + " ... " + std::to_string(passed.count()) + " s");
        next += kBetweenUpdates;
    }
    _line.clear();
}

} // namespace welcomer::tool
