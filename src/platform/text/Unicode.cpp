#include "platform/text/Unicode.h"

#include <unicode/brkiter.h>
#include <unicode/uchar.h>
#include <unicode/unistr.h>
#include <unicode/utf8.h>

#include <memory>

namespace kyn::platform {
namespace {

icu::UnicodeString fromUtf8(std::string_view text) {
  return icu::UnicodeString::fromUTF8(icu::StringPiece(text.data(), static_cast<int32_t>(text.size())));
}

std::string toUtf8(const icu::UnicodeString& text) {
  std::string out;
  text.toUTF8String(out);
  return out;
}

}  // namespace

bool isDecimalDigit(char32_t c) noexcept { return u_charType(static_cast<UChar32>(c)) == U_DECIMAL_DIGIT_NUMBER; }

std::string foldCase(std::string_view text) {
  icu::UnicodeString u = fromUtf8(text);
  u.foldCase();
  return toUtf8(u);
}

std::optional<std::string> suffixFromFirstMatch(std::string_view text, const std::function<bool(char32_t)>& accept) {
  const icu::UnicodeString u = fromUtf8(text);
  int32_t index = 0;
  bool found = false;
  while (index < u.length()) {
    const UChar32 c = u.char32At(index);
    if (accept(static_cast<char32_t>(c))) {
      found = true;
      break;
    }
    index = u.moveIndex32(index, 1);
  }
  if (!found) return std::nullopt;
  // A match at the start begins a character; so does an ASCII match after an ASCII character,
  // unless it is the LF of a CR LF (no ASCII character extends or prepends to another). Building a
  // break iterator costs more than the rest of the call.
  const UChar before = index > 0 ? u.charAt(index - 1) : 0;
  const UChar at = u.charAt(index);
  if (index == 0 || (before < 0x80 && at < 0x80 && !(before == u'\r' && at == u'\n'))) {
    return toUtf8(u.tempSubString(index));
  }
  UErrorCode status = U_ZERO_ERROR;
  std::unique_ptr<icu::BreakIterator> clusters(icu::BreakIterator::createCharacterInstance(icu::Locale::getRoot(), status));
  if (U_SUCCESS(status) && clusters) {
    clusters->setText(u);
    if (!clusters->isBoundary(index)) {
      const int32_t start = clusters->preceding(index);
      if (start != icu::BreakIterator::DONE) index = start;
    }
  }
  return toUtf8(u.tempSubString(index));
}

std::string keepCodePoints(std::string_view text, const std::function<bool(char32_t)>& keep) {
  std::string out;
  const auto* bytes = reinterpret_cast<const uint8_t*>(text.data());
  const auto length = static_cast<int32_t>(text.size());
  int32_t i = 0;
  while (i < length) {
    const int32_t start = i;
    UChar32 c;
    U8_NEXT(bytes, i, length, c);
    if (c >= 0 && keep(static_cast<char32_t>(c))) out.append(text.substr(static_cast<std::size_t>(start), static_cast<std::size_t>(i - start)));
  }
  return out;
}

}  // namespace kyn::platform
