// The BaseEncode category: an attachment's picture as JPEG and its base64 form for export.
#include "Corvelbase/platform/Base64.h"
#include "Corvelbase/platform/TextAttachment.h"

namespace corvel {

namespace {

constexpr double kJPEGCompressionFactor = 0.9;

}  // namespace

std::optional<Data> TextAttachment::jpegDataForImage(const std::shared_ptr<Image>& image) const {
  if (!image) return std::nullopt;
  return image->jpegData(kJPEGCompressionFactor);
}

std::optional<Data> TextAttachment::encodedBase64Data() const {
  std::optional<Data> data;
  if (auto picture = image()) {
    data = jpegDataForImage(picture);
  } else if (auto bytes = contents()) {
    data = std::move(bytes);  // any format, as it stands
  } else if (auto wrapper = fileWrapper()) {
    auto fileBytes = wrapper->regularFileContents();
    data = jpegDataForImage(fileBytes ? Image::initWithData(*fileBytes) : nullptr);
  }
  if (!data) return std::nullopt;
  return corvel::encodedBase64Data(*data);
}

}  // namespace corvel
