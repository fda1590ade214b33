// What the tests of the account service over online accounts share.

#pragma once

#include "backends/desktop/accounts/OnlineAccountService.h"
#include "tests/contract/OnlineAccountBackend.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeOnlineAccounts.h"

#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace welcomer::contract {

using namespace platform;
using desktop::OnlineAccount;
using desktop::OnlineFeature;
using Names = std::vector<std::string>;

inline const std::vector<std::pair<std::string, OnlineFeature>> kSwitchesOfTheCloud = {
    {kSKServiceIDContacts, OnlineFeature::Contacts},
    {kSKServiceIDCalendars, OnlineFeature::Calendar},
    {kSKServiceMobileDocuments, OnlineFeature::Files},
};

inline const Names kWithoutSwitch = {kSKServiceIDBookMarks,   kSKServiceIDMediaStream, kSKServiceIDReminders,
                                     kSKServiceIDAccountSync, kSKServiceIDNotes,       kSKServiceIDLOC};

class OnlineAccountServiceTest : public testing::Test {
  protected:
    // Bert is nobody's user: his account has all services, and no mail address.
    std::shared_ptr<CloudAccount> bert() { return backend.service.accountForID("bert", true); }
    std::shared_ptr<CloudService> serviceOfBert(const std::string& identifier) {
        return bert()->serviceForID(identifier);
    }
    void enable(const std::string& identifier, bool isOn = true) {
        serviceOfBert(identifier)->enableSilently(isOn);
    }
    bool isEnabled(const std::string& identifier) {
        return backend.service.isServiceEnabled(bert().get(), identifier);
    }
    // What the account file has.
    bool isEnabledInFile(const std::string& identifier) {
        return backend.embedded.service.isServiceEnabled(bert().get(), identifier);
    }
    std::optional<PropertyList> mailAddress() {
        return serviceOfBert(kSKServiceIDMail)->propertyValue(kSKPropertyMailEmailAddress);
    }

    OnlineAccount::Switch switchOf(std::size_t account, OnlineFeature feature) const {
        return online.accounts.at(account).switchOf(feature);
    }
    bool isOn(std::size_t account, OnlineFeature feature) const {
        return switchOf(account, feature).hasInterface;
    }

    // The notifications that come while the loop runs, each as its name and what `look` finds at that moment.
    template <typename Look>
    std::vector<std::pair<std::string, std::string>> signIn(const std::string& name,
                                                            const std::string& password, Look look) {
        std::vector<std::pair<std::string, std::string>> seen;
        std::vector<std::unique_ptr<NotificationObservation>> observations;
        for (const char* end : {kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            observations.push_back(backend.center.addObserver(end, [&](const Notification& notification) {
                EXPECT_EQ(std::this_thread::get_id(), thread);
                seen.emplace_back(notification.name, look());
            }));
        }
        backend.service.finishSignIn(name, password, {});
        backend.time.runLoops.current()->run(tooLong);
        return seen;
    }
    std::vector<std::pair<std::string, std::string>> signIn(const std::string& name,
                                                            const std::string& password) {
        return signIn(name, password, [] { return ""; });
    }
    std::string loggedIn() {
        const auto account = backend.service.loggedInAccount();
        return account ? account->accountID() : "nobody";
    }

    const std::thread::id thread = std::this_thread::get_id();
    fakes::FakeOnlineAccounts online;
    bool isThere = true;
    int askedFor = 0;
    OnlineAccountBackend<SimulatedTime> backend{[this]() -> desktop::OnlineAccounts* {
                                                    ++askedFor;
                                                    return isThere ? &online : nullptr;
                                                },
                                                {"owncloud", "https://cloud.example/"}};
};

} // namespace welcomer::contract
