// Accounts that the embedded service keeps below a root of its own.

#pragma once

#include "backends/local/LocalNotificationCenter.h"
#include "backends/local/accounts/LocalAccountService.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "backends/local/accounts/PasswordHash.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"

#include <string>

namespace welcomer::contract {

template <typename Time>
struct LocalAccounts {
    LocalAccounts() { root.addDirectory("/home/user/Library"); }

    void addUser(const std::string& name, const std::string& password) {
        users[name] = PropertyList::Dictionary{
            {"Password", local::makePasswordHash(password).value()},
            {"MailAddress", "anna@example.org"},
            {"Services", PropertyList::Dictionary{
                             {platform::kSKServiceIDContacts, PropertyList::Dictionary{}},
                             {platform::kSKServiceIDMail,
                              PropertyList::Dictionary{{"CanBeEnabled", false},
                                                       {"Properties", PropertyList::Dictionary{}}}}}}};
        root.addFile(local::kNimbusDirectoryPath,
                     *writeXMLPropertyList(PropertyList::Dictionary{{"Users", users}}));
    }

    Time time;
    TemporaryRoot root;
    PropertyList::Dictionary users;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    local::LocalNotificationCenter center;
    fakes::FakeSystemLog log{recorder};
    local::LocalAccountService service{
        posix::RootFolder(root.path()), identity, time.runLoops, time.dispatchQueues, center, log};
};

} // namespace welcomer::contract
