// Writers of recognition results in the formats OCR tools exchange: plain text, JSON,
// hOCR, ALTO, TSV (laid out as Tesseract's own renderers lay them out, so that readers
// written for its output read ours) and the searchable PDF.
//
// The stream formats take any number of inputs, one after another, and make one
// document of them: text with a "==> NAME <==" line before each input when there are
// several (pages separated by a form feed), one JSON object, one hOCR page, one ALTO
// file, one TSV table. The JSON schema is described in the README ("JSON output").
// Word boxes are in pixels of the page as read, origin at the top left; confidences are
// 0 to 100 (ALTO's WC 0 to 1).
#pragma once

#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/RVDocumentOCR.h"
#include "Corvelbase/platform/Document.h"

namespace corvel {

enum class RVDocumentFormat { Text, JSON, HOCR, ALTO, TSV, PDF };

// "txt", "json", "hocr", "alto", "tsv" or "pdf"; nullopt for any other name.
CORVEL_EXPORT std::optional<RVDocumentFormat> documentFormatNamed(const std::string& name);
// The format an output file's extension names (.txt, .json, .hocr or .html, .xml or
// .alto, .tsv, .pdf; case ignored); nullopt for another extension or none.
CORVEL_EXPORT std::optional<RVDocumentFormat> documentFormatForPath(const std::string& path);
// The names documentFormatNamed takes, for messages: "txt, json, hocr, alto, tsv, pdf".
CORVEL_EXPORT std::string documentFormatNames();

// One input's results.
struct CORVEL_EXPORT RVDocumentResult {
  std::string name;  // as the user gave it, written into the outputs
  std::vector<RVDocumentPage> pages;
  std::optional<Error> error;  // the input's own failure (it could not be opened)
};

// A writer of a stream format: begin, each input in turn, end.
class CORVEL_EXPORT RVDocumentWriter {
 public:
  // nullptr for RVDocumentFormat::PDF, which is no stream (writeSearchablePdf).
  static std::unique_ptr<RVDocumentWriter> init(RVDocumentFormat format, std::ostream& out,
                                                std::size_t inputCount);
  virtual ~RVDocumentWriter();
  virtual void add(const RVDocumentResult& result) = 0;
  // Closes the document; nothing may be added afterwards.
  virtual void end() = 0;

 protected:
  RVDocumentWriter() = default;
};

// The searchable PDF of `document` with the pages of `result` that were recognised as
// invisible text (Document.h's writeSearchablePdf). False with *error (never null).
CORVEL_EXPORT bool writeSearchablePdf(const Document& document, const RVDocumentResult& result,
                                      const std::string& path, Error* error);

}  // namespace corvel
