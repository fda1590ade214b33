#include "agent/DelegateCompletion.h"

#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "plugins/PluginText.h"

#include <utility>

namespace welcomer {

namespace {

// The success flag and the error as a message shows them.
std::string describeOutcome(bool succeeded, const std::optional<platform::Error>& error) {
    return succeeded ? "completed" : text::describe(error);
}

} // namespace

DelegateCompletion::DelegateCompletion(const std::string& identifier,
                                       std::shared_ptr<platform::WorkGroup> group,
                                       std::shared_ptr<platform::DispatchQueue> queue)
    : _identifier(pluginText(identifier)),
      _group(std::move(group)),
      _queue(std::move(queue)),
      _start(platform::current().clock.now()) {
    _group->enter();
}

void DelegateCompletion::queue(std::function<void()> job) {
    // A hold of its own, since the outcome may release the queue at any moment from here on.
    const auto queue = _queue;
    try {
        queue->async(std::move(job));
    } catch (...) {
        raised(std::current_exception());
    }
}

template <class Log>
void DelegateCompletion::_handled(const Log& log) {
    if (!_claimOutcome()) {
        return;
    }
    try {
        log();
    } catch (...) {
        // No memory for the line: the agent must not wait for ever all the same.
    }
    _leave();
}

void DelegateCompletion::complete(WLFirstRunDelegateConfiguration& plugin, const PropertyList& response) {
    const auto handler = [self = shared_from_this()](bool succeeded,
                                                     const std::optional<platform::Error>& error) {
        self->_handled([&] {
            WL_LOG("%@ setup: %@ (%0.3f seconds)", self->_identifier, describeOutcome(succeeded, error),
                   self->_secondsSinceStart());
        });
    };
    try {
        plugin.completeSetupWithResponseHandler(response, handler);
    } catch (...) {
        raised(std::current_exception());
    }
}

void DelegateCompletion::completeWithAliases(WLFirstRunDelegateConfiguration& plugin,
                                             const PropertyList& response,
                                             const std::optional<std::vector<std::string>>& aliases) {
    const auto handler = [self = shared_from_this()](bool succeeded,
                                                     const std::optional<platform::Error>& error) {
        self->_handled([&] {
            WL_LOG("%@ setup+chosen: %@ (%0.3f seconds)", self->_identifier,
                   describeOutcome(succeeded, error), self->_secondsSinceStart());
        });
    };
    try {
        plugin.completeSetupWithResponseChosenAliasesHandler(response, aliases, handler);
    } catch (...) {
        raised(std::current_exception());
    }
}

void DelegateCompletion::raised(const std::exception_ptr& exception) {
    const bool isOutcome = _claimOutcome();
    try {
        WL_LOG("exception in setup response for plugin %@ (%0.3f seconds): %@", _identifier,
               _secondsSinceStart(), exception);
    } catch (...) {
        // Without its line, then.
    }
    if (isOutcome) {
        _leave();
    }
}

double DelegateCompletion::_secondsSinceStart() const {
    return std::chrono::duration<double>(platform::current().clock.now() - _start).count();
}

bool DelegateCompletion::_claimOutcome() {
    return !_hasOutcome.exchange(true);
}

void DelegateCompletion::_leave() {
    _group->leave();
    _queue.reset();
}

} // namespace welcomer
