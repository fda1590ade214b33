// The options that every program of the system answers.

#pragma once

namespace welcomer {

// Answers an option that a program was called with in place of its work: "--help" with the usage line and
// "--version" with the program's name and version, both on the standard output; any other one with the usage
// line on the standard error.
//  option   such as "--help"
//  program  the program's name
//  usage    the arguments that the program takes, as its usage line shows them; may be empty
//  result   the exit status that fits: 0, or 2 for an option that is neither of the two
// Main thread.
int answerOption(const char* option, const char* program, const char* usage);

} // namespace welcomer
