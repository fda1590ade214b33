// Memory that is wiped before it is given back: what a password has been in.

#pragma once

#include "backends/posix/SecretText.h"

#include <cstddef>
#include <memory>
#include <string.h>
#include <string>
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

// Wipes a text of somebody else's when this goes. Borrows it.
class WipedAtEnd {
  public:
    explicit WipedAtEnd(std::string& text) : _text(text) {}
    ~WipedAtEnd() { posix::wipe(_text); }
    WipedAtEnd(const WipedAtEnd&) = delete;
    WipedAtEnd& operator=(const WipedAtEnd&) = delete;

  private:
    std::string& _text;
};

} // namespace welcomer::server
