#include "tools/account-server/AccountServer.h"

#include "backends/posix/FileContent.h"
#include "backends/posix/SystemError.h"
#include "tools/account-server/HttpListener.h"
#include "tools/account-server/LogLine.h"
#include "tools/account-server/MetricsHandler.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <poll.h>
#include <stdexcept>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <syslog.h>
#include <system_error>
#include <systemd/sd-daemon.h>
#include <thread>
#include <utility>

namespace welcomer::server {

namespace {

constexpr std::size_t kMaximumFileSize = std::size_t{1} * 1024 * 1024;
constexpr std::size_t kThreadsThatWait = 16; // for an answer from elsewhere

posix::FileDescriptor takeSignals() {
    sigset_t signals;
    ::sigemptyset(&signals);
    for (const int number : {SIGTERM, SIGINT, SIGHUP}) {
        ::sigaddset(&signals, number);
    }
    ::pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    std::signal(SIGPIPE, SIG_IGN); // a client that has gone is no reason to end
    return posix::FileDescriptor(::signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK));
}

// Throws where the file cannot be read; one that may be missing is empty then.
std::string contentOf(const posix::RootFolder& root, const std::string& path, bool mayBeMissing = false) {
    std::string content;
    const int error = posix::readFile(root, path, content, kMaximumFileSize);
    if (error != 0 && !(mayBeMissing && error == ENOENT)) {
        throw std::runtime_error(root.shown(path) + ": " + std::generic_category().message(error));
    }
    return content;
}

Settings settingsBelow(const posix::RootFolder& root) {
    SettingsText read = readSettings(contentOf(root, kSettingsFile, true));
    if (!read.problems.empty()) {
        throw std::runtime_error(root.shown(kSettingsFile) + ": " + read.problems.front());
    }
    return std::move(read.settings);
}

std::size_t threadsFor(const Settings& settings) {
    if (settings.workers > 0) {
        return settings.workers;
    }
    return settings.source == Settings::Source::LDAP ? kThreadsThatWait
                                                     : std::max(1U, std::thread::hardware_concurrency());
}

} // namespace

// In this order: the threads end before what they use, and after the listeners that wait for them.
struct AccountServer::Generation {
    Settings settings;
    std::unique_ptr<AccountSource> source;
    std::unique_ptr<AccountHandler> handler;
    std::unique_ptr<MetricsHandler> metrics;
    std::unique_ptr<WorkerPool> workers;
    std::list<HttpListener> listeners;

    void drain() { std::ranges::for_each(listeners, &HttpListener::drain); }
    bool isEmpty() const { return std::ranges::all_of(listeners, &HttpListener::isEmpty); }
};

AccountServer::AccountServer(std::vector<ListeningSocket> sockets, posix::RootFolder root,
                             MakeSource makeSource, platform::SystemLog& log)
    : _sockets(std::move(sockets)),
      _root(std::move(root)),
      _makeSource(std::move(makeSource)),
      _systemLog(log),
      _signals(takeSignals()),
      _wakeUp(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    _generations.push_back(_start());
}

AccountServer::~AccountServer() = default;

std::unique_ptr<AccountServer::Generation> AccountServer::_start() {
    auto generation = std::make_unique<Generation>();
    generation->settings = settingsBelow(_root);
    const Settings& settings = generation->settings;
    std::unique_ptr<TlsIdentity> identity;
    if (!settings.certificate.empty()) {
        identity = std::make_unique<TlsIdentity>(
            TlsIdentity{contentOf(_root, settings.certificate), contentOf(_root, settings.key)});
    }
    generation->source = _makeSource(settings);
    generation->handler =
        std::make_unique<AccountHandler>(*generation->source, settings.tellsUnknownUsers, _history, _metrics,
                                         [this](const std::string& line) { _log(LOG_INFO, line); });
    generation->metrics = std::make_unique<MetricsHandler>(_metrics);
    generation->workers = std::make_unique<WorkerPool>(threadsFor(settings), settings.queue);
    const HttpSurroundings surroundings{_timers, _metrics, *generation->workers, [this] {
                                            ::eventfd_write(_wakeUp.get(), 1);
                                        }};
    for (const ListeningSocket& socket : _sockets) {
        using Use = ListeningSocket::Use;
        const Use use = useOf(socket, identity != nullptr);
        RequestHandler& handler =
            use == Use::Metrics ? static_cast<RequestHandler&>(*generation->metrics) : *generation->handler;
        posix::FileDescriptor same(::fcntl(socket.socket.get(), F_DUPFD_CLOEXEC, 0));
        generation->listeners.emplace_back(std::move(same), use == Use::Tls ? identity.get() : nullptr,
                                           settings, handler, surroundings);
        _log(LOG_INFO, LogLine("listening")
                           .add("socket", socket.shown)
                           .add("use", use == Use::Metrics ? "metrics"
                                       : use == Use::Tls   ? "tls"
                                                           : "clear")
                           .text());
    }
    return generation;
}

void AccountServer::run() {
    sd_notify(0, "READY=1");
    while (!_generations.empty()) {
        _wait();
        _takeSignals();
        _timers.run();
        _runListeners();
        _generations.remove_if([this](const auto& generation) {
            return (_stops || generation != _generations.back()) && generation->isEmpty();
        });
    }
}

void AccountServer::_wait() {
    std::vector<pollfd> waiting = {{_signals.get(), POLLIN, 0}, {_wakeUp.get(), POLLIN, 0}};
    bool isPending = false;
    for (const auto& generation : _generations) {
        for (const HttpListener& listener : generation->listeners) {
            waiting.push_back({listener.descriptor(), POLLIN, 0});
            isPending = isPending || listener.isPending();
        }
    }
    int milliseconds = isPending ? 0 : -1;
    if (const auto next = _timers.next(); next && !isPending) {
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(*next - Timers::Clock::now());
        milliseconds =
            static_cast<int>(std::clamp<std::chrono::milliseconds::rep>(left.count(), 0, 3'600'000));
    }
    ::poll(waiting.data(), waiting.size(), milliseconds);
    eventfd_t count = 0;
    ::eventfd_read(_wakeUp.get(), &count);
}

void AccountServer::_runListeners() {
    for (const auto& generation : _generations) {
        std::ranges::for_each(generation->listeners, &HttpListener::run);
    }
}

void AccountServer::_takeSignals() {
    signalfd_siginfo signal{};
    while (::read(_signals.get(), &signal, sizeof signal) == sizeof signal) {
        if (signal.ssi_signo == SIGHUP) {
            _reload();
        } else {
            _stop();
        }
    }
}

void AccountServer::_reload() {
    if (_stops) {
        return;
    }
    sd_notify(0, "RELOADING=1");
    try {
        std::unique_ptr<Generation> next = _start();
        _generations.back()->drain();
        _generations.push_back(std::move(next));
        ++_metrics.reloads;
        _log(LOG_NOTICE, LogLine("reloaded").text());
    } catch (const std::exception& error) {
        _log(LOG_ERR, LogLine("reload-failed").add("reason", error.what()).text());
    }
    sd_notify(0, "READY=1");
}

void AccountServer::_stop() {
    if (std::exchange(_stops, true)) {
        return;
    }
    sd_notify(0, "STOPPING=1");
    _log(LOG_NOTICE, LogLine("stopping").text());
    std::ranges::for_each(_generations, [](const auto& generation) { generation->drain(); });
    _breakOff.set(_generations.back()->settings.stopLimit, [this] {
        for (const auto& generation : _generations) {
            std::ranges::for_each(generation->listeners, &HttpListener::breakOff);
        }
    });
}

void AccountServer::_log(int severity, const std::string& line) const {
    _systemLog.write((platform::kErrorPriority & ~LOG_PRIMASK) | severity, line);
}

} // namespace welcomer::server
