// corvel: the library's jobs on the command line.
#include <unistd.h>

#include <iostream>
#include <map>
#include <string>
#include <thread>

#include "Commands.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"

namespace corvel::tool {

namespace {

struct Command {
  const char* usage;
  CommandFunction run;
};

std::map<std::string, Command>& commands() {
  static std::map<std::string, Command> table;
  return table;
}

void printUsage(std::ostream& out) {
  out << "usage: corvel COMMAND [ARGS...]\n\ncommands:\n";
  for (const auto& [name, command] : commands()) out << "  " << command.usage << '\n';
}

// One line of the library's log, written at once; on a terminal the line is cleared
// first, since a progress bar may stand on it (the bar is drawn again on its next step).
void printLogLine(const std::string& line) {
  std::string text = (isatty(STDERR_FILENO) ? "\r\033[K" : "") + line + "\n";
  std::cerr << text << std::flush;
}

// The library logs from its worker threads (an OCR job's "Error: ..."), while this
// program writes its own messages and progress bar from the main thread, piece by piece.
// Log lines are therefore handed to the main thread, which writes them between its own
// writes, never inside one; the commands that run jobs drain the main queue until the
// jobs are done, and main() drains what is left once the jobs' workers are through.
void installLogSink() {
  static const std::thread::id mainThread = std::this_thread::get_id();
  PlatformRegistry::setLogSink([](std::string_view line) {
    std::string text(line);
    if (std::this_thread::get_id() == mainThread) return printLogLine(text);
    MainQueue::async([text] { printLogLine(text); });
  });
}

}  // namespace

CommandRegistration::CommandRegistration(const char* name, const char* usage, CommandFunction run) {
  commands()[name] = Command{usage, run};
}

int misuse(const std::string& message) {
  std::cerr << "corvel: " << message << '\n';
  return 2;
}

int main(int argc, char** argv) {
  std::string first = argc < 2 ? "" : argv[1];
  if (argc < 2 || first == "--help" || first == "-h") {
    printUsage(argc < 2 ? std::cerr : std::cout);
    return argc < 2 ? 2 : 0;
  }
  auto it = commands().find(first);
  if (it == commands().end()) {
    printUsage(std::cerr);
    return misuse("unknown command '" + first + "'");
  }
  installLogSink();
  int status = it->second.run(Arguments(argv + 2, argv + argc));
  // An OCR job's worker logs its failure after handing its completion to the main queue:
  // let the jobs' operations end, so that every log line is queued before the last drain.
  if (first == "ocr") RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  MainQueue::drain();
  return status;
}

}  // namespace corvel::tool

int main(int argc, char** argv) { return corvel::tool::main(argc, argv); }
