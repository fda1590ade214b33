// A text that nobody else is to see: one buffer, wiped when it is no longer needed.

#pragma once

#include <string>
#include <string_view>

namespace welcomer::posix {

// Overwrites a text with zeros, whatever the optimiser thinks of that, and empties it. Any thread.
void wipe(std::string& text);

// While there is any, the system writes no core file of the process and lets no other process of the user's
// look into its memory; what was so before is so again afterwards. Any thread may hold one, and one of its
// own.
class SecretText {
  public:
    explicit SecretText(std::string_view text);
    ~SecretText();

    SecretText(const SecretText&) = delete;
    SecretText& operator=(const SecretText&) = delete;

    // Borrowed: lives as long as this object.
    const std::string& text() const { return _text; }

  private:
    std::string _text;
};

} // namespace welcomer::posix
