#include "tools/welcomer/cli/Completions.h"

#include <functional>
#include <utility>

namespace welcomer::tool {

namespace {

using Offered = std::set<std::string>;
using Lines = std::vector<std::pair<std::string, std::string>>; // a name, and what it does

// How a value is completed: "words a b", "list USER", "file", "folder", "login" or "nothing".
std::string completionOf(const OptionDefinition& option, const Offered& offered) {
    if (!option.choices.empty()) {
        std::string words = "words";
        for (const std::string& choice : option.choices) {
            words += " " + choice;
        }
        return words;
    }
    if (offered.contains(option.value)) {
        return "list " + option.value;
    }
    if (option.value == "PLIST" || option.value == "FILE") {
        return "file";
    }
    return option.value == "DIR" ? "folder" : option.value == "LOGIN" ? "login" : "nothing";
}

// The text between single quotes.
std::string quoted(const std::string& text) {
    std::string result = "'";
    for (const char character : text) {
        result += character == '\'' ? std::string("'\\''") : std::string(1, character);
    }
    return result + "'";
}

// For fish, where a quote within quotes has a backslash.
std::string fishQuoted(const std::string& text) {
    std::string result = "'";
    for (const char character : text) {
        result += character == '\'' || character == '\\' ? std::string("\\") + character
                                                         : std::string(1, character);
    }
    return result + "'";
}

Lines commandsOf(const CommandDefinition& level) {
    Lines lines;
    for (const CommandDefinition& command : level.commands) {
        lines.emplace_back(command.name, command.description);
    }
    return lines;
}

Lines optionsOf(const CommandDefinition& level) {
    Lines lines;
    for (const OptionDefinition& option : level.options) {
        for (const std::string& name : option.names) {
            lines.emplace_back(name, option.description);
        }
    }
    return lines;
}

// By option's name, or argument's number from 1.
Lines valuesOf(const CommandDefinition& level, const Offered& offered) {
    Lines lines;
    for (const OptionDefinition& option : level.options) {
        for (const std::string& name : option.names) {
            if (option.takesValue()) {
                lines.emplace_back(name, completionOf(option, offered));
            }
        }
    }
    for (std::size_t i = 0; i < level.arguments.size(); ++i) {
        lines.emplace_back(std::to_string(i + 1), completionOf(level.arguments[i], offered));
    }
    return lines;
}

// How a shell adds an entry to a table.
using Adding = std::string (*)(const std::string& table, const std::string& key, const std::string& value);

std::string addedInBash(const std::string& table, const std::string& key, const std::string& value) {
    return "    " + table + "[" + key + "]=" + quoted(value) + "\n";
}

std::string addedInZsh(const std::string& table, const std::string& key, const std::string& value) {
    return "    " + table + "+=(" + quoted(key) + " " + quoted(value) + ")\n";
}

// One table: for each level that has something, its full name and what `text` makes of that.
std::string table(const CommandDefinition& program, const std::string& name, Adding add,
                  const std::function<Lines(const CommandDefinition&)>& linesOf,
                  const std::function<std::string(const Lines&)>& text) {
    std::string result;
    for (const CommandDefinition* const level : everyLevelOf(program)) {
        const Lines lines = linesOf(*level);
        if (!lines.empty()) {
            result += add(name, level->fullName, text(lines));
        }
    }
    return result;
}

std::string valueTable(const CommandDefinition& program, Adding add, const Offered& offered) {
    std::string result;
    for (const CommandDefinition* const level : everyLevelOf(program)) {
        for (const auto& [name, value] : valuesOf(*level, offered)) {
            result += add("values", level->fullName + " " + name, value);
        }
    }
    return result;
}

std::string namesAlone(const Lines& lines) {
    std::string text;
    for (const auto& [name, description] : lines) {
        text += (text.empty() ? "" : " ") + name;
    }
    return text;
}

std::string namesWithDescriptions(const Lines& lines) {
    std::string text;
    for (const auto& [name, description] : lines) {
        text += text.empty() ? "" : "\n";
        text.append(name).append(":").append(description);
    }
    return text;
}

// The options of fish's `complete` for what a value is completed with.
std::string fishValue(const std::string& completion) {
    if (completion.starts_with("words ")) {
        return " -x -a " + fishQuoted(completion.substr(6));
    }
    if (completion.starts_with("list ")) {
        return " -x -a '(__welcomer_values " + completion.substr(5) + ")'";
    }
    if (completion == "folder") {
        return " -x -a '(__fish_complete_directories)'";
    }
    if (completion == "login") {
        return " -x -a '(__fish_complete_users)'";
    }
    return completion == "file" ? " -r -F" : " -x";
}

std::string fishOption(const OptionDefinition& option, const std::string& condition, const Offered& offered) {
    std::string text = "complete -c welcomer" + condition;
    for (const std::string& name : option.names) {
        text += name.starts_with("--") ? " -l " + name.substr(2) : " -s " + name.substr(1);
    }
    return text + (option.takesValue() ? fishValue(completionOf(option, offered)) : "") + " -d " +
           fishQuoted(option.description) + "\n";
}

std::string fishLevel(const CommandDefinition& level, bool isProgram, const Offered& offered) {
    const std::string here = "__welcomer_at \"" + level.fullName + "\"";
    std::string text;
    for (const CommandDefinition& command : level.commands) {
        text += "complete -c welcomer -n " + fishQuoted(here) + " -a " + command.name + " -d " +
                fishQuoted(command.description) + "\n";
    }
    for (const OptionDefinition& option : level.options) {
        text += fishOption(option, isProgram ? "" : " -n " + fishQuoted(here), offered);
    }
    for (std::size_t i = 0; i < level.arguments.size(); ++i) {
        text += "complete -c welcomer -n " + fishQuoted(here + " " + std::to_string(i + 1)) +
                fishValue(completionOf(level.arguments[i], offered)) + "\n";
    }
    return text;
}

} // namespace

std::string bashTables(const CommandDefinition& program, const Offered& offered) {
    return table(program, "below", addedInBash, commandsOf, namesAlone) +
           table(program, "switches", addedInBash, optionsOf, namesAlone) +
           valueTable(program, addedInBash, offered);
}

std::string zshTables(const CommandDefinition& program, const Offered& offered) {
    return table(program, "below", addedInZsh, commandsOf, namesWithDescriptions) +
           table(program, "switches", addedInZsh, optionsOf, namesWithDescriptions) +
           valueTable(program, addedInZsh, offered);
}

std::string fishTables(const CommandDefinition& program, const Offered& offered) {
    std::string levels = "set -g __welcomer_levels";
    std::string valued = "set -g __welcomer_valued";
    std::string text;
    for (const CommandDefinition* const level : everyLevelOf(program)) {
        levels += " " + fishQuoted(level->fullName);
        for (const auto& [name, value] : valuesOf(*level, offered)) {
            valued += name.starts_with('-') ? " " + fishQuoted(level->fullName + " " + name) : "";
        }
        text += fishLevel(*level, level == &program, offered);
    }
    return levels + "\n" + valued + "\n" + text;
}

} // namespace welcomer::tool
