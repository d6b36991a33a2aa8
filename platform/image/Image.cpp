#include <tiffio.h>

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <mutex>

#include "Corvelbase/platform/Files.h"
#include "platform/image/BitmapNative.h"

namespace corvel {

namespace {

bool withinBudget(std::uint64_t width, std::uint64_t height) {
  return width > 0 && height > 0 && width * height <= kMaxImagePixels;
}

std::string formatName(l_int32 format) {
  switch (format) {
    case IFF_PNG:
      return "PNG";
    case IFF_JFIF_JPEG:
      return "JPEG";
    case IFF_GIF:
      return "GIF";
    case IFF_WEBP:
      return "WebP";
    case IFF_BMP:
      return "BMP";
    case IFF_PNM:
      return "PNM";
    default:
      return "TIFF";
  }
}

// Leptonica and libtiff report problems on stderr by default ("Bad file: amount too big",
// libtiff's "Not a TIFF file", libjpeg's words from inside a JPEG-compressed TIFF). While
// this thread decodes, their messages are collected for the failure reason instead;
// messages from any other use of the two libraries in the process go where they went
// before.
thread_local std::string* tCollected = nullptr;
TIFFErrorHandler gPreviousTiffError = nullptr;
TIFFErrorHandler gPreviousTiffWarning = nullptr;

void collect(const char* module, const char* format, va_list args) {
  if (!tCollected->empty()) return;  // the first message says the most
  char text[512];
  std::vsnprintf(text, sizeof text, format, args);
  *tCollected = module && *module ? std::string(module) + ": " + text : text;
}

void tiffError(const char* module, const char* format, va_list args) {
  if (tCollected) return collect(module, format, args);
  if (gPreviousTiffError) gPreviousTiffError(module, format, args);
}

void tiffWarning(const char* module, const char* format, va_list args) {
  if (!tCollected && gPreviousTiffWarning) gPreviousTiffWarning(module, format, args);
}

void leptonicaMessage(const char* text) {
  if (!tCollected) {
    std::fputs(text, stderr);
  } else if (tCollected->empty()) {
    std::string line = text;
    while (!line.empty() && (line.back() == '\n' || line.back() == ' ')) line.pop_back();
    *tCollected = line;
  }
}

std::string corruptOrTruncated(l_int32 format, const std::string& why) {
  return "the " + formatName(format) + " image is corrupt or truncated" +
         (why.empty() ? "" : " (" + why + ")");
}

// `bitmap` reduced to fit `maxLongSide`; itself when it fits or reducing fails.
std::shared_ptr<Bitmap> reducedBitmap(std::shared_ptr<Bitmap> bitmap, std::uint32_t maxLongSide) {
  PIX* reduced = bitmap ? reducePix(bitmap->native().pix, maxLongSide) : nullptr;
  return reduced ? bitmapFromPix(reduced, nullptr) : bitmap;
}

// The bitmap of encoded bytes; with a `maxLongSide`, reduced to fit (a PNG while it is
// decoded, anything else afterwards).
std::shared_ptr<Bitmap> decodeBytes(const Data& bytes, std::string* failure,
                                    std::uint32_t maxLongSide = 0, Size* fullSize = nullptr) {
  quietLeptonica();
  l_int32 format = IFF_UNKNOWN;
  if (bytes.size() < 12 || findFileFormatBuffer(bytes.data(), &format) != 0 ||
      format == IFF_UNKNOWN || format == IFF_SPIX || format == IFF_JP2 || format == IFF_PS ||
      format == IFF_LPDF || format == IFF_DEFAULT) {
    *failure = "the data is not an image in a supported format";
    return nullptr;
  }
  if (format == IFF_JFIF_JPEG) {
    std::uint32_t width = 0, height = 0;
    PIX* pix = decodeJPEG(bytes.data(), bytes.size(), maxLongSide, &width, &height, failure);
    if (!pix) return nullptr;
    if (fullSize) *fullSize = Size{static_cast<double>(width), static_cast<double>(height)};
    return reducedBitmap(bitmapFromPix(pix, failure), maxLongSide);
  }
  std::string said;
  Collecting collecting(&said);
  l_int32 width = 0, height = 0, bps = 0, spp = 0, colormapped = 0, headerFormat = 0;
  if (pixReadHeaderMem(bytes.data(), bytes.size(), &headerFormat, &width, &height, &bps, &spp,
                       &colormapped) != 0) {
    *failure = corruptOrTruncated(format, said);
    return nullptr;
  }
  if (width <= 0 || height <= 0) {
    *failure = "the image has no pixels";
    return nullptr;
  }
  if (!withinBudget(static_cast<std::uint64_t>(width), static_cast<std::uint64_t>(height))) {
    *failure = "the image is too large (" + std::to_string(width) + " x " + std::to_string(height) +
               " pixels; at most " + std::to_string(kMaxImagePixels / 1'000'000) + " megapixels)";
    return nullptr;
  }
  PIX* pix = format == IFF_PNG ? decodePNG(bytes.data(), bytes.size(), maxLongSide, failure)
                               : pixReadMem(bytes.data(), bytes.size());
  if (!pix) {
    if (format != IFF_PNG) *failure = corruptOrTruncated(format, said);
    return nullptr;
  }
  if (fullSize) *fullSize = Size{static_cast<double>(width), static_cast<double>(height)};
  // Reduced once the pixels are normal: colour maps and 16-bit samples are gone by then.
  return reducedBitmap(bitmapFromPix(pix, failure), maxLongSide);
}

std::string decodePercentEscapes(std::string_view text) {
  std::string out;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '%' && i + 2 < text.size() &&
        std::isxdigit(static_cast<unsigned char>(text[i + 1])) &&
        std::isxdigit(static_cast<unsigned char>(text[i + 2]))) {
      out += static_cast<char>(std::stoi(std::string(text.substr(i + 1, 2)), nullptr, 16));
      i += 2;
    } else {
      out += text[i];
    }
  }
  return out;
}

// The file path a URL names, or nullopt with the reason it names none we can read.
std::optional<std::string> pathOfFileURL(const std::string& url, std::string* failure) {
  std::size_t colon = url.find(':');
  std::string scheme = colon == std::string::npos ? "" : url.substr(0, colon);
  std::transform(scheme.begin(), scheme.end(), scheme.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  if (scheme != "file") {
    *failure = scheme.empty() ? "\"" + url + "\" is not a URL"
                              : "URLs with the scheme \"" + scheme + "\" cannot be read";
    return std::nullopt;
  }
  std::string_view rest = std::string_view(url).substr(colon + 1);
  if (rest.starts_with("//")) {
    rest.remove_prefix(2);
    std::size_t slash = rest.find('/');
    std::string_view host = rest.substr(0, slash);
    if (!host.empty() && host != "localhost") {
      *failure = "file URLs on another host (\"" + std::string(host) + "\") cannot be read";
      return std::nullopt;
    }
    rest = slash == std::string_view::npos ? std::string_view() : rest.substr(slash);
  }
  if (rest.empty()) {
    *failure = "the URL \"" + url + "\" names no file";
    return std::nullopt;
  }
  return decodePercentEscapes(rest);
}

}  // namespace

void quietLeptonica() {
  static std::once_flag once;
  std::call_once(once, [] {
    setMsgSeverity(L_SEVERITY_NONE);
    leptSetStderrHandler(leptonicaMessage);
    gPreviousTiffError = TIFFSetErrorHandler(tiffError);
    gPreviousTiffWarning = TIFFSetWarningHandler(tiffWarning);
  });
}

Collecting::Collecting(std::string* into) : previous_(tCollected) { tCollected = into; }
Collecting::~Collecting() { tCollected = previous_; }

std::shared_ptr<Bitmap> bitmapFromPix(PIX* pix, std::string* failure) {
  if (!pix) return nullptr;
  auto fail = [&](const std::string& why) -> std::shared_ptr<Bitmap> {
    pixDestroy(&pix);
    if (failure) *failure = why;
    return nullptr;
  };
  if (!withinBudget(static_cast<std::uint64_t>(std::max(0, pixGetWidth(pix))),
                    static_cast<std::uint64_t>(std::max(0, pixGetHeight(pix))))) {
    return fail("the image has no pixels or is too large");
  }
  PIX* normal = nullptr;
  if (pixGetColormap(pix)) {
    normal = pixRemoveColormap(pix, REMOVE_CMAP_BASED_ON_SRC);
  } else if (pixGetDepth(pix) == 16) {
    normal = pixConvert16To8(pix, L_MS_BYTE);
  } else if (pixGetDepth(pix) == 2 || pixGetDepth(pix) == 4) {
    normal = pixConvertTo8(pix, 0);
  }
  if (normal) {
    pixDestroy(&pix);
    pix = normal;
  }
  l_int32 depth = pixGetDepth(pix);
  if (depth != 1 && depth != 8 && depth != 32) {
    return fail("the image's pixel format (" + std::to_string(depth) + " bits) is not supported");
  }
  return std::make_shared<Bitmap>(std::make_unique<Bitmap::Native>(pix));
}

// --- Bitmap -------------------------------------------------------------------------

Bitmap::Bitmap(std::unique_ptr<Native> native) : native_(std::move(native)) {}
Bitmap::~Bitmap() = default;

std::uint32_t Bitmap::width() const {
  return static_cast<std::uint32_t>(pixGetWidth(native_->pix));
}
std::uint32_t Bitmap::height() const {
  return static_cast<std::uint32_t>(pixGetHeight(native_->pix));
}

std::shared_ptr<Bitmap> Bitmap::fromRGBA(std::uint32_t width, std::uint32_t height,
                                         const std::uint8_t* rgba, std::size_t size) {
  if (!withinBudget(width, height)) return nullptr;
  return fromPixels(width, height, 4, rgba, std::size_t{width} * 4, size);
}

std::shared_ptr<Bitmap> Bitmap::fromPixels(std::uint32_t width, std::uint32_t height, int channels,
                                           const std::uint8_t* pixels, std::size_t bytesPerRow,
                                           std::size_t size) {
  if (!pixels || (channels != 1 && channels != 3 && channels != 4) ||
      !withinBudget(width, height)) {
    return nullptr;
  }
  // Within the budget a row and the whole picture fit in 64 bits; the stride is the
  // caller's, so the last row's end is checked without overflowing.
  std::size_t row = std::size_t{width} * static_cast<std::size_t>(channels);
  if (bytesPerRow < row || size < row || (size - row) / bytesPerRow < std::size_t{height} - 1) {
    return nullptr;
  }
  PIX* pix = createPagePix(width, height, channels == 1 ? 8 : 32);
  if (!pix) return nullptr;
  if (channels != 1) pixSetSpp(pix, channels);
  l_uint32* data = pixGetData(pix);
  std::size_t wpl = static_cast<std::size_t>(pixGetWpl(pix));
  for (std::uint32_t y = 0; y < height; ++y) {
    l_uint32* line = data + y * wpl;
    const std::uint8_t* src = pixels + y * bytesPerRow;
    if (channels == 1) {
      packGreyRow(line, src, width);
    } else if (channels == 3) {
      for (std::uint32_t x = 0; x < width; ++x, src += 3) {
        line[x] =
            (l_uint32{src[0]} << 24) | (l_uint32{src[1]} << 16) | (l_uint32{src[2]} << 8) | 0xff;
      }
    } else {
      for (std::uint32_t x = 0; x < width; ++x, src += 4) line[x] = bigEndian32(src);
    }
  }
  return std::make_shared<Bitmap>(std::make_unique<Native>(pix));
}

Data Bitmap::rgba() const {
  PIX* pix = native_->pix;
  std::size_t w = width(), h = height();
  Data out(w * h * 4);
  l_uint32* data = pixGetData(pix);
  l_int32 wpl = pixGetWpl(pix);
  l_int32 depth = pixGetDepth(pix);
  bool hasAlpha = depth == 32 && pixGetSpp(pix) == 4;
  std::uint8_t* dst = out.data();
  for (std::size_t y = 0; y < h; ++y) {
    l_uint32* line = data + y * static_cast<std::size_t>(wpl);
    for (std::size_t x = 0; x < w; ++x, dst += 4) {
      if (depth == 32) {
        l_uint32 v = line[x];
        dst[0] = static_cast<std::uint8_t>(v >> 24);
        dst[1] = static_cast<std::uint8_t>(v >> 16);
        dst[2] = static_cast<std::uint8_t>(v >> 8);
        dst[3] = hasAlpha ? static_cast<std::uint8_t>(v) : 255;
      } else {
        std::uint8_t grey = depth == 8 ? static_cast<std::uint8_t>(GET_DATA_BYTE(line, x))
                                       : (GET_DATA_BIT(line, x) ? 0 : 255);  // 1 bit: set is black
        dst[0] = dst[1] = dst[2] = grey;
        dst[3] = 255;
      }
    }
  }
  return out;
}

std::optional<Data> jpegDataForBitmap(const Bitmap& bitmap, double compressionFactor) {
  quietLeptonica();
  PIX* source = bitmap.native().pix;
  PIX* owned = nullptr;
  if (pixGetDepth(source) == 1) {
    owned = pixConvertTo8(source, 0);
  } else if (pixGetDepth(source) == 32 && pixGetSpp(source) == 4) {
    owned = pixAlphaBlendUniform(source, 0xffffff00);  // over white
  }
  PIX* pix = owned ? owned : source;
  if (!pix) return std::nullopt;
  double factor = std::isnan(compressionFactor) ? 0 : std::clamp(compressionFactor, 0.0, 1.0);
  l_int32 quality = std::clamp(static_cast<l_int32>(std::lround(factor * 100)), 1, 100);
  l_uint8* bytes = nullptr;
  size_t size = 0;
  bool ok = pixWriteMemJpeg(&bytes, &size, pix, quality, 0) == 0 && bytes;
  if (owned) pixDestroy(&owned);
  if (!ok) {
    if (bytes) lept_free(bytes);
    return std::nullopt;
  }
  Data out(bytes, bytes + size);
  lept_free(bytes);
  return out;
}

// --- Image --------------------------------------------------------------------------

Image::~Image() = default;

std::shared_ptr<Image> Image::initByReferencingFile(const std::string& path) {
  std::shared_ptr<Image> image(new Image);
  image->path_ = path;
  if (path.empty()) image->sourceError_ = "no file was named";
  return image;
}

std::shared_ptr<Image> Image::initByReferencingURL(const std::string& url) {
  std::shared_ptr<Image> image(new Image);
  if (auto path = pathOfFileURL(url, &image->sourceError_)) image->path_ = *path;
  return image;
}

std::shared_ptr<Image> Image::initWithData(const Data& data) {
  std::string failure;
  auto bitmap = decodeBytes(data, &failure);
  if (!bitmap) return nullptr;
  return initWithBitmap(std::move(bitmap));
}

std::shared_ptr<Image> Image::initWithBitmap(std::shared_ptr<Bitmap> bitmap) {
  if (!bitmap) return nullptr;
  std::shared_ptr<Image> image(new Image);
  image->bitmap_ = std::move(bitmap);
  std::call_once(image->decodeOnce_, [] {});  // already decoded
  return image;
}

void Image::decode() const {
  std::call_once(decodeOnce_, [this] {
    if (!sourceError_.empty()) {
      failure_ = sourceError_;
      return;
    }
    auto bytes = readFile(path_);
    if (!bytes) {
      failure_ = "the file \"" + path_ + "\" cannot be read";
      return;
    }
    bitmap_ = decodeBytes(*bytes, &failure_);
    if (!bitmap_) failure_ = "\"" + path_ + "\": " + failure_;
  });
  decoded_.store(true, std::memory_order_release);
}

std::shared_ptr<Bitmap> Image::bitmap() const {
  decode();
  return bitmap_;
}

std::shared_ptr<Bitmap> Image::bitmapFittingLongSide(std::uint32_t maxLongSide) const {
  if (maxLongSide == 0 || decoded_.load(std::memory_order_acquire) || path_.empty()) {
    return reducedBitmap(bitmap(), maxLongSide);
  }
  // Not decoded yet: decode reduced, and keep nothing, so that the full-size pixels are
  // never held. A failure is left for bitmap() and failureReason() to find and keep.
  auto bytes = readFile(path_);
  std::string failure;
  Size fullSize;
  auto reduced = bytes ? decodeBytes(*bytes, &failure, maxLongSide, &fullSize) : nullptr;
  if (reduced) {
    // The full size is known now; size() need not decode the whole picture to tell.
    std::lock_guard lock(knownSizeMutex_);
    knownSize_ = fullSize;
  }
  return reduced;
}

std::string Image::failureReason() const {
  decode();
  return failure_;
}

Size Image::size() const {
  {
    std::lock_guard lock(knownSizeMutex_);
    if (knownSize_) return *knownSize_;
  }
  auto b = bitmap();
  return b ? Size{static_cast<double>(b->width()), static_cast<double>(b->height())} : Size{};
}

std::vector<std::shared_ptr<Bitmap>> Image::representations() const {
  auto b = bitmap();
  if (!b) return {};
  return {b};
}

std::optional<Data> Image::jpegData(double compressionFactor) const {
  auto b = bitmap();
  if (!b) return std::nullopt;
  return jpegDataForBitmap(*b, compressionFactor);
}

}  // namespace corvel
