// An open file that closes itself.

#pragma once

#include <unistd.h>
#include <utility>

namespace welcomer::posix {

class FileDescriptor {
  public:
    // Takes the descriptor over; a negative one is none.
    explicit FileDescriptor(int descriptor = -1) : _descriptor(descriptor) {}
    FileDescriptor(FileDescriptor&& other) noexcept : _descriptor(std::exchange(other._descriptor, -1)) {}
    FileDescriptor& operator=(FileDescriptor&& other) noexcept {
        std::swap(_descriptor, other._descriptor);
        return *this;
    }
    FileDescriptor(const FileDescriptor&) = delete;
    FileDescriptor& operator=(const FileDescriptor&) = delete;
    ~FileDescriptor() {
        if (_descriptor >= 0) {
            ::close(_descriptor);
        }
    }

    int get() const { return _descriptor; }
    explicit operator bool() const { return _descriptor >= 0; }

    // Gives the descriptor away.
    int release() { return std::exchange(_descriptor, -1); }

  private:
    int _descriptor;
};

} // namespace welcomer::posix
