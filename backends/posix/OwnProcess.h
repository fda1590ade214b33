// Work whose traces in memory go at once.

#pragma once

#include <functional>

namespace welcomer::posix {

// Has some work done by a copy of this process, which ends with it, and waits for that. The copy has the calling
// thread alone: the work may not wait for another one, nor take a lock that one may hold, and what it throws is
// lost. It ends when the calling thread does.
//  result  what the work says; false where it could not be done
// Any thread.
bool succeedsInAProcessOfItsOwn(const std::function<bool()>& work);

} // namespace welcomer::posix
