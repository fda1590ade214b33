// The checks themselves, each of which runs in a process of its own. PluginChecks.cpp says what they are called, what they
// are for, and in which order they run.

#pragma once

#include "tools/welcomer/plugins/CheckReport.h"
#include "tools/welcomer/plugins/CheckedPlugin.h"
#include "tools/welcomer/plugins/PluginLife.h"

namespace welcomer::tool::checks {

using Check = void(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input);

// The file (LibraryChecks.cpp).
Check library;
Check exportedSymbol;
Check uniqueSymbols;
Check visibility;

// What it exports (LoadChecks.cpp).
Check staticInitialisers;
Check loads;
Check version;
Check structureSize;
Check protocol;
Check className;
Check createFunction;
Check destroyFunction;

// What it must not do to the process (ProcessChecks.cpp).
Check wholeLife; // of whose end somebody else makes something
Check exceptions;
Check callingThread;
Check forks;
Check workingDirectory;
Check locale;
Check fileModeMask;
Check signalHandlers;
Check descriptors;
Check openedDescriptors;

// The instance (InstanceChecks.cpp).
Check create;
Check instanceSize;
Check requiredFunctions;
Check firstHost;
Check destroy;
Check extensions;
Check identifier;
Check identifierAgain;
Check identifierOnThreads;
Check request;
Check requestOnThreads;

// The completion (CompletionChecks.cpp).
Check completion;
Check handlerOnce;
Check handlerContext;
Check errorMessage;
Check terminated;
Check callerGone;
Check arrayResponse;
Check stringResponse;
Check integerResponse;
Check realResponse;
Check booleanResponse;
Check dataResponse;
Check dateResponse;
Check emptyResponse;
Check largeResponse;
Check deepResponse;
Check aliasesOffered;
Check aliasesChosen;

// The values that it holds (HandleChecks.cpp).
Check leaks;
Check keptValues;
Check releasedTwice;
Check changedBorrowed;
Check usedAfterRelease;
Check errorSlots;

} // namespace welcomer::tool::checks
