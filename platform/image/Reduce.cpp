// Reducing pictures to a smaller size by area means, a row at a time, so that a large
// picture can be reduced while it is decoded without ever being held at full size.
#include <sys/mman.h>

#include <algorithm>
#include <cmath>

#include "platform/image/BitmapNative.h"

namespace corvel {

// A scanned page is several megabytes of fresh memory, and the first write to each 4 KiB
// page of it costs a fault into the kernel: on a virtual machine that is as much time as
// decoding the page. Asking for huge pages over the part of the buffer that spans whole
// 2 MiB blocks makes that a handful of faults. Only advice: where the kernel offers no
// huge pages it changes nothing.
void adviseHugePages(void* buffer, std::size_t size) {
  constexpr std::uintptr_t kHugePage = std::uintptr_t{2} << 20;
  auto begin = (reinterpret_cast<std::uintptr_t>(buffer) + kHugePage - 1) & ~(kHugePage - 1);
  auto end = (reinterpret_cast<std::uintptr_t>(buffer) + size) & ~(kHugePage - 1);
  if (end > begin) madvise(reinterpret_cast<void*>(begin), end - begin, MADV_HUGEPAGE);
}

std::optional<ReducedSize> reducedSizeFor(std::uint32_t width, std::uint32_t height,
                                          std::uint32_t maxLongSide) {
  std::uint32_t longSide = std::max(width, height);
  if (maxLongSide == 0 || width == 0 || height == 0 || longSide <= maxLongSide) return std::nullopt;
  double scale = static_cast<double>(maxLongSide) / longSide;
  auto side = [&](std::uint32_t n) {
    return std::clamp<std::uint32_t>(static_cast<std::uint32_t>(std::floor(n * scale)), 1,
                                     maxLongSide);
  };
  return ReducedSize{side(width), side(height), scale};
}

RowReducer::RowReducer(std::uint32_t width, std::uint32_t height, ReducedSize size, int channels,
                       PIX* out)
    : width_(width), height_(height), size_(size), channels_(channels), out_(out) {
  // Source column x falls in target column x * targetWidth / width: every target pixel
  // is the mean of a block of whole source pixels, and blocks never overlap.
  firstColumn_.assign(size.width + 1, width);
  for (std::uint32_t x = width; x-- > 0;) {
    firstColumn_[static_cast<std::uint64_t>(x) * size.width / width] = x;
  }
  columnSums_.assign(static_cast<std::size_t>(width) * static_cast<std::size_t>(channels), 0);
  columnReciprocal_.resize(size.width);
  for (std::uint32_t j = 0; j < size.width; ++j) {
    columnReciprocal_[j] = 1.0 / (firstColumn_[j + 1] - firstColumn_[j]);
  }
}

void RowReducer::addRow(const std::uint8_t* row) {
  auto target =
      static_cast<std::uint32_t>(static_cast<std::uint64_t>(nextRow_) * size_.height / height_);
  if (target != currentTarget_) flush();
  currentTarget_ = target;
  ++rowsInTarget_;
  ++nextRow_;
  // Rows are summed column by column first (a loop the compiler vectorises); columns are
  // only combined once per target row.
  std::uint32_t* sums = columnSums_.data();
  for (std::size_t i = 0, n = columnSums_.size(); i < n; ++i) sums[i] += row[i];
  if (nextRow_ == height_) flush();
}

void RowReducer::flush() {
  if (rowsInTarget_ == 0) return;
  l_uint32* line = pixGetData(out_) + static_cast<std::size_t>(currentTarget_) *
                                          static_cast<std::size_t>(pixGetWpl(out_));
  // Sums are whole numbers far below 2^52, so the product with the reciprocals of the
  // block's width and height rounds as the exact quotient would.
  double rowReciprocal = 1.0 / rowsInTarget_;
  for (std::uint32_t j = 0; j < size_.width; ++j) {
    std::uint32_t first = firstColumn_[j], end = firstColumn_[j + 1];
    double reciprocal = columnReciprocal_[j] * rowReciprocal;
    auto mean = [&](std::uint64_t sum) {
      return static_cast<l_uint32>(static_cast<double>(sum) * reciprocal + 0.5);
    };
    if (channels_ == 1) {
      std::uint64_t sum = 0;
      for (std::uint32_t x = first; x < end; ++x) sum += columnSums_[x];
      SET_DATA_BYTE(line, j, mean(sum));
    } else {
      std::uint64_t sum[4] = {0, 0, 0, 0};
      for (std::uint32_t x = first; x < end; ++x) {
        const std::uint32_t* pixel = &columnSums_[static_cast<std::size_t>(x) * 4];
        sum[0] += pixel[0], sum[1] += pixel[1], sum[2] += pixel[2], sum[3] += pixel[3];
      }
      line[j] = (mean(sum[0]) << 24) | (mean(sum[1]) << 16) | (mean(sum[2]) << 8) | mean(sum[3]);
    }
  }
  std::fill(columnSums_.begin(), columnSums_.end(), 0);
  rowsInTarget_ = 0;
}

PIX* createReduced(ReducedSize size, int channels, int xResolution, int yResolution) {
  PIX* out = pixCreateNoInit(static_cast<l_int32>(size.width), static_cast<l_int32>(size.height),
                             channels == 1 ? 8 : 32);
  if (!out) return nullptr;
  if (channels == 4) pixSetSpp(out, 4);
  adviseHugePages(pixGetData(out), static_cast<std::size_t>(pixGetWpl(out)) * 4 * size.height);
  pixSetPadBits(out, 0);
  pixSetResolution(out, static_cast<l_int32>(std::lround(xResolution * size.scale)),
                   static_cast<l_int32>(std::lround(yResolution * size.scale)));
  return out;
}

PIX* reducePix(PIX* pix, std::uint32_t maxLongSide) {
  auto width = static_cast<std::uint32_t>(pixGetWidth(pix));
  auto height = static_cast<std::uint32_t>(pixGetHeight(pix));
  auto size = reducedSizeFor(width, height, maxLongSide);
  int depth = pixGetDepth(pix);
  if (!size || (depth != 1 && depth != 8 && depth != 32)) return nullptr;
  int channels = depth == 32 ? 4 : 1;
  PIX* out = createReduced(*size, channels, pixGetXRes(pix), pixGetYRes(pix));
  if (!out) return nullptr;
  // Rows go to the reducer in PNG's byte order: grey a byte per pixel (bilevel pixels
  // become black or white), colour as R, G, B, A.
  RowReducer reducer(width, height, *size, channels, out);
  std::vector<std::uint8_t> row(static_cast<std::size_t>(width) *
                                static_cast<std::size_t>(channels));
  bool alpha = pixGetSpp(pix) == 4;
  for (std::uint32_t y = 0; y < height; ++y) {
    const l_uint32* line =
        pixGetData(pix) + static_cast<std::size_t>(y) * static_cast<std::size_t>(pixGetWpl(pix));
    for (std::uint32_t x = 0; x < width; ++x) {
      if (depth == 1) {
        row[x] = GET_DATA_BIT(line, x) ? 0 : 255;
      } else if (depth == 8) {
        row[x] = static_cast<std::uint8_t>(GET_DATA_BYTE(line, x));
      } else {
        std::uint8_t* p = &row[static_cast<std::size_t>(x) * 4];
        p[0] = static_cast<std::uint8_t>(line[x] >> 24);
        p[1] = static_cast<std::uint8_t>(line[x] >> 16);
        p[2] = static_cast<std::uint8_t>(line[x] >> 8);
        p[3] = alpha ? static_cast<std::uint8_t>(line[x]) : 255;
      }
    }
    reducer.addRow(row.data());
  }
  if (channels == 4 && !alpha) pixSetSpp(out, 3);
  return out;
}

}  // namespace corvel
