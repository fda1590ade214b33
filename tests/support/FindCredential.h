// Looking an item up, with the results where a test wants them.

#pragma once

#include "platform/CredentialStore.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>

namespace welcomer {

// Looks for as much as there is an output for: none of them, which asks for its presence; the reference or
// the item; the secret. They are written on success alone; of a failure nothing but its status may be told.
inline std::int32_t findCredential(platform::CredentialStore& store, std::string* secret,
                                   std::unique_ptr<platform::CredentialItemReference>* reference,
                                   platform::CredentialItem* item = nullptr,
                                   const std::string& service = "service",
                                   const std::string& account = "account") {
    using platform::CredentialWish;
    const CredentialWish wish = secret              ? CredentialWish::Secret
                                : reference || item ? CredentialWish::Item
                                                    : CredentialWish::Presence;
    platform::CredentialFinding found = store.findItem(service, account, wish);
    if (!found) {
        EXPECT_EQ(found.secret, "");
        EXPECT_EQ(found.reference, nullptr);
        EXPECT_EQ(found.item.service, "");
        return found.status;
    }
    if (secret) {
        *secret = std::move(found.secret);
    }
    if (reference) {
        *reference = std::move(found.reference);
    }
    if (item) {
        EXPECT_EQ(found.itemStatus, platform::kCredentialSuccess);
        *item = std::move(found.item);
    }
    return found.status;
}

} // namespace welcomer
