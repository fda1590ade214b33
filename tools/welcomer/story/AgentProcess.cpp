#include "tools/welcomer/story/AgentProcess.h"

#include "agent/leaveProcess.h"
#include "agent/wlnimbussetup.h"
#include "plugins/PluginContext.h"
#include "tools/welcomer/terminal/Failure.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstring>
#include <fcntl.h>
#include <iostream>
#include <mutex>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace welcomer::tool {

namespace {

constexpr int kTickMilliseconds = 200;

[[noreturn]] void failed(const char* what) {
    throw CommandFailure(std::string(what) + ": " + std::generic_category().message(errno));
}

// A descriptor that is closed at the end of its scope.
class Descriptor {
  public:
    explicit Descriptor(int number) : _number(number) {}
    Descriptor(Descriptor&& other) noexcept : _number(std::exchange(other._number, -1)) {}
    ~Descriptor() { close(); }
    Descriptor& operator=(Descriptor&&) = delete;

    int number() const { return _number; }
    void close() {
        if (_number >= 0) {
            ::close(std::exchange(_number, -1));
        }
    }

  private:
    int _number;
};

// What stands before each message in the pipe.
struct RecordHeader {
    std::int64_t nanoseconds;
    std::uint64_t length;
    std::uint64_t isTold; // not a log record
};

// The child's system log, and what else it tells: the other end of the pipe.
class PipeLog final : public KeptLog {
  public:
    explicit PipeLog(int descriptor) : _descriptor(descriptor) {}

    void setClock(platform::Clock& clock) {
        _clock = &clock;
        _start = clock.now();
    }

    void write(int priority, const std::string& message) override {
        KeptLog::write(priority, message);
        _send(message, false);
    }

    void tell(const std::string& text) { _send(text, true); }

  private:
    void _send(const std::string& text, bool isTold) {
        const std::chrono::nanoseconds time = _clock ? _clock->now() - _start : std::chrono::nanoseconds(0);
        const RecordHeader header{time.count(), text.size(), isTold ? 1U : 0U};
        const std::lock_guard lock(_mutex);
        _write({reinterpret_cast<const char*>(&header), sizeof header});
        _write(text);
    }

    void _write(std::string_view bytes) {
        while (!bytes.empty()) {
            const ssize_t count = ::write(_descriptor, bytes.data(), bytes.size());
            if (count < 0 && errno != EINTR) {
                return; // nobody listens any more
            }
            bytes.remove_prefix(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
        }
    }

    const int _descriptor;
    platform::Clock* _clock = nullptr;
    std::chrono::nanoseconds _start{0};
    std::mutex _mutex;
};

// Puts the records together from what the pipe gives.
class RecordReader {
  public:
    RecordReader(int descriptor, const AgentListener& listener)
        : _descriptor(descriptor),
          _listener(listener) {}

    // Takes what is in the pipe now.
    //  result  false at the pipe's end
    bool readSome() {
        std::array<char, 65536> buffer;
        for (;;) {
            const ssize_t count = ::read(_descriptor, buffer.data(), buffer.size());
            if (count > 0) {
                _bytes.append(buffer.data(), static_cast<std::size_t>(count));
                _handOut();
            } else if (count == 0) {
                return false;
            } else if (errno != EINTR) {
                return true; // nothing more for now
            }
        }
    }

  private:
    void _handOut() {
        RecordHeader header{};
        std::size_t used = 0;
        while (_bytes.size() - used >= sizeof header) {
            std::memcpy(&header, _bytes.data() + used, sizeof header);
            if (_bytes.size() - used - sizeof header < header.length) {
                break;
            }
            const std::string text = _bytes.substr(used + sizeof header, header.length);
            if (header.isTold == 0) {
                _listener.record({std::chrono::nanoseconds(header.nanoseconds), text});
            } else if (_listener.told) {
                _listener.told(text);
            }
            used += sizeof header + header.length;
        }
        _bytes.erase(0, used);
    }

    const int _descriptor;
    const AgentListener& _listener;
    std::string _bytes;
};

// The child's whole life.
[[noreturn]] void beChild(const PlatformFactory& buildPlatform, const std::string& root, TimeKind time,
                          pid_t parent, int logDescriptor, const ChildLife& life,
                          platform::RunLoops* runLoops) {
    // Should the tool be killed, its child goes with it.
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) {
        _exit(1);
    }
    dup2(STDERR_FILENO, STDOUT_FILENO); // a plug-in's own words are no result of the tool
    PipeLog log(logDescriptor);
    const auto owner = buildPlatform({.root = root, .systemLog = &log, .runLoops = runLoops}, time);
    log.setClock(owner->platform().clock);
    const platform::ScopedPlatform installed(owner->platform());
    setPluginRoot(root);
    leaveProcess(life(log, [&log](const std::string& text) { log.tell(text); }));
}

int beAgent(const KeptLog& /*log*/, const std::function<void(const std::string&)>& /*tell*/) {
    const char* const arguments[] = {"wlnimbussetup", nullptr};
    return wlnimbussetup(1, arguments);
}

// Takes the child away if it is still there when this ends.
class Child {
  public:
    explicit Child(pid_t id) : _id(id) {}
    ~Child() {
        if (_id > 0) {
            kill(_id, SIGKILL);
            wait();
        }
    }
    Child(const Child&) = delete;
    Child& operator=(const Child&) = delete;

    AgentEnd wait() {
        int status = 0;
        while (waitpid(_id, &status, 0) < 0 && errno == EINTR) {
        }
        _id = 0;
        return WIFEXITED(status) ? AgentEnd{WEXITSTATUS(status), 0}
                                 : AgentEnd{std::nullopt, WTERMSIG(status)};
    }

  private:
    pid_t _id;
};

} // namespace

std::string AgentEnd::description() const {
    return exitStatus ? "status " + std::to_string(*exitStatus)
                      : "signal " + std::to_string(signal) + " (" + strsignal(signal) + ")";
}

AgentEnd runAgentProcess(const PlatformFactory& buildPlatform, const std::string& root, TimeKind time,
                         InterruptionGuard& guard, const AgentListener& listener) {
    return runChildProcess(buildPlatform, root, time, guard, listener, beAgent);
}

AgentEnd runChildProcess(const PlatformFactory& buildPlatform, const std::string& root, TimeKind time,
                         InterruptionGuard& guard, const AgentListener& listener, const ChildLife& life,
                         platform::RunLoops* runLoops) {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) {
        failed("cannot make a pipe");
    }
    const Descriptor output(ends[0]);
    Descriptor input(ends[1]);
    fcntl(output.number(), F_SETFL, O_NONBLOCK);

    std::cout.flush();
    const pid_t parent = getpid();
    const pid_t id = fork();
    if (id < 0) {
        failed("cannot make a process");
    }
    if (id == 0) {
        guard.release();
        beChild(buildPlatform, root, time, parent, input.number(), life, runLoops);
    }
    Child child(id);
    input.close();
    // The end of the process is what counts: what a plug-in left running may hold the pipe open.
    // The call itself: its header gives it the wrong linkage in C++.
    const Descriptor process(static_cast<int>(syscall(SYS_pidfd_open, id, 0)));
    if (process.number() < 0) {
        failed("cannot watch the process");
    }

    RecordReader reader(output.number(), listener);
    std::array<pollfd, 3> watched{
        {{process.number(), POLLIN, 0}, {guard.descriptor(), POLLIN, 0}, {output.number(), POLLIN, 0}}};
    for (;;) {
        poll(watched.data(), watched.size(), listener.tick ? kTickMilliseconds : -1);
        const bool ended = watched[0].revents != 0;
        if (watched[1].revents != 0) {
            throw Interrupted();
        }
        if (!reader.readSome()) {
            watched[2].fd = -1;
        }
        if (ended) {
            return child.wait();
        }
        if (listener.tick) {
            listener.tick();
        }
    }
}

} // namespace welcomer::tool
