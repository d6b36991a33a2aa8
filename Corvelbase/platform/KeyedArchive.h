// Keyed archives of a dictionary from strings to data, in the desktop platform's
// keyed-archiver form: a binary property list with "$archiver" = "NSKeyedArchiver",
// "$version" = 100000, "$top" = {"root": UID 1} and the object table "$objects", whose
// dictionary refers to its keys and values by UID. These are the same bytes the
// platform's own archiver writes for such a dictionary, so its unarchiver reads them and
// ours reads its archives.
#pragma once

#include <map>
#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// Keys are UTF-8 text.
using StringDataDictionary = std::map<std::string, Data>;

namespace KeyedArchive {

// The archive of `dictionary` as a mutable dictionary (class NSMutableDictionary), its
// keys and data stored inline. On failure (a key that is not UTF-8 or holds U+0000, or
// more than a property list may hold) nullopt, with the reason in `error` if given.
CORVEL_EXPORT std::optional<Data> archiveDictionary(const StringDataDictionary& dictionary,
                                                    std::string* error = nullptr);

// Reads an archive whose root is a dictionary from strings to data, allowing only the
// classes NSDictionary, NSData and NSString and their mutable subclasses. Any other class,
// a key that is not a string, a value that is not data, a dangling or cyclic reference,
// and bytes that are no keyed archive (truncated, not a property list) give nullopt, with
// the reason in `error` if given. Binary and XML property lists are both read.
CORVEL_EXPORT std::optional<StringDataDictionary> unarchiveDictionary(const Data& bytes,
                                                                      std::string* error = nullptr);

}  // namespace KeyedArchive
}  // namespace corvel
