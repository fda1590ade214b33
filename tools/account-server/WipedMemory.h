// Memory that is wiped before it is given back: what a password has been in.

#pragma once

#include "backends/posix/SecretText.h"

#include <cstddef>
#include <memory>
#include <string.h>
#include <vector>

namespace welcomer::server {

// Wipes every piece of memory that it takes back, those that a growing container leaves among them.
template <class T>
struct WipingAllocator {
    using value_type = T;

    WipingAllocator() = default;
    template <class Other>
    WipingAllocator(const WipingAllocator<Other>& /*other*/) {}

    T* allocate(std::size_t count) { return std::allocator<T>().allocate(count); }
    void deallocate(T* memory, std::size_t count) {
        ::explicit_bzero(memory, count * sizeof(T));
        std::allocator<T>().deallocate(memory, count);
    }
    friend bool operator==(const WipingAllocator&, const WipingAllocator&) { return true; }
};

using WipedBytes = std::vector<char, WipingAllocator<char>>;

using posix::WipedAtEnd;

} // namespace welcomer::server
