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

// What adds commands, and whether these work with what lies in the user's home.
struct CommandAdder {
    void (*add)(CommandLine& commandLine);
    bool needsHome;
};

// In the order in which --help shows them.
inline constexpr CommandAdder kCommands[] = {
    {addTryCommand, true},       {addSetupCommand, true},   {addAccountCommands, true},
    {addServicesCommands, true}, {addReplayCommands, true}, {addPluginsCommands, false},
    {addStateCommands, true},    {addSyncCommands, true},   {addSwitchCommands, false},
    {addNetworkCommands, false}, {addDoctorCommand, false}};

} // namespace welcomer::tool
