// Recognition jobs for Python. Every source (a file, the bytes of one, pixels) is read
// as a document by the library's document job, page by page on the shared queue, so an
// image and each page of a PDF or TIFF go the same way as on the command line. What a
// job leaves (the document and its pages) stays with the Python result, for the writers
// of the output formats.
//
// Delivery. Pages and the job's end go to the main queue. Unless the host installed a
// dispatcher of its own, that is the library's internal queue, which a thread of this
// module drains: it takes the GIL once per job, at its end, and calls the job's callback
// with (outcome, pages, error).
#include <pybind11/stl.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <list>
#include <sstream>
#include <thread>

#include "Corvelbase/RVDocumentOCR.h"
#include "Corvelbase/RVDocumentOutput.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Document.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Glue.h"

namespace corvel::python {

namespace {

// Pixels handed over by Python: a document of one page, that picture.
class PixelDocument final : public Document {
 public:
  explicit PixelDocument(std::shared_ptr<Bitmap> bitmap)
      : Document(std::string()), bitmap_(std::move(bitmap)) {}
  DocumentKind kind() const override { return DocumentKind::Image; }
  std::size_t pageCount() const override { return 1; }
  std::shared_ptr<Bitmap> renderPage(std::size_t page, Error* error,
                                     double* resolution) const override {
    if (page != 0) {
      *error = makeDocumentError(DocumentErrorPageRange, "pixels are one page");
      return nullptr;
    }
    if (resolution) *resolution = 0;
    return bitmap_;
  }

 private:
  std::shared_ptr<Bitmap> bitmap_;
};

// Bytes kept in a temporary file while their document is used: documents are opened
// from files, and the searchable PDF reads its source again when it is written.
class Spool {
 public:
  Spool() = default;
  Spool(const Spool&) = delete;
  Spool& operator=(const Spool&) = delete;
  ~Spool() {
    if (!path_.empty()) std::remove(path_.c_str());
  }
  // Copies the buffer's bytes into a new file; false with *failure when it cannot.
  bool write(py::handle buffer, std::string* failure) {
    Py_buffer view;
    if (PyObject_GetBuffer(buffer.ptr(), &view, PyBUF_SIMPLE) != 0) throw py::error_already_set();
    bool written;
    {
      py::gil_scoped_release release;
      written = writeBytes(static_cast<const char*>(view.buf), static_cast<std::size_t>(view.len),
                           failure);
    }
    PyBuffer_Release(&view);
    return written;
  }
  const std::string& path() const { return path_; }

 private:
  bool writeBytes(const char* bytes, std::size_t size, std::string* failure) {
    const char* dir = std::getenv("TMPDIR");
    std::string pattern = std::string(dir && *dir ? dir : "/tmp") + "/corvelbase-XXXXXX";
    int fd = mkstemp(pattern.data());
    if (fd < 0) {
      *failure = "cannot make a temporary file for the bytes";
      return false;
    }
    path_ = pattern;
    while (size > 0) {
      ssize_t n = ::write(fd, bytes, size);
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) {
        ::close(fd);
        *failure = "cannot write the bytes to a temporary file";
        return false;
      }
      bytes += n;
      size -= static_cast<std::size_t>(n);
    }
    ::close(fd);
    return true;
  }

  std::string path_;
};

// What a job leaves: its document (with the spooled bytes it was opened from) and every
// page's outcome. Members are released in reverse order: the document before its file.
struct Outcome {
  std::shared_ptr<Spool> spool;
  std::shared_ptr<Document> document;
  RVDocumentResult result;
};

struct JobOptions {
  std::vector<std::string> languages;
  bool fast = false;
  std::int64_t order = RVReadingOrderRows;
  double timeout = 0;
  bool forceOCR = false;
  std::string name = "-";  // written into the outputs
};

// What a job's end needs; the callback is emptied once it has run.
struct Pending {
  explicit Pending(py::object callback) : callback(std::move(callback)) {}
  Reference callback;
  std::shared_ptr<Outcome> outcome;
};

// Live jobs, so that exit can stop them.
std::mutex liveMutex;
std::list<std::weak_ptr<RVDocumentOCR>>& liveJobs() {
  static auto* jobs = new std::list<std::weak_ptr<RVDocumentOCR>>;
  return *jobs;
}

void track(const std::shared_ptr<RVDocumentOCR>& job) {
  std::lock_guard lock(liveMutex);
  auto& jobs = liveJobs();
  jobs.remove_if([](const std::weak_ptr<RVDocumentOCR>& j) { return j.expired(); });
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

// (index, (width, height), resolution, text, has own text, block tree, error) per page.
py::tuple pagesTuple(const RVDocumentResult& result) {
  py::tuple pages(result.pages.size());
  for (std::size_t i = 0; i < result.pages.size(); ++i) {
    const RVDocumentPage& page = result.pages[i];
    pages[i] =
        py::make_tuple(page.index, py::make_tuple(page.pixelSize.width, page.pixelSize.height),
                       page.resolution, fromString(page.text), page.hasOwnText,
                       treeTuple(page.layoutBlocks, &page.observations), errorTuple(page.error));
  }
  return pages;
}

void deliver(const std::shared_ptr<Pending>& pending, const std::optional<Error>& error) {
  if (!gate().enter()) return;
  {
    py::gil_scoped_acquire gil;
    py::object callback = pending->callback.take();
    if (callback) {
      try {
        py::tuple pages = error ? py::tuple() : pagesTuple(pending->outcome->result);
        callback(py::cast(pending->outcome), pages, errorTuple(error));
      } catch (py::error_already_set& failure) {
        failure.discard_as_unraisable("delivering a corvelbase result");
      }
    }
  }
  gate().leave();
}

// A started job as Python holds it.
class Job {
 public:
  explicit Job(std::shared_ptr<RVDocumentOCR> job) : job_(std::move(job)) {}
  // Pages not yet read are never read; pages being read are stopped inside the engine.
  void stop() {
    if (job_) job_->cancel();
  }

 private:
  std::shared_ptr<RVDocumentOCR> job_;
};

// Starts reading `outcome`'s document, or hands `failure` to the callback at once.
Job start(std::shared_ptr<Outcome> outcome, const std::optional<Error>& failure,
          const JobOptions& options, py::object callback) {
  if (options.order < RVReadingOrderLayoutAnalysis || options.order > RVReadingOrderRows) {
    throw py::value_error("unknown reading order");
  }
  startDelivery();
  auto pending = std::make_shared<Pending>(std::move(callback));
  pending->outcome = outcome;
  outcome->result.name = options.name;
  py::gil_scoped_release release;
  if (failure) {
    deliver(pending, failure);
    return Job(nullptr);
  }
  auto job = RVDocumentOCR::init();
  job->setReadingOrder(static_cast<RVReadingOrder>(options.order));
  job->setTimeout(options.timeout);
  job->setForceOCR(options.forceOCR);
  track(job);
  // Both run on the main queue's one thread, one after the other.
  job->startOcrDocument(
      outcome->document, options.languages, options.fast,
      [outcome](const RVDocumentPage& page) { outcome->result.pages.push_back(page); },
      [pending](const std::optional<Error>& error) { deliver(pending, error); });
  return Job(job);
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

RVDocumentFormat formatFor(const std::string& path, const std::string& name) {
  std::optional<RVDocumentFormat> format =
      name.empty() ? documentFormatForPath(path) : documentFormatNamed(name);
  if (format) return *format;
  throw py::value_error(
      (name.empty() ? "cannot tell the format from " + path : "no format " + name) +
      "; the formats are " + documentFormatNames());
}

using Outcomes = std::vector<std::shared_ptr<Outcome>>;

// The outcomes in a stream format.
std::string render(const Outcomes& outcomes, RVDocumentFormat format) {
  std::ostringstream out;
  auto writer = RVDocumentWriter::init(format, out, outcomes.size());
  for (const auto& outcome : outcomes) writer->add(outcome->result);
  writer->end();
  return std::move(out).str();
}

// Writes the outcomes to `path` in the format named (or `path`'s extension's), atomically.
py::object write(const Outcomes& outcomes, const std::string& path, const std::string& name) {
  RVDocumentFormat format = formatFor(path, name);
  if (format == RVDocumentFormat::PDF && outcomes.size() != 1) {
    throw py::value_error("a searchable PDF is made of one result");
  }
  std::optional<Error> failure;
  {
    py::gil_scoped_release release;
    Error error;
    if (format == RVDocumentFormat::PDF) {
      if (!writeSearchablePdf(*outcomes[0]->document, outcomes[0]->result, path, &error))
        failure = error;
    } else {
      std::string bytes = render(outcomes, format);
      if (!writeFileAtomically(path, reinterpret_cast<const std::uint8_t*>(bytes.data()),
                               bytes.size())) {
        failure = makeDocumentError(DocumentErrorWrite, "cannot write " + path);
      }
    }
  }
  return errorTuple(failure);
}

// At exit: stop what still runs, shut the interpreter's door, and wait for the queue to
// empty so that no worker is inside the engine while the process tears down its statics.
void shutdown() {
  {
    std::lock_guard lock(liveMutex);
    for (auto& weak : liveJobs())
      if (auto job = weak.lock()) job->cancel();
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

void bindJobs(py::module_& m) {
  m.attr("DOCUMENT_DOMAIN") = DocumentErrorDomain;
  m.attr("ERROR_DOCUMENT_UNREADABLE") = static_cast<int>(DocumentErrorUnreadable);
  m.attr("ERROR_DOCUMENT_DAMAGED") = static_cast<int>(DocumentErrorDamaged);
  m.attr("ERROR_DOCUMENT_ENCRYPTED") = static_cast<int>(DocumentErrorEncrypted);
  m.attr("ERROR_PAGE_RANGE") = static_cast<int>(DocumentErrorPageRange);
  m.attr("ERROR_WRITE") = static_cast<int>(DocumentErrorWrite);

  py::class_<Job>(m, "Job").def("stop", &Job::stop, py::call_guard<py::gil_scoped_release>());
  py::class_<Outcome, std::shared_ptr<Outcome>>(m, "Outcome");
  py::class_<JobOptions>(m, "JobOptions")
      .def(py::init<>())
      .def_readwrite("languages", &JobOptions::languages)
      .def_readwrite("fast", &JobOptions::fast)
      .def_readwrite("order", &JobOptions::order)
      .def_readwrite("timeout", &JobOptions::timeout)
      .def_readwrite("force_ocr", &JobOptions::forceOCR)
      .def_readwrite("name", &JobOptions::name);

  m.def("submit_path", [](const std::string& path, const JobOptions& options, py::object callback) {
    auto outcome = std::make_shared<Outcome>();
    Error error;
    {
      py::gil_scoped_release release;
      outcome->document = Document::initWithFile(path, &error);
    }
    return start(outcome, outcome->document ? std::nullopt : std::optional(error), options,
                 std::move(callback));
  });
  m.def("submit_data", [](py::handle data, const JobOptions& options, py::object callback) {
    auto outcome = std::make_shared<Outcome>();
    outcome->spool = std::make_shared<Spool>();
    std::string failure;
    Error error;
    if (!outcome->spool->write(data, &failure)) {
      error = makeDocumentError(DocumentErrorUnreadable, failure);
    } else {
      py::gil_scoped_release release;
      outcome->document = Document::initWithFile(outcome->spool->path(), &error);
    }
    return start(outcome, outcome->document ? std::nullopt : std::optional(error), options,
                 std::move(callback));
  });
  m.def("submit_pixels",
        [](const py::buffer& pixels, const JobOptions& options, py::object callback) {
          auto outcome = std::make_shared<Outcome>();
          std::string failure;
          auto bitmap = bitmapOf(pixels, &failure);
          std::optional<Error> error;
          if (bitmap) {
            outcome->document = std::make_shared<PixelDocument>(std::move(bitmap));
          } else {
            error = makeTextRecognitionError(TextRecognitionErrorImageUnreadable, failure);
          }
          return start(outcome, error, options, std::move(callback));
        });
  m.def("shutdown", &shutdown);

  m.def("render", [](const Outcomes& outcomes, const std::string& name) {
    RVDocumentFormat format = formatFor("", name);
    if (format == RVDocumentFormat::PDF) throw py::value_error("a PDF is written to a file");
    std::string text;
    {
      py::gil_scoped_release release;
      text = render(outcomes, format);
    }
    return py::str(text);
  });
  m.def("write", &write);
}

}  // namespace corvel::python
