#include "backends/posix/Libmnl.h"

#include <dlfcn.h>
#include <optional>

namespace welcomer::posix {

namespace {

constexpr char kLibrary[] = "libmnl.so.0";

template <class Function>
bool find(void* library, const char* name, Function*& function) {
    function = reinterpret_cast<Function*>(::dlsym(library, name));
    return function != nullptr;
}

std::optional<Libmnl> load() {
    void* const library = ::dlopen(kLibrary, RTLD_NOW | RTLD_LOCAL);
    Libmnl mnl;
    const bool isWhole = library && find(library, "mnl_socket_open2", mnl.socketOpen2) &&
                         find(library, "mnl_socket_bind", mnl.socketBind) &&
                         find(library, "mnl_socket_setsockopt", mnl.socketSetsockopt) &&
                         find(library, "mnl_socket_get_fd", mnl.socketGetFd) &&
                         find(library, "mnl_socket_sendto", mnl.socketSendto) &&
                         find(library, "mnl_socket_recvfrom", mnl.socketRecvfrom) &&
                         find(library, "mnl_socket_close", mnl.socketClose) &&
                         find(library, "mnl_cb_run", mnl.cbRun);
    return isWhole ? std::optional(mnl) : std::nullopt;
}

} // namespace

const Libmnl* libmnl() {
    static const std::optional<Libmnl> loaded = load();
    return loaded ? &*loaded : nullptr;
}

} // namespace welcomer::posix
