// Which terms of service users have accepted, where the source of users has no place to note it itself.

#pragma once

#include "platform/Error.h"
#include "propertylist/PropertyList.h"

#include <string>

namespace welcomer::server {

// One file in a folder of the server's own. Servers that share the folder share what is in it. Any thread, any
// process.
class AcceptedTerms {
  public:
    //  folder  an absolute path; empty: there is no place to note anything
    explicit AcceptedTerms(const std::string& folder) : _folder(folder) {}

    bool canBeNoted() const { return !_folder.empty(); }

    // Whether these are the terms that a user has accepted last.
    bool has(const std::string& user, const PropertyList& terms) const;

    // Notes that they are. Nothing changes where they were already.
    platform::Outcome add(const std::string& user, const PropertyList& terms) const;

  private:
    PropertyList::Dictionary _read() const;

    const std::string _folder;
};

} // namespace welcomer::server
