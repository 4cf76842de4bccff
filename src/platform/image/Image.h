#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

namespace kyn::platform {

/// Encoded picture data (JPEG, PNG, ...) as an address book stores it; shared, never copied.
using ImageBytes = std::shared_ptr<const std::vector<std::uint8_t>>;

/// A decoded picture: 8-bit channels, rows top to bottom.
struct Image {
  int width = 0;
  int height = 0;
  int channels = 0;  // 1 grey, 2 grey and alpha, 3 RGB, 4 RGBA
  std::vector<std::uint8_t> pixels;
  /// The data it was decoded from, when it came from `imageFromData`.
  ImageBytes encoded;
};

/// Decodes JPEG, PNG, GIF, BMP and the other formats of stb_image. Nothing for data that does not
/// decode or a picture larger than 100 megapixels.
[[nodiscard]] std::shared_ptr<const Image> decodeImage(std::span<const std::uint8_t> data);
/// The same, keeping `data` in the image as its encoded form and no pixels (a picture handed on as
/// the address book stores it needs only to decode and its size).
[[nodiscard]] std::shared_ptr<const Image> imageFromData(const ImageBytes& data);

}  // namespace kyn::platform
