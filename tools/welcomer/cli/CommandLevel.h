// How a command says what it can be given. The library that reads command lines is known behind this alone:
// every file that includes it takes ten times as long to compile.

#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace CLI {
class App;
class Option;
} // namespace CLI

namespace welcomer::tool {

// An option or an argument of a command, which says more of itself. It refers to the command line's own, and
// lives no longer. Main thread, as all that is here.
class CommandOption {
  public:
    explicit CommandOption(CLI::Option& option) : _option(&option) {}

    // What help calls its value, such as "DIR".
    CommandOption& called(const std::string& value);

    CommandOption& required();

    // May be given several times, with one value each time.
    CommandOption& repeated();

    // Takes nothing else.
    CommandOption& oneOf(const std::vector<std::string>& values);
    CommandOption& within(std::uint64_t least, std::uint64_t most);
    CommandOption& notNegative();

    // Is looked at before it is taken.
    //  problem  what is wrong with a value, in one line; empty where nothing is
    CommandOption& checked(std::function<std::string(const std::string& value)> problem);

    // Help shows the value that its place has now.
    CommandOption& showsDefault();

    // Is not given together with another one, which the command has already.
    //  name  with its dashes
    CommandOption& excludes(const std::string& name);
    CommandOption& excludes(const CommandOption& other);

  private:
    CLI::Option* _option;
};

// A command, or a group of commands, while it is being defined.
class CommandLevel {
  public:
    explicit CommandLevel(CLI::App& level) : _level(&level) {}

    // Adds an option, or an argument where the name has no dashes.
    //  place  where its value goes when the command line is read, before the command runs; borrowed. Which
    //         types it may have, CommandLevel.cpp says: texts and whole numbers, where they may be left out too
    template <class Value>
    CommandOption option(const std::string& name, Value& place, const std::string& description);

    // Adds an option that takes no value.
    CommandOption flag(const std::string& name, bool& place, const std::string& description);

    // Has help not show it.
    void hide();

    CLI::App& level() const { return *_level; }

  private:
    CLI::App* _level;
};

} // namespace welcomer::tool
