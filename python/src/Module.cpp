// The compiled part of the `corvelbase` package. The Pythonic API lives in the package's
// Python files; this module gives them the library's calls with the GIL released where
// the library works, and converts text, positions, block trees and errors.
#include <Python.h>

#include "Glue.h"

namespace corvel::python {

namespace {

// The code point at `index` of a string of `kind`.
Py_UCS4 codePoint(int kind, const void* data, py::ssize_t index) {
  return PyUnicode_READ(kind, data, index);
}

PyObject* checkedString(py::handle text) {
  if (!PyUnicode_Check(text.ptr())) throw py::type_error("expected a str");
  return text.ptr();
}

}  // namespace

String toString(py::handle text) {
  PyObject* object = checkedString(text);
  py::ssize_t length = PyUnicode_GET_LENGTH(object);
  int kind = PyUnicode_KIND(object);
  const void* data = PyUnicode_DATA(object);
  String out;
  out.reserve(static_cast<std::size_t>(length));
  for (py::ssize_t i = 0; i < length; ++i) {
    Py_UCS4 c = codePoint(kind, data, i);
    if (c > 0xFFFF) {
      c -= 0x10000;
      out.push_back(static_cast<char16_t>(0xD800 + (c >> 10)));
      out.push_back(static_cast<char16_t>(0xDC00 + (c & 0x3FF)));
    } else {
      out.push_back(static_cast<char16_t>(c));
    }
  }
  return out;
}

py::str fromString(std::u16string_view text) {
  int byteOrder = -1;  // little-endian, as char16_t is stored here
  PyObject* decoded =
      PyUnicode_DecodeUTF16(reinterpret_cast<const char*>(text.data()),
                            static_cast<py::ssize_t>(text.size() * 2), "surrogatepass", &byteOrder);
  if (!decoded) throw py::error_already_set();
  return py::reinterpret_steal<py::str>(decoded);
}

std::uint64_t unitOffset(py::handle text, py::ssize_t index) {
  PyObject* object = checkedString(text);
  py::ssize_t length = PyUnicode_GET_LENGTH(object);
  index = std::clamp<py::ssize_t>(index, 0, length);
  auto units = static_cast<std::uint64_t>(index);
  // Only a string of four-byte code points can hold any above U+FFFF.
  if (PyUnicode_KIND(object) == PyUnicode_4BYTE_KIND) {
    const void* data = PyUnicode_DATA(object);
    for (py::ssize_t i = 0; i < index; ++i)
      units += codePoint(PyUnicode_4BYTE_KIND, data, i) > 0xFFFF;
  }
  return units;
}

py::ssize_t indexOfUnit(py::handle text, std::uint64_t unit) {
  PyObject* object = checkedString(text);
  auto length = static_cast<std::uint64_t>(PyUnicode_GET_LENGTH(object));
  if (PyUnicode_KIND(object) != PyUnicode_4BYTE_KIND) {
    return static_cast<py::ssize_t>(std::min(unit, length));
  }
  const void* data = PyUnicode_DATA(object);
  std::uint64_t units = 0;
  py::ssize_t i = 0;
  // A unit inside a pair counts as the pair's code point.
  for (; static_cast<std::uint64_t>(i) < length; ++i) {
    units += codePoint(PyUnicode_4BYTE_KIND, data, i) > 0xFFFF ? 2 : 1;
    if (units > unit) break;
  }
  return i;
}

bool Gate::enter() {
  std::lock_guard lock(mutex_);
  if (!open_) return false;
  ++inside_;
  return true;
}

void Gate::leave() {
  {
    std::lock_guard lock(mutex_);
    --inside_;
  }
  left_.notify_all();
}

void Gate::close() {
  py::gil_scoped_release release;
  std::unique_lock lock(mutex_);
  open_ = false;
  left_.wait(lock, [this] { return inside_ == 0; });
}

Gate& gate() {
  static Gate* shared = new Gate;  // used by the library's threads until the process ends
  return *shared;
}

py::object Reference::take() {
  std::lock_guard lock(mutex_);
  PyObject* object = object_;
  object_ = nullptr;
  return py::reinterpret_steal<py::object>(object);
}

void Reference::reset() {
  PyObject* object;
  {
    std::lock_guard lock(mutex_);
    object = object_;
    object_ = nullptr;
  }
  if (!object || !gate().enter()) return;
  {
    py::gil_scoped_acquire gil;
    Py_DECREF(object);
  }
  gate().leave();
}

}  // namespace corvel::python

PYBIND11_MODULE(_corvelbase, module) {
  module.doc() = "The compiled part of corvelbase; use the corvelbase package instead.";
  corvel::python::bindOcr(module);
  corvel::python::bindJobs(module);
  corvel::python::bindText(module);
  corvel::python::bindTypes(module);
}
