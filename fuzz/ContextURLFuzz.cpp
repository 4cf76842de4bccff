// Reads arbitrary text as a context identifier URL. Whatever comes out, once normalised by one
// read, must survive writing and reading again unchanged (less the token, which is never written).
#include "utils/KYNAXUtils.h"

#include <cstddef>
#include <cstdint>
#include <string_view>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  kyn::Value first = kyn::KYNAXUtils::contextDictionaryForURL(text);
  first.erase("authToken");
  const auto url = kyn::KYNAXUtils::contextIdentifierURLForDictionary(&first);
  if (!url) __builtin_trap();
  const kyn::Value second = kyn::KYNAXUtils::contextDictionaryForURL(*url);
  if (second != first) __builtin_trap();
  return 0;
}
