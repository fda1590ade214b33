// Online accounts in memory.

#pragma once

#include "backends/desktop/accounts/OnlineAccounts.h"

#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::fakes {

// A provider of accounts stores the switches of the features that it knows, and no others.
class FakeOnlineAccounts final : public desktop::OnlineAccounts {
  public:
    using Feature = desktop::OnlineFeature;

    // Set between the calls.
    bool isServing = true;
    bool canWrite = true; // whether switches and new accounts are taken
    std::map<std::string, std::set<Feature>> featuresOfProvider = {
        {"owncloud", {Feature::Contacts, Feature::Calendar, Feature::Files}},
        {"imap_smtp", {Feature::Mail}},
        {"google", {Feature::Contacts, Feature::Calendar, Feature::Files, Feature::Mail}},
    };

    // In the order in which they were made, and what each was made with.
    std::vector<desktop::OnlineAccount> accounts;
    std::vector<desktop::NewOnlineAccount> made;
    std::function<void()> whileMaking; // called when an account is to be made; may be empty
    int writes = 0;
    int questions = 0;

    // An account with everything that its provider knows switched on or off.
    desktop::OnlineAccount& add(const std::string& providerType, const std::string& identity, bool isOn) {
        desktop::OnlineAccount account{
            "/account" + std::to_string(++_count), providerType, identity, identity + "@host", {}, ""};
        for (const Feature feature : featuresOfProvider[providerType]) {
            account.switches[static_cast<std::size_t>(feature)] = {!isOn, isOn};
        }
        accounts.push_back(std::move(account));
        return accounts.back();
    }

    std::optional<std::vector<desktop::OnlineAccount>> list() noexcept override {
        ++questions;
        return isServing ? std::optional(accounts) : std::nullopt;
    }

    bool setFeature(const desktop::OnlineAccount& account, Feature feature, bool isOn) noexcept override {
        ++writes;
        for (desktop::OnlineAccount& other : accounts) {
            if (isServing && canWrite && other.path == account.path) {
                const bool isKnown = featuresOfProvider[other.providerType].contains(feature);
                other.switches[static_cast<std::size_t>(feature)] = {!isOn, isOn && isKnown};
                return isKnown || !isOn;
            }
        }
        return false;
    }

    bool makeOnce(const desktop::NewOnlineAccount& account) noexcept override {
        if (whileMaking) {
            whileMaking();
        }
        if (!isServing || !canWrite) {
            return false;
        }
        for (const desktop::OnlineAccount& other : accounts) {
            if (other.providerType == account.providerType && other.identity == account.identity) {
                return true;
            }
        }
        made.push_back(account);
        desktop::OnlineAccount& added = add(account.providerType, account.identity, false);
        for (const Feature feature : featuresOfProvider[account.providerType]) {
            const auto i = static_cast<std::size_t>(feature);
            added.switches[i] = {!account.isOn[i], account.isOn[i]};
        }
        return true;
    }

  private:
    int _count = 0;
};

} // namespace welcomer::fakes
