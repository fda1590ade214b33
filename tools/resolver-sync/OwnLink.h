// A network link of our own, which carries nothing: the resolver keeps nameservers per link.

#pragma once

#include "platform/Error.h"

namespace welcomer::resolver {

// A pair of linked devices, both up, one with an address of global scope, without which the resolver takes no
// notice of it. Needs the right to administer the network.
class OwnLink {
  public:
    // Makes the link unless it is there.
    static platform::Outcome make();

    // Removes it; when there is none, that is a success.
    static platform::Outcome remove();

    // The link's number, or 0 when there is none.
    static int index();
};

} // namespace welcomer::resolver
