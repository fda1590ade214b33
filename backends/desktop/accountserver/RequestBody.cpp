#include "backends/desktop/accountserver/RequestBody.h"

#include <algorithm>
#include <cstring>

namespace welcomer::desktop {

namespace {

constexpr std::size_t kLongestEscape = 8; // bytes, of one byte of the password

void clear(std::string& text) {
    ::explicit_bzero(text.data(), text.size());
    text.clear();
}

} // namespace

RequestBody::RequestBody(accountserver::AroundPassword around, std::string_view password,
                         accountserver::ContentType type)
    : _around(std::move(around)),
      _password(password),
      _type(type),
      _size(_around.before.size() + _around.after.size()) {
    accountserver::escapePassword(_password, _type,
                                  [this](std::string_view piece) { _size += piece.size(); });
    _escaped.reserve(kLongestEscape); // so that it stays where it is
    rewind();
}

RequestBody::~RequestBody() {
    clear(_escaped);
}

void RequestBody::rewind() {
    _piece = 0;
    _current = _around.before;
}

std::size_t RequestBody::read(char* buffer, std::size_t room) {
    std::size_t copied = 0;
    while (copied < room) {
        if (_current.empty()) {
            _current = _next();
        }
        if (_current.empty()) {
            break;
        }
        const std::size_t count = std::min(room - copied, _current.size());
        std::memcpy(buffer + copied, _current.data(), count);
        _current.remove_prefix(count);
        copied += count;
    }
    return copied;
}

std::string_view RequestBody::_next() {
    clear(_escaped);
    if (_piece < _password.size()) {
        accountserver::escapePassword(_password.substr(_piece, 1), _type,
                                      [this](std::string_view piece) { _escaped += piece; });
        ++_piece;
        return _escaped;
    }
    return _piece++ == _password.size() ? std::string_view(_around.after) : std::string_view();
}

} // namespace welcomer::desktop
