#include "Corvelbase/UTI.h"

#include "Corvelbase/platform/TypeRegistry.h"

namespace corvel {

const std::u16string_view kUTTypeRVMXDatabase = u"com.corvelworks.tessel.database";
const std::u16string_view kUTTypeRVMXGroup = u"com.corvelworks.tessel.group";
const std::u16string_view kUTTypeRVMXSheet = u"com.corvelworks.tessel.sheet";
const std::u16string_view kUTTypeRVMXSmartGroup = u"com.corvelworks.tessel.smartgroup";
const std::u16string_view kUTTypeRVMXPlaceholder = u"com.corvelworks.tessel.placeholder";
const std::u16string_view kUTTypeRVMXFeed = u"com.corvelworks.tessel.feed";
const std::u16string_view kUTTypeRVMXFormattedNote = u"com.corvelworks.tessel.formattednote";
const std::u16string_view kUTTypeRVMXUnknown = u"com.corvelworks.tessel.unknown";
const std::u16string_view kUTTypeMarkdown = u"net.daringfireball.markdown";
const std::u16string_view kUTTypeAppleMail = u"com.apple.mail.email";
const std::u16string_view kUTTypeWebInternetLocation = u"com.apple.web-internet-location";
const std::u16string_view kUTTypeTextbundle = u"org.textbundle.package";
const std::u16string_view kUTTypeCompressedTextBundle = u"org.textbundle.compressed";
const std::u16string_view kUTTypeHEIC = u"public.heic";
const std::u16string_view kUTTypeURLName = u"public.url-name";

namespace {

constexpr std::u16string_view kTextClipping = u"com.apple.finder.textclipping";
constexpr std::u16string_view kPictClipping = u"com.apple.finder.pictclipping";
constexpr std::u16string_view kDynamicPrefix = u"dyn.";
constexpr std::u16string_view kRTF = u"public.rtf";
constexpr std::u16string_view kRTFD = u"com.apple.rtfd";
constexpr std::string_view kItem = "public.item";
constexpr std::string_view kContent = "public.content";

// The application's item kinds are its own declarations: made once, when the library
// loads, so that every caller of the shared registry sees them.
[[maybe_unused]] const bool kOwnTypesDeclared = [] {
  TypeRegistry& types = TypeRegistry::shared();
  for (std::u16string_view kind :
       {kUTTypeRVMXDatabase, kUTTypeRVMXGroup, kUTTypeRVMXSheet, kUTTypeRVMXSmartGroup,
        kUTTypeRVMXPlaceholder, kUTTypeRVMXFeed, kUTTypeRVMXUnknown})
    types.declare({toUTF8(kind), {std::string(kItem)}, {}, {}, ""});
  types.declare(
      {toUTF8(kUTTypeRVMXFormattedNote), {std::string(kItem), std::string(kContent)}, {}, {}, ""});
  return true;
}();

}  // namespace

namespace UTI {

String validUTIString(const String& uti) {
  if (uti == kTextClipping || uti == kPictClipping) return String(kUTTypeRVMXUnknown);
  return uti;
}

bool conformsToUTI(const String& uti, const std::optional<String>& other) {
  if (!other) return false;
  return TypeRegistry::shared().conformsTo(toUTF8(validUTIString(uti)),
                                           toUTF8(validUTIString(*other)));
}

bool conformsToUTIString(const String& uti, const std::optional<String>& other) {
  return conformsToUTI(uti, other);
}

bool isEqualToUTI(const String& uti, const std::optional<String>& other) {
  if (!other) return false;
  return TypeRegistry::shared().equal(toUTF8(validUTIString(uti)), toUTF8(validUTIString(*other)));
}

bool isEqualToUTIString(const String& uti, const std::optional<String>& other) {
  return isEqualToUTI(uti, other);
}

bool isDynamicUTI(const String& uti) { return uti.starts_with(kDynamicPrefix); }

bool isRTFKindUTI(const String& uti) {
  return isEqualToUTI(uti, String(kRTF)) || isEqualToUTI(uti, String(kRTFD));
}

}  // namespace UTI
}  // namespace corvel
