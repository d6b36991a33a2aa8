// Reducing pictures to a smaller size by area means, a row at a time, so that a large
// picture can be reduced while it is decoded without ever being held at full size.
#include <algorithm>
#include <cmath>

#include "platform/image/BitmapNative.h"

namespace corvel {

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
  // One column more than the source has, always zero: see flush().
  columnSums_.assign((std::size_t{width} + 1) * static_cast<std::size_t>(channels), 0);
  columnReciprocal_.resize(size.width);
  for (std::uint32_t j = 0; j < size.width; ++j) {
    std::uint32_t span = firstColumn_[j + 1] - firstColumn_[j];
    columnReciprocal_[j] = 1.0 / span;
    atMostTwoColumns_ = atMostTwoColumns_ && span <= 2;
  }
  lineBytes_.resize(size.width);
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
  for (std::size_t i = 0, n = std::size_t{width_} * static_cast<std::size_t>(channels_); i < n;
       ++i) {
    sums[i] += row[i];
  }
  if (nextRow_ == height_) flush();
}

void RowReducer::flush() {
  if (rowsInTarget_ == 0) return;
  l_uint32* line = pixGetData(out_) + static_cast<std::size_t>(currentTarget_) *
                                          static_cast<std::size_t>(pixGetWpl(out_));
  // Sums are whole numbers far below 2^52, so the product with the reciprocals of the
  // block's width and height rounds as the exact quotient would.
  double rowReciprocal = 1.0 / rowsInTarget_;
  const std::uint32_t* sums = columnSums_.data();
  if (channels_ == 1 && atMostTwoColumns_) {
    // The common case of a grey page reduced to more than half its size, kept lean:
    // the second column is added with a weight of 0 or 1 rather than by a branch on the
    // block's width, which follows no pattern a predictor learns (past the last column
    // it reads the spare zero column), and the bytes are packed into words afterwards.
    std::uint8_t* bytes = lineBytes_.data();
    for (std::uint32_t j = 0; j < size_.width; ++j) {
      std::uint32_t first = firstColumn_[j];
      std::uint32_t sum = sums[first] + sums[first + 1] * (firstColumn_[j + 1] - first - 1);
      bytes[j] = static_cast<std::uint8_t>(sum * columnReciprocal_[j] * rowReciprocal + 0.5);
    }
    std::uint32_t words = size_.width / 4;
    for (std::uint32_t k = 0; k < words; ++k) {
      line[k] = (l_uint32{bytes[4 * k]} << 24) | (l_uint32{bytes[4 * k + 1]} << 16) |
                (l_uint32{bytes[4 * k + 2]} << 8) | bytes[4 * k + 3];
    }
    for (std::uint32_t j = words * 4; j < size_.width; ++j) SET_DATA_BYTE(line, j, bytes[j]);
    std::fill(columnSums_.begin(), columnSums_.end(), 0);
    rowsInTarget_ = 0;
    return;
  }
  auto channels = static_cast<std::size_t>(channels_);
  for (std::uint32_t j = 0; j < size_.width; ++j) {
    std::uint32_t first = firstColumn_[j], span = firstColumn_[j + 1] - first;
    double reciprocal = columnReciprocal_[j] * rowReciprocal;
    const std::uint32_t* block = sums + std::size_t{first} * channels;
    std::uint64_t sum[4] = {0, 0, 0, 0};
    if (atMostTwoColumns_) {
      for (std::size_t c = 0; c < channels; ++c) {
        sum[c] = block[c] + std::uint64_t{block[channels + c]} * (span - 1);
      }
    } else {
      for (std::size_t k = 0; k < span * channels; ++k) sum[k % channels] += block[k];
    }
    auto mean = [&](std::size_t c) {
      return static_cast<l_uint32>(static_cast<double>(sum[c]) * reciprocal + 0.5);
    };
    if (channels_ == 1) {
      SET_DATA_BYTE(line, j, mean(0));
    } else {
      line[j] = (mean(0) << 24) | (mean(1) << 16) | (mean(2) << 8) | mean(3);
    }
  }
  std::fill(columnSums_.begin(), columnSums_.end(), 0);
  rowsInTarget_ = 0;
}

PIX* createReduced(ReducedSize size, int channels, int xResolution, int yResolution) {
  PIX* out = createPagePix(size.width, size.height, channels == 1 ? 8 : 32);
  if (!out) return nullptr;
  if (channels == 4) pixSetSpp(out, 4);
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
