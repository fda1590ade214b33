// The credential store on the Secret Service, as a module.

#pragma once

#include "platform/CredentialStore.h"

#include <chrono>
#include <cstddef>

namespace welcomer::desktop {

// The most bytes that a secret may have: the bus takes messages of up to 64 MiB and ends the connection of
// whoever sends a larger one. What encryption and the message add stays far below the rest.
inline constexpr std::size_t kLargestSecret = std::size_t{48} * 1024 * 1024;

struct CredentialModule {
    static constexpr char kName[] = "credentials";
    using Interface = platform::CredentialStore;
    struct Arguments {
        // How long a prompt waits for an answer before it is given up.
        std::chrono::nanoseconds promptPatience = std::chrono::minutes(2);
        // How long one operation may take, without what a person takes to answer.
        std::chrono::nanoseconds questionLimit = std::chrono::seconds(10);
    };
};

} // namespace welcomer::desktop
