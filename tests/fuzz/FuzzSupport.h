// What the harnesses share: invariant checks that stop the run with a message (libFuzzer
// then keeps the input), and a reader that takes parameters off the front of the input.
#pragma once

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#define FUZZ_CHECK(condition) \
  ((condition) ? (void)0 : corvel::fuzz::fail(#condition, __FILE__, __LINE__))

namespace corvel::fuzz {

[[noreturn]] inline void fail(const char* what, const char* file, int line) {
  std::fprintf(stderr, "%s:%d: invariant broken: %s\n", file, line, what);
  std::abort();
}

class Input {
 public:
  Input(const std::uint8_t* data, std::size_t size) : data_(data), size_(size) {}
  // The next byte, or 0 when the input is used up.
  std::uint8_t byte() { return size_ ? (--size_, *data_++) : 0; }
  std::uint16_t word() { return static_cast<std::uint16_t>(byte() << 8 | byte()); }
  // Everything left, as text.
  std::string rest() { return std::string(reinterpret_cast<const char*>(data_), size_); }

 private:
  const std::uint8_t* data_;
  std::size_t size_;
};

}  // namespace corvel::fuzz
