#include "platform/image/Image.h"

#include <stb/stb_image.h>

#include <climits>

namespace kyn::platform {

namespace {

std::shared_ptr<Image> decode(std::span<const std::uint8_t> data, bool keepPixels) {
  if (data.empty() || data.size() > static_cast<std::size_t>(INT_MAX)) return nullptr;
  const auto* bytes = reinterpret_cast<const stbi_uc*>(data.data());
  const int length = static_cast<int>(data.size());
  int width = 0, height = 0, channels = 0;
  // Ask for the size first, so that a forged header cannot make the decoder allocate gigabytes.
  if (!stbi_info_from_memory(bytes, length, &width, &height, &channels)) return nullptr;
  if (width <= 0 || height <= 0 || static_cast<long long>(width) * height > 100'000'000LL) return nullptr;
  stbi_uc* pixels = stbi_load_from_memory(bytes, length, &width, &height, &channels, 0);
  if (pixels == nullptr) return nullptr;
  auto image = std::make_shared<Image>();
  image->width = width;
  image->height = height;
  image->channels = channels;
  if (keepPixels) {
    image->pixels.assign(pixels, pixels + static_cast<std::size_t>(width) * static_cast<std::size_t>(height) *
                                              static_cast<std::size_t>(channels));
  }
  stbi_image_free(pixels);
  return image;
}

}  // namespace

std::shared_ptr<const Image> decodeImage(std::span<const std::uint8_t> data) { return decode(data, true); }

std::shared_ptr<const Image> imageFromData(const ImageBytes& data) {
  if (!data) return nullptr;
  // Decoded only to know that it decodes and its size: whoever shows it gets the encoded bytes.
  auto image = decode(*data, false);
  if (image) image->encoded = data;
  return image;
}

}  // namespace kyn::platform
