// Where times lie on a picture.

#pragma once

#include <chrono>
#include <vector>

namespace welcomer::tool {

// A scale whose first part shows what happens, and whose second one, behind a break, is shorter than its time.
class TimeScale {
  public:
    using Time = std::chrono::nanoseconds;

    //  left, right  where it begins and ends
    //  busy         the last time at which something happens but the end
    //  end          the last time of all
    TimeScale(double left, double right, Time busy, Time end);

    double at(Time time) const;

    // Where the break is, or its right end where there is none.
    double breakAt() const { return _breakAt; }
    bool isBroken() const { return _end > _busy; }

    // Round times on the first part.
    std::vector<Time> ticks() const;

    double left() const { return _left; }
    double right() const { return _right; }

  private:
    double _left;
    double _right;
    double _breakAt;
    Time _busy; // what the first part shows
    Time _end;  // what the second part shows ends here; as above where there is none
};

} // namespace welcomer::tool
