// Memory for the pixels of large pictures.
#include <sys/mman.h>

#include <cstdlib>

#include "platform/image/BitmapNative.h"

namespace corvel {

namespace {
constexpr std::size_t kHugePage = std::size_t{2} << 20;
}

// A scanned page is several megabytes of fresh memory, and the first write to each 4 KiB
// page of it costs a fault into the kernel: on a virtual machine that is as much time as
// decoding the page. Asking for huge pages over the part of the buffer that spans whole
// 2 MiB blocks makes that a handful of faults. Only advice: where the kernel offers no
// huge pages it changes nothing.
void adviseHugePages(void* buffer, std::size_t size) {
  auto begin = (reinterpret_cast<std::uintptr_t>(buffer) + std::uintptr_t{kHugePage} - 1) &
               ~(std::uintptr_t{kHugePage} - 1);
  auto end = (reinterpret_cast<std::uintptr_t>(buffer) + size) & ~(std::uintptr_t{kHugePage} - 1);
  if (end > begin) madvise(reinterpret_cast<void*>(begin), end - begin, MADV_HUGEPAGE);
}

PIX* createPagePix(std::uint32_t width, std::uint32_t height, int depth) {
  PIX* pix = pixCreateHeader(static_cast<l_int32>(width), static_cast<l_int32>(height), depth);
  if (!pix) return nullptr;
  std::size_t size = std::size_t{4} * static_cast<std::size_t>(pixGetWpl(pix)) * height;
  void* data = nullptr;
  // Whole huge pages need a buffer that starts on one.
  if (posix_memalign(&data, size >= kHugePage ? kHugePage : 64, size) != 0) {
    pixDestroy(&pix);
    return nullptr;
  }
  adviseHugePages(data, size);
  pixSetData(pix, static_cast<l_uint32*>(data));
  pixSetPadBits(pix, 0);
  return pix;
}

}  // namespace corvel
