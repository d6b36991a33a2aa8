// Internal: the document backends that Document::initWithFile chooses between.
#pragma once

#include <memory>
#include <string>

#include "Corvelbase/platform/Document.h"

namespace corvel::detail {

// Each opens `path`, already known to start like its kind; nullptr with *error (never
// null) when it cannot.
std::shared_ptr<Document> openPdf(const std::string& path, Error* error);
std::shared_ptr<Document> openTiff(const std::string& path, Error* error);

// True when `path` starts like a picture the image layer reads, within the pixel
// budget; false with *error (never null) otherwise. Only the header is read.
bool probeImage(const std::string& path, Error* error);
// The pixels per inch a bitmap states, 0 when none.
double bitmapResolution(const Bitmap& bitmap);

// Writes the searchable PDF of `document` (platform/pdf/SearchablePdf.cpp).
bool writeSearchablePdf(const Document& document, const std::vector<TextLayerPage>& pages,
                        const std::string& path, Error* error);

}  // namespace corvel::detail
