#include "backends/posix/AlternateStack.h"

namespace welcomer::posix {

AlternateStack::AlternateStack() noexcept {
    stack_t stack = {};
    stack.ss_sp = _memory.data();
    stack.ss_size = _memory.size();
    ::sigaltstack(&stack, &_previous);
}

AlternateStack::~AlternateStack() {
    ::sigaltstack(&_previous, nullptr);
}

} // namespace welcomer::posix
