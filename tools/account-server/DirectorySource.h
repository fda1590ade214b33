// The directory file of this machine as a source of users.

#pragma once

#include "platform/SignInDirectory.h"
#include "tools/account-server/AcceptedTerms.h"
#include "tools/account-server/AccountSource.h"

#include <string>

namespace welcomer::server {

class DirectorySource final : public AccountSource {
  public:
    //  directory  borrowed
    DirectorySource(const platform::SignInDirectory& directory, AcceptedTerms terms)
        : _directory(directory),
          _terms(std::move(terms)) {}

    SourceAnswer authenticate(const std::string& user, const std::string& password) override;
    SourceAnswer acceptTerms(const std::string& user, const std::string& password,
                             const PropertyList& terms) override;

  private:
    SourceAnswer _completed(const std::string& user, const platform::SignInAnswer& answer) const;

    const platform::SignInDirectory& _directory;
    const AcceptedTerms _terms;
};

} // namespace welcomer::server
