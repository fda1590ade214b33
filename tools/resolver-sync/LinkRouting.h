// Routing through a link of our own and a forwarder, for a resolver that keeps one set of nameservers per
// link.

#pragma once

#include "tools/resolver-sync/Forwarder.h"
#include "tools/resolver-sync/ResolverService.h"
#include "tools/resolver-sync/Routing.h"

namespace welcomer::resolver {

// The forwarder is needed for two reasons: one link cannot send different domains to different nameservers,
// and the resolver asks a link's nameserver through that link alone, which leads nowhere here.
class LinkRouting final : public Routing {
  public:
    // Borrows both.
    LinkRouting(ResolverService& resolver, Forwarder& forwarder)
        : _resolver(resolver),
          _forwarder(forwarder) {}

    platform::Outcome apply(const Overrides& overrides) override;

  private:
    platform::Outcome _clear();

    ResolverService& _resolver;
    Forwarder& _forwarder;
};

} // namespace welcomer::resolver
