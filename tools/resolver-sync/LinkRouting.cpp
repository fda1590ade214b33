#include "tools/resolver-sync/LinkRouting.h"

#include "tools/resolver-sync/OwnLink.h"

#include <chrono>
#include <thread>

namespace welcomer::resolver {

platform::Outcome LinkRouting::_clear() {
    const bool wasThere = OwnLink::index() != 0;
    platform::Outcome removed = OwnLink::remove();
    _forwarder.stop();
    return removed && wasThere ? _resolver.flushCaches() : removed;
}

platform::Outcome LinkRouting::apply(const Overrides& overrides) {
    if (overrides.empty()) {
        return _clear();
    }
    platform::Outcome outcome = _forwarder.serve(overrides);
    const auto then = [&](auto next) {
        if (outcome) {
            outcome = next();
        }
    };
    // While the forwarder starts.
    then([] { return OwnLink::make(); });
    then([&] {
        platform::Outcome ready = _forwarder.waitUntilReady();
        if (!ready) {
            // Somebody else may listen there, who is to get no queries.
            static_cast<void>(OwnLink::remove());
        }
        return ready;
    });
    std::vector<std::string> domains;
    for (const auto& [domain, nameservers] : overrides) {
        domains.push_back(domain);
    }
    then([&] {
        const auto route = [&] {
            return _resolver.routeLink(OwnLink::index(), domains, Forwarder::kAddress, Forwarder::kPort);
        };
        platform::Outcome routed = route();
        // A link that was made only now the resolver may not have heard of.
        for (int attempt = 0; !routed && attempt < 50; ++attempt) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
            routed = route();
        }
        return routed;
    });
    then([&] { return _resolver.flushCaches(); });
    return outcome;
}

} // namespace welcomer::resolver
