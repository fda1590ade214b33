// One question to the Secret Service: the calls of one operation, which end in time.

#pragma once

#include "backends/desktop/credentials/LibSecret.h"
#include "backends/desktop/credentials/SecretServiceItem.h"
#include "backends/desktop/credentials/SecretServiceStatus.h"
#include "backends/desktop/glib/AsyncCall.h"
#include "backends/desktop/glib/Bus.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace welcomer::desktop {

inline constexpr char kNoObject[] = "/"; // the path that stands for none

// The service, and its objects once they have a path.
inline constexpr Peer kSecretService = {"org.freedesktop.secrets", "/org/freedesktop/secrets",
                                        "org.freedesktop.Secret.Service", kReportLimit};
inline constexpr Peer kSecretItem = kSecretService.as(kItemInterface);
inline constexpr Peer kSecretCollection = kSecretService.as("org.freedesktop.Secret.Collection");

// All of a question together (to reach the bus, to start the service, to open a session, and every call) has
// one limit. What a person takes to answer a prompt does not count for it, and has a limit of its own.
//
// Statuses are platform::CredentialStatus, or kTimedOut. One thread.
class SecretServiceQuestion {
  public:
    //  bus  borrowed
    SecretServiceQuestion(Bus& bus, std::chrono::nanoseconds limit, std::chrono::nanoseconds promptPatience)
        : _bus(bus),
          _deadline(limit),
          _promptPatience(promptPatience) {}

    // Reaches the service, and has it started where it does not run. This or beginToLook() comes first.
    std::int32_t begin();

    // The same without starting anybody.
    //  name  what the bus says about the service's name
    std::int32_t beginToLook(BusName& name);

    // The bus's calls within what is left of the time.
    //  status  kCredentialSuccess, or what the error means; an answer of another type is
    //          kCredentialServiceFailed
    VariantPointer call(const Peer& peer, const char* method, GVariant* arguments, const char* type,
                        std::int32_t& status);
    VariantPointer readProperty(const Peer& peer, const char* name, std::int32_t& status);
    VariantPointer readProperties(const Peer& peer, std::int32_t& status);

    // Has the service put a prompt before the user.
    //  path    of the prompt
    //  type    of what it gives, or null
    //  result  what it has given; null when it was refused or given up
    VariantPointer prompt(const char* path, const char* type, std::int32_t& status);

    // What it means when a prompt was answered with nothing.
    std::int32_t refusal() const;

    // Unlocks objects, which may ask the user; success when at least one of them is.
    std::int32_t unlock(const std::vector<std::string>& paths);

    // Reads the path that the default collection has now; "/" when there is none.
    std::int32_t readDefaultAlias(std::string& path);

    // Opens a session for secrets; library() then encrypts for it.
    std::int32_t openSession();
    SecretService* library() const { return _library.get(); }

  private:
    // The library's object of the service, made for one question. What it knows (who the service is, and the
    // session that secrets are encrypted for) ends with the service, and it learns of that end only where a
    // main loop runs: one that was kept would send its calls to nobody once the service has been started
    // anew.
    struct CloseLibrary {
        void operator()(SecretService* library) const;
    };

    std::int32_t _connect();
    std::int32_t _openLibrary();

    Bus& _bus;
    Deadline _deadline;
    const std::chrono::nanoseconds _promptPatience;
    BusConnection _connection;
    // What the library's object leaves behind is cleared away on the context that it was made on.
    std::unique_ptr<AsyncCall> _opening;
    std::unique_ptr<SecretService, CloseLibrary> _library;
};

} // namespace welcomer::desktop
