// The person at the terminal.

#pragma once

#include "backends/posix/SecretText.h"

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

// Talks to the process's controlling terminal, wherever the standard streams lead: results stay apart from
// questions.
class Terminal {
  public:
    // Throws UsageError where there is no terminal.
    //  instead  what the user can do without one, for the message
    explicit Terminal(const std::string& instead);
    ~Terminal();
    Terminal(const Terminal&) = delete;
    Terminal& operator=(const Terminal&) = delete;

    // Writes a line, with control characters made visible.
    void say(const std::string& line);

    // Asks for a line, which can be mended while it is typed. After Ctrl-Z and the return from it the
    // question is shown again.
    //  result  without its end and without spaces around it
    // Throws CommandFailure when the input has ended.
    std::string ask(const std::string& question);

    // Asks for a line that is not shown while it is typed. A signal that ends or stops the program takes its
    // course only after the terminal shows what is typed again; after a stop the question is asked anew.
    //  result  without its end
    // Throws CommandFailure when the input has ended.
    posix::SecretText askWithoutEcho(const std::string& question);

    // Asks yes or no, until it is one of them. Return alone is a yes.
    bool confirm(const std::string& question);

    // Shows numbered items and asks which ones, until the answer makes sense: numbers, "all" or "none".
    // Return alone is all of them.
    //  result  the indices, in order and once each
    std::vector<std::size_t> choose(const std::string& title, const std::vector<std::string>& items);

  private:
    void _write(const std::string& text);
    void _askPlainly(const std::string& prompt, bool isShown, int interruption, std::string& line);
    bool _readLine(int interruption, int suspension, std::string& line);

    const int _descriptor;
};

// What an answer of Terminal::choose stands for.
//  count   how many items there are
//  result  the indices, in order and once each; none when the answer makes no sense
std::optional<std::vector<std::size_t>> parseChoice(const std::string& answer, std::size_t count);

} // namespace welcomer::tool
