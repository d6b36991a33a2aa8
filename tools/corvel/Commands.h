// The subcommands of `corvel`. Each command file registers itself with a static
// CommandRegistration, so adding a command touches no other file. A command returns the
// process exit status: 0 success, 1 when it ran but found nothing or some inputs
// failed, 2 on misuse or bad input.
//
// Before a command sees its arguments, main() has taken out what every command shares:
// --help and -h (the command's usage), --verbose (the library's log lines on standard
// error), and "--name=value" split into "--name" "value" (an option named in `flags`
// given a value is refused).
#pragma once

#include <string>
#include <vector>

namespace corvel::tool {

using Arguments = std::vector<std::string>;
using CommandFunction = int (*)(const Arguments& args);

struct CommandRegistration {
  // `usage` is "NAME ARGS... : what it does"; `flags` names the options that take no
  // value, separated by spaces.
  CommandRegistration(const char* name, const char* usage, CommandFunction run,
                      const char* flags = "");
};

// Prints "corvel: <message>" to standard error and returns 2.
int misuse(const std::string& message);

// The candidate closest to `given` when it is a likely typing slip of it (a few letters
// off), else "".
std::string closestMatch(const std::string& given, const std::vector<std::string>& candidates);
// " (did you mean 'X'?)" for closestMatch, else "".
std::string didYouMean(const std::string& given, const std::vector<std::string>& candidates);

// How many of the library's log lines (shown with --verbose) have been written so far; a
// command that draws a progress bar draws it again when this changes, since a log line
// clears the bar's line.
std::size_t logLinesWritten();

}  // namespace corvel::tool
