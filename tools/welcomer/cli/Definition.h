// The command line as data: what its pages and completions are written from.

#pragma once

#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace welcomer::tool {

// An option, or an argument, which has no names.
struct OptionDefinition {
    std::vector<std::string> names;   // with their dashes, the short ones first
    std::string value;                // what it takes, such as "DIR"; empty for a flag
    std::vector<std::string> choices; // the values that it takes, where they are few and known
    std::string description;
    bool isRequired = false;
    bool isRepeated = false;

    bool takesValue() const { return !value.empty() || !choices.empty(); }
};

struct CommandDefinition {
    std::string name;     // of this level: "show"
    std::string fullName; // "welcomer replay show"
    std::string description;
    std::vector<OptionDefinition> options;
    std::vector<OptionDefinition> arguments;
    std::vector<CommandDefinition> commands;
};

// Everything below a level of the command line that its help shows.
//  above  the full name of the level above, or nothing
CommandDefinition definitionOf(const CLI::App& level, const std::string& above = "");

// The names of the commands that are next below a level.
std::vector<std::string> namesBelow(const CommandDefinition& level);

// The level and all that are below it, each before those below it.
std::vector<const CommandDefinition*> everyLevelOf(const CommandDefinition& level);

} // namespace welcomer::tool
