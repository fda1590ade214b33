// libmnl, as far as it is used here. It is no part of a program's start: most programs never ask the kernel anything.

#pragma once

#include <libmnl/libmnl.h>

namespace welcomer::posix {

// Its functions, which keep their names.
struct Libmnl {
    decltype(&::mnl_socket_open2) socketOpen2 = nullptr;
    decltype(&::mnl_socket_bind) socketBind = nullptr;
    decltype(&::mnl_socket_setsockopt) socketSetsockopt = nullptr;
    decltype(&::mnl_socket_get_fd) socketGetFd = nullptr;
    decltype(&::mnl_socket_sendto) socketSendto = nullptr;
    decltype(&::mnl_socket_recvfrom) socketRecvfrom = nullptr;
    decltype(&::mnl_socket_close) socketClose = nullptr;
    decltype(&::mnl_cb_run) cbRun = nullptr;
};

// The library, loaded at the first call. Throws std::runtime_error with the loader's reason where it is not there or lacks
// one of these: an installation that is not whole is not a machine without a network. Any thread.
const Libmnl& libmnl();

} // namespace welcomer::posix
