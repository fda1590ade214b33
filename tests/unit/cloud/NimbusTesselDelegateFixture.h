// What the tests of signing in share.

#pragma once

#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/plugins/InProcessPlugin.h"

#include <algorithm>
#include <chrono>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

using namespace platform;
using namespace std::chrono_literals;
using Strings = std::vector<std::string>;
using Dictionary = PropertyList::Dictionary;
using Answer = fakes::FakeAccountService::Answer;
using Wait = fakes::RecordedTime::Wait;

inline const Dictionary kEmptyRequest{{"delegates", Dictionary{{"com.corvid.skylark", Dictionary{}}}}};

class NimbusTesselDelegateTest : public testing::Test {
  protected:
    NimbusTesselDelegateTest() {
        for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
            fake.accountService.servicesOfNewAccounts[identifier] = {};
        }
    }

    // Installs a plug-in that asks for {"from": its identifier}.
    template <int Index>
    void installPlugin(fakes::InProcessPlugin& plugin) {
        const std::string file =
            "/System/Library/CoreServices/FirstRunPlugins/" + *plugin.identifier + ".ncdplugin";
        plugin.request = [&plugin](wl_error_slot*) {
            wl_value* request = plugin.host->new_dictionary();
            plugin.host->dictionary_set(
                request, "from", 4,
                plugin.host->new_string(plugin.identifier->c_str(), plugin.identifier->size()));
            return request;
        };
        fake.fileSystem.addFile(file, "");
        fake.pluginBundle.add(file, "wl_delegate_plugin", plugin.exportAs<Index>());
    }

    void answerWith(bool completed, Dictionary contents, std::chrono::nanoseconds delay = 0ns) {
        _setAnswer({completed, std::move(contents), delay, false});
    }
    void answerImmediately(bool completed, Dictionary contents) {
        _setAnswer({completed, std::move(contents), 0ns, true});
    }
    void answerNever() {
        fake.accountService.answerAuthenticate = [](const auto&, const auto&, const auto&) {
            return std::optional<Answer>();
        };
        fake.accountService.answerSignIn = fake.accountService.answerAuthenticate;
    }

    bool validate() { return delegate.validateNimbusUsernameAndPasswordError("anna", "secret", &error); }
    bool validateWith(const std::optional<Dictionary>& tosVersions,
                      const std::optional<Dictionary>& delegates) {
        return delegate.validateNimbusUsernameAndPasswordTosVersionsDelegatesError(
            "anna", "secret", tosVersions, delegates, &error);
    }
    bool signIn(const Dictionary& additional = {}, const Strings& omitting = {}) {
        return delegate.signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(
            "anna", "secret", additional, omitting, &error);
    }
    bool complete(const Strings& selected = WLNimbusAllSetupServiceIDs(), bool kvsOnly = false,
                  const std::shared_ptr<Window>& window = nullptr) {
        return delegate
            .completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesJustTheAccountAndKVSWindowError(
                "anna", "secret", {{"cloud", "dictionary"}}, selected, kvsOnly, window, &error);
    }

    std::size_t slices() const { return fake.virtualTime.waits().size(); }
    Strings lines() const { return fake.systemLog.lines(); }
    bool hasLine(const std::string& line) const {
        const Strings all = lines();
        return std::find(all.begin(), all.end(), line) != all.end();
    }
    std::size_t observers() const {
        std::size_t count = 0;
        for (const char* name : {kSKNotificationAuthenticationCompleted, kSKNotificationAuthenticationFailed,
                                 kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            count += fake.notificationCenter.observerCount(name);
        }
        return count;
    }

    void TearDown() override {
        // On no path is the error written, is an observer left, or does the log get the password.
        EXPECT_EQ(error, (Error{17, "as it was"}));
        EXPECT_EQ(observers(), 0U);
        for (const std::string& line : lines()) {
            EXPECT_EQ(line.find("secret"), std::string::npos) << line;
        }
    }

    fakes::FakePlatform fake;
    const ScopedPlatform installed{fake.platform()};
    NimbusTesselDelegate delegate;
    Error error{17, "as it was"};

  private:
    void _setAnswer(const Answer& answer) {
        fake.accountService.answerAuthenticate = [answer](const auto&, const auto&, const auto&) {
            return std::optional(answer);
        };
        fake.accountService.answerSignIn = fake.accountService.answerAuthenticate;
    }
};

} // namespace welcomer
