#include "Corvelbase/platform/TypeRegistry.h"

#include <sys/stat.h>
#include <unistd.h>

#include <deque>
#include <mutex>
#include <shared_mutex>
#include <unordered_map>
#include <unordered_set>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/PropertyList.h"
#include "platform/BuiltinTypes.h"

namespace corvel {

namespace {

constexpr std::string_view kDynamicPrefix = "dyn.";
constexpr std::string_view kDynamicMarker = "dyn.a";
constexpr std::string_view kDataType = "public.data";
constexpr std::string_view kFolderType = "public.folder";
constexpr std::string_view kPackageType = "com.apple.package";
// Tag classes inside a dynamic identifier: 0 conforms-to, 1 extension, 3 MIME type; the
// parent index 6 stands for public.data.
constexpr std::string_view kTagClassExtension = "1";
constexpr std::string_view kTagClassMIME = "3";
constexpr std::string_view kDataParentIndex = "6";
constexpr char kBase32[] = "abcdefghkmnpqrstuvwxyz0123456789";

std::string lower(std::string_view s) {
  std::string out(s);
  for (char& c : out)
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  return out;
}

std::vector<std::string> splitBlanks(const char* list) {
  std::vector<std::string> out;
  std::string_view rest(list);
  while (!rest.empty()) {
    std::size_t blank = rest.find(' ');
    if (blank != 0) out.emplace_back(rest.substr(0, blank));
    if (blank == std::string_view::npos) break;
    rest.remove_prefix(blank + 1);
  }
  return out;
}

std::string base32Encode(std::string_view bytes) {
  std::string out;
  unsigned buffer = 0;
  int bits = 0;
  for (unsigned char byte : bytes) {
    buffer = (buffer << 8) | byte;
    bits += 8;
    while (bits >= 5) {
      out += kBase32[(buffer >> (bits - 5)) & 31u];
      bits -= 5;
    }
  }
  if (bits > 0) out += kBase32[(buffer << (5 - bits)) & 31u];
  return out;
}

// nullopt when a character is outside the alphabet.
std::optional<std::string> base32Decode(std::string_view text) {
  std::string out;
  unsigned buffer = 0;
  int bits = 0;
  for (char c : text) {
    const char* at = std::char_traits<char>::find(kBase32, 32, c);
    if (at == nullptr) return std::nullopt;
    buffer = (buffer << 5) | static_cast<unsigned>(at - kBase32);
    bits += 5;
    if (bits >= 8) {
      out += static_cast<char>((buffer >> (bits - 8)) & 0xFFu);
      bits -= 8;
    }
  }
  return out;
}

// Separators of the dynamic form are escaped so that any tag round-trips.
std::string escapeTag(std::string_view tag) {
  std::string out;
  for (char c : tag) {
    if (c == ':' || c == '=' || c == '\\') out += '\\';
    out += c;
  }
  return out;
}

// The value of `tagClass` inside a decoded dynamic identifier text ("?0=6:1=sql").
std::optional<std::string> dynamicTag(std::string_view type, std::string_view tagClass) {
  if (type.substr(0, kDynamicMarker.size()) != kDynamicMarker) return std::nullopt;
  std::optional<std::string> text = base32Decode(type.substr(kDynamicMarker.size()));
  if (!text || text->empty() || (*text)[0] != '?') return std::nullopt;
  std::string key, value;
  bool inValue = false;
  auto finish = [&]() -> bool { return inValue && key == tagClass; };
  for (std::size_t i = 1; i < text->size(); ++i) {
    char c = (*text)[i];
    if (c == '\\' && i + 1 < text->size()) {
      (inValue ? value : key) += (*text)[++i];
    } else if (c == '=' && !inValue) {
      inValue = true;
    } else if (c == ':') {
      if (finish()) return value;
      key.clear(), value.clear(), inValue = false;
    } else {
      (inValue ? value : key) += c;
    }
  }
  if (finish()) return value;
  return std::nullopt;
}

std::string normalisedMIME(std::string_view mime) {
  std::size_t semicolon = mime.find(';');
  std::string_view bare = mime.substr(0, semicolon);
  while (!bare.empty() && bare.back() == ' ') bare.remove_suffix(1);
  while (!bare.empty() && bare.front() == ' ') bare.remove_prefix(1);
  return lower(bare);
}

std::vector<std::string> stringsOf(const PropertyList* value) {
  std::vector<std::string> out;
  if (value == nullptr) return out;
  if (const String* s = value->string()) out.push_back(toUTF8(*s));
  if (const PropertyList::Array* array = value->array())
    for (const PropertyList& item : *array)
      if (const String* s = item.string()) out.push_back(toUTF8(*s));
  return out;
}

std::optional<TypeDeclaration> declarationFromPlist(const PropertyList& entry) {
  std::vector<std::string> ids = stringsOf(entry.find("UTTypeIdentifier"));
  if (ids.empty() || ids.front().empty()) return std::nullopt;
  TypeDeclaration d;
  d.identifier = ids.front();
  d.conformsTo = stringsOf(entry.find("UTTypeConformsTo"));
  std::vector<std::string> description = stringsOf(entry.find("UTTypeDescription"));
  if (!description.empty()) d.description = description.front();
  if (const PropertyList* tags = entry.find("UTTypeTagSpecification")) {
    d.filenameExtensions = stringsOf(tags->find("public.filename-extension"));
    d.mimeTypes = stringsOf(tags->find("public.mime-type"));
  }
  return d;
}

}  // namespace

struct TypeRegistry::State {
  mutable std::shared_mutex mutex;
  std::vector<TypeDeclaration> declarations;
  std::unordered_map<std::string, std::size_t> byIdentifier;  // lower-case keys
  std::unordered_map<std::string, std::size_t> byExtension;
  std::unordered_map<std::string, std::size_t> byMIME;

  void index(std::size_t i) {
    const TypeDeclaration& d = declarations[i];
    byIdentifier[lower(d.identifier)] = i;
    for (const std::string& ext : d.filenameExtensions) byExtension.emplace(lower(ext), i);
    for (const std::string& mime : d.mimeTypes) byMIME.emplace(normalisedMIME(mime), i);
  }

  void reindex() {
    byIdentifier.clear(), byExtension.clear(), byMIME.clear();
    for (std::size_t i = 0; i < declarations.size(); ++i) index(i);
  }

  const TypeDeclaration* find(std::string_view type) const {
    auto it = byIdentifier.find(lower(type));
    return it == byIdentifier.end() ? nullptr : &declarations[it->second];
  }

  // Breadth-first walk over the parents, nearest first, each identifier once.
  std::vector<std::string> supertypes(std::string_view type) const {
    std::vector<std::string> out{std::string(type)};
    std::unordered_set<std::string> seen{lower(type)};
    for (std::size_t next = 0; next < out.size(); ++next) {
      std::vector<std::string> parents;
      if (const TypeDeclaration* d = find(out[next]))
        parents = d->conformsTo;
      else if (isDynamic(out[next]))
        parents = {std::string(kDataType)};
      for (std::string& parent : parents)
        if (seen.insert(lower(parent)).second) out.push_back(std::move(parent));
    }
    return out;
  }
};

TypeRegistry& TypeRegistry::shared() {
  static TypeRegistry* registry = new TypeRegistry();  // never destroyed: used at exit too
  return *registry;
}

TypeRegistry::TypeRegistry() : state_(std::make_unique<State>()) {
  for (const detail::BuiltinType& b : detail::builtinTypes()) {
    state_->declarations.push_back(TypeDeclaration{b.identifier, splitBlanks(b.conformsTo),
                                                   splitBlanks(b.extensions),
                                                   splitBlanks(b.mimeTypes), b.description});
  }
  state_->reindex();
}

TypeRegistry::~TypeRegistry() = default;

bool TypeRegistry::conformsTo(std::string_view type, std::string_view parent) const {
  if (equal(type, parent)) return true;
  std::shared_lock lock(state_->mutex);
  for (const std::string& ancestor : state_->supertypes(type))
    if (equal(ancestor, parent)) return true;
  return false;
}

bool TypeRegistry::equal(std::string_view a, std::string_view b) const {
  return a.size() == b.size() && lower(a) == lower(b);
}

std::string TypeRegistry::typeForFilenameExtension(std::string_view extension) const {
  std::string key = lower(extension);
  {
    std::shared_lock lock(state_->mutex);
    auto it = state_->byExtension.find(key);
    if (it != state_->byExtension.end()) return state_->declarations[it->second].identifier;
  }
  return dynamicIdentifier(kTagClassExtension, key);
}

std::string TypeRegistry::typeForMIMEType(std::string_view mimeType) const {
  std::string key = normalisedMIME(mimeType);
  {
    std::shared_lock lock(state_->mutex);
    auto it = state_->byMIME.find(key);
    if (it != state_->byMIME.end()) return state_->declarations[it->second].identifier;
  }
  return dynamicIdentifier(kTagClassMIME, key);
}

std::optional<std::string> TypeRegistry::preferredFilenameExtension(std::string_view type) const {
  std::shared_lock lock(state_->mutex);
  if (const TypeDeclaration* d = state_->find(type))
    return d->filenameExtensions.empty() ? std::nullopt
                                         : std::optional(d->filenameExtensions.front());
  return dynamicTag(type, kTagClassExtension);
}

std::optional<std::string> TypeRegistry::preferredMIMEType(std::string_view type) const {
  std::shared_lock lock(state_->mutex);
  if (const TypeDeclaration* d = state_->find(type))
    return d->mimeTypes.empty() ? std::nullopt : std::optional(d->mimeTypes.front());
  return dynamicTag(type, kTagClassMIME);
}

std::vector<std::string> TypeRegistry::supertypes(std::string_view type) const {
  std::shared_lock lock(state_->mutex);
  return state_->supertypes(type);
}

std::optional<TypeDeclaration> TypeRegistry::declaration(std::string_view type) const {
  std::shared_lock lock(state_->mutex);
  const TypeDeclaration* d = state_->find(type);
  return d ? std::optional(*d) : std::nullopt;
}

bool TypeRegistry::declare(TypeDeclaration declaration) {
  if (declaration.identifier.empty()) return false;
  std::unique_lock lock(state_->mutex);
  auto it = state_->byIdentifier.find(lower(declaration.identifier));
  if (it != state_->byIdentifier.end()) {
    state_->declarations[it->second] = std::move(declaration);
    state_->reindex();  // its tags may have changed
  } else {
    state_->declarations.push_back(std::move(declaration));
    state_->index(state_->declarations.size() - 1);
  }
  return true;
}

std::optional<std::size_t> TypeRegistry::loadDeclarations(const std::string& path) {
  std::optional<PropertyList> plist = PropertyList::readFromFile(path);
  if (!plist) return std::nullopt;
  std::vector<const PropertyList*> entries;
  auto collect = [&](const PropertyList* list) {
    if (list == nullptr || list->array() == nullptr) return;
    for (const PropertyList& entry : *list->array()) entries.push_back(&entry);
  };
  if (plist->array() != nullptr) {
    collect(&*plist);
  } else if (plist->dictionary() != nullptr) {
    const PropertyList* exported = plist->find("UTExportedTypeDeclarations");
    const PropertyList* imported = plist->find("UTImportedTypeDeclarations");
    if (exported == nullptr && imported == nullptr) return std::nullopt;
    collect(exported);
    collect(imported);
  } else {
    return std::nullopt;
  }
  std::size_t added = 0;
  for (const PropertyList* entry : entries)
    if (std::optional<TypeDeclaration> d = declarationFromPlist(*entry))
      added += declare(std::move(*d)) ? 1 : 0;
  return added;
}

std::string TypeRegistry::dynamicIdentifier(std::string_view tagClass, std::string_view tag) {
  std::string text = "?0=";
  text += kDataParentIndex;
  text += ':';
  text += escapeTag(tagClass);
  text += '=';
  text += escapeTag(tag);
  return std::string(kDynamicMarker) + base32Encode(text);
}

bool TypeRegistry::isDynamic(std::string_view type) {
  return type.substr(0, kDynamicPrefix.size()) == kDynamicPrefix;
}

std::optional<std::string> typeOfFile(const std::string& path) {
  struct stat info {};
  if (path.empty() || ::stat(path.c_str(), &info) != 0 || ::access(path.c_str(), R_OK) != 0)
    return std::nullopt;
  std::string extension = pathExtension(path);
  bool hasExtension = !extension.empty();

  TypeRegistry& types = TypeRegistry::shared();
  if (S_ISDIR(info.st_mode)) {
    if (hasExtension) {
      std::string type = types.typeForFilenameExtension(extension);
      if (!TypeRegistry::isDynamic(type) && types.conformsTo(type, kPackageType)) return type;
    }
    return std::string(kFolderType);
  }
  if (!hasExtension) return std::string(kDataType);
  return types.typeForFilenameExtension(extension);
}

}  // namespace corvel
