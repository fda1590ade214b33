// The body of a request, which is read piece by piece: the password stands in it nowhere but where it came
// from. Blanks follow it, which mean nothing: read by themselves, they overwrite the password where the reader
// takes each piece into the same place, and they have the lengths that can be seen on the network say little
// about the password's.

#pragma once

#include "backends/accountserver/Messages.h"

#include <cstddef>
#include <string>
#include <string_view>

namespace welcomer::desktop {

class RequestBody {
  public:
    //  password  sendable in this form; borrowed
    RequestBody(accountserver::AroundPassword around, std::string_view password,
                accountserver::ContentType type);
    ~RequestBody();

    RequestBody(const RequestBody&) = delete;
    RequestBody& operator=(const RequestBody&) = delete;

    accountserver::ContentType type() const { return _type; }
    std::size_t size() const { return _content + _filling + _cover; } // bytes

    // Begins anew.
    void rewind();

    // Copies what comes next.
    //  result  how much; 0 only at the end
    std::size_t read(char* buffer, std::size_t room);

  private:
    std::string_view _next();
    static std::size_t _blank(char* buffer, std::size_t room, std::size_t& left);

    const accountserver::AroundPassword _around;
    const std::string_view _password;
    const accountserver::ContentType _type;
    std::size_t _content = 0; // bytes, without the blanks
    std::size_t _filling = 0; // blanks that the content is rounded up with, and then those by themselves
    std::size_t _cover = 0;
    std::size_t _fillingLeft = 0;
    std::size_t _coverLeft = 0;
    std::size_t _piece = 0;    // 0 what is before the password, then each byte of it, then what is behind
    std::string _escaped;      // a byte of the password
    std::string_view _current; // what is left of the piece
};

} // namespace welcomer::desktop
