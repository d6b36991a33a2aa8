// RVMXScaledImageAttachment: a picture fitted to its line, carrying an optional drawing.
#include "Corvelbase/RVMXScaledImageAttachment.h"

#include "Corvelbase/platform/Base64.h"
#include "Corvelbase/platform/FileWrapper.h"
#include "Corvelbase/platform/Files.h"

namespace corvel {

const std::string RVMXScaledImageFileType = "public.jpeg";

namespace {

constexpr char kJPEGExtension[] = ".jpeg";
// A picture wider than its line is shrunk to this share of the line's width.
constexpr double kLineWidthShare = 0.9;

}  // namespace

std::shared_ptr<RVMXScaledImageAttachment> RVMXScaledImageAttachment::init() {
  auto attachment = alloc<RVMXScaledImageAttachment>();
  return attachment->initHook() ? attachment : nullptr;
}

bool RVMXScaledImageAttachment::initHook() {
  if (!RVMXTextAttachment::initHook()) return false;
  setSaving(kSavingEditing);
  initScaledImage();
  return true;
}

std::shared_ptr<RVMXScaledImageAttachment> RVMXScaledImageAttachment::initWithImage(
    const std::shared_ptr<Image>& image, std::shared_ptr<RVPencilAttachment> pencilStoke) {
  auto attachment = alloc<RVMXScaledImageAttachment>();
  auto jpeg = attachment->jpegDataForImage(image);
  if (!attachment->initWithDataHook(jpeg, RVMXScaledImageFileType)) return nullptr;
  attachment->pencilAttachment_ = std::move(pencilStoke);
  attachment->initScaledImage();
  attachment->createFileWrapper(jpeg);
  return attachment;
}

void RVMXScaledImageAttachment::initScaledImage() { scaleImage_ = false; }

void RVMXScaledImageAttachment::createFileWrapper(const std::optional<Data>& jpegData) {
  if (!jpegData) return;
  std::string directory = cachesDirectory();
  if (directory.empty()) return;
  std::string identifier = pencilAttachment_ && pencilAttachment_->uuid()
                               ? *pencilAttachment_->uuid()
                               : makeUUIDString();
  std::string fileName = identifier + kJPEGExtension;
  // A drawing's uuid can be set by the host; one that is not a plain name would write
  // outside the caches directory, so it counts as a failed write.
  if (!isSafeFileName(fileName)) {
    fw_ = nullptr;
    return;
  }
  std::string path = directory + "/" + fileName;
  writeFileAtomically(path, *jpegData);
  fw_ = FileWrapper::initWithPath(path);
}

Rect RVMXScaledImageAttachment::attachmentBoundsForTextContainer(const TextContainer*,
                                                                 const Rect& proposedLineFragment,
                                                                 const Point&,
                                                                 std::uint64_t) const {
  return scaleImageSizeToWidth(static_cast<float>(proposedLineFragment.size.width));
}

Rect RVMXScaledImageAttachment::scaleImageSizeToWidth(float width) const {
  auto picture = image();
  Size size = picture ? picture->size() : Size{};
  double ratio = 1.0;
  double lineWidth = width;
  if (size.width > lineWidth) {
    // The ratio passes through a 32-bit float on purpose: layouts made before depend on
    // the exact digits this gives. The conversion is always defined: a picture's width
    // is a whole number of pixels, so the quotient is below 0.9 for a positive line and
    // between -inf and 0 (which a float holds) for a negative one.
    ratio = static_cast<float>(lineWidth * kLineWidthShare / size.width);
  }
  return Rect(0, 0, size.width * ratio, size.height * ratio);
}

std::optional<std::string> RVMXScaledImageAttachment::fileType() const {
  if (originalType_) return originalType_;
  if (auto inherited = TextAttachment::fileType()) return inherited;
  return RVMXScaledImageFileType;
}

std::shared_ptr<FileWrapper> RVMXScaledImageAttachment::fileWrapper() const {
  if (saving() == kSavingWritingOut && fw_) return fw_;
  return TextAttachment::fileWrapper();
}

std::optional<Data> RVMXScaledImageAttachment::contents() const {
  if (saving() == kSavingTextExport) {
    if (auto picture = TextAttachment::image()) {
      auto jpeg = jpegDataForImage(picture);
      if (!jpeg) return std::nullopt;
      std::string text = base64Encoding(*jpeg, Base64Encoding64CharacterLineLength);
      return Data(text.begin(), text.end());
    }
  }
  return TextAttachment::contents();
}

std::shared_ptr<Image> RVMXScaledImageAttachment::image() const {
  if (saving() == kSavingWritingOut) return TextAttachment::image();
  if (saving() == kSavingTextExport) return nullptr;
  if (auto inherited = TextAttachment::image()) return inherited;
  if (actualImage_) return actualImage_;
  std::optional<Data> encoded;
  if (auto wrapper = TextAttachment::fileWrapper())
    encoded = wrapper->regularFileContents();
  else
    encoded = contents();
  if (encoded) actualImage_ = Image::initWithData(*encoded);
  return actualImage_;
}

std::optional<Data> RVMXScaledImageAttachment::encodedBase64Data() const {
  auto picture = TextAttachment::image();
  if (!picture) picture = actualImage_;
  if (!picture) picture = image();
  auto jpeg = jpegDataForImage(picture);
  if (!jpeg) return std::nullopt;
  return corvel::encodedBase64Data(*jpeg);
}

bool RVMXScaledImageAttachment::isKindOfClass(std::string_view className) const {
  return className == kRVMXScaledImageAttachmentClassName ||
         RVMXTextAttachment::isKindOfClass(className);
}

}  // namespace corvel
