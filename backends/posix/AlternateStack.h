// A second stack for a thread's signal handlers.

#pragma once

#include <array>
#include <csignal>
#include <cstddef>

namespace welcomer::posix {

// Lets the calling thread's handlers of signals (those that ask for it, with SA_ONSTACK) run also once the
// thread's own stack has overflowed, for as long as this object lives. Where it lives is where that stack
// lies: on the thread's own stack it takes room at the end that does not overflow. What is not used of it is
// never touched, and so costs no memory. Made and destroyed on the same thread, without another one in
// between.
class AlternateStack {
  public:
    AlternateStack() noexcept;
    ~AlternateStack();
    AlternateStack(const AlternateStack&) = delete;
    AlternateStack& operator=(const AlternateStack&) = delete;

  private:
    static constexpr std::size_t kSize = std::size_t{32} << 10; // the largest registers take a third of it

    stack_t _previous = {};
    alignas(std::max_align_t) std::array<std::byte, kSize> _memory; // without a value: untouched
};

} // namespace welcomer::posix
