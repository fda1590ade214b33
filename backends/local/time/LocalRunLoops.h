// A run loop for each thread, on a mutex and a condition variable.

#pragma once

#include "platform/RunLoop.h"

namespace welcomer::local {

// The loops belong to the threads: any two objects of this class give a thread the same one. A loop sleeps
// until its deadline unless something is performed on it. When its thread ends, its pending blocks are
// released, and so is every block that is performed on it later.
class LocalRunLoops final : public platform::RunLoops {
  public:
    std::shared_ptr<platform::RunLoop> current() override;
};

} // namespace welcomer::local
