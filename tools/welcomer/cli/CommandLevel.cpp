#include "tools/welcomer/cli/CommandLevel.h"

#include <CLI/CLI.hpp>
#include <optional>
#include <utility>

namespace welcomer::tool {

CommandOption& CommandOption::called(const std::string& value) {
    _option->type_name(value);
    return *this;
}

CommandOption& CommandOption::required() {
    _option->required();
    return *this;
}

CommandOption& CommandOption::repeated() {
    _option->expected(1)->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    return *this;
}

CommandOption& CommandOption::oneOf(const std::vector<std::string>& values) {
    _option->check(CLI::IsMember(values));
    return *this;
}

CommandOption& CommandOption::within(std::uint64_t least, std::uint64_t most) {
    _option->check(CLI::Range(least, most));
    return *this;
}

CommandOption& CommandOption::notNegative() {
    _option->check(CLI::NonNegativeNumber);
    return *this;
}

CommandOption& CommandOption::checked(std::function<std::string(const std::string& value)> problem) {
    _option->check(std::move(problem));
    return *this;
}

CommandOption& CommandOption::showsDefault() {
    _option->capture_default_str();
    return *this;
}

CommandOption& CommandOption::excludes(const std::string& name) {
    _option->excludes(name);
    return *this;
}

CommandOption& CommandOption::excludes(const CommandOption& other) {
    _option->excludes(other._option);
    return *this;
}

template <class Value>
CommandOption CommandLevel::option(const std::string& name, Value& place, const std::string& description) {
    return CommandOption(*_level->add_option(name, place, description));
}

template CommandOption CommandLevel::option(const std::string&, std::string&, const std::string&);
template CommandOption CommandLevel::option(const std::string&, std::vector<std::string>&,
                                            const std::string&);
template CommandOption CommandLevel::option(const std::string&, std::optional<std::string>&,
                                            const std::string&);
template CommandOption CommandLevel::option(const std::string&, std::int64_t&, const std::string&);
template CommandOption CommandLevel::option(const std::string&, std::uint64_t&, const std::string&);
template CommandOption CommandLevel::option(const std::string&, std::optional<int>&, const std::string&);

CommandOption CommandLevel::flag(const std::string& name, bool& place, const std::string& description) {
    return CommandOption(*_level->add_flag(name, place, description));
}

void CommandLevel::hide() {
    _level->group("");
}

} // namespace welcomer::tool
