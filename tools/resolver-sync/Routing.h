// How the resolver is brought in line with the overrides.

#pragma once

#include "platform/Error.h"
#include "tools/resolver-sync/Overrides.h"

namespace welcomer::resolver {

class Routing {
  public:
    virtual ~Routing() = default;

    // Sends each domain's queries to its nameservers, and no others. With no overrides nothing of ours is
    // left. When it fails, some may be routed and others not.
    virtual platform::Outcome apply(const Overrides& overrides) = 0;
};

} // namespace welcomer::resolver
