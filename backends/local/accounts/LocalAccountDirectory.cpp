#include "backends/local/accounts/LocalAccountDirectory.h"

#include "backends/local/accounts/NimbusDirectory.h"

namespace welcomer::local {

std::vector<std::string> LocalAccountDirectory::accounts() {
    return _accountFile.names();
}

std::optional<std::vector<std::string>> LocalAccountDirectory::users() {
    return NimbusDirectory(_root).userNames();
}

platform::Outcome LocalAccountDirectory::addUser(const platform::CloudUser& user) {
    return NimbusDirectory(_root).writeUser(user, NimbusDirectory::IfThere::Fail);
}

platform::Outcome LocalAccountDirectory::storeUser(const platform::CloudUser& user) {
    return NimbusDirectory(_root).writeUser(user, NimbusDirectory::IfThere::Replace);
}

} // namespace welcomer::local
