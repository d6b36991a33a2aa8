// What the parts of the Python glue share: text and position conversions between
// Python strings and the library's UTF-16, results and errors as tuples, and the gate
// that keeps the library's threads out of the interpreter once it is shutting down.
#pragma once

#include <pybind11/pybind11.h>

#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string_view>
#include <vector>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/String.h"
#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel::python {

namespace py = pybind11;

// A Python string as UTF-16. Every code point above U+FFFF becomes a surrogate pair
// and every other one a single unit, lone surrogates included, so positions map one to
// one (see unitOffset). Raises TypeError for anything but a str.
String toString(py::handle text);
// UTF-16 as a Python string; unpaired surrogates come back as lone surrogate code
// points instead of failing the conversion.
py::str fromString(std::u16string_view text);

// Positions in a Python string (code points) and in its UTF-16 form (units). Indexes
// outside the string are clamped to it.
std::uint64_t unitOffset(py::handle text, py::ssize_t index);
py::ssize_t indexOfUnit(py::handle text, std::uint64_t unit);

// Threads of the library (the queue's workers, the delivery thread) enter the
// interpreter only through this gate. At exit the gate closes: from then on a thread
// that would enter gets false and leaves its Python objects alone (leaking them is the
// only safe thing once the interpreter is finalising), and close() waits for those
// already inside.
class Gate {
 public:
  bool enter();
  void leave();
  // Called with the GIL held; releases it while waiting for the threads inside.
  void close();

 private:
  std::mutex mutex_;
  std::condition_variable left_;
  bool open_ = true;
  int inside_ = 0;
};
Gate& gate();

// An owned reference to a Python object that may be dropped on any thread: dropping
// takes the GIL through the gate, or leaks the reference once the gate is closed.
class Reference {
 public:
  explicit Reference(py::object object) : object_(object.release().ptr()) {}
  ~Reference() { reset(); }
  Reference(const Reference&) = delete;
  Reference& operator=(const Reference&) = delete;
  // The object, taken out (the reference becomes empty); call with the GIL held.
  py::object take();
  void reset();

 private:
  std::mutex mutex_;
  PyObject* object_;
};

// Results as the package's Python files read them: a box is (x, y, width, height); a
// block is (text, box, confidence, level, children, words) with the words of a line as
// (text, box, confidence), confidences in percent; an error is (domain, code, reason,
// description) or None. The words of a tree's lines are found among `observations`
// (the lines the tree was made of), when given.
py::tuple boxTuple(const Rect& box);
py::tuple treeTuple(const std::shared_ptr<RVBlockArray>& blocks,
                    const std::vector<RecognizedTextObservation>* observations = nullptr);
py::object errorTuple(const std::optional<Error>& error);

// The bytes of any buffer that is one contiguous run of bytes (bytes, bytearray,
// memoryview, mmap, a contiguous array), copied with the GIL released.
Data bytesOf(py::handle buffer);

void bindOcr(py::module_& module);
void bindJobs(py::module_& module);
void bindText(py::module_& module);
void bindTypes(py::module_& module);

}  // namespace corvel::python
