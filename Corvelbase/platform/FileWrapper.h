// File wrappers: a regular file or a directory of named children, held in memory.
//
// A regular-file wrapper carries its bytes; a directory wrapper maps names to child
// wrappers. Wrappers have identity and are shared (`std::shared_ptr`): an attachment
// hands out its wrapper, a directory holds its children. A wrapper is not locked; use it
// on one thread at a time.
//
// Names: `filename` is the name the wrapper had on disk or in its directory;
// `preferredFilename` is the name its owner would like it to have. Both may be absent
// (a wrapper made from bytes has neither until its owner sets one).
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

class CORVEL_EXPORT FileWrapper {
 public:
  using Children = std::map<std::string, std::shared_ptr<FileWrapper>>;

  // Reads the file or directory at `path` now, wholly into memory (nothing is mapped or
  // read later). `filename` and `preferredFilename` become the last path component. A
  // directory is read recursively; symbolic links, devices and sockets inside it are
  // left out, and so is anything deeper than 32 levels. nullptr when `path` does not
  // exist, is a symbolic link or special file, or cannot be read.
  static std::shared_ptr<FileWrapper> initWithPath(const std::string& path);
  // A regular file holding `contents`, without a name.
  static std::shared_ptr<FileWrapper> initRegularFileWithContents(Data contents);
  // A directory holding `children` under the map's names, which become the children's
  // filenames (and their preferredFilenames where they have none). Empty names, "." and
  // "..", names with '/' or NUL, and null children are left out.
  static std::shared_ptr<FileWrapper> initDirectoryWithFileWrappers(const Children& children);
  // The wrapper serialised by serializedRepresentation(); nullptr for bytes that are not
  // such a serialisation (truncated, lengths past the end, nesting deeper than 32).
  static std::shared_ptr<FileWrapper> initWithSerializedRepresentation(const Data& bytes);

  FileWrapper(const FileWrapper&) = delete;
  FileWrapper& operator=(const FileWrapper&) = delete;

  bool isRegularFile() const { return contents_.has_value(); }
  bool isDirectory() const { return !contents_.has_value(); }

  const std::optional<std::string>& filename() const { return filename_; }
  void setFilename(std::optional<std::string> name) { filename_ = std::move(name); }
  const std::optional<std::string>& preferredFilename() const { return preferredFilename_; }
  void setPreferredFilename(std::optional<std::string> name) {
    preferredFilename_ = std::move(name);
  }

  // The bytes of a regular file (a reference, valid while the wrapper lives); nullopt for
  // a directory.
  const std::optional<Data>& regularFileContents() const { return contents_; }
  // The children of a directory by name; empty for a regular file.
  const Children& fileWrappers() const { return children_; }

  // Adds `child` to this directory under its preferredFilename (else its filename),
  // made unique by " 2", " 3"... before the extension when the name is taken; the name
  // used becomes the child's filename (and its preferredFilename if it has none).
  // Returns that name, or "" when this is no directory, the child is null or has no
  // usable name (see initDirectoryWithFileWrappers).
  std::string addFileWrapper(std::shared_ptr<FileWrapper> child);
  // The same under `name` (made unique) instead of the child's own names.
  std::string addFileWrapper(std::shared_ptr<FileWrapper> child, const std::string& name);
  // Removes the child stored under `name`; false when there is none.
  bool removeFileWrapper(const std::string& name);

  // Writes the wrapper to `path`: a regular file atomically, a directory by writing the
  // whole tree beside `path` first and then swapping it in, so a reader sees the old
  // tree or the new one. An existing file or directory at `path` is replaced only when
  // the new one has been written in full; every file and directory is flushed to disk
  // before this returns, with the usual permissions (0666 and 0777 less the umask).
  // Returns false on any failure.
  bool writeToPath(const std::string& path) const;

  // A flat byte form of the wrapper and its children, for pasteboards: little-endian
  // 32-bit words, "rtfd", 0, then the record of this wrapper.
  Data serializedRepresentation() const;

 private:
  FileWrapper() = default;
  friend struct FileWrapperAccess;

  std::optional<Data> contents_;  // nullopt for a directory
  Children children_;
  std::optional<std::string> filename_;
  std::optional<std::string> preferredFilename_;
  std::map<std::string, int> nextSuffix_;  // per asked-for name, where uniquing goes on
};

// True for a name that can stand for one entry of a directory: not empty, not "." or
// "..", without '/' or NUL.
CORVEL_EXPORT bool isSafeFileName(std::string_view name);

}  // namespace corvel
