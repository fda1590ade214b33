#include "backends/desktop/accountserver/RequestBody.h"

#include <algorithm>
#include <cstring>

namespace welcomer::desktop {

namespace {

constexpr std::size_t kLongestEscape = 8; // bytes, of one byte of the password
constexpr std::size_t kStep = 512;        // bytes; of what is seen on the network

std::size_t roundedUp(std::size_t size) {
    return (size + kStep - 1) / kStep * kStep;
}

void clear(std::string& text) {
    ::explicit_bzero(text.data(), text.size());
    text.clear();
}

} // namespace

RequestBody::RequestBody(accountserver::AroundPassword around, std::string_view password,
                         accountserver::ContentType type)
    : _around(std::move(around)),
      _password(password),
      _type(type) {
    std::size_t end = _around.before.size(); // of the password
    accountserver::escapePassword(_password, _type, [&end](std::string_view piece) { end += piece.size(); });
    _content = end + _around.after.size();
    _filling = roundedUp(_content) - _content;
    _cover = roundedUp(end);
    _escaped.reserve(kLongestEscape); // so that it stays where it is
    rewind();
}

RequestBody::~RequestBody() {
    clear(_escaped);
}

void RequestBody::rewind() {
    _piece = 0;
    _current = _around.before;
    _fillingLeft = _filling;
    _coverLeft = _cover;
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
    copied += _blank(buffer + copied, room - copied, _fillingLeft);
    return copied > 0 ? copied : _blank(buffer, room, _coverLeft);
}

// Writes as many of these blanks as there is room for.
std::size_t RequestBody::_blank(char* buffer, std::size_t room, std::size_t& left) {
    const std::size_t count = std::min(room, left);
    std::memset(buffer, ' ', count);
    left -= count;
    return count;
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
