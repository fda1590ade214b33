// The service's one loop: it waits for changes and brings the resolver in line.

#pragma once

#include "tools/resolver-sync/DelegateRouting.h"
#include "tools/resolver-sync/FolderWatch.h"
#include "tools/resolver-sync/Forwarder.h"
#include "tools/resolver-sync/LinkRouting.h"
#include "tools/resolver-sync/ResolverService.h"
#include "tools/shared/RunningMark.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

struct sd_event;
struct sd_event_source;

namespace welcomer::resolver {

// Wakes up only when the folder, the resolver or the forwarder has changed, or a failure is to be made good.
class ResolverSync {
  public:
    // Throws std::system_error when it cannot watch or has no bus.
    //  folder         the overrides
    //  runtimeFolder  where our own file lies, and goes with the last override
    //  mark           where what keeps the overrides from having an effect is noted; borrowed
    ResolverSync(const std::string& folder, const std::string& runtimeFolder, RunningMark& mark);
    ~ResolverSync();
    ResolverSync(const ResolverSync&) = delete;
    ResolverSync& operator=(const ResolverSync&) = delete;

    // Runs until the process is told to end, then takes everything back.
    //  result  0, or 1 when the bus was lost
    int run();

  private:
    struct DropEvent {
        void operator()(sd_event* event) const;
    };
    struct DropSource {
        void operator()(sd_event_source* source) const;
    };

    static sd_event* _newEvent();
    void _folderChanged();
    void _resolverAppeared(bool running);
    void _forwarderEnded();
    void _synchroniseIn(std::uint64_t microseconds);
    void _synchronise();
    void _watchForwarder();
    void _logRefusals(std::vector<std::string> refusals);
    Routing& _routing();
    void _takeBack();

    std::string _folder;
    RunningMark& _mark;
    std::unique_ptr<sd_event, DropEvent> _event;
    FolderWatch _watch;
    ResolverService _resolver;
    Forwarder _forwarder;
    LinkRouting _linkRouting;
    DelegateRouting _delegateRouting;
    std::unique_ptr<sd_event_source, DropSource> _timer;
    std::unique_ptr<sd_event_source, DropSource> _forwarderWatch;
    std::optional<std::uint64_t> _firstChange; // when the changes began that are waiting, in microseconds
    std::vector<std::string> _refusals;        // those that are in the log already
    bool _toldOfMissingResolver = false;
};

} // namespace welcomer::resolver
