#include "tools/welcomer/plugins/HandleBook.h"

#include "plugins/PropertyListHandles.h"

#include <algorithm>
#include <map>

namespace welcomer::tool {

namespace {

constexpr std::size_t kMostRecords = 20; // of a loop that goes wrong, the first ones tell

} // namespace

HandleBook::~HandleBook() {
    for (const Handle& handle : _handles) {
        if (handle.value && (handle.state == State::Owned || handle.state == State::Released)) {
            takeHandle(handle.value);
        }
    }
}

HandleBook& HandleBook::instance() {
    static auto* const book = new HandleBook; // plug-in threads may still use it while the process ends
    return *book;
}

wl_value* HandleBook::own(wl_value* value, const char* function) {
    if (!value) {
        return nullptr;
    }
    const std::lock_guard lock(_mutex);
    Handle& handle = _handles.emplace_back(Handle{State::Owned, value, nullptr, 0, 0, function});
    _known.insert(&handle);
    return reinterpret_cast<wl_value*>(&handle);
}

const wl_value* HandleBook::lend(const wl_value* value, const wl_value* source, const char* function) {
    if (!value) {
        return nullptr;
    }
    const std::lock_guard lock(_mutex);
    const auto* const of = reinterpret_cast<const Handle*>(source);
    Handle& handle = _handles.emplace_back(
        Handle{State::Lent, const_cast<wl_value*>(value), of, of ? of->version : 0, 0, function});
    _known.insert(&handle);
    return reinterpret_cast<const wl_value*>(&handle);
}

void HandleBook::endLoan(const wl_value* handle) {
    const std::lock_guard lock(_mutex);
    if (handle) {
        const_cast<Handle*>(reinterpret_cast<const Handle*>(handle))->state = State::Returned;
    }
}

const wl_value* HandleBook::read(const wl_value* handle, const char* function) {
    const std::lock_guard lock(_mutex);
    const Handle* const found = _find(handle, function);
    if (!found) {
        return nullptr;
    }
    // What was released is still there, unlike what may have moved with its container.
    _isGone(*found, Misuse::UsedAfterRelease, function);
    return _isStale(*found) ? nullptr : found->value;
}

wl_value* HandleBook::change(wl_value* handle, const char* function) {
    const std::lock_guard lock(_mutex);
    Handle* const found = _find(handle, function);
    if (!found || _isGone(*found, Misuse::UsedAfterRelease, function)) {
        return nullptr;
    }
    if (found->state == State::Lent) {
        _note(Misuse::ChangedBorrowed, *found, function, "changes a value that was only lent");
        return nullptr;
    }
    ++found->version;
    return found->value;
}

wl_value* HandleBook::pass(wl_value* handle, const char* function) {
    const std::lock_guard lock(_mutex);
    Handle* const found = _find(handle, function);
    if (!found || _isGone(*found, Misuse::ReleasedTwice, function)) {
        return nullptr;
    }
    if (found->state == State::Lent) {
        _note(Misuse::ChangedBorrowed, *found, function, "is given a value that was only lent");
        return nullptr;
    }
    found->state = State::Passed;
    ++found->version;
    wl_value* const value = found->value;
    found->value = nullptr;
    return value;
}

void HandleBook::release(wl_value* handle) {
    const std::lock_guard lock(_mutex);
    Handle* const found = _find(handle, "release");
    if (!found || _isGone(*found, Misuse::ReleasedTwice, "release")) {
        return;
    }
    if (found->state == State::Lent) {
        _note(Misuse::ChangedBorrowed, *found, "release", "is given a value that was only lent");
        return;
    }
    found->state = State::Released;
    ++found->version;
}

void HandleBook::open(const wl_error_slot* slot) {
    const std::lock_guard lock(_mutex);
    _slots.insert(slot);
}

void HandleBook::close(const wl_error_slot* slot) {
    const std::lock_guard lock(_mutex);
    _slots.erase(slot);
}

bool HandleBook::isOpen(const wl_error_slot* slot) {
    const std::lock_guard lock(_mutex);
    const bool isKnown = _slots.contains(slot);
    if (!isKnown) {
        _misuses.push_back({Misuse::SlotOfAnother, "raise: the error slot is not that of a running call"});
    }
    return isKnown;
}

std::size_t HandleBook::owned() const {
    const std::lock_guard lock(_mutex);
    return static_cast<std::size_t>(std::ranges::count(_handles, State::Owned, &Handle::state));
}

std::string HandleBook::ownedTexts() const {
    const std::lock_guard lock(_mutex);
    std::map<std::string, int> counts;
    for (const Handle& handle : _handles) {
        if (handle.state == State::Owned) {
            ++counts[handle.from];
        }
    }
    std::string texts;
    for (const auto& [from, count] : counts) {
        texts += (texts.empty() ? "" : ", ") + std::to_string(count) + " of " + from;
    }
    return texts;
}

std::vector<MisuseRecord> HandleBook::misuses() const {
    const std::lock_guard lock(_mutex);
    return _misuses;
}

HandleBook::Handle* HandleBook::_find(const wl_value* handle, const char* function) {
    if (!handle) {
        return nullptr;
    }
    if (!_known.contains(handle)) {
        _misuses.push_back(
            {Misuse::UsedAfterRelease, std::string(function) + ": the value was never the host's"});
        return nullptr;
    }
    return const_cast<Handle*>(reinterpret_cast<const Handle*>(handle));
}

// Whether what it was lent of has changed or gone since.
bool HandleBook::_isStale(const Handle& handle) const {
    for (const Handle* each = &handle; each->source; each = each->source) {
        if (each->source->version != each->versionOf || each->source->state == State::Returned) {
            return true;
        }
    }
    return false;
}

bool HandleBook::_isGone(const Handle& handle, Misuse misuse, const char* function) {
    switch (handle.state) {
    case State::Released:
        _note(misuse, handle, function, "is given a value that was released");
        return true;
    case State::Passed:
        _note(misuse, handle, function, "is given a value that was passed on");
        return true;
    case State::Returned:
        _note(Misuse::UsedAfterRelease, handle, function,
              "is given a value that was lent for a call which has ended");
        return true;
    case State::Owned:
        return false;
    case State::Lent:
        if (_isStale(handle)) {
            _note(Misuse::UsedAfterRelease, handle, function,
                  "is given a value that was lent of one which has changed or gone");
            return true;
        }
        return false;
    }
    return false;
}

void HandleBook::_note(Misuse misuse, const Handle& handle, const char* function, const char* what) {
    if (_misuses.size() < kMostRecords) {
        _misuses.push_back(
            {misuse, std::string(function) + " " + what + " (it came from " + handle.from + ")"});
    }
}

} // namespace welcomer::tool
