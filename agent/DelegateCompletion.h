// One delegate's completion, from its start to the one moment at which it is over.

#pragma once

#include "platform/DispatchQueue.h"
#include "plugins/WLFirstRunDelegateConfiguration.h"

#include <atomic>
#include <chrono>
#include <exception>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// Shared by the queued job and by the handler that the plug-in gets, either of which may outlive the other.
// It does not hold the plug-in, so that a plug-in may keep its handler. Whatever fails on the way, the
// outcome leaves the group: after its line, or without one where that cannot be written.
class DelegateCompletion : public std::enable_shared_from_this<DelegateCompletion> {
  public:
    // Takes the time and enters the group; the completion's outcome leaves it.
    //  queue  held until there is an outcome
    // Main thread.
    DelegateCompletion(const std::string& identifier, std::shared_ptr<platform::WorkGroup> group,
                       std::shared_ptr<platform::DispatchQueue> queue);

    // Puts the job that completes the delegate on the queue. A queue without the means to take it counts as
    // an exception of the plug-in: nobody must wait for that job. Main thread.
    void queue(std::function<void()> job);

    // Calls the plug-in with the response alone, or with the aliases that the user chose as well. Nothing
    // that the plug-in throws gets out. On the delegate's queue.
    void complete(WLFirstRunDelegateConfiguration& plugin, const PropertyList& response);
    void completeWithAliases(WLFirstRunDelegateConfiguration& plugin, const PropertyList& response,
                             const std::optional<std::vector<std::string>>& aliases);

    // Logs an exception; it is the outcome unless there is one already. Nothing throws out of it. Any thread.
    void raised(const std::exception_ptr& exception);

  private:
    double _secondsSinceStart() const;

    // Of the handler's first call and the exception, the first one is the outcome.
    bool _claimOutcome();

    // Logs the outcome if it is one, and leaves the group whatever comes of that.
    template <class Log>
    void _handled(const Log& log);
    void _leave();

    const std::string _identifier; // as log lines have it
    const std::shared_ptr<platform::WorkGroup> _group;
    std::shared_ptr<platform::DispatchQueue> _queue;
    const std::chrono::nanoseconds _start;
    std::atomic<bool> _hasOutcome = false;
};

} // namespace welcomer
