#include <sys/stat.h>

#include <map>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/RTFD.h"
#include "Corvelbase/platform/TextAttachment.h"
#include "Corvelbase/platform/TypeRegistry.h"
#include "platform/rtfd/RtfCodec.h"

namespace corvel {

const std::string RTFDTextFileName = "TXT.rtf";

namespace {

constexpr char kAttachmentStem[] = "Attachment";
constexpr char kJPEGExtension[] = ".jpeg";
constexpr double kJPEGCompressionFactor = 0.9;

// A name fit for one entry of the bundle: separators and control characters become '_',
// surrounding blanks go (the RTF reader trims them), and nothing is left as "", "." or "..".
std::string safeName(const std::string& wanted) {
  std::string name;
  for (char c : wanted) name += (c == '/' || static_cast<unsigned char>(c) < 0x20) ? '_' : c;
  auto first = name.find_first_not_of(" \t");
  name = first == std::string::npos ? ""
                                    : name.substr(first, name.find_last_not_of(" \t") - first + 1);
  return isSafeFileName(name) ? name : kAttachmentStem;
}

std::optional<Size> sizeOf(const TextAttachment& attachment) {
  Rect bounds = attachment.bounds();
  if (bounds.size.width > 0 && bounds.size.height > 0) return bounds.size;
  if (auto image = attachment.image()) {
    Size size = image->size();
    if (size.width > 0 && size.height > 0) return size;
  }
  return std::nullopt;
}

// A new wrapper with the same contents, so that naming it in the bundle leaves the
// attachment's own wrapper (whose name may identify it) untouched.
std::shared_ptr<FileWrapper> copyOf(const FileWrapper& wrapper) {
  if (wrapper.isRegularFile())
    return FileWrapper::initRegularFileWithContents(*wrapper.regularFileContents());
  return FileWrapper::initDirectoryWithFileWrappers(wrapper.fileWrappers());
}

// The file an attachment is written with, and the name it asks for; null when the
// attachment has nothing to write.
std::pair<std::shared_ptr<FileWrapper>, std::string> fileOf(const TextAttachment& attachment) {
  if (auto wrapper = attachment.fileWrapper())
    return {wrapper, wrapper->preferredFilename().value_or(wrapper->filename().value_or(""))};
  if (auto contents = attachment.contents()) {
    std::string name = kAttachmentStem;
    if (auto type = attachment.fileType())
      if (auto extension = TypeRegistry::shared().preferredFilenameExtension(*type))
        name += "." + *extension;
    return {FileWrapper::initRegularFileWithContents(std::move(*contents)), name};
  }
  if (auto image = attachment.image())
    if (auto jpeg = image->jpegData(kJPEGCompressionFactor))
      return {FileWrapper::initRegularFileWithContents(std::move(*jpeg)),
              std::string(kAttachmentStem) + kJPEGExtension};
  return {nullptr, ""};
}

std::shared_ptr<TextAttachment> attachmentFor(std::shared_ptr<FileWrapper> file,
                                              const detail::AttachmentReference& reference) {
  auto attachment = TextAttachment::initWithFileWrapper(std::move(file));
  if (attachment && reference.size)
    attachment->setBounds(Rect(0, 0, reference.size->width, reference.size->height));
  return attachment;
}

// Whether `path` is a directory (or a regular file), not following a final symbolic
// link unless asked to.
bool isKind(const std::string& path, bool directory, bool followLink = false) {
  struct stat st;
  if ((followLink ? stat(path.c_str(), &st) : lstat(path.c_str(), &st)) != 0) return false;
  return directory ? S_ISDIR(st.st_mode) : S_ISREG(st.st_mode);
}

std::optional<AttributedString> readWithFiles(
    const Data& rtf,
    const std::function<std::shared_ptr<FileWrapper>(const std::string&)>& lookUp) {
  std::map<std::string, std::shared_ptr<FileWrapper>> found;
  detail::AttachmentResolver resolver = [&](const detail::AttachmentReference& reference) {
    std::shared_ptr<FileWrapper> file;
    if (isSafeFileName(reference.name)) {
      auto it = found.find(reference.name);
      file = it != found.end() ? it->second : (found[reference.name] = lookUp(reference.name));
    }
    return attachmentFor(file, reference);
  };
  return detail::readRTF(rtf.data(), rtf.size(), resolver);
}

}  // namespace

std::shared_ptr<FileWrapper> RTFDFileWrapperFromRange(const AttributedString& text, Range range) {
  auto bundle = FileWrapper::initDirectoryWithFileWrappers({});
  // Held first so no attachment can take its name.
  bundle->addFileWrapper(FileWrapper::initRegularFileWithContents({}), RTFDTextFileName);
  std::map<const FileWrapper*, std::string> written;
  std::vector<std::shared_ptr<FileWrapper>> held;
  detail::AttachmentNamer namer = [&](const std::shared_ptr<TextAttachment>& attachment)
      -> std::optional<detail::AttachmentReference> {
    auto [file, wanted] = fileOf(*attachment);
    if (!file) return std::nullopt;
    auto it = written.find(file.get());
    std::string name =
        it != written.end() ? it->second : bundle->addFileWrapper(copyOf(*file), safeName(wanted));
    if (name.empty()) return std::nullopt;
    written.emplace(file.get(), name);
    held.push_back(file);  // keeps the address in `written` unique while writing
    return detail::AttachmentReference{name, sizeOf(*attachment)};
  };
  std::string rtf = detail::writeRTF(text, range, namer);
  bundle->removeFileWrapper(RTFDTextFileName);
  auto textFile = FileWrapper::initRegularFileWithContents(Data(rtf.begin(), rtf.end()));
  textFile->setPreferredFilename(RTFDTextFileName);
  textFile->setFilename(RTFDTextFileName);
  bundle->addFileWrapper(textFile);
  return bundle;
}

Data RTFDFromRange(const AttributedString& text, Range range) {
  return RTFDFileWrapperFromRange(text, range)->serializedRepresentation();
}

bool writeRTFDToPath(const AttributedString& text, const std::string& path) {
  return RTFDFileWrapperFromRange(text, Range{0, text.length()})->writeToPath(path);
}

std::optional<AttributedString> attributedStringWithRTFDFileWrapper(const FileWrapper& bundle) {
  const auto& files = bundle.fileWrappers();
  auto textFile = files.find(RTFDTextFileName);
  if (!bundle.isDirectory() || textFile == files.end() || !textFile->second->isRegularFile())
    return std::nullopt;
  return readWithFiles(*textFile->second->regularFileContents(),
                       [&](const std::string& name) -> std::shared_ptr<FileWrapper> {
                         auto it = files.find(name);
                         return it == files.end() ? nullptr : it->second;
                       });
}

std::optional<AttributedString> attributedStringWithRTFD(const Data& flat) {
  auto bundle = FileWrapper::initWithSerializedRepresentation(flat);
  if (!bundle) return std::nullopt;
  return attributedStringWithRTFDFileWrapper(*bundle);
}

std::optional<AttributedString> attributedStringWithContentsOfRTFD(const std::string& path) {
  std::string textPath = path + "/" + RTFDTextFileName;
  // The bundle's own path is the caller's choice and may be a link; its contents are
  // not trusted.
  if (!isKind(path, true, true) || !isKind(textPath, false)) return std::nullopt;
  auto rtf = readFile(textPath);
  if (!rtf) return std::nullopt;
  return readWithFiles(*rtf, [&](const std::string& name) -> std::shared_ptr<FileWrapper> {
    std::string filePath = path + "/" + name;  // `name` is one safe component
    if (!isKind(filePath, false) && !isKind(filePath, true)) return nullptr;
    return FileWrapper::initWithPath(filePath);
  });
}

std::optional<AttributedString> attributedStringWithRTF(const Data& rtf) {
  return readWithFiles(rtf, [](const std::string&) { return nullptr; });
}

}  // namespace corvel
