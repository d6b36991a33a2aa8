#include "Corvelbase/platform/KeyedArchive.h"

#include <set>
#include <variant>

#include "Corvelbase/platform/PropertyList.h"

namespace corvel::KeyedArchive {

namespace {

using Uid = PropertyList::Uid;
using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;

constexpr std::uint64_t kArchiveVersion = 100000;
const char kArchiverName[] = "NSKeyedArchiver";
// Nesting deeper than any archive of a flat dictionary needs is refused.
constexpr int kMaxDepth = 64;

PropertyList classDescription(std::initializer_list<const char16_t*> chain) {
  Array classes;
  for (const char16_t* name : chain) classes.emplace_back(String(name));
  return Dictionary{{"$classname", String(*chain.begin())}, {"$classes", std::move(classes)}};
}

bool fail(std::string* error, const std::string& reason) {
  if (error) *error = reason;
  return false;
}

// What an archived object decodes to, as far as this reader needs.
struct Decoded {
  std::variant<String, Data, StringDataDictionary> value;
};

class Reader {
 public:
  Reader(const Array& objects, std::string* error) : objects_(objects), error_(error) {}

  std::optional<Decoded> decode(const PropertyList& reference, int depth) {
    const Uid* uid = reference.uid();
    if (!uid) return failed("an object reference is not a UID");
    if (uid->value == 0) return failed("a required object is nil");
    if (uid->value >= objects_.size()) return failed("a UID points past the object table");
    if (depth > kMaxDepth || !inProgress_.insert(uid->value).second) {
      return failed("the archive refers to itself in a cycle");
    }
    auto result = decodeObject(objects_[uid->value], depth);
    inProgress_.erase(uid->value);
    return result;
  }

 private:
  std::optional<Decoded> failed(const std::string& reason) {
    fail(error_, reason);
    return std::nullopt;
  }

  std::optional<Decoded> decodeObject(const PropertyList& object, int depth) {
    if (auto s = object.string()) return Decoded{*s};
    if (auto d = object.data()) return Decoded{*d};
    const Dictionary* dict = object.dictionary();
    if (!dict) return failed("an archived object is of a class that is not allowed");
    auto className = classNameOf(*dict);
    if (!className) return std::nullopt;
    if (*className == "NSData" || *className == "NSMutableData") {
      const PropertyList* bytes = object.find("NS.data");
      if (!bytes || !bytes->data()) return failed("archived data has no bytes");
      return Decoded{*bytes->data()};
    }
    if (*className == "NSString" || *className == "NSMutableString") {
      const PropertyList* text = object.find("NS.string");
      if (!text || !text->string()) return failed("an archived string has no text");
      return Decoded{*text->string()};
    }
    return decodeDictionary(object, depth);
  }

  // The class of an archived object, when it is one of the allowed ones.
  std::optional<std::string> classNameOf(const Dictionary& object) {
    auto it = object.find("$class");
    if (it == object.end() || !it->second.uid() || it->second.uid()->value == 0 ||
        it->second.uid()->value >= objects_.size()) {
      fail(error_, "an archived object has no valid class reference");
      return std::nullopt;
    }
    const PropertyList* name = objects_[it->second.uid()->value].find("$classname");
    if (!name || !name->string()) {
      fail(error_, "a class description has no name");
      return std::nullopt;
    }
    std::string className = toUTF8(*name->string());
    static const std::set<std::string> kAllowed = {"NSDictionary", "NSMutableDictionary",
                                                   "NSData",       "NSMutableData",
                                                   "NSString",     "NSMutableString"};
    if (!kAllowed.count(className)) {
      fail(error_, "the class \"" + className + "\" is not allowed");
      return std::nullopt;
    }
    return className;
  }

  std::optional<Decoded> decodeDictionary(const PropertyList& object, int depth) {
    const PropertyList* keys = object.find("NS.keys");
    const PropertyList* values = object.find("NS.objects");
    if (!keys || !values || !keys->array() || !values->array() ||
        keys->array()->size() != values->array()->size()) {
      return failed("an archived dictionary's keys and objects do not pair up");
    }
    StringDataDictionary out;
    for (std::size_t i = 0; i < keys->array()->size(); ++i) {
      auto key = decode((*keys->array())[i], depth + 1);
      if (!key) return std::nullopt;
      auto value = decode((*values->array())[i], depth + 1);
      if (!value) return std::nullopt;
      const String* keyText = std::get_if<String>(&key->value);
      const Data* bytes = std::get_if<Data>(&value->value);
      if (!keyText) return failed("a dictionary key is not a string");
      if (!bytes) return failed("a dictionary value is not data");
      out[toUTF8(*keyText)] = *bytes;
    }
    return Decoded{std::move(out)};
  }

  const Array& objects_;
  std::string* error_;
  std::set<std::uint64_t> inProgress_;
};

// XML property lists spell a UID as {"CF$UID": n}; turn those into UIDs.
void restoreUids(PropertyList& value) {
  if (auto dict = value.dictionary()) {
    if (dict->size() == 1 && dict->begin()->first == "CF$UID" &&
        std::holds_alternative<std::uint64_t>(dict->begin()->second.value())) {
      value = PropertyList(Uid{std::get<std::uint64_t>(dict->begin()->second.value())});
      return;
    }
    for (auto& [key, child] : *dict) restoreUids(child);
  } else if (auto array = value.array()) {
    for (auto& child : *array) restoreUids(child);
  }
}

}  // namespace

std::optional<Data> archiveDictionary(const StringDataDictionary& dictionary, std::string* error) {
  for (const auto& [key, value] : dictionary) {
    // Property lists keep text as C strings, and a key must come back as it went in.
    if (key.find('\0') != std::string::npos) {
      fail(error, "a key holds U+0000, which a property list cannot carry");
      return std::nullopt;
    }
    if (toUTF8(fromUTF8(key)) != key) {
      fail(error, "a key is not UTF-8");
      return std::nullopt;
    }
  }
  // Object table: "$null", the dictionary, its keys, its values, its class description.
  Array objects;
  objects.emplace_back(String(u"$null"));
  objects.emplace_back();  // the dictionary, filled in below
  Array keyRefs, valueRefs;
  for (const auto& [key, value] : dictionary) {
    keyRefs.emplace_back(Uid{objects.size()});
    objects.emplace_back(fromUTF8(key));
  }
  for (const auto& [key, value] : dictionary) {
    valueRefs.emplace_back(Uid{objects.size()});
    objects.emplace_back(value);
  }
  Uid classRef{objects.size()};
  objects.push_back(classDescription({u"NSMutableDictionary", u"NSDictionary", u"NSObject"}));
  objects[1] = Dictionary{
      {"NS.keys", std::move(keyRefs)}, {"NS.objects", std::move(valueRefs)}, {"$class", classRef}};
  PropertyList archive = Dictionary{{"$archiver", fromUTF8(kArchiverName)},
                                    {"$version", kArchiveVersion},
                                    {"$top", Dictionary{{"root", Uid{1}}}},
                                    {"$objects", std::move(objects)}};
  auto bytes = archive.serialize(PropertyList::Format::Binary);
  if (!bytes) fail(error, "the property list could not be written");
  return bytes;
}

std::optional<StringDataDictionary> unarchiveDictionary(const Data& bytes, std::string* error) {
  auto plist = PropertyList::deserialize(bytes);
  if (!plist) {
    fail(error, "the data is not a property list");
    return std::nullopt;
  }
  restoreUids(*plist);
  const PropertyList* archiver = plist->find("$archiver");
  const PropertyList* top = plist->find("$top");
  const PropertyList* objects = plist->find("$objects");
  if (!archiver || !archiver->string() || toUTF8(*archiver->string()) != kArchiverName || !top ||
      !objects || !objects->array()) {
    fail(error, "the property list is not a keyed archive");
    return std::nullopt;
  }
  const PropertyList* root = top->find("root");
  if (!root) {
    fail(error, "the archive has no root object");
    return std::nullopt;
  }
  Reader reader(*objects->array(), error);
  auto decoded = reader.decode(*root, 0);
  if (!decoded) return std::nullopt;
  if (auto dict = std::get_if<StringDataDictionary>(&decoded->value)) return std::move(*dict);
  fail(error, "the archive's root is not a dictionary");
  return std::nullopt;
}

}  // namespace corvel::KeyedArchive
