// SPDX-License-Identifier: MIT
#include "render/image.h"

#include <jpeglib.h>
#include <png.h>

#include <algorithm>
#include <csetjmp>
#include <cstdio>  // before jpeglib.h, which needs FILE
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <memory>

#include "support/atomic_file.h"
#include "support/error.h"

namespace n3ds::tool {
namespace {

constexpr int kLargestSide = 16384;

std::vector<unsigned char> ReadBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) throw Error(path + ": the image cannot be opened");
  std::vector<unsigned char> bytes{std::istreambuf_iterator<char>(in), {}};
  if (in.bad() || bytes.empty()) throw Error(path + ": the image cannot be read");
  return bytes;
}

void CheckSize(const std::string& path, std::size_t width, std::size_t height) {
  if (width < 1 || height < 1 || width > kLargestSide || height > kLargestSide) {
    throw Error(path + ": an image of " + std::to_string(width) + " x " + std::to_string(height) +
                " pixels is not accepted");
  }
}

Image DecodePng(const std::string& path, const std::vector<unsigned char>& bytes) {
  png_image png{};
  png.version = PNG_IMAGE_VERSION;
  const auto fail = [&]() {
    const std::string reason = png.message;
    png_image_free(&png);
    throw Error(path + ": truncated or damaged PNG file (" + reason + ")");
  };
  if (png_image_begin_read_from_memory(&png, bytes.data(), bytes.size()) == 0) fail();
  png.format = PNG_FORMAT_RGBA;
  if (png.width > kLargestSide || png.height > kLargestSide) {
    png_image_free(&png);
    CheckSize(path, png.width, png.height);
  }
  Image image(static_cast<int>(png.width), static_cast<int>(png.height));
  const png_color white = {255, 255, 255};
  if (png_image_finish_read(&png, &white, image.rgba.data(), 0, nullptr) == 0) fail();
  return image;
}

// libjpeg reports errors by a callback that must not return.
struct JpegError {
  jpeg_error_mgr manager;
  std::jmp_buf escape;
  char message[JMSG_LENGTH_MAX];
};

[[noreturn]] void OnJpegError(j_common_ptr info) {
  auto* error = reinterpret_cast<JpegError*>(info->err);
  info->err->format_message(info, error->message);
  std::longjmp(error->escape, 1);
}

void OnJpegMessage(j_common_ptr) {}

// Decodes into `image`; false with a message in `error`. No object with a destructor may live in
// this function between setjmp and longjmp, so everything is handed in.
bool DecodeJpegInto(const std::vector<unsigned char>& bytes, jpeg_decompress_struct& info,
                    JpegError& error, Image& image) {
  if (setjmp(error.escape) != 0) return false;
  jpeg_mem_src(&info, bytes.data(), static_cast<unsigned long>(bytes.size()));
  jpeg_read_header(&info, TRUE);
  info.out_color_space = JCS_EXT_RGBA;
  jpeg_start_decompress(&info);
  if (info.output_width > kLargestSide || info.output_height > kLargestSide) {
    std::snprintf(error.message, sizeof error.message, "too large");
    return false;
  }
  image = Image(static_cast<int>(info.output_width), static_cast<int>(info.output_height));
  while (info.output_scanline < info.output_height) {
    JSAMPROW row = image.Pixel(0, static_cast<int>(info.output_scanline));
    jpeg_read_scanlines(&info, &row, 1);
  }
  jpeg_finish_decompress(&info);
  if (info.err->num_warnings > 0) {
    std::snprintf(error.message, sizeof error.message, "damaged or cut off");
    return false;
  }
  return true;
}

Image DecodeJpeg(const std::string& path, const std::vector<unsigned char>& bytes) {
  JpegError error{};
  jpeg_decompress_struct info{};
  info.err = jpeg_std_error(&error.manager);
  error.manager.error_exit = OnJpegError;
  error.manager.output_message = OnJpegMessage;
  jpeg_create_decompress(&info);
  Image image;
  const bool decoded = DecodeJpegInto(bytes, info, error, image);
  jpeg_destroy_decompress(&info);
  if (!decoded) throw Error(path + ": truncated or damaged JPEG file (" + error.message + ")");
  return image;
}

// Encodes into memory that libjpeg allocates; false with a message in `error`. As above, nothing
// with a destructor may live here.
bool EncodeJpegInto(const Image& image, jpeg_compress_struct& info, JpegError& error,
                    unsigned char*& bytes, unsigned long& size) {
  constexpr int kQuality = 92;
  if (setjmp(error.escape) != 0) return false;
  jpeg_mem_dest(&info, &bytes, &size);
  info.image_width = static_cast<JDIMENSION>(image.width);
  info.image_height = static_cast<JDIMENSION>(image.height);
  info.input_components = 4;
  info.in_color_space = JCS_EXT_RGBX;
  jpeg_set_defaults(&info);
  jpeg_set_quality(&info, kQuality, TRUE);
  jpeg_start_compress(&info, TRUE);
  while (info.next_scanline < info.image_height) {
    // libjpeg's rows are not const, but it only reads them.
    JSAMPROW row = const_cast<JSAMPROW>(image.Pixel(0, static_cast<int>(info.next_scanline)));
    jpeg_write_scanlines(&info, &row, 1);
  }
  jpeg_finish_compress(&info);
  return true;
}

void WriteBytes(const std::string& path, const unsigned char* bytes, std::size_t size) {
  AtomicFile out(path);
  out.stream().write(reinterpret_cast<const char*>(bytes), static_cast<std::streamsize>(size));
  out.Commit();
}

}  // namespace

Image ReadImage(const std::string& path) {
  const std::vector<unsigned char> bytes = ReadBytes(path);
  if (bytes.size() > 8 && png_sig_cmp(bytes.data(), 0, 8) == 0) return DecodePng(path, bytes);
  if (bytes.size() > 2 && bytes[0] == 0xff && bytes[1] == 0xd8) return DecodeJpeg(path, bytes);
  throw Error(path + ": neither a PNG nor a JPEG image");
}

void WritePng(const std::string& path, const Image& image) {
  png_image png{};
  png.version = PNG_IMAGE_VERSION;
  png.width = static_cast<png_uint_32>(image.width);
  png.height = static_cast<png_uint_32>(image.height);
  png.format = PNG_FORMAT_RGBA;
  std::vector<unsigned char> bytes;
  png_alloc_size_t size = PNG_IMAGE_PNG_SIZE_MAX(png);
  bytes.resize(size);
  if (png_image_write_to_memory(&png, bytes.data(), &size, 0, image.rgba.data(), 0, nullptr) == 0) {
    throw Error(path + ": the PNG cannot be made (" + std::string(png.message) + ")");
  }
  WriteBytes(path, bytes.data(), size);
}

void WriteJpeg(const std::string& path, const Image& image) {
  JpegError error{};
  jpeg_compress_struct info{};
  info.err = jpeg_std_error(&error.manager);
  error.manager.error_exit = OnJpegError;
  error.manager.output_message = OnJpegMessage;
  jpeg_create_compress(&info);
  unsigned char* bytes = nullptr;  // from malloc, by libjpeg
  unsigned long size = 0;
  const bool encoded = EncodeJpegInto(image, info, error, bytes, size);
  jpeg_destroy_compress(&info);
  const std::unique_ptr<unsigned char, decltype(&std::free)> owner(bytes, std::free);
  if (!encoded) throw Error(path + ": the JPEG cannot be made (" + error.message + ")");
  WriteBytes(path, bytes, size);
}

Image Upright(const Image& delivered, int degree, bool mirror) {
  const bool turned = degree == 90 || degree == 270;
  const int w = delivered.width;
  const int h = delivered.height;
  Image upright(turned ? h : w, turned ? w : h);
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x) {
      const int mx = mirror ? w - 1 - x : x;
      int ux = mx;
      int uy = y;
      if (degree == 90) {
        ux = h - 1 - y;
        uy = mx;
      } else if (degree == 180) {
        ux = w - 1 - mx;
        uy = h - 1 - y;
      } else if (degree == 270) {
        ux = y;
        uy = w - 1 - mx;
      }
      std::copy_n(delivered.Pixel(x, y), 4, upright.Pixel(ux, uy));
    }
  }
  return upright;
}

void Paste(const Image& source, int x, int y, Image& target) {
  for (int row = 0; row < source.height; ++row) {
    std::copy_n(source.Pixel(0, row), 4 * static_cast<std::size_t>(source.width),
                target.Pixel(x, y + row));
  }
}

}  // namespace n3ds::tool
