// The `UTI` category: type tests on strings holding uniform type identifiers, and the
// type-identifier constants of the application's own item kinds and of a few outside
// formats.
//
// Every test maps both sides through `validUTIString` first, so a Finder text or picture
// clipping counts as the unknown item kind. Conformance and equality are those of
// `TypeRegistry::shared()` (case-insensitive, transitive). A nil argument (std::nullopt)
// makes every test answer false. All functions are safe to call from any thread.
#pragma once

#include <optional>
#include <string_view>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// The application's item kinds. Loading the library declares each of them in the shared
// type registry, conforming to public.item (the formatted note also to public.content).
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXDatabase;
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXGroup;
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXSheet;
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXSmartGroup;
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXPlaceholder;
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXFeed;
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXFormattedNote;
CORVEL_EXPORT extern const std::u16string_view kUTTypeRVMXUnknown;
// Outside formats the platform declares but names no constant for.
CORVEL_EXPORT extern const std::u16string_view kUTTypeMarkdown;
CORVEL_EXPORT extern const std::u16string_view kUTTypeAppleMail;
CORVEL_EXPORT extern const std::u16string_view kUTTypeWebInternetLocation;
CORVEL_EXPORT extern const std::u16string_view kUTTypeTextbundle;
CORVEL_EXPORT extern const std::u16string_view kUTTypeCompressedTextBundle;
CORVEL_EXPORT extern const std::u16string_view kUTTypeHEIC;
CORVEL_EXPORT extern const std::u16string_view kUTTypeURLName;

namespace UTI {

// The identifier to use in tests: kUTTypeRVMXUnknown when `uti` is exactly (case-sensitive)
// "com.apple.finder.textclipping" or "com.apple.finder.pictclipping", else `uti` itself.
CORVEL_EXPORT String validUTIString(const String& uti);

// True when `uti` conforms to `other` (both through validUTIString); false for nullopt.
// The two spellings differ only in where the argument came from on the platform.
CORVEL_EXPORT bool conformsToUTI(const String& uti, const std::optional<String>& other);
CORVEL_EXPORT bool conformsToUTIString(const String& uti, const std::optional<String>& other);

// True when `uti` equals `other` without regard to case (both through validUTIString);
// false for nullopt.
CORVEL_EXPORT bool isEqualToUTI(const String& uti, const std::optional<String>& other);
CORVEL_EXPORT bool isEqualToUTIString(const String& uti, const std::optional<String>& other);

// True when `uti` begins with "dyn." (case-sensitive).
CORVEL_EXPORT bool isDynamicUTI(const String& uti);

// True when `uti` equals public.rtf or com.apple.rtfd; a type that merely conforms to one
// of them is not an RTF kind.
CORVEL_EXPORT bool isRTFKindUTI(const String& uti);

}  // namespace UTI
}  // namespace corvel
