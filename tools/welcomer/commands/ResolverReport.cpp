#include "tools/welcomer/commands/ResolverReport.h"

#include "platform/Path.h"
#include "platform/Platform.h"
#include "tools/shared/ForwarderProgram.h"
#include "tools/shared/RunningMark.h"

#include <sstream>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace welcomer::tool {

namespace {

using platform::BackendReport;

// The socket that systemd-resolved listens on while it runs; its folder stays when it has ended.
constexpr char kResolverSocket[] = "/run/systemd/resolve/io.systemd.Resolve";

bool somebodyListensOn(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path) {
        return false;
    }
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    const int file = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const bool isServed = ::connect(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    ::close(file);
    return isServed;
}

// Whether a line of the file begins with this word and has one of those after it.
bool hasLine(const std::string& path, const std::string& head, const std::string& word,
             const std::string& otherWord) {
    std::istringstream lines(platform::current().fileSystem.readText(path).value_or(""));
    for (std::string line; std::getline(lines, line);) {
        std::istringstream words(line);
        std::string each;
        if (!(words >> each) || each != head) {
            continue;
        }
        while (words >> each) {
            if (each == word || each == otherWord) {
                return true;
            }
        }
    }
    return false;
}

// Through its stub, or through its module in the C library.
bool namesAreLookedUpThroughTheResolver() {
    return hasLine("/etc/resolv.conf", "nameserver", "127.0.0.53", "127.0.0.54") ||
           hasLine("/etc/nsswitch.conf", "hosts:", "resolve", "resolve");
}

} // namespace

BackendReport resolverReport(const std::string& root) {
    const std::string above = root == "/" ? "" : root;
    const auto report = [](const std::string& backend, const std::string& reason, const std::string& advice) {
        return BackendReport{"resolver overrides", backend, reason, advice};
    };
    const bool hasForwarder = platform::current().fileSystem.exists(resolver::kForwarderProgram);
    const std::string forwarderToo = hasForwarder ? "" : "; install dnsmasq-base, which it needs";
    const resolver::RunningState service = resolver::readRunningMark(above + resolver::kRunningMark);
    if (!somebodyListensOn(above + kResolverSocket)) {
        return report("none", "systemd-resolved does not run: the overrides have no effect",
                      service.runs ? "install and start systemd-resolved"
                                   : "install and start systemd-resolved, and enable welcomer-resolver-sync" +
                                         forwarderToo);
    }
    if (!service.runs) {
        return report("none", "welcomer-resolver-sync does not run: the overrides have no effect",
                      "systemctl enable --now welcomer-resolver-sync" + forwarderToo);
    }
    if (!service.trouble.empty()) {
        return report("none", "welcomer-resolver-sync cannot route the overrides: " + service.trouble,
                      "see the system log of welcomer-resolver-sync; its forwarder is dnsmasq");
    }
    if (!hasForwarder) {
        return report("none",
                      std::string("welcomer-resolver-sync cannot route the overrides: there is no ") +
                          resolver::kForwarderProgram,
                      "install dnsmasq-base");
    }
    if (!namesAreLookedUpThroughTheResolver()) {
        return report(
            "systemd-resolved",
            "the overrides reach systemd-resolved, but programs do not look names up through it",
            "link /etc/resolv.conf to /run/systemd/resolve/stub-resolv.conf, or install libnss-resolve");
    }
    return report("systemd-resolved",
                  "systemd-resolved and welcomer-resolver-sync run: the overrides have an effect", "");
}

} // namespace welcomer::tool
