#include "Corvelbase/platform/FileWrapper.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <new>

#include "Corvelbase/platform/Files.h"
#include "platform/SiblingFiles.h"

namespace corvel {

struct FileWrapperAccess {
  static std::shared_ptr<FileWrapper> make() {
    return std::shared_ptr<FileWrapper>(new FileWrapper());
  }
};

namespace {

constexpr int kMaxDepth = 32;
constexpr std::uint32_t kRecordFile = 1;
constexpr std::uint32_t kRecordDirectory = 3;
constexpr std::uint32_t kLongLength = 0x80000000u;
constexpr char kMagic[4] = {'r', 't', 'f', 'd'};

// Entries of a serialised directory that carry the platform's metadata, not files.
bool isMetadataName(std::string_view name) {
  return name == "." || name == "__@PreferredName@__" || name == "__@UTF8PreferredName@__";
}

std::shared_ptr<FileWrapper> readPath(const std::string& path, int depth) {
  struct stat st;
  if (depth > kMaxDepth || lstat(path.c_str(), &st) != 0) return nullptr;
  std::string name = lastPathComponent(path);
  if (S_ISREG(st.st_mode)) {
    auto bytes = readFile(path);
    if (!bytes) return nullptr;
    auto wrapper = FileWrapper::initRegularFileWithContents(std::move(*bytes));
    wrapper->setFilename(name);
    wrapper->setPreferredFilename(name);
    return wrapper;
  }
  if (!S_ISDIR(st.st_mode)) return nullptr;
  DIR* dir = opendir(path.c_str());
  if (!dir) return nullptr;
  FileWrapper::Children children;
  while (dirent* entry = readdir(dir)) {
    std::string childName = entry->d_name;
    if (!isSafeFileName(childName)) continue;
    if (auto child = readPath(path + "/" + childName, depth + 1))
      children.emplace(childName, child);
  }
  closedir(dir);
  auto wrapper = FileWrapper::initDirectoryWithFileWrappers(children);
  wrapper->setFilename(name);
  wrapper->setPreferredFilename(name);
  return wrapper;
}

void putWord(Data& out, std::uint32_t v) {
  for (int i = 0; i < 4; ++i) out.push_back(static_cast<std::uint8_t>(v >> (8 * i)));
}

// The size of the record of `w`; nullopt when a file or record is too large for the
// 32-bit form.
std::optional<std::uint64_t> recordSize(const FileWrapper& w) {
  if (const auto& contents = w.regularFileContents()) {
    if (contents->size() > 0xFFFFFFFFu) return std::nullopt;
    return (contents->size() >= kLongLength ? 16 : 8) + contents->size();
  }
  std::uint64_t size = 8;
  for (const auto& [name, child] : w.fileWrappers()) {
    auto childSize = recordSize(*child);
    if (!childSize || *childSize > 0xFFFFFFFFu) return std::nullopt;
    size += 4 + name.size() + 4 + *childSize;
  }
  return size;
}

// Appends the record of `w`, whose size recordSize has vouched for.
void putRecord(Data& out, const FileWrapper& w) {
  if (const auto& contents = w.regularFileContents()) {
    putWord(out, kRecordFile);
    auto size = static_cast<std::uint32_t>(contents->size());
    if (size >= kLongLength) {
      putWord(out, kLongLength);
      putWord(out, size);
      putWord(out, 0);  // no padding
    } else {
      putWord(out, size);
    }
    out.insert(out.end(), contents->begin(), contents->end());
    return;
  }
  const auto& children = w.fileWrappers();
  putWord(out, kRecordDirectory);
  putWord(out, static_cast<std::uint32_t>(children.size()));
  for (const auto& [name, child] : children) {
    putWord(out, static_cast<std::uint32_t>(name.size()));
    out.insert(out.end(), name.begin(), name.end());
  }
  for (const auto& [name, child] : children)
    putWord(out, static_cast<std::uint32_t>(*recordSize(*child)));
  for (const auto& [name, child] : children) putRecord(out, *child);
}

// A bounds-checked reader over a byte span.
class Reader {
 public:
  Reader(const std::uint8_t* p, std::size_t n) : p_(p), n_(n) {}
  bool word(std::uint32_t* v) {
    if (n_ - pos_ < 4) return false;
    *v = 0;
    for (int i = 0; i < 4; ++i) *v |= static_cast<std::uint32_t>(p_[pos_ + i]) << (8 * i);
    pos_ += 4;
    return true;
  }
  bool bytes(std::size_t count, const std::uint8_t** at) {
    if (n_ - pos_ < count) return false;
    *at = p_ + pos_;
    pos_ += count;
    return true;
  }
  std::size_t remaining() const { return n_ - pos_; }

 private:
  const std::uint8_t* p_;
  std::size_t n_;
  std::size_t pos_ = 0;
};

std::shared_ptr<FileWrapper> readRecord(Reader& in, int depth) {
  std::uint32_t type;
  if (depth > kMaxDepth || !in.word(&type)) return nullptr;
  if (type == kRecordFile) {
    std::uint32_t length;
    if (!in.word(&length)) return nullptr;
    if (length == kLongLength) {
      std::uint32_t padding;
      const std::uint8_t* skip;
      if (!in.word(&length) || !in.word(&padding) || !in.bytes(padding, &skip)) return nullptr;
    }
    const std::uint8_t* at;
    if (!in.bytes(length, &at)) return nullptr;
    return FileWrapper::initRegularFileWithContents(Data(at, at + length));
  }
  if (type != kRecordDirectory) return nullptr;
  std::uint32_t count;
  if (!in.word(&count) || count > in.remaining() / 8) return nullptr;
  std::vector<std::string> names(count);
  for (auto& name : names) {
    std::uint32_t length;
    const std::uint8_t* at;
    if (!in.word(&length) || !in.bytes(length, &at)) return nullptr;
    name.assign(reinterpret_cast<const char*>(at), length);
  }
  std::vector<std::uint32_t> sizes(count);
  for (auto& size : sizes)
    if (!in.word(&size)) return nullptr;
  FileWrapper::Children children;
  for (std::uint32_t i = 0; i < count; ++i) {
    const std::uint8_t* at;
    if (!in.bytes(sizes[i], &at)) return nullptr;
    if (isMetadataName(names[i]) || !isSafeFileName(names[i])) continue;
    Reader child(at, sizes[i]);
    std::uint32_t childType;
    Reader peek(at, sizes[i]);
    // Records of other kinds (links) are skipped; a broken file or directory is not.
    if (!peek.word(&childType) || (childType != kRecordFile && childType != kRecordDirectory))
      continue;
    auto wrapper = readRecord(child, depth + 1);
    if (!wrapper) return nullptr;
    wrapper->setFilename(names[i]);
    wrapper->setPreferredFilename(names[i]);
    children.emplace(names[i], wrapper);
  }
  return FileWrapper::initDirectoryWithFileWrappers(children);
}

bool writeChildren(const FileWrapper& w, const std::string& path);

bool writeTree(const FileWrapper& w, const std::string& path) {
  if (const auto& contents = w.regularFileContents()) return writeFileAtomically(path, *contents);
  return mkdir(path.c_str(), 0777) == 0 && writeChildren(w, path);
}

// Writes the children of directory `w` into the existing directory `path` and flushes
// its entries.
bool writeChildren(const FileWrapper& w, const std::string& path) {
  for (const auto& [name, child] : w.fileWrappers())
    if (!writeTree(*child, path + "/" + name)) return false;
  return syncDirectory(path);
}

}  // namespace

bool isSafeFileName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." &&
         name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

std::shared_ptr<FileWrapper> FileWrapper::initWithPath(const std::string& path) {
  try {
    return readPath(path, 0);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}

std::shared_ptr<FileWrapper> FileWrapper::initRegularFileWithContents(Data contents) {
  auto w = FileWrapperAccess::make();
  w->contents_ = std::move(contents);
  return w;
}

std::shared_ptr<FileWrapper> FileWrapper::initDirectoryWithFileWrappers(const Children& children) {
  auto w = FileWrapperAccess::make();
  w->contents_.reset();
  for (const auto& [name, child] : children) {
    if (!child || !isSafeFileName(name)) continue;
    child->filename_ = name;
    if (!child->preferredFilename_) child->preferredFilename_ = name;
    w->children_.emplace(name, child);
  }
  return w;
}

std::shared_ptr<FileWrapper> FileWrapper::initWithSerializedRepresentation(const Data& bytes) {
  try {
    Reader in(bytes.data(), bytes.size());
    const std::uint8_t* magic;
    std::uint32_t zero;
    if (!in.bytes(4, &magic) || !std::equal(magic, magic + 4, kMagic) || !in.word(&zero))
      return nullptr;
    return readRecord(in, 0);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}

std::string FileWrapper::addFileWrapper(std::shared_ptr<FileWrapper> child) {
  if (!child) return {};
  std::string name = child->preferredFilename().value_or(child->filename().value_or(""));
  return addFileWrapper(std::move(child), name);
}

std::string FileWrapper::addFileWrapper(std::shared_ptr<FileWrapper> child,
                                        const std::string& name) {
  if (!isDirectory() || !child || !isSafeFileName(name)) return {};
  std::string unique = name;
  std::string stem = deletingPathExtension(name);
  std::string extension = name.substr(stem.size());  // with its dot
  // Probing resumes where the last child asking for this name stopped, so adding many
  // children under one name stays linear.
  int& n = nextSuffix_[name];
  if (n < 2) n = 2;
  for (; children_.count(unique); ++n) unique = stem + " " + std::to_string(n) + extension;
  child->filename_ = unique;
  if (!child->preferredFilename_) child->preferredFilename_ = unique;
  children_.emplace(unique, std::move(child));
  return unique;
}

bool FileWrapper::removeFileWrapper(const std::string& name) { return children_.erase(name) > 0; }

bool FileWrapper::writeToPath(const std::string& path) const {
  if (contents_) return writeFileAtomically(path, *contents_);
  namespace fs = std::filesystem;
  std::error_code ec;
  fs::path target(path);
  while (target.has_relative_path() && target.filename().empty()) target = target.parent_path();
  fs::path parent = target.parent_path().empty() ? fs::path(".") : target.parent_path();
  // A fresh name made with mkdir, which applies the umask as an ordinary mkdir would
  // (mkdtemp makes it private, and asking umask for the mask changes it process-wide).
  std::string staging;
  bool made = false;
  for (int attempt = 0; !made && attempt < 16; ++attempt) {
    staging = detail::uniqueSibling(target.string(), attempt);
    made = mkdir(staging.c_str(), 0777) == 0;
    if (!made && errno != EEXIST) return false;
  }
  if (!made) return false;
  bool ok = writeChildren(*this, staging);
  if (ok) {
    if (!fs::exists(fs::symlink_status(target, ec))) {
      ok = std::rename(staging.c_str(), target.c_str()) == 0;
    } else {
      // Swap the new tree in, then the old one (now at the staging name) goes.
      ok = renameat2(AT_FDCWD, staging.c_str(), AT_FDCWD, target.c_str(), RENAME_EXCHANGE) == 0;
    }
  }
  fs::remove_all(staging, ec);
  return ok && syncDirectory(parent.string());
}

Data FileWrapper::serializedRepresentation() const {
  try {
    auto size = recordSize(*this);
    if (!size) return {};
    Data out;
    out.reserve(8 + *size);
    for (char c : kMagic) out.push_back(static_cast<std::uint8_t>(c));
    putWord(out, 0);
    putRecord(out, *this);
    return out;
  } catch (const std::bad_alloc&) {
    return {};
  }
}

}  // namespace corvel
