// Type identifiers for Python: the shared type registry, the identifier tests the
// application's own code uses, and the identifier constants.
#include <pybind11/stl.h>

#include "Corvelbase/UTI.h"
#include "Corvelbase/platform/TypeRegistry.h"
#include "Glue.h"

namespace corvel::python {

void bindTypes(py::module_& m) {
  auto& registry = TypeRegistry::shared();
  m.def("type_conforms_to", [&registry](const std::string& type, const std::string& parent) {
    return registry.conformsTo(type, parent);
  });
  m.def("type_for_extension", [&registry](const std::string& extension) {
    return registry.typeForFilenameExtension(extension);
  });
  m.def("type_for_mime_type",
        [&registry](const std::string& mime) { return registry.typeForMIMEType(mime); });
  m.def("type_preferred_extension",
        [&registry](const std::string& type) { return registry.preferredFilenameExtension(type); });
  m.def("type_preferred_mime_type",
        [&registry](const std::string& type) { return registry.preferredMIMEType(type); });
  m.def("type_supertypes",
        [&registry](const std::string& type) { return registry.supertypes(type); });
  m.def("type_declaration", [&registry](const std::string& type) -> py::object {
    auto declaration = registry.declaration(type);
    if (!declaration) return py::none();
    return py::make_tuple(declaration->identifier, declaration->conformsTo,
                          declaration->filenameExtensions, declaration->mimeTypes,
                          declaration->description);
  });
  m.def("type_declare",
        [&registry](const std::string& identifier, const std::vector<std::string>& conformsTo,
                    const std::vector<std::string>& extensions,
                    const std::vector<std::string>& mimeTypes, const std::string& description) {
          return registry.declare(
              TypeDeclaration{identifier, conformsTo, extensions, mimeTypes, description});
        });
  m.def("type_load_declarations",
        [&registry](const std::string& path) { return registry.loadDeclarations(path); });
  m.def(
      "type_of_file", [](const std::string& path) { return typeOfFile(path); },
      py::call_guard<py::gil_scoped_release>());

  // The application's own tests: clippings count as the unknown item kind.
  m.def("uti_conforms_to", [](const py::str& uti, const py::str& other) {
    return UTI::conformsToUTIString(toString(uti), toString(other));
  });
  m.def("uti_equal", [](const py::str& uti, const py::str& other) {
    return UTI::isEqualToUTIString(toString(uti), toString(other));
  });
  m.def("uti_is_dynamic", [](const py::str& uti) { return UTI::isDynamicUTI(toString(uti)); });
  m.def("uti_is_rtf_kind", [](const py::str& uti) { return UTI::isRTFKindUTI(toString(uti)); });
  m.def("uti_valid",
        [](const py::str& uti) { return fromString(UTI::validUTIString(toString(uti))); });

  py::dict constants;
  const std::pair<const char*, std::u16string_view> named[] = {
      {"RVMX_DATABASE", kUTTypeRVMXDatabase},
      {"RVMX_GROUP", kUTTypeRVMXGroup},
      {"RVMX_SHEET", kUTTypeRVMXSheet},
      {"RVMX_SMART_GROUP", kUTTypeRVMXSmartGroup},
      {"RVMX_PLACEHOLDER", kUTTypeRVMXPlaceholder},
      {"RVMX_FEED", kUTTypeRVMXFeed},
      {"RVMX_FORMATTED_NOTE", kUTTypeRVMXFormattedNote},
      {"RVMX_UNKNOWN", kUTTypeRVMXUnknown},
      {"MARKDOWN", kUTTypeMarkdown},
      {"APPLE_MAIL", kUTTypeAppleMail},
      {"WEB_INTERNET_LOCATION", kUTTypeWebInternetLocation},
      {"TEXTBUNDLE", kUTTypeTextbundle},
      {"COMPRESSED_TEXTBUNDLE", kUTTypeCompressedTextBundle},
      {"HEIC", kUTTypeHEIC},
      {"URL_NAME", kUTTypeURLName},
  };
  for (const auto& [name, value] : named) constants[name] = fromString(value);
  m.attr("TYPE_CONSTANTS") = constants;
}

}  // namespace corvel::python
