// The engine, the language catalogue and the layout analysis for Python, and the
// conversions of results (block trees with their words, errors) the jobs share.
#include <pybind11/stl.h>

#include <algorithm>
#include <unordered_map>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "Glue.h"

namespace corvel::python {

namespace {

// The words of a page's lines. Each recognised line belongs to the line block made of
// it: the block with its box and text or, where the layout analysis joined lines side by
// side into one, the smallest line block whose box holds the line's centre.
class LineWords {
 public:
  LineWords(const RVBlockArray& tree, const std::vector<RecognizedTextObservation>& observations) {
    std::vector<const RVRecognitionBlock*> leaves;
    collectLines(tree, leaves);
    for (const auto& observation : observations) {
      if (observation.candidates.empty()) continue;
      const Rect& box = observation.boundingBox;
      double x = box.origin.x + box.size.width / 2, y = box.origin.y + box.size.height / 2;
      const RVRecognitionBlock* home = nullptr;
      double smallest = 0;
      for (const auto* leaf : leaves) {
        Rect area = leaf->boundingBox();
        if (area == box && leaf->text() == observation.candidates.front().string) {
          home = leaf;
          break;
        }
        double size = area.size.width * area.size.height;
        if (x >= rectGetMinX(area) && x <= rectGetMaxX(area) && y >= rectGetMinY(area) &&
            y <= rectGetMaxY(area) && (!home || size < smallest)) {
          home = leaf;
          smallest = size;
        }
      }
      if (home) lines_[home].push_back(&observation);
    }
    for (auto& [line, parts] : lines_) {
      std::stable_sort(parts.begin(), parts.end(), [](const auto* a, const auto* b) {
        return a->boundingBox.origin.x < b->boundingBox.origin.x;
      });
    }
  }

  // The words of a line block, left to right: its own, or those of the lines it is made
  // of (a row of cells).
  void add(const RVRecognitionBlock& line, py::list& words) const {
    if (hasLines(line)) {
      for (const auto& child : line.children())
        if (child) add(*child, words);
      return;
    }
    auto found = lines_.find(&line);
    if (found == lines_.end()) return;
    for (const auto* observation : found->second) {
      const auto& best = observation->candidates.front();
      // An engine that does not tell words apart gives the line as one word.
      if (observation->words.empty()) {
        words.append(py::make_tuple(fromString(best.string), boxTuple(observation->boundingBox),
                                    static_cast<double>(best.confidence) * 100));
      }
      for (const auto& word : observation->words) {
        words.append(py::make_tuple(fromString(word.string), boxTuple(word.boundingBox),
                                    static_cast<double>(word.confidence) * 100));
      }
    }
  }

 private:
  static bool hasLines(const RVRecognitionBlock& block) {
    const auto& children = block.children();
    return std::any_of(children.begin(), children.end(), [](const auto& child) {
      return child && child->level() == RVRecognitionBlockLevelLine;
    });
  }
  static void collectLines(const RVBlockArray& blocks,
                           std::vector<const RVRecognitionBlock*>& leaves) {
    for (const auto& block : blocks) {
      if (!block) continue;
      if (block->level() == RVRecognitionBlockLevelLine && !hasLines(*block)) {
        leaves.push_back(block.get());
      } else {
        collectLines(block->children(), leaves);
      }
    }
  }

  std::unordered_map<const RVRecognitionBlock*, std::vector<const RecognizedTextObservation*>>
      lines_;
};

py::tuple blockTuple(const RVRecognitionBlock& block, const LineWords* lineWords) {
  const auto& children = block.children();
  py::tuple kids(children.size());
  for (std::size_t i = 0; i < children.size(); ++i) kids[i] = blockTuple(*children[i], lineWords);
  py::list words;
  if (lineWords && block.level() == RVRecognitionBlockLevelLine) lineWords->add(block, words);
  return py::make_tuple(fromString(block.text().value_or(String())), boxTuple(block.boundingBox()),
                        block.confidence(), static_cast<std::uint64_t>(block.level()), kids,
                        py::tuple(words));
}

// Property-list values as Python values (catalogue entries and the like).
py::object toPython(const PropertyList& value) {
  return std::visit(
      [](const auto& v) -> py::object {
        using T = std::decay_t<decltype(v)>;
        if constexpr (std::is_same_v<T, std::monostate>) {
          return py::none();
        } else if constexpr (std::is_same_v<T, String>) {
          return fromString(v);
        } else if constexpr (std::is_same_v<T, Data>) {
          return py::bytes(reinterpret_cast<const char*>(v.data()), v.size());
        } else if constexpr (std::is_same_v<T, PropertyList::Array>) {
          py::list out;
          for (const auto& item : v) out.append(toPython(item));
          return out;
        } else if constexpr (std::is_same_v<T, PropertyList::Dictionary>) {
          py::dict out;
          for (const auto& [key, item] : v) out[py::str(key)] = toPython(item);
          return out;
        } else if constexpr (std::is_same_v<T, PropertyList::Uid>) {
          return py::int_(v.value);
        } else if constexpr (std::is_same_v<T, PropertyList::Date>) {
          return py::float_(v.secondsSinceReferenceDate);
        } else {
          return py::cast(v);
        }
      },
      value.value());
}

std::shared_ptr<TesseractRecognizer> tesseract() {
  return std::dynamic_pointer_cast<TesseractRecognizer>(PlatformRegistry::textRecognizer());
}

}  // namespace

py::tuple boxTuple(const Rect& box) {
  return py::make_tuple(box.origin.x, box.origin.y, box.size.width, box.size.height);
}

py::tuple treeTuple(const std::shared_ptr<RVBlockArray>& blocks,
                    const std::vector<RecognizedTextObservation>* observations) {
  if (!blocks) return py::tuple();
  std::optional<LineWords> words;
  if (observations) words.emplace(*blocks, *observations);
  py::tuple out(blocks->size());
  for (std::size_t i = 0; i < blocks->size(); ++i)
    out[i] = blockTuple(*(*blocks)[i], words ? &*words : nullptr);
  return out;
}

py::object errorTuple(const std::optional<Error>& error) {
  if (!error) return py::none();
  return py::make_tuple(error->domain, error->code, error->userInfoString("Error reason"),
                        error->description());
}

Data bytesOf(py::handle buffer) {
  Py_buffer view;
  if (PyObject_GetBuffer(buffer.ptr(), &view, PyBUF_SIMPLE) != 0) throw py::error_already_set();
  const auto* begin = static_cast<const std::uint8_t*>(view.buf);
  Data bytes;
  {
    py::gil_scoped_release release;
    bytes.assign(begin, begin + view.len);
  }
  PyBuffer_Release(&view);
  return bytes;
}

void bindOcr(py::module_& m) {
  m.attr("RECOGNITION_DOMAIN") = TextRecognitionErrorDomain;
  m.attr("OCR_DOMAIN") = RVVisionOCRErrorDomain;
  m.attr("ERROR_IMAGE_UNREADABLE") = static_cast<int>(TextRecognitionErrorImageUnreadable);
  m.attr("ERROR_UNSUPPORTED_LANGUAGE") = static_cast<int>(TextRecognitionErrorUnsupportedLanguage);
  m.attr("ERROR_ENGINE_FAILURE") = static_cast<int>(TextRecognitionErrorEngineFailure);
  m.attr("ERROR_NO_RECOGNIZER") = static_cast<int>(TextRecognitionErrorNoRecognizer);
  m.attr("ERROR_TIMED_OUT") = static_cast<int>(TextRecognitionErrorTimedOut);
  m.attr("ERROR_CANCELLED") = static_cast<int>(TextRecognitionErrorCancelled);
  m.attr("ERROR_UNSUPPORTED_SYSTEM") = RVVisionOCRErrorUnsupported;
  m.attr("READING_ORDER_LAYOUT") = static_cast<int>(RVReadingOrderLayoutAnalysis);
  m.attr("READING_ORDER_ENGINE") = static_cast<int>(RVReadingOrderEngine);
  m.attr("READING_ORDER_ROWS") = static_cast<int>(RVReadingOrderRows);

  m.def("configure_engine",
        [](const std::string& dataPath, unsigned concurrency, std::uint64_t idleModelBytes,
           std::uint32_t fastMaxLongSide, double secondsPerMegapixel, double minTimeout) {
          TesseractRecognizer::Options options;
          options.dataPath = dataPath;
          options.maxConcurrentRecognitions = concurrency;
          if (idleModelBytes) options.maxIdleModelBytes = idleModelBytes;
          if (fastMaxLongSide) options.fastMaxLongSide = fastMaxLongSide;
          if (secondsPerMegapixel > 0) options.timeoutSecondsPerMegapixel = secondsPerMegapixel;
          if (minTimeout > 0) options.minTimeoutSeconds = minTimeout;
          py::gil_scoped_release release;
          PlatformRegistry::setTextRecognizer(TesseractRecognizer::init(options));
        });
  m.def(
      "release_idle_engines",
      [] {
        if (auto engine = tesseract()) engine->releaseIdleEngines();
      },
      py::call_guard<py::gil_scoped_release>());

  m.def("all_languages", [] { return toPython(PropertyList(RVVisionOCR::allVisionLanguages())); });
  m.def("supported_languages", [](std::int64_t level) -> py::object {
    std::optional<std::vector<PropertyList>> entries;
    {
      py::gil_scoped_release release;
      entries = RVVisionOCR::supportedLanguages(level);
    }
    if (!entries) return py::none();
    return toPython(PropertyList(PropertyList::Array(entries->begin(), entries->end())));
  });
  m.def("is_language_combination_valid", &RVVisionOCR::isLanguageCombinationValid);
  m.def("supports_fast_recognition", &RVVisionOCR::supportFastRecognition);
  m.def("order_language_codes", [](const std::vector<std::string>& codes) {
    return RVVisionOCR::init()->orderLanguageCodes(codes);
  });

  // Lines are (text, (x, y, width, height), confidence) in normalised page units with
  // the origin at the bottom left; the answer is (text, column tree).
  m.def("analyse_layout", [](const py::iterable& lines) {
    auto analyser = RVTextLayoutAnalyser::init();
    for (py::handle line : lines) {
      auto item = line.cast<py::tuple>();
      if (item.size() != 3) throw py::value_error("a line is (text, box, confidence)");
      auto box = item[1].cast<std::vector<double>>();
      if (box.size() != 4) throw py::value_error("a box is (x, y, width, height)");
      analyser->addRecognitionBlock(
          RVRecognitionBlock::initWithText(toString(item[0]), Rect(box[0], box[1], box[2], box[3]),
                                           item[2].cast<double>(), RVRecognitionBlockLevelLine));
    }
    String text;
    {
      py::gil_scoped_release release;
      analyser->analyse(Size{}, RVWritingDirectionHorizontal);
      text = analyser->text();
    }
    return py::make_tuple(fromString(text), treeTuple(analyser->layoutBlocks()));
  });

  m.def("write_file_atomically", [](const std::string& path, py::handle data) {
    Data bytes = bytesOf(data);
    py::gil_scoped_release release;
    return writeFileAtomically(path, bytes);
  });
}

}  // namespace corvel::python
