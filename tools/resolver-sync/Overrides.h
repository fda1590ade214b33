// The resolver overrides: which nameservers answer for which domain.

#pragma once

#include <compare>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::resolver {

struct Nameserver {
    std::string address; // IPv4 or IPv6, as text
    std::uint16_t port = 53;

    bool isIPv6() const { return address.find(':') != std::string::npos; }
    friend bool operator==(const Nameserver&, const Nameserver&) = default;
};

// By domain, in small letters and without a dot at the end; each has at least one nameserver.
using Overrides = std::map<std::string, std::vector<Nameserver>>;

// One file's override, or why there is none.
struct OverrideFile {
    std::string domain;
    std::vector<Nameserver> nameservers;
    std::string error; // empty on success

    friend bool operator==(const OverrideFile&, const OverrideFile&) = default;
};

// Reads one override: lines of a word and its value, of which "domain", "nameserver" (as often as there are
// some) and "port" count. A line that begins with "#" or ";" is a comment.
//  name  the file's name: the domain, when no line says it
//  text  its content
OverrideFile readOverride(std::string_view name, std::string_view text);

// What a folder of overrides says, and a line for each file that says nothing.
struct OverrideFolder {
    Overrides overrides;
    std::vector<std::string> refusals; // "PATH: reason"; none for a file with nothing in it (yet)
};

// Reads every file of a folder; a missing folder has none. Of two files for one domain the first by its name
// counts.
OverrideFolder readOverrides(const std::string& folder);

} // namespace welcomer::resolver
