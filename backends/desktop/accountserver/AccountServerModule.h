// Signing in over HTTPS with an account server, as a module.

#pragma once

#include "backends/accountserver/Messages.h"
#include "platform/SignInDirectory.h"

#include <chrono>
#include <functional>
#include <string>

namespace welcomer::desktop {

// Where the server is, and how long it is waited for.
struct AccountServerSettings {
    std::string address; // "https://HOST..." or "unix:/PATH"

    // The file of the authorities that its certificate may be from; empty: the system's.
    std::string authority = {};

    // The file of the certificates that those authorities have revoked; empty: nobody looks.
    std::string revocations = {};

    std::chrono::seconds connectLimit{10};
    std::chrono::seconds limit{30}; // for everything, with what is tried again
};

// How the server looks to who does not sign in.
struct AccountServerLook {
    bool isRight = false;
    std::string text;   // one line
    std::string advice; // one line; empty where nothing is wrong
};

class AccountServer : public platform::SignInDirectory {
  public:
    // Looks whether there is a server, which, until when its certificate holds, and whether its clock is this
    // machine's. Sends no password. Blocks as answer() does. Any thread.
    virtual AccountServerLook look() const = 0;

    // Has what is being asked end soon, as if the server were not there, and everything that is asked
    // afterwards. Any thread.
    virtual void stop() = 0;
};

struct AccountServerModule {
    static constexpr char kName[] = "accountserver";
    using Interface = AccountServer;
    struct Arguments {
        // Each is asked when the module is first used.
        std::function<AccountServerSettings()> settings;
        std::function<accountserver::Machine()> machine;
    };
};

} // namespace welcomer::desktop
