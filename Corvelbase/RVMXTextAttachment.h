// The base class of the library's own text attachments, with its export state `saving`.
//
// Subclasses (the pencil drawing and the scaled image) read `saving` in their overrides
// of fileWrapper(), contents() and image() to decide what they hand out:
//   0 (kSavingEditing)    normal editing; also any value other than 1 and 2
//   1 (kSavingWritingOut) cut, copy and save are writing the text out
//   2 (kSavingTextExport) the host exports plain text; the library never sets it
// The comparisons are exact equality with 1 and with 2. Like every attachment, not locked.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/TextAttachment.h"

namespace corvel {

inline constexpr std::int64_t kSavingEditing = 0;
inline constexpr std::int64_t kSavingWritingOut = 1;
inline constexpr std::int64_t kSavingTextExport = 2;

// Class names for isKindOfClass, so that the kind tests can name the subclasses.
inline constexpr std::string_view kRVMXTextAttachmentClassName = "RVMXTextAttachment";
inline constexpr std::string_view kRVMXScaledImageAttachmentClassName = "RVMXScaledImageAttachment";
inline constexpr std::string_view kRVPencilAttachmentClassName = "RVPencilAttachment";

class CORVEL_EXPORT RVMXTextAttachment : public TextAttachment {
 public:
  explicit RVMXTextAttachment(Passkey key) : TextAttachment(key) {}

  // As TextAttachment's initialisers, making an RVMXTextAttachment with `saving` 0.
  static std::shared_ptr<RVMXTextAttachment> init();
  static std::shared_ptr<RVMXTextAttachment> initWithData(std::optional<Data> contentData,
                                                          std::optional<std::string> uti);

  std::int64_t saving() const { return saving_; }
  void setSaving(std::int64_t saving) { saving_ = saving; }

  bool isKindOfClass(std::string_view className) const override;

 private:
  std::int64_t saving_ = kSavingEditing;
};

}  // namespace corvel
