#include "backends/local/AlternateStack.h"

namespace welcomer::local {

AlternateStack::AlternateStack() noexcept {
    stack_t stack = {};
    stack.ss_sp = _memory.data();
    stack.ss_size = _memory.size();
    ::sigaltstack(&stack, &_previous);
}

AlternateStack::~AlternateStack() {
    ::sigaltstack(&_previous, nullptr);
}

} // namespace welcomer::local
