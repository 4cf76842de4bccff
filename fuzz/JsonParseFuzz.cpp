// Parses arbitrary bytes as JSON, with the default limits and with tight ones. A text that parses
// must serialise to a text that parses to the same value.
#include "platform/value/Json.h"

#include <cstddef>
#include <cstdint>
#include <string_view>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  auto parsed = kyn::platform::parseJson(text);
  if (parsed) {
    auto again = kyn::platform::parseJson(kyn::platform::toJson(*parsed));
    if (!again || *again != *parsed) __builtin_trap();
  }
  kyn::platform::JsonLimits tight;
  tight.maxDepth = 3;
  tight.maxBytes = 64;
  (void)kyn::platform::parseJson(text, tight);
  return 0;
}
