// The switches of online accounts that are still to be set.

#pragma once

#include "platform/PreferenceStore.h"

#include <string>

namespace welcomer::desktop {

// The domain that says for which account names an online account has been made.
inline constexpr char kOnlineAccountsDomain[] = "com.corvid.welcomer.onlineaccounts";

// The domain that says which services' switches are still to be set: "SERVICE of ACCOUNT".
inline constexpr char kPendingSwitchesDomain[] = "com.corvid.welcomer.onlineaccounts.pending";

// What is remembered of online accounts from one program to the next. What cannot be stored is told in the system log.
// Any thread.
class PendingSwitches {
  public:
    // Borrows the store, which must outlive this.
    explicit PendingSwitches(platform::PreferenceStore& store) : _store(store) {}

    // An online account has been made for this name; its switches are what they were made as.
    void setMade(const std::string& account) const;
    bool isMade(const std::string& account) const;

    // The switch of an account's service is to be set, or is no longer; nothing is written where that is known.
    void note(const std::string& account, const std::string& service) const;
    void forget(const std::string& account, const std::string& service) const;

    // Takes up what all processes have stored.
    void refresh() const;

    // Whether it is to be set, as far as that has been taken up.
    bool has(const std::string& account, const std::string& service) const;

  private:
    platform::PreferenceStore& _store;
};

} // namespace welcomer::desktop
