// All commands of the tool. A new one is declared here and named once in the list.

#pragma once

#include "tools/welcomer/cli/Tool.h"

namespace welcomer::tool {

void addStatusCommand(CommandLine& commandLine);
void addLogCommand(CommandLine& commandLine);
void addTryCommand(CommandLine& commandLine);
void addSetupCommand(CommandLine& commandLine);
void addAccountCommands(CommandLine& commandLine);
void addServicesCommands(CommandLine& commandLine);
void addReplayCommands(CommandLine& commandLine);
void addPluginsCommands(CommandLine& commandLine);
void addPluginsCheck(CommandLine& commandLine, CommandLevel group); // one of these
void addStateCommands(CommandLine& commandLine);
void addSyncCommands(CommandLine& commandLine);
void addSwitchCommands(CommandLine& commandLine);
void addDoctorCommand(CommandLine& commandLine);
void addNetworkCommands(CommandLine& commandLine);

// In the order in which --help shows them.
inline constexpr CommandAdder kCommands[] = {
    {addStatusCommand, true},  {addLogCommand, false},      {addTryCommand, true},
    {addSetupCommand, true},   {addAccountCommands, true},  {addServicesCommands, true},
    {addReplayCommands, true}, {addPluginsCommands, false}, {addStateCommands, true},
    {addSyncCommands, true},   {addSwitchCommands, false},  {addNetworkCommands, false},
    {addDoctorCommand, false}};

} // namespace welcomer::tool
