// Recognition jobs for Python: starting them on the shared queue with the GIL released,
// delivering their results to a Python callback, stopping them, and the engine, the
// language catalogue and the layout analysis around them.
//
// Delivery. A job's completion goes to the main queue. Unless the host installed a
// dispatcher of its own, that is the library's internal queue, which a thread of this
// module drains: it takes the GIL for each completion and calls the job's callback with
// (text, page size, column tree, error). A job that is cancelled before it starts never
// calls back; its callback is dropped with the job.
#include <pybind11/stl.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <list>
#include <thread>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "Glue.h"

namespace corvel::python {

namespace {

// What a job's completion needs; emptied once it has run.
struct Pending {
  explicit Pending(py::object callback) : callback(std::move(callback)) {}
  Reference callback;
  std::mutex mutex;
  std::shared_ptr<Image> image;  // for the page size; dropped at delivery
  std::weak_ptr<RVVisionOCR> job;
};

// Live jobs, so that exit can stop them.
std::mutex liveMutex;
std::list<std::weak_ptr<RVVisionOCR>>& liveJobs() {
  static auto* jobs = new std::list<std::weak_ptr<RVVisionOCR>>;
  return *jobs;
}

void track(const std::shared_ptr<RVVisionOCR>& job) {
  std::lock_guard lock(liveMutex);
  auto& jobs = liveJobs();
  jobs.remove_if([](const std::weak_ptr<RVVisionOCR>& j) { return j.expired(); });
  jobs.push_back(job);
}

// The thread that drains the internal main queue, started with the first job.
std::atomic<bool> deliveryStopping{false};
std::once_flag deliveryStarted;
std::thread* deliveryThread = nullptr;

void startDelivery() {
  std::call_once(deliveryStarted, [] {
    deliveryThread =
        new std::thread([] { MainQueue::runUntil([] { return deliveryStopping.load(); }); });
  });
}

py::tuple boxTuple(const Rect& box) {
  return py::make_tuple(box.origin.x, box.origin.y, box.size.width, box.size.height);
}

// (text, (x, y, width, height), confidence, level, children) for a block and its tree.
py::tuple blockTuple(const RVRecognitionBlock& block) {
  const auto& children = block.children();
  py::tuple kids(children.size());
  for (std::size_t i = 0; i < children.size(); ++i) kids[i] = blockTuple(*children[i]);
  return py::make_tuple(fromString(block.text().value_or(String())), boxTuple(block.boundingBox()),
                        block.confidence(), static_cast<std::uint64_t>(block.level()), kids);
}

py::tuple treeTuple(const std::shared_ptr<RVBlockArray>& blocks) {
  if (!blocks) return py::tuple();
  py::tuple out(blocks->size());
  for (std::size_t i = 0; i < blocks->size(); ++i) out[i] = blockTuple(*(*blocks)[i]);
  return out;
}

py::object errorTuple(const std::optional<Error>& error) {
  if (!error) return py::none();
  return py::make_tuple(error->domain, error->code, error->userInfoString("Error reason"),
                        error->description());
}

void deliver(const std::shared_ptr<Pending>& pending, const String& text,
             const std::optional<Error>& error) {
  std::shared_ptr<Image> image;
  {
    std::lock_guard lock(pending->mutex);
    image = std::move(pending->image);
  }
  auto job = pending->job.lock();
  Size size = !error && image ? image->size() : Size{};
  image.reset();
  std::shared_ptr<RVBlockArray> columns;
  if (!error && job && job->layoutAnalyser()) columns = job->layoutAnalyser()->layoutBlocks();
  if (!gate().enter()) return;
  {
    py::gil_scoped_acquire gil;
    py::object callback = pending->callback.take();
    if (callback) {
      try {
        callback(fromString(text), py::make_tuple(size.width, size.height), treeTuple(columns),
                 errorTuple(error));
      } catch (py::error_already_set& failure) {
        failure.discard_as_unraisable("delivering a corvelbase result");
      }
    }
  }
  gate().leave();
}

struct JobOptions {
  std::vector<std::string> languages;
  bool fast = false;
  std::int64_t order = RVReadingOrderRows;
  double timeout = 0;
};

// A started job as Python holds it.
class Job {
 public:
  explicit Job(std::shared_ptr<RVVisionOCR> job) : job_(std::move(job)) {}
  // Cancels the job if it is waiting, and stops its recognition if it is running.
  void stop() { job_->stopOCRJob(); }

 private:
  std::shared_ptr<RVVisionOCR> job_;
};

Job start(std::shared_ptr<Image> image, const JobOptions& options, py::object callback,
          const std::optional<Error>& failure = std::nullopt) {
  startDelivery();
  auto pending = std::make_shared<Pending>(std::move(callback));
  auto job = RVVisionOCR::init();
  pending->image = image;
  pending->job = job;
  if (options.order < RVReadingOrderLayoutAnalysis || options.order > RVReadingOrderRows) {
    throw py::value_error("unknown reading order");
  }
  job->setReadingOrder(static_cast<RVReadingOrder>(options.order));
  job->setTimeout(options.timeout);
  track(job);
  py::gil_scoped_release release;
  if (failure) {
    deliver(pending, String(), failure);
  } else {
    job->startOcrImage(std::move(image), options.languages, options.fast,
                       [pending](const String& text, const std::optional<Error>& error) {
                         deliver(pending, text, error);
                       });
  }
  return Job(job);
}

// Encoded bytes from any buffer that is one contiguous run of bytes (bytes, bytearray,
// memoryview, mmap, a contiguous array), copied with the GIL released.
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

// The pixels of a buffer of unsigned bytes shaped (height, width) or (height, width,
// channels), channels 1, 3 or 4, each pixel's channels next to each other and each row's
// pixels next to each other; rows may lie any distance apart. Read once, with the GIL
// released; a layout this cannot read is refused rather than copied here.
std::shared_ptr<Bitmap> bitmapOf(const py::buffer& buffer, std::string* failure) {
  py::buffer_info info = buffer.request(false);
  if (info.itemsize != 1 || info.format != "B") {
    throw py::type_error("pixels must be unsigned 8-bit values (format 'B'), not '" + info.format +
                         "'");
  }
  if (info.ndim != 2 && info.ndim != 3) {
    throw py::value_error("pixels must be shaped (height, width) or (height, width, channels)");
  }
  py::ssize_t height = info.shape[0], width = info.shape[1];
  py::ssize_t channels = info.ndim == 3 ? info.shape[2] : 1;
  if (channels != 1 && channels != 3 && channels != 4) {
    throw py::value_error("pixels must have 1, 3 or 4 channels, not " + std::to_string(channels));
  }
  py::ssize_t rowStride = info.strides[0];
  bool packed = info.strides[1] == channels && (info.ndim == 2 || info.strides[2] == 1) &&
                rowStride >= width * channels;
  if (!packed) {
    throw py::value_error(
        "pixels must be laid out row by row with each pixel's channels "
        "together (numpy.ascontiguousarray gives that layout)");
  }
  if (height <= 0 || width <= 0 || height > UINT32_MAX || width > UINT32_MAX) {
    *failure = "the pixels have no area or are too large";
    return nullptr;
  }
  std::size_t size = static_cast<std::size_t>(rowStride) * static_cast<std::size_t>(height - 1) +
                     static_cast<std::size_t>(width * channels);
  py::gil_scoped_release release;
  auto bitmap =
      Bitmap::fromPixels(static_cast<std::uint32_t>(width), static_cast<std::uint32_t>(height),
                         static_cast<int>(channels), static_cast<const std::uint8_t*>(info.ptr),
                         static_cast<std::size_t>(rowStride), size);
  if (!bitmap) *failure = "the pixels are too large to recognise";
  return bitmap;
}

// As the command line tells them apart: a URL names its scheme.
bool isURL(const std::string& text) {
  return text.find("://") != std::string::npos || text.rfind("file:", 0) == 0;
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

// At exit: stop what still runs, shut the interpreter's door, and wait for the queue to
// empty so that no worker is inside the engine while the process tears down its statics.
void shutdown() {
  {
    std::lock_guard lock(liveMutex);
    for (auto& weak : liveJobs())
      if (auto job = weak.lock()) job->stopOCRJob();
  }
  gate().close();
  py::gil_scoped_release release;
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  if (deliveryThread) {
    deliveryStopping = true;
    MainQueue::async([] {});
    deliveryThread->join();
  }
}

}  // namespace

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
  py::class_<Job>(m, "Job").def("stop", &Job::stop, py::call_guard<py::gil_scoped_release>());
  py::class_<JobOptions>(m, "JobOptions")
      .def(py::init<>())
      .def_readwrite("languages", &JobOptions::languages)
      .def_readwrite("fast", &JobOptions::fast)
      .def_readwrite("order", &JobOptions::order)
      .def_readwrite("timeout", &JobOptions::timeout);

  m.def("submit_path", [](const std::string& path, const JobOptions& options, py::object callback) {
    auto image =
        isURL(path) ? Image::initByReferencingURL(path) : Image::initByReferencingFile(path);
    return start(std::move(image), options, std::move(callback));
  });
  m.def("submit_data", [](py::handle data, const JobOptions& options, py::object callback) {
    return start(Image::initByReferencingData(bytesOf(data)), options, std::move(callback));
  });
  m.def("submit_pixels",
        [](const py::buffer& pixels, const JobOptions& options, py::object callback) {
          std::string failure;
          auto bitmap = bitmapOf(pixels, &failure);
          if (!bitmap) {
            return start(nullptr, options, std::move(callback),
                         makeTextRecognitionError(TextRecognitionErrorImageUnreadable, failure));
          }
          return start(Image::initWithBitmap(std::move(bitmap)), options, std::move(callback));
        });
  m.def("shutdown", &shutdown);

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
  m.def("engine_statistics", []() -> py::object {
    auto engine = tesseract();
    if (!engine) return py::none();
    TesseractRecognizer::Statistics s = engine->statistics();
    py::dict out;
    out["recognitions"] = s.recognitions;
    out["recognition_seconds"] = s.recognitionSeconds;
    out["recognition_cpu_seconds"] = s.recognitionCpuSeconds;
    out["engines_started"] = s.enginesStarted;
    out["engine_start_seconds"] = s.engineStartSeconds;
    out["engine_start_cpu_seconds"] = s.engineStartCpuSeconds;
    out["idle_engines"] = s.idleEngines;
    return out;
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
