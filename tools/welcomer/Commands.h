// All commands of the tool. A new one is declared here and named once in the list.

#pragma once

namespace welcomer::tool {

class CommandLine;

void addTryCommand(CommandLine& commandLine);
void addSetupCommand(CommandLine& commandLine);
void addAccountCommands(CommandLine& commandLine);
void addServicesCommands(CommandLine& commandLine);
void addReplayCommands(CommandLine& commandLine);
void addPluginsCommands(CommandLine& commandLine);
void addStateCommands(CommandLine& commandLine);
void addSyncCommands(CommandLine& commandLine);
void addSwitchCommands(CommandLine& commandLine);
void addDoctorCommand(CommandLine& commandLine);
void addNetworkCommands(CommandLine& commandLine);

// In the order in which --help shows them.
inline constexpr void (*kCommands[])(CommandLine&) = {
    addTryCommand,     addSetupCommand,    addAccountCommands, addServicesCommands,
    addReplayCommands, addPluginsCommands, addStateCommands,   addSyncCommands,
    addSwitchCommands, addNetworkCommands, addDoctorCommand};

} // namespace welcomer::tool
