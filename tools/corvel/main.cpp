// corvel: the library's jobs on the command line.
#include <unistd.h>

#include <algorithm>
#include <iostream>
#include <map>
#include <sstream>
#include <string>
#include <thread>

#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "tools/corvel/Commands.h"

namespace corvel::tool {

namespace {

struct Command {
  std::string usage;  // "NAME ARGS..."
  std::string summary;
  std::vector<std::string> flags;
  CommandFunction run;
};

std::map<std::string, Command>& commands() {
  static std::map<std::string, Command> table;
  return table;
}

std::vector<std::string> commandNames() {
  std::vector<std::string> names;
  for (const auto& [name, command] : commands()) names.push_back(name);
  return names;
}

void printUsage(std::ostream& out) {
  out << "usage: corvel COMMAND [ARGS...]    (corvel help COMMAND, corvel --version)\n\n"
         "commands:\n";
  for (const auto& [name, command] : commands()) out << "  " << command.usage << '\n';
  out << "\noptions every command takes: --help, --verbose (the library's log lines on "
         "standard error)\n";
}

void printCommandHelp(const Command& command, std::ostream& out) {
  out << "usage: corvel " << command.usage << "\n\n" << command.summary << '\n';
}

std::size_t logLines = 0;  // written by the main thread only

// One line of the library's log, written at once; on a terminal the line is cleared
// first, since a progress bar may stand on it (the command draws the bar again).
void printLogLine(const std::string& line) {
  std::string text = (isatty(STDERR_FILENO) ? "\r\033[K" : "") + line + "\n";
  std::cerr << text << std::flush;
  ++logLines;
}

// The library logs from its worker threads (an OCR job's "Error: ..."), while this
// program writes its own messages and progress bar from the main thread, piece by piece.
// With --verbose, log lines are handed to the main thread, which writes them between its
// own writes; without it they are dropped, since every failure also reaches the program
// and is reported once, as one "corvel: FILE: reason" line.
void installLogSink(bool verbose) {
  static const std::thread::id mainThread = std::this_thread::get_id();
  if (!verbose) {
    PlatformRegistry::setLogSink([](std::string_view) {});
    return;
  }
  PlatformRegistry::setLogSink([](std::string_view line) {
    std::string text(line);
    if (std::this_thread::get_id() == mainThread) return printLogLine(text);
    MainQueue::async([text] { printLogLine(text); });
  });
}

// Edits between two names, a swap of neighbours counting as one (the slip "orc" for
// "ocr" is one edit, not two).
std::size_t editDistance(const std::string& a, const std::string& b) {
  std::vector<std::vector<std::size_t>> d(a.size() + 1, std::vector<std::size_t>(b.size() + 1));
  for (std::size_t i = 0; i <= a.size(); ++i) d[i][0] = i;
  for (std::size_t j = 0; j <= b.size(); ++j) d[0][j] = j;
  for (std::size_t i = 1; i <= a.size(); ++i) {
    for (std::size_t j = 1; j <= b.size(); ++j) {
      d[i][j] = std::min(
          {d[i - 1][j] + 1, d[i][j - 1] + 1, d[i - 1][j - 1] + (a[i - 1] == b[j - 1] ? 0 : 1)});
      if (i > 1 && j > 1 && a[i - 1] == b[j - 2] && a[i - 2] == b[j - 1]) {
        d[i][j] = std::min(d[i][j], d[i - 2][j - 2] + 1);
      }
    }
  }
  return d[a.size()][b.size()];
}

}  // namespace

CommandRegistration::CommandRegistration(const char* name, const char* usage, CommandFunction run,
                                         const char* flags) {
  std::string text = usage;
  std::size_t colon = text.find(" : ");
  Command command{
      text.substr(0, colon), colon == std::string::npos ? "" : text.substr(colon + 3), {}, run};
  std::istringstream names(flags);
  for (std::string flag; names >> flag;) command.flags.push_back(flag);
  commands()[name] = std::move(command);
}

std::size_t logLinesWritten() { return logLines; }

int misuse(const std::string& message) {
  std::cerr << "corvel: " << message << '\n';
  return 2;
}

std::string closestMatch(const std::string& given, const std::vector<std::string>& candidates) {
  std::string best;
  std::size_t bestDistance = std::max<std::size_t>(1, std::min<std::size_t>(3, given.size() / 4));
  for (const auto& candidate : candidates) {
    std::size_t distance = editDistance(given, candidate);
    if (distance <= bestDistance && (best.empty() || distance < editDistance(given, best))) {
      best = candidate;
    }
  }
  return best;
}

std::string didYouMean(const std::string& given, const std::vector<std::string>& candidates) {
  std::string match = closestMatch(given, candidates);
  return match.empty() ? "" : " (did you mean '" + match + "'?)";
}

int main(int argc, char** argv) {
  std::string first = argc < 2 ? "" : argv[1];
  if (argc < 2 || first == "--help" || first == "-h") {
    printUsage(argc < 2 ? std::cerr : std::cout);
    return argc < 2 ? 2 : 0;
  }
  if (first == "--version") {
    std::cout << "corvel " << CORVEL_VERSION << '\n';
    return 0;
  }
  if (first == "help") {
    if (argc < 3) {
      printUsage(std::cout);
      return 0;
    }
    auto it = commands().find(argv[2]);
    if (it == commands().end()) {
      return misuse("no command '" + std::string(argv[2]) + "'" +
                    didYouMean(argv[2], commandNames()));
    }
    printCommandHelp(it->second, std::cout);
    return 0;
  }
  auto it = commands().find(first);
  if (it == commands().end()) {
    return misuse("unknown command '" + first + "'" + didYouMean(first, commandNames()) +
                  "; corvel --help lists them");
  }
  const Command& command = it->second;
  Arguments args;
  bool verbose = false;
  for (int i = 2; i < argc; ++i) {
    std::string arg = argv[i];
    if (arg.size() < 2 || arg[0] != '-') {
      args.push_back(arg);
    } else if (arg == "--help" || arg == "-h") {
      printCommandHelp(command, std::cout);
      return 0;
    } else if (arg == "--verbose") {
      verbose = true;
    } else if (std::size_t equals = arg.find('=');
               arg.starts_with("--") && equals != std::string::npos) {
      std::string name = arg.substr(0, equals);
      if (std::find(command.flags.begin(), command.flags.end(), name) != command.flags.end()) {
        return misuse(first + ": " + name + " takes no value");
      }
      args.push_back(name);
      args.push_back(arg.substr(equals + 1));
    } else {
      args.push_back(arg);
    }
  }
  installLogSink(verbose);
  int status = command.run(args);
  MainQueue::drain();
  return status;
}

}  // namespace corvel::tool

int main(int argc, char** argv) { return corvel::tool::main(argc, argv); }
