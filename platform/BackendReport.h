// Which backend serves an interface of the platform, and why: for people.

#pragma once

#include <string>

namespace welcomer::platform {

// Every text is one line.
struct BackendReport {
    std::string interface; // the interface's name, such as CredentialStore
    std::string backend;   // who serves it, such as "Secret Service" or "local file"
    std::string reason;    // why that one does, and in what state it is
    std::string advice;    // what would bring in what is missing; empty when nothing is
    bool startsWhenAsked =
        false; // a credential store that does not run, and that a question to it would start
    friend bool operator==(const BackendReport&, const BackendReport&) = default;
};

} // namespace welcomer::platform
