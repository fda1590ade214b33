#include "tools/welcomer/cli/ManualPages.h"

#include "text/Contains.h"

#include <algorithm>

namespace welcomer::tool {

namespace {

// Plain text, none of which means anything to scdoc.
std::string escaped(const std::string& text) {
    std::string result;
    for (const char character : text) {
        if (std::string_view("\\*_#[]<~+|").find(character) != std::string_view::npos) {
            result += '\\';
        }
        result += character;
    }
    return result;
}

std::string sentence(const std::string& text) {
    return escaped(text) + (text.ends_with('.') ? "" : ".");
}

std::string bold(const std::string& text) {
    return "*" + escaped(text) + "*";
}

std::string underlined(const std::string& text) {
    return "_" + escaped(text) + "_";
}

// What stands for an option's value: its name, or the values themselves.
std::string valueOf(const OptionDefinition& option) {
    std::string choices;
    for (const std::string& choice : option.choices) {
        choices += (choices.empty() ? "" : "\\|") + bold(choice);
    }
    return option.choices.empty() ? underlined(option.value) : choices;
}

std::string namesOf(const OptionDefinition& option) {
    std::string text;
    for (const std::string& name : option.names) {
        text += (text.empty() ? "" : ", ") + bold(name);
    }
    if (option.takesValue()) {
        text += (text.empty() ? "" : " ") + valueOf(option);
    }
    return text;
}

std::string entry(const OptionDefinition& option) {
    const bool isDemanded = option.isRequired && !option.names.empty();
    // What stands for an argument is its value.
    return namesOf(option) + "\n\t" + sentence(option.description) + (isDemanded ? " Required." : "") +
           "\n\n";
}

// The options of a command that not every command has.
std::vector<OptionDefinition> ownOptions(const CommandDefinition& command) {
    std::vector<OptionDefinition> options = command.options;
    std::erase_if(options,
                  [](const OptionDefinition& option) { return text::contains(option.names, "--help"); });
    return options;
}

std::string entries(const std::vector<OptionDefinition>& arguments,
                    const std::vector<OptionDefinition>& options) {
    std::string text;
    for (const OptionDefinition& argument : arguments) {
        text += entry(argument);
    }
    for (const OptionDefinition& option : options) {
        text += entry(option);
    }
    return text;
}

// One line of the synopsis.
std::string synopsis(const CommandDefinition& level) {
    std::string text = bold(level.fullName);
    const std::vector<OptionDefinition> options = ownOptions(level);
    const bool hasOptional =
        std::ranges::any_of(options, [](const OptionDefinition& option) { return !option.isRequired; });
    if (hasOptional) {
        text += " \\[" + underlined("options") + "\\]";
    }
    for (const OptionDefinition& option : options) {
        if (option.isRequired) {
            text += " " + namesOf(option);
        }
    }
    for (const OptionDefinition& argument : level.arguments) {
        const std::string value = valueOf(argument) + (argument.isRepeated ? "..." : "");
        text += argument.isRequired ? " " + value : " \\[" + value + "\\]";
    }
    return text;
}

std::string reference(const std::string& page) {
    return bold(page) + "(1)";
}

std::string programPage(const CommandDefinition& program) {
    std::string text = "# SYNOPSIS\n\n" + bold(program.name) + " \\[" + underlined("options") + "\\] " +
                       underlined("COMMAND") + " ...\n\n# DESCRIPTION\n\n" + sentence(program.description) +
                       "\n\n# COMMANDS\n\n";
    for (const CommandDefinition& command : program.commands) {
        text += bold(command.name) + "\n\t" + sentence(command.description) + " See " +
                reference(pageName(command)) + ".\n\n";
    }
    return text + "# OPTIONS\n\nThese stand before or after any command.\n\n" +
           entries(program.arguments, program.options);
}

std::string commandPage(const CommandDefinition& program, const CommandDefinition& page) {
    std::string text = "# SYNOPSIS\n\n";
    std::string descriptions;
    for (const CommandDefinition* const level : everyLevelOf(page)) {
        if (!level->commands.empty()) {
            continue;
        }
        text += synopsis(*level) + "\n\n";
        descriptions += page.commands.empty() ? ""
                                              : "## " + level->fullName.substr(program.fullName.size() + 1) +
                                                    "\n\n" + sentence(level->description) + "\n\n";
        descriptions += entries(level->arguments, ownOptions(*level));
    }
    return text + "# DESCRIPTION\n\n" + sentence(page.description) + "\n\n" +
           (descriptions.empty()    ? ""
            : page.commands.empty() ? "# OPTIONS\n\n"
                                    : "# COMMANDS\n\n") +
           descriptions + "# COMMON OPTIONS\n\nThose that every command takes are in " +
           reference(program.name) + ".\n\n";
}

std::string seeAlso(const CommandDefinition& program, const CommandDefinition& page) {
    std::string text = "# SEE ALSO\n\n";
    if (&page != &program) {
        return text + reference(program.name) + "\n";
    }
    std::string pages;
    for (const CommandDefinition& command : program.commands) {
        pages += (pages.empty() ? "" : ", ") + reference(pageName(command));
    }
    return text + pages + ", " + bold("wlnimbussetup") + "(8), " + bold("welcomer-platform.conf") + "(5), " +
           bold("welcomer-plugins") + "(7)\n";
}

} // namespace

std::string pageName(const CommandDefinition& command) {
    std::string name = command.fullName;
    std::ranges::replace(name, ' ', '-');
    return name;
}

std::string manualPage(const CommandDefinition& program, const CommandDefinition& page,
                       const std::string& more) {
    const std::string heading = pageName(page) + "(1) \"" WELCOMER_VERSION "\" \"Welcomer\"\n\n";
    const std::string purpose = page.description.substr(0, page.description.find_last_not_of('.') + 1);
    const std::string name = "# NAME\n\n" + pageName(page) + " - " + escaped(purpose) + "\n\n";
    return heading + name + (&page == &program ? programPage(program) : commandPage(program, page)) + more +
           (more.empty() || more.ends_with("\n\n") ? "" : "\n") + seeAlso(program, page);
}

} // namespace welcomer::tool
