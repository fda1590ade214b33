// Routing through delegate files, for a resolver that has nameservers per domain.

#pragma once

#include "tools/resolver-sync/Routing.h"

#include <functional>
#include <string>

namespace welcomer::resolver {

// The text of the file that delegates one domain.
std::string delegateText(const std::string& domain, const std::vector<Nameserver>& nameservers);

// One file per domain, "welcomer-DOMAIN.dns-delegate", in a folder that the resolver reads when it is told
// to.
class DelegateRouting final : public Routing {
  public:
    //  folder  made when it is needed; files of others in it are left alone
    //  reload  has the resolver read the folder again
    DelegateRouting(std::string folder, std::function<platform::Outcome()> reload)
        : _folder(std::move(folder)),
          _reload(std::move(reload)) {}

    platform::Outcome apply(const Overrides& overrides) override;

  private:
    std::string _folder;
    std::function<platform::Outcome()> _reload;
};

} // namespace welcomer::resolver
