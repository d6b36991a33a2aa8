// corvel ocr [--lang CODE]... [--fast] [--order rows|engine|layout] [--timeout SECONDS]
//            [--json] [--overlay OUT.png] FILE-OR-URL...
//
// Recognises each image and prints its text (a "==> FILE <==" header line before each
// when there are several), in the order --order names: rows (the default) is the
// engine's blocks and paragraphs with the rows of side-by-side short-line blocks kept
// together, which measured best on real pages (forms, receipts, tables, court papers
// and articles alike); engine is the engine's order alone; layout is the library's
// layout analysis, the order the library's jobs give by default. --timeout bounds each
// page's recognition (default: the recogniser's deadline, which grows with the page).
// With --json it prints one JSON object per line and file:
// {"file", "text", "blocks"} where "blocks" is the analysed column tree in the blocks'
// dictionary form. --overlay draws the page with its columns (blue), paragraphs (green)
// and lines (red) into OUT.png (OUT-1.png, OUT-2.png, ... for several files). All files
// go through the shared queue at once; a progress bar goes to standard error when it is
// a terminal. A file that fails gets its error on standard error and the others still
// complete; the exit status is then 1. Results are printed in the order of the files,
// each as soon as it and those before it are done. Ctrl-C prints what is finished,
// stops the rest and exits with 130; a second Ctrl-C exits at once.
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <iostream>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "Commands.h"
#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Image.h"
#include "JsonConversion.h"

namespace corvel::tool {

namespace {

using nlohmann::json;

struct Options {
  std::vector<std::string> languages;
  bool fast = false;
  RVReadingOrder order = RVReadingOrderRows;
  double timeout = 0;
  bool json = false;
  std::string overlay;
  std::vector<std::string> inputs;
};

struct Outcome {
  bool delivered = false;
  String text;
  std::optional<Error> error;
  std::shared_ptr<RVVisionOCR> job;
};

volatile sig_atomic_t interrupted = 0;

void onInterrupt(int) {
  if (interrupted) _exit(130);
  interrupted = 1;
}

bool isURL(const std::string& input) {
  return input.find("://") != std::string::npos || input.rfind("file:", 0) == 0;
}

std::shared_ptr<Image> imageFor(const std::string& input) {
  return isURL(input) ? Image::initByReferencingURL(input) : Image::initByReferencingFile(input);
}

std::string describe(const Error& error) {
  std::string reason = error.userInfoString("Error reason");
  return (reason.empty() ? error.description() : reason) + " (" + error.domain + " " +
         std::to_string(error.code) + ")";
}

// --- the overlay ----------------------------------------------------------------------

struct Colour {
  std::uint8_t r, g, b;
};

void strokeRect(Data& rgba, std::uint32_t width, std::uint32_t height, const Rect& box,
                Colour colour, int thickness) {
  auto clampX = [&](double v) {
    return static_cast<long>(std::clamp(v, 0.0, static_cast<double>(width) - 1));
  };
  auto clampY = [&](double v) {
    return static_cast<long>(std::clamp(v, 0.0, static_cast<double>(height) - 1));
  };
  if (!(box.size.width >= 0 && box.size.height >= 0)) return;  // also rejects NaN
  // Boxes are normalised with the origin at the bottom left; pixels count from the top.
  long left = clampX(box.origin.x * width), right = clampX((box.origin.x + box.size.width) * width);
  long top = clampY((1 - box.origin.y - box.size.height) * height);
  long bottom = clampY((1 - box.origin.y) * height);
  auto plot = [&](long x, long y) {
    if (x < 0 || y < 0 || x >= static_cast<long>(width) || y >= static_cast<long>(height)) return;
    std::uint8_t* p =
        &rgba[(static_cast<std::size_t>(y) * width + static_cast<std::size_t>(x)) * 4];
    p[0] = colour.r, p[1] = colour.g, p[2] = colour.b, p[3] = 255;
  };
  for (int t = 0; t < thickness; ++t) {
    for (long x = left - t; x <= right + t; ++x) plot(x, top - t), plot(x, bottom + t);
    for (long y = top - t; y <= bottom + t; ++y) plot(left - t, y), plot(right + t, y);
  }
}

void strokeTree(Data& rgba, std::uint32_t width, std::uint32_t height,
                const RVRecognitionBlock& block, int thickness) {
  static const Colour kColours[] = {{30, 90, 230}, {20, 160, 60}, {220, 40, 40}};
  for (const auto& child : block.children()) strokeTree(rgba, width, height, *child, thickness);
  auto level = std::min<std::uint64_t>(block.level(), 2);
  // Outer levels are drawn a little outside the inner ones so all three stay visible.
  int grow = static_cast<int>(2 - level) * thickness * 2;
  Rect box = block.boundingBox();
  double dx = static_cast<double>(grow) / width, dy = static_cast<double>(grow) / height;
  Rect grown(box.origin.x - dx, box.origin.y - dy, box.size.width + 2 * dx,
             box.size.height + 2 * dy);
  strokeRect(rgba, width, height, grown, kColours[level], thickness);
}

// Draws the analysed tree over the page; an error message, or "" on success.
std::string writeOverlay(const std::string& input, const RVBlockArray& columns,
                         const std::string& out) {
  auto page = imageFor(input)->bitmap();
  if (!page) return "cannot read the image again for the overlay";
  std::uint32_t width = page->width(), height = page->height();
  Data rgba = page->rgba();
  int thickness = static_cast<int>(std::max<std::uint32_t>(1, std::max(width, height) / 800));
  for (const auto& column : columns) strokeTree(rgba, width, height, *column, thickness);
  auto drawn = Bitmap::fromRGBA(width, height, rgba.data(), rgba.size());
  auto png = drawn ? pngDataForBitmap(*drawn) : std::nullopt;
  if (!png) return "cannot encode the overlay";
  if (!writeFileAtomically(out, *png)) return "cannot write " + out;
  return "";
}

std::string overlayName(const std::string& base, std::size_t index, std::size_t count) {
  if (count == 1) return base;
  std::size_t dot = base.rfind('.');
  std::size_t slash = base.rfind('/');
  if (dot == std::string::npos || (slash != std::string::npos && dot < slash)) dot = base.size();
  return base.substr(0, dot) + "-" + std::to_string(index + 1) + base.substr(dot);
}

// --- progress and output --------------------------------------------------------------

void showProgress(std::size_t done, std::size_t total) {
  constexpr int kWidth = 30;
  int filled = static_cast<int>(kWidth * done / std::max<std::size_t>(total, 1));
  std::cerr << "\r[" << std::string(static_cast<std::size_t>(filled), '#')
            << std::string(static_cast<std::size_t>(kWidth - filled), ' ') << "] " << done << "/"
            << total << (done == total ? "\r\033[K" : "") << std::flush;
}

bool report(const Options& options, std::size_t index, const Outcome& outcome) {
  const std::string& input = options.inputs[index];
  if (outcome.error) {
    std::cerr << "corvel: " << input << ": " << describe(*outcome.error) << '\n';
    return false;
  }
  auto columns = outcome.job->layoutAnalyser()->layoutBlocks();
  if (options.json) {
    json blocks = json::array();
    if (columns)
      for (const auto& column : *columns)
        blocks.push_back(jsonFromPropertyList(column->blockInformation()));
    std::cout << json{{"file", input}, {"text", toUTF8(outcome.text)}, {"blocks", blocks}}.dump()
              << '\n';
  } else {
    if (options.inputs.size() > 1) std::cout << (index ? "\n" : "") << "==> " << input << " <==\n";
    std::cout << toUTF8(outcome.text) << '\n';
  }
  std::cout.flush();
  if (!options.overlay.empty() && columns) {
    std::string failure =
        writeOverlay(input, *columns, overlayName(options.overlay, index, options.inputs.size()));
    if (!failure.empty()) {
      std::cerr << "corvel: " << input << ": " << failure << '\n';
      return false;
    }
  }
  return true;
}

int run(const Arguments& args) {
  Options options;
  for (std::size_t i = 0; i < args.size(); ++i) {
    const std::string& arg = args[i];
    if (arg == "--lang" || arg == "--overlay" || arg == "--order" || arg == "--timeout") {
      if (i + 1 >= args.size()) return misuse(arg + " needs a value");
      const std::string& value = args[++i];
      if (arg == "--lang") {
        options.languages.push_back(value);
      } else if (arg == "--overlay") {
        options.overlay = value;
      } else if (arg == "--order") {
        if (value == "rows") {
          options.order = RVReadingOrderRows;
        } else if (value == "engine") {
          options.order = RVReadingOrderEngine;
        } else if (value == "layout") {
          options.order = RVReadingOrderLayoutAnalysis;
        } else {
          return misuse("--order takes rows, engine or layout, not " + value);
        }
      } else {
        char* end = nullptr;
        options.timeout = std::strtod(value.c_str(), &end);
        if (value.empty() || *end != '\0' || !(options.timeout > 0)) {
          return misuse("--timeout takes a number of seconds above 0, not " + value);
        }
      }
    } else if (arg == "--fast") {
      options.fast = true;
    } else if (arg == "--json") {
      options.json = true;
    } else if (arg.size() > 1 && arg[0] == '-') {
      return misuse("unknown option " + arg);
    } else {
      options.inputs.push_back(arg);
    }
  }
  if (options.inputs.empty()) return misuse("ocr needs at least one image file or file: URL");

  std::vector<Outcome> outcomes(options.inputs.size());
  for (std::size_t i = 0; i < options.inputs.size(); ++i) {
    Outcome* outcome = &outcomes[i];
    outcome->job = RVVisionOCR::init();
    outcome->job->setReadingOrder(options.order);
    outcome->job->setTimeout(options.timeout);
    outcome->job->startOcrImage(imageFor(options.inputs[i]), options.languages, options.fast,
                                [outcome](const String& text, const std::optional<Error>& error) {
                                  outcome->delivered = true;
                                  outcome->text = text;
                                  outcome->error = error;
                                });
  }
  // Results are printed in the order of the inputs, each as soon as it and all before it
  // are in; the completions arrive on this thread, through the main queue.
  bool progress = isatty(STDERR_FILENO) && options.inputs.size() > 1;
  std::size_t printed = 0, delivered = 0;
  bool allGood = true;
  auto advance = [&] {
    std::size_t now = static_cast<std::size_t>(std::count_if(
        outcomes.begin(), outcomes.end(), [](const Outcome& o) { return o.delivered; }));
    if (progress && now != delivered) showProgress(now, outcomes.size());
    delivered = now;
    while (printed < outcomes.size() && outcomes[printed].delivered) {
      if (progress) std::cerr << "\r\033[K";
      allGood = report(options, printed, outcomes[printed]) && allGood;
      ++printed;
      if (progress && printed < outcomes.size()) showProgress(delivered, outcomes.size());
    }
    return printed == outcomes.size();
  };
  if (progress) showProgress(0, outcomes.size());
  struct sigaction action {};
  action.sa_handler = onInterrupt;
  sigemptyset(&action.sa_mask);
  struct sigaction previous {};
  sigaction(SIGINT, &action, &previous);
  MainQueue::runUntil([&] { return advance() || interrupted; });
  sigaction(SIGINT, &previous, nullptr);
  if (printed == outcomes.size()) return allGood ? 0 : 1;

  // Interrupted: what is finished is printed, in order; the rest is stopped.
  if (progress) std::cerr << "\r\033[K";
  for (std::size_t i = printed; i < outcomes.size(); ++i) {
    if (outcomes[i].delivered) {
      report(options, i, outcomes[i]);
    } else {
      outcomes[i].job->stopOCRJob();
      std::cerr << "corvel: " << options.inputs[i] << ": interrupted before it was read\n";
    }
  }
  std::cout.flush();
  std::cerr.flush();
  // Recognitions still winding down on the queue's threads are not waited for.
  std::_Exit(130);
}

CommandRegistration reg(
    "ocr",
    "ocr [--lang CODE]... [--fast] [--order rows|engine|layout] "
    "[--timeout SECONDS] [--json] [--overlay OUT.png] FILE-OR-URL... "
    ": recognise the text of images; --order rows (the default, best measured on "
    "real pages: keeps the rows of forms, receipts and tables together), engine "
    "(the engine's blocks and paragraphs) or layout (the library's analysis)",
    &run);

}  // namespace

}  // namespace corvel::tool
