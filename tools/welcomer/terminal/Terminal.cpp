#include "tools/welcomer/terminal/Terminal.h"

#include "tools/welcomer/terminal/Failure.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"
#include "tools/welcomer/terminal/LineEditor.h"
#include "tools/welcomer/terminal/Printable.h"
#include "tools/welcomer/terminal/SuspensionWatch.h"
#include "tools/welcomer/terminal/TerminalRestorer.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <fcntl.h>
#include <poll.h>
#include <set>
#include <sstream>
#include <string_view>
#include <termios.h>
#include <unistd.h>

namespace welcomer::tool {

namespace {

constexpr std::size_t kLongestLine = 4096; // what a terminal takes in one line
constexpr const char* kInputHasEnded = "the input has ended";

// While it lives, the terminal does not show what is typed.
class EchoGuard {
  public:
    explicit EchoGuard(int terminal) : _terminal(terminal), _restorer(terminal) {
        termios quiet = _restorer.before();
        quiet.c_lflag &= ~static_cast<tcflag_t>(ECHO);
        tcsetattr(terminal, TCSAFLUSH, &quiet);
    }
    ~EchoGuard() { tcsetattr(_terminal, TCSAFLUSH, &_restorer.before()); }
    EchoGuard(const EchoGuard&) = delete;
    EchoGuard& operator=(const EchoGuard&) = delete;

  private:
    const int _terminal;
    const TerminalRestorer _restorer;
};

std::string trimmed(const std::string& text) {
    const std::size_t first = text.find_first_not_of(" \t");
    return first == std::string::npos ? "" : text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

int openTerminal(const std::string& instead) {
    const int descriptor = open("/dev/tty", O_RDWR | O_CLOEXEC);
    if (descriptor < 0) {
        throw UsageError("there is no terminal to ask at: use " + instead);
    }
    return descriptor;
}

} // namespace

Terminal::Terminal(const std::string& instead) : _descriptor(openTerminal(instead)) {}

Terminal::~Terminal() {
    close(_descriptor);
}

void Terminal::say(const std::string& line) {
    _write(printable(line) + '\n');
}

std::string Terminal::ask(const std::string& question) {
    const std::string prompt = printable(question) + ' ';
    const LineEditor editor(_descriptor);
    if (!editor.isThere()) {
        std::string line;
        _askPlainly(prompt, true, -1, line);
        return trimmed(line);
    }
    const std::optional<std::string> line = editor.readLine(prompt);
    if (!line) {
        _write("\n");
        throw CommandFailure(kInputHasEnded);
    }
    return trimmed(*line);
}

posix::SecretText Terminal::askWithoutEcho(const std::string& question) {
    InterruptionGuard guard;
    try {
        posix::SecretText line(2 * kLongestLine, [&](std::string& typed) {
            _askPlainly(printable(question) + ' ', false, guard.descriptor(), typed);
        });
        _write("\n"); // the one that was typed is not shown either
        return line;
    } catch (const Interrupted&) {
        _write("\n");
        guard.release(); // the signal takes its course here
        throw CommandFailure("interrupted");
    }
}

bool Terminal::confirm(const std::string& question) {
    for (;;) {
        const std::string answer = ask(question + " [Y/n]");
        if (answer.empty() || answer == "y" || answer == "Y" || answer == "yes") {
            return true;
        }
        if (answer == "n" || answer == "N" || answer == "no") {
            return false;
        }
    }
}

std::vector<std::size_t> Terminal::choose(const std::string& title, const std::vector<std::string>& items) {
    say(title);
    for (std::size_t i = 0; i < items.size(); ++i) {
        say("  " + std::to_string(i + 1) + "  " + items[i]);
    }
    for (;;) {
        const std::string answer = ask("Which ones? Numbers, all or none [all]:");
        if (auto chosen = parseChoice(answer, items.size())) {
            return *chosen;
        }
        say("Please give numbers from 1 to " + std::to_string(items.size()) + ", all or none.");
    }
}

void Terminal::_write(const std::string& text) {
    std::string_view rest = text;
    while (!rest.empty()) {
        const ssize_t count = ::write(_descriptor, rest.data(), rest.size());
        if (count < 0 && errno != EINTR) {
            throw CommandFailure("the terminal is gone");
        }
        rest.remove_prefix(count < 0 ? 0 : static_cast<std::size_t>(count));
    }
}

// Asks with no more than the terminal itself has for mending the line.
//  line  receives the answer
void Terminal::_askPlainly(const std::string& prompt, bool isShown, int interruption, std::string& line) {
    SuspensionWatch suspension;
    for (;;) {
        line.clear();
        {
            std::optional<EchoGuard> quiet;
            if (!isShown) {
                quiet.emplace(_descriptor);
            }
            _write(prompt);
            if (_readLine(interruption, suspension.descriptor(), line)) {
                return;
            }
        }
        suspension.takeEffect();
    }
}

// Throws Interrupted when the descriptor given for that is readable first.
//  line    receives what is typed, and is at most twice as long as a line that a terminal takes
//  result  false when the one for suspensions is
bool Terminal::_readLine(int interruption, int suspension, std::string& line) {
    for (;;) {
        std::array<pollfd, 3> watched{
            {{_descriptor, POLLIN, 0}, {interruption, POLLIN, 0}, {suspension, POLLIN, 0}}};
        if (poll(watched.data(), watched.size(), -1) < 0 && errno == EINTR) {
            continue;
        }
        if (watched[1].revents != 0) {
            throw Interrupted();
        }
        if (watched[2].revents != 0) {
            return false;
        }
        const std::size_t before = line.size();
        if (before > kLongestLine) {
            throw CommandFailure("the line is too long");
        }
        line.resize(before + kLongestLine);
        const ssize_t count = ::read(_descriptor, line.data() + before, kLongestLine);
        line.resize(before + static_cast<std::size_t>(std::max(count, ssize_t{0})));
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count <= 0) {
            _write("\n");
            throw CommandFailure(kInputHasEnded);
        }
        if (line.ends_with('\n')) {
            line.pop_back();
            return true;
        }
    }
}

std::optional<std::vector<std::size_t>> parseChoice(const std::string& answer, std::size_t count) {
    std::set<std::size_t> chosen;
    if (answer.empty() || answer == "all") {
        for (std::size_t i = 0; i < count; ++i) {
            chosen.insert(i);
        }
        return std::vector(chosen.begin(), chosen.end());
    }
    if (answer == "none") {
        return std::vector<std::size_t>();
    }
    std::string separated = answer;
    for (char& character : separated) {
        character = character == ',' ? ' ' : character;
    }
    std::istringstream words(separated);
    for (std::string word; words >> word;) {
        std::size_t number = 0;
        const char* const end = word.data() + word.size();
        const auto result = std::from_chars(word.data(), end, number);
        if (result.ec != std::errc() || result.ptr != end || number < 1 || number > count) {
            return std::nullopt;
        }
        chosen.insert(number - 1);
    }
    return chosen.empty() ? std::nullopt : std::optional(std::vector(chosen.begin(), chosen.end()));
}

} // namespace welcomer::tool
