#include "tools/welcomer/cli/Definition.h"

#include <CLI/CLI.hpp>
#include <iterator>
#include <sstream>

namespace welcomer::tool {

namespace {

// The library has a value's name and what is checked of it in one text, such as "TEXT:{pre,post}".
void takeValue(OptionDefinition& option, const std::string& typeName) {
    const std::size_t colon = typeName.find(':');
    option.value = typeName.substr(0, colon);
    const std::string checked = colon == std::string::npos ? "" : typeName.substr(colon + 1);
    if (!checked.starts_with('{') || !checked.ends_with('}')) {
        return;
    }
    std::istringstream choices(checked.substr(1, checked.size() - 2));
    for (std::string choice; std::getline(choices, choice, ',');) {
        option.choices.push_back(choice);
    }
}

OptionDefinition definitionOf(const CLI::Option& option) {
    OptionDefinition definition;
    for (const std::string& name : option.get_snames()) {
        definition.names.push_back("-" + name);
    }
    for (const std::string& name : option.get_lnames()) {
        definition.names.push_back("--" + name);
    }
    if (option.get_items_expected_max() > 0) {
        takeValue(definition, option.get_type_name());
    }
    if (option.get_positional() && definition.value.empty()) {
        definition.value = option.get_name(true);
    }
    definition.description = option.get_description();
    definition.isRequired = option.get_required();
    definition.isRepeated = option.get_items_expected_max() > 1 ||
                            option.get_multi_option_policy() == CLI::MultiOptionPolicy::TakeAll;
    return definition;
}

} // namespace

CommandDefinition definitionOf(const CLI::App& level, const std::string& above) {
    CommandDefinition definition;
    definition.name = level.get_name();
    definition.fullName = above.empty() ? definition.name : above + " " + definition.name;
    definition.description = level.get_description();
    for (const CLI::Option* const option :
         level.get_options([](const CLI::Option* each) { return !each->get_group().empty(); })) {
        (option->nonpositional() ? definition.options : definition.arguments)
            .push_back(definitionOf(*option));
    }
    for (const CLI::App* const below :
         level.get_subcommands([](const CLI::App* each) { return !each->get_group().empty(); })) {
        definition.commands.push_back(definitionOf(*below, definition.fullName));
    }
    return definition;
}

std::vector<std::string> namesBelow(const CommandDefinition& level) {
    std::vector<std::string> names;
    for (const CommandDefinition& command : level.commands) {
        names.push_back(command.name);
    }
    return names;
}

std::vector<const CommandDefinition*> everyLevelOf(const CommandDefinition& level) {
    std::vector<const CommandDefinition*> levels{&level};
    for (const CommandDefinition& below : level.commands) {
        const auto more = everyLevelOf(below);
        levels.insert(levels.end(), more.begin(), more.end());
    }
    return levels;
}

} // namespace welcomer::tool
