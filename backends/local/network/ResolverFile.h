// The file that tells the C library which name servers to ask.

#pragma once

#include "backends/posix/RootFolder.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::local {

// What it says: servers in order, and the domain, which is the first of several search domains; the last
// "domain" or "search" line counts.
struct ResolverConfiguration {
    std::vector<std::string> servers;
    std::optional<std::string> domain;
};

// Reads the text of such a file; lines that mean something else and words that are no printable ASCII are
// left out. Any thread.
ResolverConfiguration readResolverText(std::string_view text);

// The text with other servers, where the first one stood or at the end; every other line stays as it is.
std::string replaceResolverServers(std::string_view text, const std::vector<std::string>& servers);

// "/etc/resolv.conf" below the root. Any thread.
class ResolverFile {
  public:
    explicit ResolverFile(posix::RootFolder root) : _root(std::move(root)) {}

    // What the file says; nothing when it cannot be read or is longer than a text may be.
    ResolverConfiguration read() const;

    // Whether it is a link to one of the files that systemd-resolved keeps.
    bool isOfResolved() const;

    // Puts other servers in, all or nothing.
    //  servers  addresses, checked before
    //  detail   receives on failure what the file is called here and, where that is known, what the system
    //  said result   0, or a NetworkConfigStatus: the file is another program's, or cannot be written
    std::int32_t writeServers(const std::vector<std::string>& servers, std::string& detail) const;

  private:
    const posix::RootFolder _root;
};

} // namespace welcomer::local
