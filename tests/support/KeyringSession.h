// A desktop session of a test's own: a session bus and a keyring, on folders that are removed at the end.

#pragma once

#include "tests/contract/TemporaryRoot.h"

#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer {

// A program that runs beside the test and is ended, by its id, with this object.
class Daemon {
  public:
    Daemon() = default;
    //  input   what it reads from its standard input
    //  expect  starting has succeeded when it has printed a line that begins with this; empty: once it is
    //          started
    Daemon(const std::vector<std::string>& command, const std::string& input, const std::string& expect);
    ~Daemon() { stop(); }
    Daemon(Daemon&& other) noexcept;
    Daemon& operator=(Daemon&& other) noexcept;

    // The rest of the awaited line.
    const std::string& answer() const { return _answer; }
    // Waits for another line that begins with the text.
    //  result  whether it came
    bool waitForLine(const std::string& text);
    void stop();
    void kill();
    // Has it hang (SIGSTOP), or lets it go on.
    void hold(bool isHeld) const;

  private:
    pid_t _process = -1;
    int _output = -1;
    std::string _answer;
    std::string _unread;
};

// The environment of this process is the session's while it lives: HOME, XDG_RUNTIME_DIR,
// DBUS_SESSION_BUS_ADDRESS.
class KeyringSession {
  public:
    KeyringSession();
    ~KeyringSession();
    KeyringSession(const KeyringSession&) = delete;
    KeyringSession& operator=(const KeyringSession&) = delete;

    // A running keyring whose login keyring is the default one and unlocked.
    void startKeyring();
    // A running keyring without any collection.
    void startEmptyKeyring();
    // The bus's name for the running keyring, another one after each start.
    std::string keyringOwner() const;
    // Locks the login keyring.
    void lockKeyring();
    // Somebody who answers the keyring's questions: "ok", "refuse" or "silent".
    Daemon startPrompter(const std::string& answer) const;
    // The bus dies without a word.
    void killBus() { _bus.kill(); }
    // The keyring ends, as at a logout, or without a word. It may be started again.
    void stopKeyring() { _keyring.stop(); }
    void killKeyring() { _keyring.kill(); }
    // The keyring, or the bus, hangs, or goes on.
    void holdKeyring(bool isHeld) const { _keyring.hold(isHeld); }
    void holdBus(bool isHeld) const { _bus.hold(isHeld); }

    static constexpr const char* kPassword = "the keyring's password";

  private:
    void _waitForKeyring(const std::vector<std::string>& call, const std::string& expect) const;

    TemporaryRoot _folder;
    std::vector<std::pair<std::string, std::string>> _environment; // as it was, of what was set
    Daemon _bus;
    Daemon _keyring;
};

// Runs a program to its end.
//  result  what it printed, without the last line end
std::string outputOf(const std::vector<std::string>& command);

} // namespace welcomer
