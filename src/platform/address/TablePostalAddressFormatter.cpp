#include "platform/address/PostalAddress.h"

#include "platform/localization/IcuLocalization.h"

#include <unicode/locid.h>
#include <unicode/uchar.h>
#include <unicode/uscript.h>
#include <unicode/unistr.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <mutex>
#include <string_view>

namespace kyn::platform {
namespace {

struct AddressFormat {
  std::string_view country;
  std::string_view layout;       // empty: the default layout
  std::string_view latinLayout;  // empty: the layout serves Latin script as well
  std::string_view upper;        // the fields written in capitals
};

constexpr AddressFormat kFormats[] = {
#include "platform/address/AddressFormats.inc"
};
static_assert(std::ranges::is_sorted(kFormats, {}, &AddressFormat::country), "binary search needs the rows sorted");

// The data's own default (name, organisation, street, city), with state and postal code on a last
// line so that a country without a layout of its own loses neither.
constexpr std::string_view kDefaultLayout = "%N%n%O%n%A%n%C%n%S %Z";
constexpr std::size_t kMaxFieldBytes = 64 * 1024;

// The fields of a layout, in the data's letters. Name, organisation, dependent locality and sorting
// code have no counterpart in the address and stay empty.
constexpr std::string_view kFieldLetters = "NOADCSZX";
using Fields = std::array<icu::UnicodeString, kFieldLetters.size()>;

const AddressFormat* formatFor(std::string_view country) {
  const auto* it = std::ranges::lower_bound(kFormats, country, {}, &AddressFormat::country);
  return it != std::end(kFormats) && it->country == country ? it : nullptr;
}

/// The upper-case ISO code that `text` is ("de", "US"), or nothing when it is no two-letter code.
std::optional<std::string> isoCountryCode(std::string_view text) {
  const auto isLetter = [](char c) { return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z'); };
  if (text.size() != 2 || !isLetter(text[0]) || !isLetter(text[1])) return std::nullopt;
  std::string code(text);
  for (char& c : code) c = static_cast<char>(c & ~0x20);
  return code;
}

bool isLineBreak(UChar32 c) {
  return (c >= 0x0A && c <= 0x0D) || c == 0x85 || c == 0x2028 || c == 0x2029;
}

/// The field as text: ill-formed UTF-8 as U+FFFD, cut at kMaxFieldBytes (at a character boundary),
/// control characters and whitespace runs as one space, no space at either end. Line breaks start
/// a new line when `multiLine`, blank lines dropped; otherwise they count as spaces.
icu::UnicodeString readField(const std::optional<std::string>& value, bool multiLine) {
  icu::UnicodeString out;
  if (!value) return out;
  std::string_view text = *value;
  if (text.size() > kMaxFieldBytes) {
    std::size_t cut = kMaxFieldBytes;
    while (cut > 0 && (static_cast<unsigned char>(text[cut]) & 0xC0) == 0x80) --cut;
    text = text.substr(0, cut);
  }
  const icu::UnicodeString raw =
      icu::UnicodeString::fromUTF8(icu::StringPiece(text.data(), static_cast<int32_t>(text.size())));
  bool pendingSpace = false;
  bool pendingBreak = false;
  for (int32_t i = 0; i < raw.length(); i = raw.moveIndex32(i, 1)) {
    const UChar32 c = raw.char32At(i);
    if (multiLine && isLineBreak(c)) {
      pendingBreak = !out.isEmpty();
      continue;
    }
    if (isLineBreak(c) || u_isUWhiteSpace(c) || u_charType(c) == U_CONTROL_CHAR) {
      pendingSpace = !out.isEmpty();
      continue;
    }
    if (pendingBreak) {
      out.append(u'\n');
    } else if (pendingSpace) {
      out.append(u' ');
    }
    pendingBreak = pendingSpace = false;
    out.append(c);
  }
  return out;
}

/// True when every letter of the fields is Latin (digits and punctuation belong to every script).
bool isLatinScript(const Fields& fields) {
  for (const auto& field : fields) {
    for (int32_t i = 0; i < field.length(); i = field.moveIndex32(i, 1)) {
      const UChar32 c = field.char32At(i);
      if (!u_isalpha(c)) continue;
      UErrorCode status = U_ZERO_ERROR;
      const UScriptCode script = uscript_getScript(c, &status);
      if (U_SUCCESS(status) && script != USCRIPT_LATIN && script != USCRIPT_COMMON && script != USCRIPT_INHERITED) {
        return false;
      }
    }
  }
  return true;
}

/// One line of a layout: the fields that have text, each with the text between it and the field
/// before it on the line, the line's leading text only before its first field and its trailing text
/// only after its last. A line without fields is fixed text, written when the address has any.
icu::UnicodeString renderLine(std::string_view line, const Fields& fields, bool addressHasText) {
  icu::UnicodeString out;
  std::string literal;  // the text since the previous field
  bool sawField = false;
  bool wroteField = false;
  bool lastWritten = false;
  for (std::size_t i = 0; i < line.size(); ++i) {
    const auto letter =
        i + 1 < line.size() && line[i] == '%' ? kFieldLetters.find(line[i + 1]) : std::string_view::npos;
    if (letter == std::string_view::npos) {
      literal += line[i];
      continue;
    }
    ++i;
    const icu::UnicodeString& value = fields[letter];
    lastWritten = !value.isEmpty();
    if (lastWritten) {
      if (wroteField || !sawField) out.append(icu::UnicodeString::fromUTF8(literal));
      out.append(value);
      wroteField = true;
    }
    sawField = true;
    literal.clear();
  }
  if (!sawField) return addressHasText ? icu::UnicodeString::fromUTF8(literal) : icu::UnicodeString();
  if (lastWritten) out.append(icu::UnicodeString::fromUTF8(literal));
  return out.trim();
}

std::string countryDisplayName(const std::string& code, const std::optional<std::string>& language) {
  std::string localeId = icuLocaleId(language.value_or(std::string()));
  if (localeId == "root") localeId = "en";  // the root table has no region names
  icu::UnicodeString name;
  icu::Locale("und", code.c_str()).getDisplayCountry(icu::Locale(localeId.c_str()), name);
  std::string out;
  (name.isEmpty() ? icu::UnicodeString::fromUTF8(code) : name).toUTF8String(out);
  return out;
}

/// The locale whose rules a country's capitals follow: its likely language. ICU takes some ten
/// thousand instructions to find it, so the last one found is kept.
icu::Locale caseLocaleOf(const std::string& region) {
  static std::mutex mutex;
  static std::string lastRegion;
  static icu::Locale last;
  std::lock_guard lock(mutex);
  if (region != lastRegion) {  // a region is a code, never empty
    icu::Locale locale("und", region.c_str());
    UErrorCode status = U_ZERO_ERROR;
    locale.addLikelySubtags(status);
    last = locale;
    lastRegion = region;
  }
  return last;
}

}  // namespace

TablePostalAddressFormatter::TablePostalAddressFormatter(TextSource systemRegion, TextSource language)
    : systemRegion_(std::move(systemRegion)), language_(std::move(language)) {}

std::string TablePostalAddressFormatter::stringFromPostalAddress(const PostalAddress& address,
                                                                 PostalAddressStyle /*style*/) const {
  Fields fields;
  auto field = [&fields](char letter) -> icu::UnicodeString& { return fields[kFieldLetters.find(letter)]; };
  field('A') = readField(address.street, /*multiLine=*/true);
  field('C') = readField(address.city, false);
  field('S') = readField(address.state, false);
  field('Z') = readField(address.postalCode, false);
  const bool hasText = std::ranges::any_of(fields, [](const auto& f) { return !f.isEmpty(); });

  const icu::UnicodeString countryText = readField(address.country, false);
  std::string countryUtf8;
  countryText.toUTF8String(countryUtf8);
  const auto code = isoCountryCode(countryUtf8);
  const auto systemCode = isoCountryCode(systemRegion_ ? systemRegion_().value_or(std::string()) : std::string());
  // A country text that is no code has no layout of its own; no country at all is the system's.
  const std::optional<std::string> region = code ? code : (countryText.isEmpty() ? systemCode : std::nullopt);

  const AddressFormat* format = region ? formatFor(*region) : nullptr;
  std::string_view layout = kDefaultLayout;
  if (format && !format->layout.empty()) layout = format->layout;
  if (format && !format->latinLayout.empty() && isLatinScript(fields)) layout = format->latinLayout;
  if (format && !format->upper.empty()) {
    const icu::Locale locale = caseLocaleOf(*region);
    for (const char letter : format->upper) {
      if (kFieldLetters.find(letter) != std::string_view::npos) field(letter).toUpper(locale);
    }
  }

  std::string out;
  auto appendLine = [&out](const icu::UnicodeString& line) {
    if (line.isEmpty()) return;
    if (!out.empty()) out += '\n';
    line.toUTF8String(out);
  };
  for (std::size_t start = 0; start <= layout.size();) {
    const std::size_t end = std::min(layout.find("%n", start), layout.size());
    appendLine(renderLine(layout.substr(start, end - start), fields, hasText));
    start = end + 2;
  }
  if (code && code != systemCode) {
    appendLine(icu::UnicodeString::fromUTF8(countryDisplayName(*code, language_ ? language_() : std::nullopt)));
  } else if (!code) {
    appendLine(countryText);
  }
  return out;
}

}  // namespace kyn::platform
