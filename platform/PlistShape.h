// Internal: a look at a property list's shape before libplist reads it.
//
// libplist 2.2 parses nested containers recursively, so a list nested a hundred thousand
// levels deep overflows the stack; it copies an object once for every reference to it, so a list of
// a few dozen bytes whose arrays each refer twice to the next expands into millions of nodes and
// minutes of work; and it asserts (aborting the process) on a dictionary key whose
// UTF-16 text holds U+0000. This walk sees both in time linear in the list's size, and
// refuses what libplist cannot be trusted with.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace corvel {

struct PlistLimits {
  std::uint64_t maxObjects;  // objects after libplist's expansion of shared references
  int maxDepth;              // containers inside containers
};

// Empty when libplist may read `bytes` (which start with "bplist00"); otherwise why
// not: a malformed trailer or object table, a reference cycle, nesting or expansion
// beyond `limits`, a dictionary key that is no string or holds U+0000, a date outside
// libplist's 32-bit seconds.
std::string binaryPlistRefusal(const std::uint8_t* bytes, std::size_t size,
                               const PlistLimits& limits);

// The same for an XML list: empty when its <array> and <dict> elements nest at most
// `limits.maxDepth` deep and it holds no NUL byte (never valid in XML, and libplist
// keeps it inside C strings). Comments and CDATA sections are not told apart, so tags
// inside them count too: this errs towards refusing.
std::string xmlPlistRefusal(const std::uint8_t* bytes, std::size_t size, const PlistLimits& limits);

}  // namespace corvel
