// The fileTypes category: copying an attachment and classifying attachments by kind.
#include <algorithm>
#include <cctype>

#include "Corvelbase/RVMXTextAttachment.h"
#include "Corvelbase/RVPencilAttachment.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TypeRegistry.h"

namespace corvel {

namespace {

constexpr char kImageType[] = "public.image";
constexpr char kMovieType[] = "public.movie";
constexpr char kPDFType[] = "com.adobe.pdf";
constexpr char kAudioType[] = "public.audio";

}  // namespace

bool TextAttachment::initWithTextAttachmentHook(const TextAttachment& source,
                                                std::shared_ptr<Image> image) {
  if (!initWithDataHook(source.contents(), source.fileType())) return false;
  setFileWrapper(source.fileWrapper());
  setImage(std::move(image));
  setBounds(source.bounds());
  if (PlatformRegistry::platformVersion().isAtLeast(12, 0))
    setLineLayoutPadding(source.lineLayoutPadding());
  return true;
}

bool TextAttachment::kindTest(std::string_view type) const {
  std::string kind(type);
  if (auto ownType = fileType()) return doesFileType(ownType, kind);
  auto wrapper = fileWrapper();
  return isFile(wrapper ? wrapper->filename() : std::nullopt, kind);
}

bool TextAttachment::isImage() const { return image() != nullptr || kindTest(kImageType); }
bool TextAttachment::isVideo() const { return kindTest(kMovieType); }
bool TextAttachment::isPDF() const { return kindTest(kPDFType); }
bool TextAttachment::isAudio() const { return kindTest(kAudioType); }

bool TextAttachment::isFile(const std::optional<std::string>& path,
                            const std::optional<std::string>& type) const {
  if (!path) return false;
  return doesFileType(typeOfFile(*path), type);
}

bool TextAttachment::doesFileType(const std::optional<std::string>& fileType,
                                  const std::optional<std::string>& conformTo) const {
  if (!fileType || !conformTo) return false;
  return TypeRegistry::shared().conformsTo(*fileType, *conformTo);
}

bool TextAttachment::isScaledImage() const {
  return isKindOfClass(kRVMXScaledImageAttachmentClassName);
}

bool TextAttachment::isPencilData() const {
  if (!isKindOfClass(kRVPencilAttachmentClassName)) return false;
  auto wrapper = fileWrapper();
  if (!wrapper || !wrapper->filename()) return false;
  std::string extension = pathExtension(*wrapper->filename());
  std::transform(extension.begin(), extension.end(), extension.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return extension == RVPencilDataExtension;
}

}  // namespace corvel
