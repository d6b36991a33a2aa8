// corvel ocr [--lang CODE]... [--fast] [--order rows|engine|layout] [--timeout SECONDS]
//            [--force-ocr] [-o OUT] [--format txt|json|hocr|alto|tsv|pdf]
//            [--overlay OUT.png] FILE-OR-URL-OR-...
//
// Recognises every page of each input (an image, a multi-page TIFF, a PDF, a `file:` URL,
// or "-" for standard input) and writes the results in one format: to standard output,
// or to OUT (written whole, atomically; "-o -" is standard output). The format is
// --format's, else OUT's extension's, else text. A searchable PDF is one file per input
// (OUT, or OUT-1.pdf, OUT-2.pdf, ... for several). Reading order: rows (the default) is
// the engine's blocks and paragraphs with the rows of side-by-side short-line blocks
// kept together, which measured best on real pages; engine is the engine's order alone;
// layout is the library's layout analysis. --timeout bounds each page's recognition.
// A PDF page that already has text is reported and kept as it is unless --force-ocr.
// --overlay draws each page with its columns (blue), paragraphs (green, numbered in
// reading order) and lines (red), and a legend, into OUT.png (OUT-1.png, ... for several
// pages). All pages go through the shared queue at once; a progress bar counts pages on
// standard error when it is a terminal. A file or page that fails gets one
// "corvel: FILE: reason" line and the others still complete. Results come in the order
// of the inputs, each as soon as it and those before it are done. Ctrl-C stops the
// rest, writes what is finished and exits with 130; a second Ctrl-C exits at once.
// Exit status: 0 when text was found; 1 when some input or page failed or nothing was
// found (blank pages); 2 on misuse or when no input could be read.
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <sstream>
#include <string>
#include <vector>

#include "Corvelbase/RVDocumentOCR.h"
#include "Corvelbase/RVDocumentOutput.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "tools/corvel/Commands.h"
#include "tools/corvel/Overlay.h"

namespace corvel::tool {

namespace {

struct Options {
  std::vector<std::string> languages;
  bool fast = false;
  bool forceOCR = false;
  RVReadingOrder order = RVReadingOrderRows;
  double timeout = 0;
  std::optional<RVDocumentFormat> format;
  std::string output;  // "" or "-": standard output
  std::string overlay;
  std::vector<std::string> inputs;
};

struct Input {
  std::string name;  // as given
  std::shared_ptr<RVDocumentOCR> job;
  RVDocumentResult result;
  bool done = false;
};

volatile sig_atomic_t interrupted = 0;

void onInterrupt(int) {
  if (interrupted) _exit(130);
  interrupted = 1;
}

std::string reasonOf(const Error& error) {
  std::string reason = error.userInfoString("Error reason");
  return reason.empty() ? error.description() : reason;
}

// --- languages --------------------------------------------------------------------------

// The catalogue key a user's code names: a catalogue code ("fr-FR", any case), the
// engine's model name ("fra") or the language alone ("fr") when one entry has it.
std::optional<std::string> catalogueCode(const std::string& given, std::string* ambiguous) {
  auto lower = [](std::string s) {
    std::transform(s.begin(), s.end(), s.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return s;
  };
  std::string wanted = lower(given);
  std::vector<std::string> byLanguage, byModel;
  for (const auto& [key, entry] : RVVisionOCR::allVisionLanguages()) {
    if (lower(key) == wanted) return key;
    // Two entries share the Chinese models; the one that is its own code comes first.
    if (TesseractRecognizer::modelForLanguageCode(key) == wanted) {
      const PropertyList* iso = entry.find(RVVisionLanguageIsoCodeKey);
      bool own = iso && iso->string() && toUTF8(*iso->string()) == key;
      byModel.insert(own ? byModel.begin() : byModel.end(), key);
    }
    if (lower(key.substr(0, key.find('-'))) == wanted) byLanguage.push_back(key);
  }
  if (!byModel.empty()) return byModel.front();
  if (byLanguage.size() == 1) return byLanguage[0];
  if (byLanguage.size() > 1) {
    for (const auto& key : byLanguage) *ambiguous += (ambiguous->empty() ? "" : ", ") + key;
  }
  return std::nullopt;
}

std::string languageList() {
  std::string list;
  for (const auto& [key, entry] : RVVisionOCR::allVisionLanguages()) {
    list += (list.empty() ? "" : ", ") + key + " (" +
            TesseractRecognizer::modelForLanguageCode(key) + ")";
  }
  return list;
}

// --- arguments --------------------------------------------------------------------------

const std::vector<std::string> kValueOptions = {"--lang",   "--order", "--timeout", "--format",
                                                "--output", "-o",      "--overlay"};
const std::vector<std::string> kFlags = {"--fast", "--json", "--force-ocr"};

std::optional<int> parse(const Arguments& args, Options& options) {
  bool json = false;
  for (std::size_t i = 0; i < args.size(); ++i) {
    const std::string& arg = args[i];
    bool takesValue =
        std::find(kValueOptions.begin(), kValueOptions.end(), arg) != kValueOptions.end();
    if (takesValue) {
      if (i + 1 >= args.size()) return misuse("ocr: " + arg + " needs a value");
      const std::string& value = args[++i];
      if (arg == "--lang") {
        std::string ambiguous;
        auto code = catalogueCode(value, &ambiguous);
        if (!code) {
          return misuse("ocr: --lang " + value +
                        (ambiguous.empty() ? " is not a recognition language"
                                           : " could be " + ambiguous + "; say which") +
                        "; the languages are " + languageList());
        }
        options.languages.push_back(*code);
      } else if (arg == "--overlay") {
        options.overlay = value;
      } else if (arg == "--output" || arg == "-o") {
        options.output = value;
      } else if (arg == "--format") {
        options.format = documentFormatNamed(value);
        if (!options.format) {
          return misuse("ocr: --format takes " + documentFormatNames() + ", not " + value);
        }
      } else if (arg == "--order") {
        if (value == "rows") {
          options.order = RVReadingOrderRows;
        } else if (value == "engine") {
          options.order = RVReadingOrderEngine;
        } else if (value == "layout") {
          options.order = RVReadingOrderLayoutAnalysis;
        } else {
          return misuse("ocr: --order takes rows, engine or layout, not " + value);
        }
      } else {
        char* end = nullptr;
        options.timeout = std::strtod(value.c_str(), &end);
        if (value.empty() || *end != '\0' || !(options.timeout > 0)) {
          return misuse("ocr: --timeout takes a number of seconds above 0, not " + value);
        }
      }
    } else if (arg == "--fast") {
      options.fast = true;
    } else if (arg == "--force-ocr") {
      options.forceOCR = true;
    } else if (arg == "--json") {
      json = true;
    } else if (arg.size() > 1 && arg[0] == '-') {
      std::vector<std::string> known = kValueOptions;
      known.insert(known.end(), kFlags.begin(), kFlags.end());
      return misuse("ocr: unknown option " + arg + didYouMean(arg, known));
    } else {
      options.inputs.push_back(arg);
    }
  }
  if (options.inputs.empty())
    return misuse("ocr: give at least one file, file: URL or - (standard input)");
  if (std::count(options.inputs.begin(), options.inputs.end(), "-") > 1) {
    return misuse("ocr: standard input (-) can be read once");
  }
  if (json) {
    if (options.format && *options.format != RVDocumentFormat::JSON) {
      return misuse("ocr: --json and --format " + args.back() + " contradict each other");
    }
    options.format = RVDocumentFormat::JSON;
  }
  if (!options.format && !options.output.empty() && options.output != "-") {
    options.format = documentFormatForPath(options.output);
    if (!options.format) {
      return misuse("ocr: cannot tell the format from " + options.output + "; add --format " +
                    documentFormatNames());
    }
  }
  if (options.format == RVDocumentFormat::PDF) {
    if (options.output.empty())
      return misuse("ocr: a PDF goes to a file: add -o OUT.pdf (or -o -)");
    if (options.output == "-" && options.inputs.size() > 1) {
      return misuse("ocr: one PDF per input; -o - takes one input");
    }
  }
  return std::nullopt;
}

// --- inputs -----------------------------------------------------------------------------

// The path of a `file:` URL, or "" when it is no such URL.
std::string pathOfFileURL(const std::string& url) {
  std::string rest;
  for (const char* prefix : {"file://localhost/", "file:///", "file:/"}) {
    if (url.rfind(prefix, 0) == 0) {
      rest = "/" + url.substr(std::string(prefix).size());
      break;
    }
  }
  std::string path;
  for (std::size_t i = 0; i < rest.size(); ++i) {
    if (rest[i] == '%' && i + 2 < rest.size() &&
        std::isxdigit(static_cast<unsigned char>(rest[i + 1])) &&
        std::isxdigit(static_cast<unsigned char>(rest[i + 2]))) {
      path += static_cast<char>(std::stoi(rest.substr(i + 1, 2), nullptr, 16));
      i += 2;
    } else {
      path += rest[i];
    }
  }
  return path;
}

// Standard input kept in a temporary file: documents are read page by page, more than
// once (for the PDF output), which a pipe does not allow.
class SpooledInput {
 public:
  ~SpooledInput() {
    if (!path_.empty()) std::remove(path_.c_str());
  }
  // The file's path, or "" (with *error) when standard input cannot be kept.
  std::string spool(std::string* error) {
    const char* dir = std::getenv("TMPDIR");
    std::string pattern = std::string(dir && *dir ? dir : "/tmp") + "/corvel-stdin-XXXXXX";
    int fd = mkstemp(pattern.data());
    if (fd < 0) {
      *error = "cannot make a temporary file for standard input";
      return "";
    }
    path_ = pattern;
    char buffer[1 << 16];
    for (ssize_t n; (n = read(STDIN_FILENO, buffer, sizeof buffer)) != 0;) {
      if (n < 0 && errno == EINTR) continue;
      if (n < 0 || write(fd, buffer, static_cast<std::size_t>(n)) != n) {
        close(fd);
        *error = "cannot read standard input";
        return "";
      }
    }
    close(fd);
    return path_;
  }

 private:
  std::string path_;
};

std::string numberedName(const std::string& base, std::size_t index, std::size_t count) {
  if (count == 1) return base;
  std::string extension = pathExtension(base);
  return deletingPathExtension(base) + "-" + std::to_string(index + 1) +
         (extension.empty() ? "" : "." + extension);
}

// --- progress ---------------------------------------------------------------------------

void showProgress(std::size_t done, std::size_t total) {
  constexpr int kWidth = 30;
  int filled = static_cast<int>(kWidth * done / std::max<std::size_t>(total, 1));
  std::cerr << "\r[" << std::string(static_cast<std::size_t>(filled), '#')
            << std::string(static_cast<std::size_t>(kWidth - filled), ' ') << "] " << done << "/"
            << total << " pages" << std::flush;
}

int run(const Arguments& args) {
  Options options;
  if (auto status = parse(args, options)) return *status;
  RVDocumentFormat format = options.format.value_or(RVDocumentFormat::Text);

  SpooledInput spooled;
  std::vector<Input> inputs(options.inputs.size());
  std::size_t opened = 0, totalPages = 0;
  bool allGood = true;
  for (std::size_t i = 0; i < inputs.size(); ++i) {
    Input& input = inputs[i];
    input.name = options.inputs[i];
    input.result.name = input.name;
    std::string path = input.name, failure;
    if (path == "-") {
      path = spooled.spool(&failure);
    } else if (path.find("://") != std::string::npos || path.rfind("file:", 0) == 0) {
      path = pathOfFileURL(path);
      if (path.empty()) failure = "only file: URLs can be read";
    }
    Error error;
    auto document = failure.empty() ? Document::initWithFile(path, &error) : nullptr;
    if (!document) {
      if (failure.empty()) failure = reasonOf(error);
      std::cerr << "corvel: " << input.name << ": cannot be read: " << failure << '\n';
      input.result.error =
          failure.empty() ? error : makeDocumentError(DocumentErrorUnreadable, failure);
      input.done = true;
      allGood = false;
      continue;
    }
    ++opened;
    totalPages += document->pageCount();
    input.job = RVDocumentOCR::init();
    input.job->setReadingOrder(options.order);
    input.job->setTimeout(options.timeout);
    input.job->setForceOCR(options.forceOCR);
    input.job->startOcrDocument(
        document, options.languages, options.fast,
        [&input](const RVDocumentPage& page) { input.result.pages.push_back(page); },
        [&input](const std::optional<Error>& error) {
          if (error && error->code != TextRecognitionErrorCancelled) input.result.error = error;
          input.done = true;
        });
  }
  if (opened == 0) return 2;

  // Stream formats go to standard output as they come, or to OUT once all is done.
  bool toStdout = options.output.empty() || options.output == "-";
  std::ostringstream buffered;
  std::ostream& out = toStdout ? std::cout : buffered;
  auto writer = format == RVDocumentFormat::PDF
                    ? nullptr
                    : RVDocumentWriter::init(format, out, inputs.size());
  bool progress = isatty(STDERR_FILENO) && totalPages > 1;
  bool foundText = false;
  std::size_t overlays = 0, shownPages = SIZE_MAX, shownLogLines = 0;
  auto finish = [&](Input& input) {
    for (const auto& page : input.result.pages) {
      if (page.error) {
        allGood = false;
        bool stopped = page.error->code == TextRecognitionErrorCancelled;
        std::cerr << "corvel: " << input.name << ": page " << page.index + 1 << ": "
                  << (stopped ? "interrupted before it was read" : reasonOf(*page.error)) << '\n';
      } else if (page.hasOwnText) {
        std::cerr << "corvel: " << input.name << ": page " << page.index + 1
                  << " has text already; kept as it is (--force-ocr reads it)\n";
      }
      if (!page.error && !page.text.empty()) foundText = true;
    }
    if (writer) writer->add(input.result);
    if (!input.job) return;  // it could not be opened, and said so then
    if (input.result.error) {
      allGood = false;
      std::cerr << "corvel: " << input.name << ": " << reasonOf(*input.result.error) << '\n';
    }
    if (format == RVDocumentFormat::PDF) {
      Error error;
      // Named by the input's place among all given, read or not.
      auto index = static_cast<std::size_t>(&input - inputs.data());
      std::string name = numberedName(options.output, index, inputs.size());
      if (!writeSearchablePdf(*input.job->document(), input.result, name, &error)) {
        allGood = false;
        std::cerr << "corvel: " << input.name << ": " << reasonOf(error) << '\n';
      }
    }
    if (!options.overlay.empty()) {
      for (const auto& page : input.result.pages) {
        if (!page.layoutBlocks) continue;
        Error error;
        auto picture = input.job->document()->renderPage(page.index, &error, nullptr);
        std::string failure =
            picture ? writeOverlay(*picture, *page.layoutBlocks,
                                   numberedName(options.overlay, overlays++, totalPages))
                    : reasonOf(error);
        if (!failure.empty()) {
          allGood = false;
          std::cerr << "corvel: " << input.name << ": overlay: " << failure << '\n';
        }
      }
    }
  };
  std::size_t next = 0;
  auto advance = [&] {
    if (progress) {
      std::size_t pages = 0;
      for (const auto& input : inputs) pages += input.job ? input.job->pagesDelivered() : 0;
      if (pages != shownPages || logLinesWritten() != shownLogLines) {
        showProgress(shownPages = pages, totalPages);
        shownLogLines = logLinesWritten();
      }
    }
    while (next < inputs.size() && inputs[next].done) {
      if (progress) std::cerr << "\r\033[K";
      finish(inputs[next++]);
      shownPages = SIZE_MAX;
    }
    return next == inputs.size();
  };
  struct sigaction action {};
  action.sa_handler = onInterrupt;
  sigemptyset(&action.sa_mask);
  struct sigaction previous {};
  sigaction(SIGINT, &action, &previous);
  MainQueue::runUntil([&] { return advance() || interrupted; });
  if (interrupted) {
    // What is finished stays; the rest is stopped, and its pages come back cancelled.
    for (auto& input : inputs)
      if (input.job) input.job->cancel();
    MainQueue::runUntil([&] { return advance(); });
  }
  sigaction(SIGINT, &previous, nullptr);
  // A job's worker logs its failure after handing the completion to the main queue: let
  // the workers end, so that every log line is written before the bar is cleared.
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  MainQueue::drain();
  if (progress) std::cerr << "\r\033[K" << std::flush;
  if (writer) writer->end();
  if (writer && !toStdout) {
    std::string bytes = buffered.str();
    if (!writeFileAtomically(options.output, reinterpret_cast<const std::uint8_t*>(bytes.data()),
                             bytes.size())) {
      std::cerr << "corvel: cannot write " << options.output << '\n';
      return interrupted ? 130 : 2;
    }
  }
  std::cout.flush();
  if (interrupted) return 130;
  return allGood && foundText ? 0 : 1;
}

CommandRegistration reg(
    "ocr",
    "ocr [--lang CODE]... [--fast] [--order rows|engine|layout] [--timeout SECONDS] "
    "[--force-ocr] [-o OUT] [--format txt|json|hocr|alto|tsv|pdf] [--overlay OUT.png] "
    "FILE-OR-URL-OR-... : recognise every page of images, multi-page TIFFs and PDFs (- reads "
    "standard input); -o writes OUT (the format follows its extension), pdf makes a "
    "searchable PDF; --lang takes fr-FR, fra or fr",
    &run, "--fast --json --force-ocr");

}  // namespace

}  // namespace corvel::tool
