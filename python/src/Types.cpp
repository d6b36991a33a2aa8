// Type identifiers for Python: the shared type registry, the identifier tests the
// application's own code uses, and the identifier constants.
#include <pybind11/stl.h>

#include "Corvelbase/UTI.h"
#include "Corvelbase/platform/TypeRegistry.h"
#include "Glue.h"

namespace corvel::python {

void bindTypes(py::module_& m) {
  m.def("type_for_extension", [](const std::string& extension) {
    return TypeRegistry::shared().typeForFilenameExtension(extension);
  });
  m.def("type_for_mime_type",
        [](const std::string& mime) { return TypeRegistry::shared().typeForMIMEType(mime); });
  m.def("type_preferred_extension", [](const std::string& type) {
    return TypeRegistry::shared().preferredFilenameExtension(type);
  });
  m.def("type_preferred_mime_type",
        [](const std::string& type) { return TypeRegistry::shared().preferredMIMEType(type); });
  m.def("type_supertypes",
        [](const std::string& type) { return TypeRegistry::shared().supertypes(type); });
  m.def("type_declaration", [](const std::string& type) -> py::object {
    auto declaration = TypeRegistry::shared().declaration(type);
    if (!declaration) return py::none();
    return py::make_tuple(declaration->identifier, declaration->conformsTo,
                          declaration->filenameExtensions, declaration->mimeTypes,
                          declaration->description);
  });
  m.def("type_declare",
        [](const std::string& identifier, const std::vector<std::string>& conformsTo,
           const std::vector<std::string>& extensions, const std::vector<std::string>& mimeTypes,
           const std::string& description) {
          return TypeRegistry::shared().declare(
              TypeDeclaration{identifier, conformsTo, extensions, mimeTypes, description});
        });
  m.def("type_load_declarations",
        [](const std::string& path) { return TypeRegistry::shared().loadDeclarations(path); });
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
