// JPEG reading through libjpeg directly. Leptonica's reader leaves libjpeg's default
// message handler in place, which prints "Premature end of JPEG file", "Corrupt JPEG
// data: ..." and the like on stderr of whatever process decodes a damaged picture; here
// warnings are dropped (libjpeg fills what is missing with grey, as before) and the
// error that stops decoding becomes the failure reason. Rows go through the same
// builder as PNG's, so a picture is reduced while it is decoded.
// jpeglib.h needs size_t and FILE declared before it.
#include <cstddef>
#include <cstdio>

#include <jpeglib.h>

#include <csetjmp>
#include <cstdio>
#include <optional>
#include <vector>

#include "platform/image/BitmapNative.h"

namespace corvel {

namespace {

// Plain data only: libjpeg's errors longjmp out of the phases below.
struct Errors {
  jpeg_error_mgr manager;
  std::jmp_buf jump;
  char message[JMSG_LENGTH_MAX];
};

[[noreturn]] void fail(j_common_ptr info) {
  auto* errors = reinterpret_cast<Errors*>(info->err);
  (*info->err->format_message)(info, errors->message);
  std::longjmp(errors->jump, 1);
}

void quiet(j_common_ptr, int) {}

struct Header {
  std::uint32_t width, height;
  bool cmyk, adobe;
  l_int32 xResolution, yResolution;
};

bool readHeader(jpeg_decompress_struct* info, const std::uint8_t* bytes, std::size_t size,
                Header* header) {
  auto* errors = reinterpret_cast<Errors*>(info->err);
  if (setjmp(errors->jump)) return false;
  jpeg_create_decompress(info);
  jpeg_mem_src(info, bytes, static_cast<unsigned long>(size));
  jpeg_read_header(info, TRUE);
  header->width = info->image_width;
  header->height = info->image_height;
  header->cmyk = info->jpeg_color_space == JCS_CMYK || info->jpeg_color_space == JCS_YCCK;
  header->adobe = info->saw_Adobe_marker;
  info->out_color_space = header->cmyk                ? JCS_CMYK
                          : info->num_components == 1 ? JCS_GRAYSCALE
                                                      : JCS_EXT_RGBX;
  if (info->density_unit == 1 || info->density_unit == 2) {
    double perInch = info->density_unit == 1 ? 1.0 : 2.54;
    header->xResolution = static_cast<l_int32>(info->X_density * perInch + 0.5);
    header->yResolution = static_cast<l_int32>(info->Y_density * perInch + 0.5);
  }
  return true;
}

// CMYK as Adobe writes it is inverted; either way the ink takes away from white.
void cmykToRGBX(std::uint8_t* row, std::uint32_t width, bool inverted) {
  for (std::uint32_t x = 0; x < width; ++x, row += 4) {
    int k = inverted ? row[3] : 255 - row[3];
    for (int c = 0; c < 3; ++c) {
      int ink = inverted ? row[c] : 255 - row[c];
      row[c] = static_cast<std::uint8_t>(ink * k / 255);
    }
    row[3] = 255;
  }
}

bool readRows(jpeg_decompress_struct* info, const Header& header, PictureBuilder* builder,
              std::uint8_t* row) {
  auto* errors = reinterpret_cast<Errors*>(info->err);
  if (setjmp(errors->jump)) return false;
  jpeg_start_decompress(info);
  while (info->output_scanline < info->output_height) {
    JSAMPROW rows[1] = {row};
    jpeg_read_scanlines(info, rows, 1);
    if (header.cmyk) cmykToRGBX(row, header.width, header.adobe);
    builder->addRow(row);
  }
  jpeg_finish_decompress(info);
  return true;
}

}  // namespace

PIX* decodeJPEG(const std::uint8_t* bytes, std::size_t size, std::uint32_t maxLongSide,
                std::uint32_t* fullWidth, std::uint32_t* fullHeight, std::string* failure) {
  jpeg_decompress_struct info{};
  Errors errors{};
  info.err = jpeg_std_error(&errors.manager);
  errors.manager.error_exit = fail;
  errors.manager.emit_message = quiet;
  Header header{};
  std::optional<PictureBuilder> builder;
  std::vector<std::uint8_t> row;
  bool decoded = readHeader(&info, bytes, size, &header);
  if (decoded && (header.width == 0 || header.height == 0 ||
                  std::uint64_t{header.width} * header.height > kMaxImagePixels)) {
    std::snprintf(errors.message, sizeof errors.message, "the image's size is out of range");
    decoded = false;
  }
  if (decoded) {
    bool grey = info.out_color_space == JCS_GRAYSCALE;
    builder.emplace(header.width, header.height, grey ? 1 : 4, false, maxLongSide,
                    header.xResolution, header.yResolution);
    row.resize(std::size_t{header.width} * (grey ? 1 : 4));
    if (!builder->ready()) {
      std::snprintf(errors.message, sizeof errors.message,
                    "there is not enough memory for the image");
      decoded = false;
    }
  }
  decoded = decoded && readRows(&info, header, &*builder, row.data());
  jpeg_destroy_decompress(&info);
  if (!decoded) {
    *failure = "the JPEG image is corrupt or truncated";
    if (errors.message[0]) *failure += std::string(" (") + errors.message + ")";
    return nullptr;
  }
  *fullWidth = header.width;
  *fullHeight = header.height;
  return builder->take();
}

}  // namespace corvel
