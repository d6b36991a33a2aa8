// Uniform type identifiers: the registry of declared types, their conformance, their
// filename extensions and MIME types, and the type of a file on disk.
//
// Identifiers are reverse-DNS strings ("public.jpeg"). The registry starts with the public
// system types a document application meets and this library's own item kinds; a host adds
// its own declarations at run time (`declare`, `loadDeclarations`). Identifiers and tags
// (extensions, MIME types) are compared without regard to ASCII case everywhere.
//
// Example:
//   auto& types = corvel::TypeRegistry::shared();
//   types.conformsTo("public.jpeg", "public.image");      // true
//   types.typeForFilenameExtension("PNG");                // "public.png"
//   types.typeForFilenameExtension("sql");                // "dyn.ah62d4rv4ge81g6pq"
//
// Thread safety: every member may be called from any thread at any time; declarations
// added while another thread queries become visible atomically, one declaration at a time.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "Corvelbase/Export.h"

namespace corvel {

// One type as a declaration states it. Parents, extensions and MIME types keep their
// order: the first extension and MIME type are the preferred ones.
struct CORVEL_EXPORT TypeDeclaration {
  std::string identifier;
  std::vector<std::string> conformsTo;
  std::vector<std::string> filenameExtensions;  // without the dot
  std::vector<std::string> mimeTypes;
  std::string description;

  friend bool operator==(const TypeDeclaration&, const TypeDeclaration&) = default;
};

class CORVEL_EXPORT TypeRegistry {
 public:
  // The process-wide registry, created on first use (thread-safe) and never destroyed.
  static TypeRegistry& shared();

  // A registry holding the built-in declarations only; for hosts and tests that want a
  // private one. Not copyable (it owns a lock).
  TypeRegistry();
  ~TypeRegistry();
  TypeRegistry(const TypeRegistry&) = delete;
  TypeRegistry& operator=(const TypeRegistry&) = delete;

  // Transitive conformance; identifiers compared without regard to case; a type conforms
  // to itself. Unknown identifiers conform only to themselves (dyn. ones also to public.data
  // and public.item, as the platform does). Cycles in declarations are harmless.
  bool conformsTo(std::string_view type, std::string_view parent) const;

  // Equality of identifiers without regard to ASCII case. Two empty strings are equal.
  bool equal(std::string_view a, std::string_view b) const;

  // The type for a filename extension (without the dot, any case); a dynamic "dyn.a..."
  // identifier when no declared type claims it. When several types claim an extension the
  // one declared first wins (the built-in public types come first). An empty extension gives
  // the dynamic identifier of the empty tag, which conforms to public.data like any other.
  std::string typeForFilenameExtension(std::string_view extension) const;

  // The type for a MIME type (any case, parameters such as "; charset=utf-8" ignored); a
  // dynamic identifier when no declared type claims it.
  std::string typeForMIMEType(std::string_view mimeType) const;

  // The first declared extension / MIME type of a type, or nullopt when it has none or is
  // unknown. A dynamic identifier made from an extension or MIME type gives that tag back.
  std::optional<std::string> preferredFilenameExtension(std::string_view type) const;
  std::optional<std::string> preferredMIMEType(std::string_view type) const;

  // Every type `type` conforms to, itself first (as given), then its ancestors nearest
  // first, each once, in the declared spelling. An unknown identifier gives just itself
  // (a dynamic one also public.data and public.item).
  std::vector<std::string> supertypes(std::string_view type) const;

  // The declaration of a type, or nullopt when it is not declared.
  std::optional<TypeDeclaration> declaration(std::string_view type) const;
  bool isDeclared(std::string_view type) const { return declaration(type).has_value(); }

  // Adds a declaration, or replaces the one with the same identifier (any case). Tags a
  // declaration claims that an earlier type already claims stay with the earlier type.
  // Returns false, changing nothing, when the identifier is empty.
  bool declare(TypeDeclaration declaration);

  // Reads declarations from a property list file (XML or binary): either a dictionary with
  // "UTExportedTypeDeclarations" and/or "UTImportedTypeDeclarations" arrays (the form of an
  // application's Info.plist) or a bare array of declarations. Each declaration is a
  // dictionary with "UTTypeIdentifier", "UTTypeConformsTo" (string or array),
  // "UTTypeDescription" and "UTTypeTagSpecification" holding "public.filename-extension" and
  // "public.mime-type" (string or array). Returns the number of declarations added; entries
  // without an identifier are skipped. nullopt (and nothing added) when the file cannot be
  // read or is not such a property list.
  std::optional<std::size_t> loadDeclarations(const std::string& path);

  // The dynamic identifier for an undeclared tag, e.g. dynamicIdentifier("1", "sql") for
  // the extension "sql". `tagClass` is "1" (filename extension) or "3" (MIME type).
  static std::string dynamicIdentifier(std::string_view tagClass, std::string_view tag);

  // Whether `type` begins with "dyn." (case-sensitive, as identifiers are minted).
  static bool isDynamic(std::string_view type);

 private:
  struct State;
  std::unique_ptr<State> state_;
};

// The workspace's type of a file (by extension; directories are public.folder except the
// known package extensions); nullopt when the path does not exist or cannot be read.
// A regular file without an extension is public.data. A directory whose extension names a
// type conforming to com.apple.package (rtfd, textbundle, or one a host declared) is of
// that type. Symbolic links are followed.
CORVEL_EXPORT std::optional<std::string> typeOfFile(const std::string& path);

}  // namespace corvel
