#include "backends/posix/SecretText.h"

#include <cstring>
#include <map>
#include <mutex>
#include <sys/prctl.h>

namespace welcomer::posix {

namespace {

// All that there are, by where their text is.
struct Held {
    std::mutex mutex;
    std::size_t count = 0;
    int dumpableBefore = 0;
    std::map<const char*, std::weak_ptr<const void>> buffers;
};

// Never destroyed: a thread may hold one while the process ends.
Held& held() {
    static Held& instance = *new Held;
    return instance;
}

} // namespace

void wipe(std::string& text) {
    text.resize(text.capacity()); // beyond the size, an earlier and longer content may be left
    ::explicit_bzero(text.data(), text.size());
    text.clear();
}

// What is written into it stays where it is.
struct SecretText::Buffer {
    Buffer() {
        Held& all = held();
        const std::lock_guard lock(all.mutex);
        if (all.count++ == 0) {
            all.dumpableBefore = ::prctl(PR_GET_DUMPABLE);
            ::prctl(PR_SET_DUMPABLE, 0);
        }
    }
    ~Buffer() {
        const char* const place = text.data();
        wipe(text);
        Held& all = held();
        const std::lock_guard lock(all.mutex);
        all.buffers.erase(place);
        // Anything but 1 is the system's own choice, and cannot be set.
        if (--all.count == 0 && all.dumpableBefore == 1) {
            ::prctl(PR_SET_DUMPABLE, 1);
        }
    }
    Buffer(const Buffer&) = delete;
    Buffer& operator=(const Buffer&) = delete;

    // Has others find it.
    static std::shared_ptr<const Buffer> finished(std::shared_ptr<Buffer> buffer) {
        Held& all = held();
        const std::lock_guard lock(all.mutex);
        all.buffers.insert_or_assign(buffer->text.data(), buffer);
        return buffer;
    }

    std::string text;
};

SecretText::SecretText(std::string_view text) : _buffer(_sharedWith(text)) {
    if (!_buffer) {
        auto buffer = std::make_shared<Buffer>();
        buffer->text = text;
        _buffer = Buffer::finished(std::move(buffer));
    }
}

SecretText::SecretText(std::size_t room, const std::function<void(std::string& text)>& write) {
    auto buffer = std::make_shared<Buffer>();
    buffer->text.reserve(room);
    write(buffer->text);
    _buffer = Buffer::finished(std::move(buffer));
}

const std::string& SecretText::text() const {
    return _buffer->text;
}

std::shared_ptr<const SecretText::Buffer> SecretText::_sharedWith(std::string_view text) {
    Held& all = held();
    std::shared_ptr<const Buffer> buffer; // goes after the lock does: its own end takes that
    const std::lock_guard lock(all.mutex);
    const auto found = all.buffers.find(text.data());
    if (found != all.buffers.end()) {
        buffer = std::static_pointer_cast<const Buffer>(found->second.lock());
    }
    return buffer && buffer->text.size() == text.size() ? buffer : nullptr;
}

} // namespace welcomer::posix
