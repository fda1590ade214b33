#include "tools/launch-agents/LaunchAgent.h"

#include "propertylist/PropertyListReader.h"

#include <algorithm>

namespace welcomer::launch {

namespace {

LaunchAgentResult refused(std::string reason) {
    return {std::nullopt, std::move(reason)};
}

// Nothing that reaches a program as a C string can hold a NUL.
const std::string* text(const PropertyList* value) {
    const std::string* const string = value ? value->string() : nullptr;
    return string && !string->empty() && string->find('\0') == std::string::npos ? string : nullptr;
}

// The arguments of a definition, which may be empty ones, or none when they are no array of strings.
std::optional<std::vector<std::string>> argumentList(const PropertyList& value) {
    if (!value.array()) {
        return std::nullopt;
    }
    std::vector<std::string> arguments;
    for (const PropertyList& each : *value.array()) {
        if (!each.string() || each.string()->find('\0') != std::string::npos) {
            return std::nullopt;
        }
        arguments.push_back(*each.string());
    }
    return arguments;
}

} // namespace

LaunchAgentResult readLaunchAgent(std::string_view bytes) {
    const PropertyListReadResult definition = readPropertyList(bytes);
    if (!definition) {
        return refused("it is no property list: " + definition.error);
    }
    if (!definition.value->isDictionary()) {
        return refused("it is no dictionary");
    }
    LaunchAgent agent;
    const std::string* const label = text(definition.value->find("Label"));
    if (!label) {
        return refused("it has no label");
    }
    agent.label = *label;
    if (const PropertyList* const list = definition.value->find("ProgramArguments")) {
        auto arguments = argumentList(*list);
        if (!arguments) {
            return refused("its arguments are no list of texts");
        }
        agent.arguments = std::move(*arguments);
    }
    if (const PropertyList* const program = definition.value->find("Program")) {
        agent.program = program->string() ? *program->string() : "";
    } else if (!agent.arguments.empty()) {
        agent.program = agent.arguments.front();
    }
    // Without a full path the program would depend on who searches for it, the user manager or this process.
    if (!agent.program.starts_with('/') || agent.program.find('\0') != std::string::npos) {
        return refused("it names no program by its full path");
    }
    if (agent.arguments.empty()) {
        agent.arguments.push_back(agent.program);
    }
    const PropertyList* const runAtLoad = definition.value->find("RunAtLoad");
    agent.runAtLoad = runAtLoad && runAtLoad->boolean() == true;
    return {std::move(agent), ""};
}

} // namespace welcomer::launch
