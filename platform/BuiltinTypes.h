// The public type declarations the registry starts with (internal to the platform layer).
#pragma once

#include <span>

namespace corvel::detail {

// One built-in declaration; lists are separated by single blanks, first entry preferred.
struct BuiltinType {
  const char* identifier;
  const char* conformsTo;
  const char* extensions;
  const char* mimeTypes;
  const char* description;
};

std::span<const BuiltinType> builtinTypes();

}  // namespace corvel::detail
