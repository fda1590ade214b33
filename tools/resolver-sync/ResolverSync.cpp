#include "tools/resolver-sync/ResolverSync.h"

#include "log/PCLogManager.h"
#include "tools/resolver-sync/OwnLink.h"

#include <algorithm>
#include <csignal>
#include <ctime>
#include <sys/wait.h>
#include <system_error>
#include <systemd/sd-daemon.h>
#include <systemd/sd-event.h>

namespace welcomer::resolver {

namespace {

// A switch removes the folder and writes it anew within a moment: the folder is read once it has been quiet
// for this long, and no later than the second after the first change.
constexpr std::uint64_t kQuiet = 5'000;
constexpr std::uint64_t kLongestWait = 200'000;
// After a failure that nothing tells the end of.
constexpr std::uint64_t kRetry = 5'000'000;

void check(int result, const char* what) {
    if (result < 0) {
        throw std::system_error(-result, std::generic_category(), what);
    }
}

} // namespace

void ResolverSync::DropEvent::operator()(sd_event* event) const {
    sd_event_unref(event);
}

void ResolverSync::DropSource::operator()(sd_event_source* source) const {
    sd_event_source_disable_unref(source);
}

sd_event* ResolverSync::_newEvent() {
    sd_event* event = nullptr;
    check(sd_event_new(&event), "the event loop");
    return event;
}

ResolverSync::ResolverSync(const std::string& folder, const std::string& runtimeFolder, RunningMark& mark)
    : _folder(folder),
      _mark(mark),
      _event(_newEvent()),
      _watch(_event.get(), folder, [this] { _folderChanged(); }),
      _resolver(_event.get(), [this](bool running) { _resolverAppeared(running); }),
      _forwarder(runtimeFolder),
      _linkRouting(_resolver, _forwarder),
      // Gone with the next start of the machine, as everything of ours is to be.
      _delegateRouting("/run/systemd/dns-delegate.d", [this] { return _resolver.reload(); }) {
    sigset_t signals;
    ::sigemptyset(&signals);
    for (const int number : {SIGTERM, SIGINT, SIGCHLD}) {
        ::sigaddset(&signals, number);
    }
    ::sigprocmask(SIG_BLOCK, &signals, nullptr);
    check(sd_event_add_signal(_event.get(), nullptr, SIGTERM, nullptr, nullptr), "SIGTERM");
    check(sd_event_add_signal(_event.get(), nullptr, SIGINT, nullptr, nullptr), "SIGINT");
    sd_event_source* timer = nullptr;
    check(sd_event_add_time(
              _event.get(), &timer, CLOCK_MONOTONIC, 0, 1,
              [](sd_event_source*, std::uint64_t, void* self) {
                  static_cast<ResolverSync*>(self)->_synchronise();
                  return 0;
              },
              this),
          "the timer");
    _timer.reset(timer);
    sd_event_source_set_enabled(timer, SD_EVENT_OFF);
}

ResolverSync::~ResolverSync() = default;

int ResolverSync::run() {
    // A run that was cut short may have left a link that leads to nobody.
    if (const auto removed = OwnLink::remove(); !removed) {
        WL_LOG("Failed to clear the resolver's routes: %@", removed.error);
    }
    _synchronise();
    ::sd_notify(0, "READY=1");
    const int result = sd_event_loop(_event.get());
    _takeBack();
    return result == 0 ? 0 : 1;
}

void ResolverSync::_folderChanged() {
    std::uint64_t now = 0;
    sd_event_now(_event.get(), CLOCK_MONOTONIC, &now);
    if (!_firstChange) {
        _firstChange = now;
    }
    const std::uint64_t latest = *_firstChange + kLongestWait;
    _synchroniseIn(std::min(kQuiet, latest > now ? latest - now : 0));
}

void ResolverSync::_resolverAppeared(bool running) {
    if (running) {
        _synchroniseIn(0);
    } else {
        sd_event_exit(_event.get(), 1);
    }
}

void ResolverSync::_forwarderEnded() {
    _forwarder.hasEnded();
    _forwarderWatch.reset();
    WL_LOG("The forwarder for the resolver's overrides has ended");
    _mark.note("the forwarder has ended");
    _synchroniseIn(kRetry);
}

void ResolverSync::_synchroniseIn(std::uint64_t microseconds) {
    sd_event_source_set_time_relative(_timer.get(), microseconds);
    sd_event_source_set_enabled(_timer.get(), SD_EVENT_ONESHOT);
}

void ResolverSync::_synchronise() {
    _firstChange.reset();
    _watch.rearm();
    OverrideFolder folder = readOverrides(_folder);
    _logRefusals(std::move(folder.refusals));
    if (!_resolver.isRunning()) {
        if (!folder.overrides.empty() && !_toldOfMissingResolver) {
            WL_LOG("The resolver's overrides have no effect: systemd-resolved does not run");
        }
        _toldOfMissingResolver = !folder.overrides.empty();
        _mark.note("systemd-resolved does not run");
        return;
    }
    _toldOfMissingResolver = false;
    _forwarderWatch.reset();
    const platform::Outcome applied = _routing().apply(folder.overrides);
    _watchForwarder();
    _mark.note(applied ? "" : applied.error.message);
    if (!applied) {
        WL_LOG("Failed to route the resolver's overrides: %@", applied.error);
        _synchroniseIn(kRetry);
    }
}

void ResolverSync::_watchForwarder() {
    if (_forwarder.process() == 0) {
        return;
    }
    sd_event_source* source = nullptr;
    sd_event_add_child(
        _event.get(), &source, _forwarder.process(), WEXITED,
        [](sd_event_source*, const siginfo_t*, void* self) {
            static_cast<ResolverSync*>(self)->_forwarderEnded();
            return 0;
        },
        this);
    _forwarderWatch.reset(source);
}

void ResolverSync::_logRefusals(std::vector<std::string> refusals) {
    for (const std::string& refusal : refusals) {
        if (std::ranges::find(_refusals, refusal) == _refusals.end()) {
            WL_LOG("Refusing resolver override %@", refusal);
        }
    }
    _refusals = std::move(refusals);
}

Routing& ResolverSync::_routing() {
    if (_resolver.hasDelegates()) {
        return _delegateRouting;
    }
    return _linkRouting;
}

void ResolverSync::_takeBack() {
    _forwarderWatch.reset();
    if (_resolver.isRunning() && _resolver.hasDelegates()) {
        if (const auto cleared = _delegateRouting.apply({}); !cleared) {
            WL_LOG("Failed to clear the resolver's routes: %@", cleared.error);
        }
    }
    if (const auto removed = OwnLink::remove(); !removed) {
        WL_LOG("Failed to clear the resolver's routes: %@", removed.error);
    }
    _forwarder.stop();
}

} // namespace welcomer::resolver
