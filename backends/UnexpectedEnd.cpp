#include "backends/UnexpectedEnd.h"

#include "backends/posix/AlternateStack.h"
#include "propertylist/Characters.h"

#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string_view>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

// Everything below, but what is said to run elsewhere, runs in signal handlers: it allocates nothing, takes
// no lock and calls what POSIX allows there.

namespace welcomer {

namespace {

constexpr char kLogPath[] = "/dev/log";
// For a system log that does not read: room in the own buffer and in the daemon's are waited for one after the
// other, a second in all.
constexpr timeval kLongestWait{0, 500'000};

struct FatalSignal {
    int number;
    const char* name;
};
constexpr std::array kFatalSignals{FatalSignal{SIGABRT, "SIGABRT"}, FatalSignal{SIGBUS, "SIGBUS"},
                                   FatalSignal{SIGFPE, "SIGFPE"},   FatalSignal{SIGILL, "SIGILL"},
                                   FatalSignal{SIGSEGV, "SIGSEGV"}, FatalSignal{SIGSYS, "SIGSYS"},
                                   FatalSignal{SIGTRAP, "SIGTRAP"}};

UnexpectedEndOptions reportOptions;
pid_t reportingProcess = 0;
std::atomic<pid_t> endingThread = 0; // the one that has begun to end the process

// One line of bounded length; what is too long is cut, at a character's end, and says so.
class Line {
  public:
    // Control characters become visible: a line stays one line, whatever is in it.
    Line& operator<<(const char* text) {
        for (std::string_view rest = text; !rest.empty() && !_isCut;) {
            const std::size_t controlSize = _controlSize(rest);
            for (std::size_t at = 0; at < controlSize; ++at) {
                _appendEscaped(static_cast<unsigned char>(rest[at]));
            }
            if (controlSize == 0) {
                _append(rest.substr(0, 1));
            }
            rest.remove_prefix(controlSize == 0 ? 1 : controlSize);
        }
        return *this;
    }

    Line& operator<<(int number) {
        std::array<char, 12> digits{};
        std::size_t begin = digits.size() - 1;
        unsigned rest = number < 0 ? 0U - static_cast<unsigned>(number) : static_cast<unsigned>(number);
        do {
            digits[--begin] = static_cast<char>('0' + rest % 10);
            rest /= 10;
        } while (rest > 0);
        if (number < 0) {
            digits[--begin] = '-';
        }
        return *this << digits.data() + begin;
    }

    const char* bytes() const { return _bytes.data(); }
    std::size_t size() const { return _size; }

  private:
    // How many bytes a control character has that the text begins with; 0: it begins with another one.
    static std::size_t _controlSize(std::string_view text) {
        const auto first = static_cast<unsigned char>(text[0]);
        if (first < 0x20 || first == 0x7F) {
            return 1;
        }
        return first == 0xC2 && text.size() > 1 && static_cast<unsigned char>(text[1]) < 0xA0 ? 2 : 0;
    }

    void _appendEscaped(unsigned char byte) {
        const std::array<char, 4> escape{'\\', 'x', kHexDigits[byte >> 4], kHexDigits[byte & 15]};
        _append({escape.data(), escape.size()});
    }

    void _append(std::string_view text) {
        if (_size + text.size() > kLimit) {
            _cut();
            return;
        }
        std::memcpy(_bytes.data() + _size, text.data(), text.size());
        _size += text.size();
    }

    void _cut() {
        // A character that is cut in two goes as a whole.
        while (_size > 0 && (static_cast<unsigned char>(_bytes[_size - 1]) & 0xC0) == 0x80) {
            --_size;
        }
        if (_size > 0 && static_cast<unsigned char>(_bytes[_size - 1]) >= 0xC0) {
            --_size;
        }
        std::memcpy(_bytes.data() + _size, kEllipsis.data(), kEllipsis.size());
        _size += kEllipsis.size();
        _isCut = true;
    }

    static constexpr std::size_t kLimit = 1024;
    static constexpr std::string_view kEllipsis = "…";

    std::array<char, kLimit + kEllipsis.size() + 1> _bytes{}; // the last one always NUL
    std::size_t _size = 0;
    bool _isCut = false;
};

// As syslog(3) writes a record, but without the time, which the system log then adds: to know the local time
// means to read files.
void writeRecord(const Line& message) {
    ::close(STDIN_FILENO); // makes room for a socket, also where there is none left
    const int log = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    ::setsockopt(log, SOL_SOCKET, SO_SNDTIMEO, &kLongestWait, sizeof kLongestWait);
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, kLogPath, sizeof kLogPath);
    Line record;
    record << "<" << reportOptions.priority << ">" << program_invocation_short_name << ": "
           << message.bytes();
    ::sendto(log, record.bytes(), record.size(), MSG_NOSIGNAL, reinterpret_cast<const sockaddr*>(&address),
             sizeof address);
}

// Of several threads at once one speaks. One whose last words end it too says no more.
[[noreturn]] void end(const Line& what) {
    pid_t ending = 0;
    if (endingThread.compare_exchange_strong(ending, ::gettid())) {
        const char* const plugin = reportOptions.currentPlugin();
        Line message;
        if (plugin) {
            message << "ended by plug-in " << plugin << ": " << what.bytes();
        } else {
            message << "ended outside of any call into a plug-in: " << what.bytes();
        }
        writeRecord(message);
    } else {
        while (ending != ::gettid()) {
            ::pause(); // the other thread ends this one too
        }
    }
    ::_exit(0);
}

bool isForkedOff() {
    return ::getpid() != reportingProcess;
}

extern "C" {

static void endBySignal(int number) {
    if (isForkedOff()) {
        ::signal(number, SIG_DFL);
        ::raise(number);
        return;
    }
    Line what;
    for (const FatalSignal& signal : kFatalSignals) {
        what << (signal.number == number ? signal.name : "");
    }
    end(what);
}

// The rest of this file runs on a thread's ordinary way.

static void endByExit(int status, void* /*unused*/) {
    if (!isForkedOff()) {
        end(Line() << "exit(" << status << ")");
    }
}

static void endByQuickExit() {
    if (!isForkedOff()) {
        end(Line() << "quick_exit()");
    }
}
}

[[noreturn]] void endByTerminate() {
    if (isForkedOff()) {
        std::abort();
    }
    if (const std::exception_ptr exception = std::current_exception()) {
        try {
            std::rethrow_exception(exception);
        } catch (const std::exception& known) {
            end(Line() << "uncaught exception: " << known.what());
        } catch (...) {
            end(Line() << "uncaught exception");
        }
    }
    end(Line() << "std::terminate()");
}

} // namespace

void reportUnexpectedEnd(const UnexpectedEndOptions& options) {
    reportOptions = options;
    reportingProcess = ::getpid();
    [[maybe_unused]] static const auto* const stack = new posix::AlternateStack; // never destroyed

    struct sigaction action = {};
    action.sa_handler = endBySignal;
    // Without SA_NODEFER a fault in the last words would end the process by its signal.
    action.sa_flags = SA_ONSTACK | SA_NODEFER;
    for (const FatalSignal& signal : kFatalSignals) {
        ::sigaction(signal.number, &action, nullptr);
    }
    ::signal(SIGPIPE, SIG_IGN);
    ::signal(SIGXFSZ, SIG_IGN);
    std::set_terminate(endByTerminate);
    ::on_exit(endByExit, nullptr);
    std::at_quick_exit(endByQuickExit);
}

} // namespace welcomer
