#include "tools/welcomer/login/LoginPicture.h"

#include "backends/posix/AtomicFile.h"
#include "backends/posix/RootFolder.h"
#include "plugins/DelegateIdentifiers.h"
#include "tools/welcomer/login/AgentTexts.h"
#include "tools/welcomer/login/PictureStyle.h"
#include "tools/welcomer/login/SVGDrawing.h"
#include "tools/welcomer/login/TimeScale.h"
#include "tools/welcomer/terminal/Failure.h"
#include "tools/welcomer/terminal/Printable.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <iomanip>
#include <sstream>
#include <system_error>
#include <utility>
#include <vector>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;
using Time = std::chrono::nanoseconds;

constexpr double kWidth = 960;
constexpr double kLeft = 190; // of the times
constexpr double kRight = 930;
constexpr double kRow = 26;
constexpr double kBar = 16;
constexpr std::size_t kNameColumns = 20;
constexpr std::size_t kReasonColumns = 64;
constexpr double kLegendColumn = 182;

std::string inSeconds(Time time, int decimals) {
    std::ostringstream text;
    text << std::fixed << std::setprecision(decimals) << std::chrono::duration<double>(time).count() << " s";
    return text.str();
}

// A name without what those of its kind have in common.
std::string_view shortName(std::string_view identifier) {
    return identifier.substr(identifier.rfind('.') + 1);
}

// Why a service is not on, without its name, which stands before its row.
std::string whyNotOn(const ServiceOutcome& service) {
    const std::string text = service.text();
    return std::string(
        agenttext::after(text, std::string(agenttext::kServiceRefused) + service.identifier + "' ")
            .value_or(text));
}

bool isMessaging(const DelegateOutcome& delegate) {
    return delegate.identifier == kVidlinkIdentifier || delegate.identifier == kChatterIdentifier;
}

// The last time at which something happens besides the agent's end.
Time lastOfAll(const LoginRecord& record) {
    Time last = std::max(record.waiting().value_or(Time(0)), record.lingering().value_or(Time(0)));
    for (const DelegateOutcome& delegate : record.delegates()) {
        last = std::max(last, delegate.end);
    }
    for (const ServiceOutcome& service : record.services()) {
        last = std::max(last, service.settled);
    }
    return last;
}

// The drawing of one login, from top to bottom.
class Picture {
  public:
    Picture(const LoginRecord& record, std::optional<Time> runningFor)
        : _record(record),
          _end(std::max(record.last(), runningFor.value_or(Time(0)))),
          _isRunning(runningFor.has_value()),
          _scale(kLeft, kRight, lastOfAll(record), _end) {}

    std::string draw(const PictureTexts& texts) {
        _drawing.text("title", 20, 30, texts.title);
        _drawing.text("quiet", 20, 50, texts.when + (texts.when.empty() ? "" : ", ") + _ending());
        _y = 74;
        _drawAgent();
        _drawServices();
        _drawDelegates();
        _drawTimes();
        _drawLegend();
        SVGDrawing whole;
        whole.rectangle("page", 0, 0, kWidth, _y + 16);
        whole.add(_behind);
        whole.add(_drawing);
        return whole.document(kWidth, _y + 16, texts.title + ": " + _ending(), kPictureStyle, kPictureShared);
    }

  private:
    std::string _ending() const {
        if (_isRunning) {
            return "the agent runs, for " + inSeconds(_end, 0) + " so far";
        }
        const std::string after = " after " + inSeconds(_end, 1);
        switch (_record.end()) {
        case LoginRecord::End::Ended:
            return "the agent ended" + after;
        case LoginRecord::End::Broken:
            return "the agent was " + _record.endReason() + after;
        case LoginRecord::End::Unfinished:
            return "the agent's end is not in the log; its last line came" + after;
        }
        return "";
    }

    void _nameRow(std::string_view name) {
        _drawing.text("name", kLeft - 12, _y + kBar - 3, cutTo(name, kNameColumns));
    }

    void _bar(std::string_view className, Time begin, Time end) {
        const double x = _scale.at(begin);
        _drawing.rectangle(className, x, _y, std::max(_scale.at(end) - x, 3.0), kBar, 3);
    }

    void _agentPart(std::string_view className, const std::string& what, Time begin, Time end) {
        _drawing.beginGroup(what + ", " + inSeconds(end - begin, 3));
        _bar(className, begin, end);
        if (_scale.at(end) - _scale.at(begin) > 90) {
            _drawing.text("inside", _scale.at(begin) + 6, _y + kBar - 4, what);
        }
        _drawing.endGroup();
    }

    // What the agent itself did: it begins, waits and lingers.
    void _drawAgent() {
        _nameRow("agent");
        const Time lingers = _record.lingering().value_or(_end);
        const Time waits = _record.waiting().value_or(lingers);
        _agentPart("begins", "begins", Time(0), waits);
        if (lingers > waits) {
            _agentPart("waits", "waits", waits, lingers);
        }
        if (_record.lingering()) {
            _agentPart("lingers", "lingers", lingers, _end);
        }
        const bool isWhole = _record.end() == LoginRecord::End::Ended;
        const double end = _scale.at(_end);
        if (isWhole) {
            _drawing.line("end", end, _y - 4, end, _y + kBar + 4);
        } else if (!_isRunning) {
            _drawing.path("raised mark", end, _y + kBar / 2, kCross);
        }
        _y += kRow + 6;
    }

    void _drawServices() {
        for (const ServiceOutcome& service : _record.services()) {
            if (service.kind != ServiceOutcome::Kind::OfSetup) {
                _drawService(service);
            }
        }
        _y += 8;
    }

    void _drawService(const ServiceOutcome& service) {
        const bool isOn = service.kind == ServiceOutcome::Kind::Enabled;
        const double middle = _y + 8;
        const double begin = _scale.at(service.named);
        const double settled = _scale.at(service.settled);
        _drawing.beginGroup(service.identifier + ": " + service.text() + ", " +
                            inSeconds(service.settled, 3));
        _drawing.text("small name", kLeft - 12, _y + 12, cutTo(shortName(service.identifier), kNameColumns));
        if (service.kind == ServiceOutcome::Kind::PutOff) {
            _drawing.line("never putoff", begin, middle, _scale.right(), middle);
            _drawing.path("never mark", begin, middle, kDiamond);
        } else {
            if (settled > begin) {
                _drawing.line("putoff", begin, middle, settled, middle);
            }
            _drawing.path(isOn ? "service mark" : "refused mark", settled, middle, isOn ? kDiamond : kBang);
        }
        if (!isOn) {
            _drawBeside(cutTo(whyNotOn(service), kReasonColumns), begin - 6, settled);
        }
        _drawing.endGroup();
        _y += 17;
    }

    // Those that share a queue stand together, the others by themselves.
    void _drawDelegates() {
        std::vector<DelegateOutcome> delegates = _record.delegates();
        const auto others = std::stable_partition(delegates.begin(), delegates.end(), isMessaging);
        const double top = _y;
        for (auto each = delegates.begin(); each != others; ++each) {
            _drawDelegate(*each);
        }
        if (others - delegates.begin() > 1) {
            _drawing.beginGroup("one queue for both: one is called after the other");
            _drawing.path("queue", kLeft - 4, top,
                          "M4 0H0V" + std::to_string(static_cast<int>(_y - top - kRow + kBar)) + "H4");
            _drawing.endGroup();
        }
        for (auto each = others; each != delegates.end(); ++each) {
            _drawDelegate(*each);
        }
    }

    // When it began, by its own seconds: the line that announces it comes a little before.
    static Time _beginning(const DelegateOutcome& delegate) {
        double seconds = 0;
        std::istringstream(delegate.seconds) >> seconds;
        const auto taken = std::chrono::duration_cast<Time>(std::chrono::duration<double>(seconds));
        return delegate.seconds.empty() ? delegate.begin : std::max(delegate.begin, delegate.end - taken);
    }

    void _drawDelegate(const DelegateOutcome& delegate) {
        const OutcomeLook look = lookOf(delegate.kind);
        const bool isOpen = delegate.working();
        const Time begin = _beginning(delegate);
        const Time end = isOpen ? _end : delegate.end;
        const std::string outcome =
            isOpen ? (_isRunning ? "has not answered yet" : "never answered") : delegate.text();
        _drawing.beginGroup(delegate.identifier + ": " + outcome);
        _nameRow(shortName(delegate.identifier));
        if (delegate.kind != DelegateOutcome::Kind::NoResponse) {
            _bar(look.className, begin, end);
            if (look.pattern) {
                _bar(look.pattern, begin, end);
            }
        }
        const double mark = _scale.at(end) + 14;
        _drawing.path(std::string(look.className) + " mark", mark, _y + kBar / 2, look.mark);
        const std::string text =
            (delegate.seconds.empty() ? "" : delegate.seconds + " s") +
            (delegate.kind == DelegateOutcome::Kind::Completed
                 ? ""
                 : (delegate.seconds.empty() ? "" : ", ") + cutTo(outcome, kReasonColumns));
        _drawBeside(text, _scale.at(begin), mark);
        _drawing.endGroup();
        _y += kRow;
    }

    // Behind the mark, or before the bar where there is more room.
    void _drawBeside(const std::string& text, double begin, double mark) {
        const double width = 6.6 * static_cast<double>(columns(text));
        if (mark + 14 + width < kWidth - 10) {
            _drawing.text("beside", mark + 14, _y + kBar - 4, text);
        } else if (begin - width - 8 > kLeft) {
            _drawing.text("beside before", begin - 8, _y + kBar - 4, text);
        } else {
            // On a plate, since the bar may have a pattern.
            _drawing.rectangle("page", begin + 4, _y + 2, width + 6, kBar - 4, 3);
            _drawing.text("inside", begin + 7, _y + kBar - 4, text);
        }
    }

    void _drawTimes() {
        const double top = 70;
        _y += 4;
        _drawing.line("axis", kLeft, _y, _scale.breakAt(), _y);
        const std::vector<Time> ticks = _scale.ticks();
        const Time step = ticks.size() > 1 ? ticks[1] : Time(1);
        const int decimals = step % 1s == 0s ? 0 : step % 100ms == 0s ? 1 : step % 10ms == 0s ? 2 : 3;
        for (const Time tick : ticks) {
            const double x = _scale.at(tick);
            _behind.line("tick", x, top, x, _y + 4);
            _drawing.text("time", x, _y + 18, inSeconds(tick, decimals));
        }
        if (_scale.isBroken()) {
            _drawing.path("axis", _scale.breakAt(), _y, "M0 0l4 -5l5 10l5 -10l4 5");
            _drawing.line("axis", _scale.breakAt() + 18, _y, _scale.right(), _y);
            _drawing.text("time", _scale.right(), _y + 18, inSeconds(_end, 1));
        }
        _y += 44;
    }

    // What an outcome's bar and mark are, and in a second row what else there is.
    void _drawLegend() {
        double x = 20;
        for (const auto& [kind, name] : kLegend) {
            const OutcomeLook look = lookOf(kind);
            if (kind != DelegateOutcome::Kind::NoResponse) {
                _drawing.rectangle(look.className, x, _y - 9, 26, 12, 3);
                if (look.pattern) {
                    _drawing.rectangle(look.pattern, x, _y - 9, 26, 12, 3);
                }
            }
            _drawing.path(std::string(look.className) + " mark", x + 40, _y - 3, look.mark);
            _drawing.text("quiet", x + 54, _y + 1, name);
            x += kLegendColumn;
        }
        _y += 22;
        _drawing.rectangle("begins", 20, _y - 9, 26, 12, 3);
        _drawing.path("service mark", 20 + kLegendColumn + 40, _y - 3, kDiamond);
        _drawing.line("putoff", 20 + 2 * kLegendColumn, _y - 3, 20 + 2 * kLegendColumn + 40, _y - 3);
        _drawing.path("queue", 20 + 3 * kLegendColumn + 36, _y - 9, "M4 0H0V12H4");
        int column = 0;
        for (const char* const name : {"the agent begins", "service enabled", "service put off",
                                       "one queue, one call after the other"}) {
            _drawing.text("quiet", 74 + kLegendColumn * column++, _y + 1, name);
        }
    }

    const LoginRecord& _record;
    const Time _end;
    const bool _isRunning;
    const TimeScale _scale;
    SVGDrawing _drawing;
    SVGDrawing _behind; // what bars and marks lie on
    double _y = 0;      // of the next row
};

} // namespace

std::string drawLogin(const LoginRecord& record, const PictureTexts& texts, std::optional<Time> runningFor) {
    return Picture(record, runningFor).draw(texts);
}

void writePicture(const std::string& path, const std::string& picture) {
    const posix::PathParts parts = posix::splitPath(std::filesystem::absolute(path).string());
    const posix::FileDescriptor folder(::open(parts.folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    const int number = folder ? posix::replaceFile(folder.get(), parts.name, picture, 0644) : errno;
    if (number != 0) {
        throw CommandFailure("cannot write " + path + ": " + std::generic_category().message(number));
    }
}

} // namespace welcomer::tool
