// What the tests of accounts in a file share.

#pragma once

#include "backends/local/LocalNotificationCenter.h"
#include "backends/local/accounts/LocalAccountService.h"
#include "backends/local/accounts/PasswordHash.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/ChildProcess.h"

#include <chrono>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace welcomer {

using namespace platform;
using namespace std::chrono_literals;
using Dictionary = PropertyList::Dictionary;
using Names = std::vector<std::string>;

class LocalAccountServiceTest : public testing::Test {
  protected:
    static inline const std::string kFolder = "/home/user/Library/Accounts";
    static inline const std::string kFile = kFolder + "/Accounts.plist";

    LocalAccountServiceTest() {
        root.addDirectory("/home/user/Library");
        // One hash for all tests of a process: it is slow on purpose.
        addUser("anna", {});
        for (const char* name : {kSKNotificationAuthenticationCompleted, kSKNotificationAuthenticationFailed,
                                 kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            observations.push_back(center.addObserver(
                name, [this](const Notification& notification) { notifications.push_back(notification); }));
        }
    }

    // A user of the directory whose password is "secret".
    void addUser(const std::string& name, Dictionary user) {
        static const std::string hash = local::makePasswordHash("secret").value();
        user.emplace("Password", hash);
        users[name] = std::move(user);
        root.addFile(local::kNimbusDirectoryPath, *writeXMLPropertyList(Dictionary{{"Users", users}}));
    }

    Notification authenticate(const std::string& name = "anna", const std::string& password = "secret") {
        service.authenticate(name, password, {});
        return finish();
    }
    Notification signIn(const std::string& name = "anna", const std::string& password = "secret") {
        service.finishSignIn(name, password, {});
        return finish();
    }
    Notification finish() {
        time.current()->run(24h);
        EXPECT_FALSE(notifications.empty());
        return notifications.empty() ? Notification{} : notifications.back();
    }
    static PropertyList accountError(const Notification& notification) {
        const auto found = notification.contents.find(kSKPropertyAccountError);
        return found == notification.contents.end() ? PropertyList("none") : found->second;
    }

    Dictionary stored() const {
        const PropertyListReadResult result = readPropertyList(root.content(kFile).value_or("nothing"));
        EXPECT_TRUE(result) << result.error;
        return result && result.value->isDictionary() ? *result.value->dictionary() : Dictionary();
    }

    mode_t mode(const std::string& path) const {
        struct stat status = {};
        EXPECT_EQ(::stat(root.locate(path).c_str(), &status), 0);
        return status.st_mode & 07777U;
    }

    TemporaryRoot root;
    Dictionary users;
    simulated::VirtualTime time;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    local::LocalNotificationCenter center;
    fakes::FakeSystemLog log{recorder};
    local::LocalAccountService service{posix::RootFolder(root.path()), identity, time, time, center, log};
    std::vector<Notification> notifications;
    std::vector<std::unique_ptr<NotificationObservation>> observations;
};

} // namespace welcomer
