// A text that nobody else is to see: one buffer, wiped when it is no longer needed.

#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

namespace welcomer::posix {

// Overwrites a text with zeros, whatever the optimiser thinks of that, and empties it. Any thread.
void wipe(std::string& text);

// Wipes a text of somebody else's at the end of its scope.
class WipedAtEnd {
  public:
    //  text  borrowed
    explicit WipedAtEnd(std::string& text) : _text(text) {}
    ~WipedAtEnd() { wipe(_text); }
    WipedAtEnd(const WipedAtEnd&) = delete;
    WipedAtEnd& operator=(const WipedAtEnd&) = delete;

  private:
    std::string& _text;
};

// While there is any, the system writes no core file of the process and lets no other process of the user's
// look into its memory; what was so before is so again afterwards. Copies share the one buffer, which is wiped
// with the last of them. Any thread may hold one, and one of its own.
class SecretText {
  public:
    // Holds what another one holds, without a copy, where this is that one's text(); else a copy.
    explicit SecretText(std::string_view text);

    // Holds what is put together in its place: whoever reads a secret needs no other.
    //  room   how long it may become, in bytes
    //  write  called once, with an empty text that does not move until it is longer than that; what it throws
    //         is thrown
    SecretText(std::size_t room, const std::function<void(std::string& text)>& write);

    // Borrowed: lives as long as this object, or a copy of it.
    const std::string& text() const;

  private:
    struct Buffer;

    static std::shared_ptr<const Buffer> _sharedWith(std::string_view text);

    std::shared_ptr<const Buffer> _buffer;
};

} // namespace welcomer::posix
