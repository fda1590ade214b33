// The body of a request, which is read piece by piece: the password stands in it nowhere but where it came
// from.

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
    std::size_t size() const { return _size; } // bytes

    // Begins anew.
    void rewind();

    // Copies what comes next.
    //  result  how much; less than there is room for only at the end
    std::size_t read(char* buffer, std::size_t room);

  private:
    std::string_view _next();

    const accountserver::AroundPassword _around;
    const std::string_view _password;
    const accountserver::ContentType _type;
    std::size_t _size = 0;
    std::size_t _piece = 0;    // 0 what is before the password, then each byte of it, then what is behind
    std::string _escaped;      // a byte of the password
    std::string_view _current; // what is left of the piece
};

} // namespace welcomer::desktop
