#include "tools/welcomer/login/TimeScale.h"

#include <algorithm>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;

constexpr double kBehindTheBreak = 90;
constexpr int kMostTicks = 8;

// The smallest round step of which there are few.
TimeScale::Time stepFor(TimeScale::Time whole) {
    TimeScale::Time step = 1ms;
    for (int round = 0; whole / step > kMostTicks; ++round) {
        step = round % 3 == 1 ? step * 5 / 2 : step * 2; // 1, 2, 5, 10
    }
    return step;
}

} // namespace

TimeScale::TimeScale(double left, double right, Time busy, Time end)
    : _left(left),
      _right(right),
      _breakAt(right),
      _busy(std::max<Time>(busy + busy / 12, 10ms)),
      _end(end) {
    if (_end > 2 * _busy) {
        _breakAt = right - kBehindTheBreak;
    } else {
        _busy = _end = std::max(_busy, end);
    }
}

double TimeScale::at(Time time) const {
    const auto share = [](Time part, Time whole) {
        return std::clamp(std::chrono::duration<double>(part) / std::chrono::duration<double>(whole), 0.0,
                          1.0);
    };
    if (time <= _busy || !isBroken()) {
        return _left + (_breakAt - _left) * share(time, _busy);
    }
    return _breakAt + (_right - _breakAt) * share(time - _busy, _end - _busy);
}

std::vector<TimeScale::Time> TimeScale::ticks() const {
    std::vector<Time> times;
    const Time step = stepFor(_busy);
    for (Time time{0}; time <= _busy; time += step) {
        times.push_back(time);
    }
    return times;
}

} // namespace welcomer::tool
