// libcurl's memory: what it no longer needs is wiped, since a request's body has gone through its buffers.

#pragma once

namespace welcomer::desktop {

// Prepares libcurl for this process, once. Where somebody has prepared it already, its memory stays theirs.
// Any thread.
//  result  whether it can be used
bool prepareCurl();

} // namespace welcomer::desktop
