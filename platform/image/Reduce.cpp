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
    packGreyRow(line, bytes, size_.width);
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

namespace {}  // namespace

void packGreyRow(l_uint32* line, const std::uint8_t* bytes, std::uint32_t width) {
  std::uint32_t words = width / 4;
  for (std::uint32_t k = 0; k < words; ++k) line[k] = bigEndian32(bytes + std::size_t{k} * 4);
  for (std::uint32_t x = words * 4; x < width; ++x) SET_DATA_BYTE(line, x, bytes[x]);
}

l_int32 dotsPerInch(std::uint32_t perMetre) { return static_cast<l_int32>(perMetre / 39.37 + 0.5); }

PictureBuilder::PictureBuilder(std::uint32_t width, std::uint32_t height, int channels, bool alpha,
                               std::uint32_t maxLongSide, l_int32 xResolution, l_int32 yResolution)
    : width_(width), channels_(channels) {
  auto reduced = reducedSizeFor(width, height, maxLongSide);
  double scale = reduced ? reduced->scale : 1.0;
  pix_ = reduced ? createPagePix(reduced->width, reduced->height, channels * 8)
                 : createPagePix(width, height, channels * 8);
  if (!pix_) return;
  // The resolution follows the size.
  pixSetResolution(pix_, static_cast<l_int32>(std::lround(xResolution * scale)),
                   static_cast<l_int32>(std::lround(yResolution * scale)));
  if (channels == 4) pixSetSpp(pix_, alpha ? 4 : 3);
  if (reduced) reducer_.emplace(width, height, *reduced, channels, pix_);
}

PictureBuilder::~PictureBuilder() { pixDestroy(&pix_); }

void PictureBuilder::addRow(const std::uint8_t* row) {
  if (reducer_) {
    reducer_->addRow(row);
    return;
  }
  l_uint32* line =
      pixGetData(pix_) + std::size_t{nextRow_++} * static_cast<std::size_t>(pixGetWpl(pix_));
  if (channels_ == 1) {
    packGreyRow(line, row, width_);
    return;
  }
  for (std::uint32_t x = 0; x < width_; ++x) line[x] = bigEndian32(row + std::size_t{x} * 4);
}

PIX* PictureBuilder::take() {
  PIX* pix = pix_;
  pix_ = nullptr;
  return pix;
}

PIX* reducePix(PIX* pix, std::uint32_t maxLongSide) {
  auto width = static_cast<std::uint32_t>(pixGetWidth(pix));
  auto height = static_cast<std::uint32_t>(pixGetHeight(pix));
  int depth = pixGetDepth(pix);
  if (!reducedSizeFor(width, height, maxLongSide) || (depth != 1 && depth != 8 && depth != 32)) {
    return nullptr;
  }
  int channels = depth == 32 ? 4 : 1;
  bool alpha = pixGetSpp(pix) == 4;
  PictureBuilder builder(width, height, channels, alpha, maxLongSide, pixGetXRes(pix),
                         pixGetYRes(pix));
  if (!builder.ready()) return nullptr;
  // Rows go to the builder in PNG's byte order: grey a byte per pixel (bilevel pixels
  // become black or white), colour as R, G, B, A.
  std::vector<std::uint8_t> row(std::size_t{width} * static_cast<std::size_t>(channels));
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
    builder.addRow(row.data());
  }
  return builder.take();
}

}  // namespace corvel
