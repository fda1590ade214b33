#include "backends/posix/Libmnl.h"

#include <dlfcn.h>
#include <stdexcept>
#include <string>

namespace welcomer::posix {

namespace {

constexpr char kLibrary[] = "libmnl.so.0";

[[noreturn]] void failed() {
    const char* const reason = ::dlerror();
    throw std::runtime_error(reason ? reason : std::string(kLibrary) + " cannot be loaded");
}

template <class Function>
void find(void* library, const char* name, Function*& function) {
    function = reinterpret_cast<Function*>(::dlsym(library, name));
    if (!function) {
        failed();
    }
}

Libmnl load() {
    void* const library = ::dlopen(kLibrary, RTLD_NOW | RTLD_LOCAL);
    if (!library) {
        failed();
    }
    Libmnl mnl;
    find(library, "mnl_socket_open2", mnl.socketOpen2);
    find(library, "mnl_socket_bind", mnl.socketBind);
    find(library, "mnl_socket_setsockopt", mnl.socketSetsockopt);
    find(library, "mnl_socket_get_fd", mnl.socketGetFd);
    find(library, "mnl_socket_sendto", mnl.socketSendto);
    find(library, "mnl_socket_recvfrom", mnl.socketRecvfrom);
    find(library, "mnl_socket_close", mnl.socketClose);
    find(library, "mnl_cb_run", mnl.cbRun);
    return mnl;
}

} // namespace

const Libmnl& libmnl() {
    static const Libmnl loaded = load();
    return loaded;
}

} // namespace welcomer::posix
