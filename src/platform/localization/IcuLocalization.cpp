#include "platform/localization/Localization.h"
#include "platform/localization/IcuLocalization.h"

#include <unicode/dcfmtsym.h>
#include <unicode/decimfmt.h>
#include <unicode/numfmt.h>
#include <unicode/udata.h>
#include <unicode/uloc.h>
#include <unicode/unistr.h>
#include <unicode/ures.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>
#include <mutex>

namespace kyn::platform {

extern const unsigned char kynStringsData[];
extern const std::size_t kynStringsDataSize;

namespace {

constexpr const char* kPackage = "kynstrings";

// ICU keeps the registered package for the rest of the process, and ICU outlives the plug-in when a
// host unloads and loads it again. So ICU is handed a copy on the heap that is never freed rather
// than the plug-in's own bytes: after a reload the name is taken and that copy, still valid, serves.
void registerPackage() {
  static std::once_flag once;
  std::call_once(once, [] {
    auto* copy = static_cast<unsigned char*>(::operator new(kynStringsDataSize, std::align_val_t{16}));
    std::memcpy(copy, kynStringsData, kynStringsDataSize);
    UErrorCode status = U_ZERO_ERROR;
    udata_setAppData(kPackage, copy, &status);
    if (status != U_ZERO_ERROR) ::operator delete(copy, std::align_val_t{16});  // an earlier load's copy serves
  });
}

struct BundleCloser {
  void operator()(UResourceBundle* b) const noexcept { ures_close(b); }
};
using Bundle = std::unique_ptr<UResourceBundle, BundleCloser>;

}  // namespace

std::string icuLocaleId(std::string_view language) {
  if (language.empty()) return "root";
  std::string tag(language);
  for (char& c : tag) {
    if (c == '_') c = '-';
  }
  char id[ULOC_FULLNAME_CAPACITY] = {};
  int32_t parsed = 0;
  UErrorCode status = U_ZERO_ERROR;
  uloc_forLanguageTag(tag.c_str(), id, sizeof id, &parsed, &status);
  if (U_FAILURE(status) || id[0] == '\0') return "root";
  return id;
}

IcuLocalization::IcuLocalization() { registerPackage(); }

std::string IcuLocalization::localizedString(std::string_view key, std::string_view language) const {
  const std::string localeId = icuLocaleId(language);
  UErrorCode status = U_ZERO_ERROR;
  Bundle bundle(ures_open(kPackage, localeId.c_str(), &status));
  if (status == U_USING_DEFAULT_WARNING) {
    // ICU fell back to the process's default locale: use the root table instead, so that only the
    // requested language and its parents decide.
    status = U_ZERO_ERROR;
    bundle.reset(ures_openDirect(kPackage, "root", &status));
  }
  if (U_FAILURE(status) || !bundle) return std::string(key);
  const std::string keyText(key);
  int32_t length = 0;
  status = U_ZERO_ERROR;
  const UChar* text = ures_getStringByKey(bundle.get(), keyText.c_str(), &length, &status);
  if (U_FAILURE(status) || text == nullptr) return keyText;
  std::string out;
  icu::UnicodeString(false, text, length).toUTF8String(out);
  return out;
}

struct IcuNumberFormatting::Impl {
  std::mutex mutex;  // ICU formats are not documented as safe for concurrent use
  std::unique_ptr<icu::NumberFormat> integer;
  std::unique_ptr<icu::NumberFormat> decimal;
  /// The locale's decimal separator when it is one ASCII character and the locale writes ASCII
  /// digits; 0 otherwise.
  char asciiSeparator = 0;

  /// The value of a text of ASCII digits with at most one separator between digits, read without
  /// ICU; nothing for any other text. Fifteen digits at most: the digits then make an integer that
  /// a double holds exactly, as it holds every power of ten up to 10^15, so one division gives the
  /// correctly rounded value, the one ICU's reading gives too.
  [[nodiscard]] std::optional<double> plainDecimal(std::string_view text) const {
    static constexpr std::array<double, 16> kPowersOfTen{1e0, 1e1, 1e2,  1e3,  1e4,  1e5,  1e6,  1e7,
                                                         1e8, 1e9, 1e10, 1e11, 1e12, 1e13, 1e14, 1e15};
    if (asciiSeparator == 0 || text.empty() || text.size() > 16) return std::nullopt;
    std::uint64_t mantissa = 0;
    std::size_t digits = 0;
    std::size_t separator = std::string_view::npos;
    for (std::size_t i = 0; i < text.size(); ++i) {
      const char c = text[i];
      if (c >= '0' && c <= '9') {
        mantissa = mantissa * 10 + static_cast<unsigned>(c - '0');
        ++digits;
      } else if (c == asciiSeparator && separator == std::string_view::npos && i > 0 && i + 1 < text.size()) {
        separator = i;
      } else {
        return std::nullopt;
      }
    }
    if (digits > 15) return std::nullopt;
    const std::size_t fraction = separator == std::string_view::npos ? 0 : text.size() - separator - 1;
    return static_cast<double>(mantissa) / kPowersOfTen[fraction];
  }
};

IcuNumberFormatting::IcuNumberFormatting(std::optional<std::string> localeId) : impl_(std::make_unique<Impl>()) {
  const icu::Locale locale = localeId ? icu::Locale(localeId->c_str()) : icu::Locale::getDefault();
  UErrorCode status = U_ZERO_ERROR;
  impl_->integer.reset(icu::NumberFormat::createInstance(locale, UNUM_DECIMAL, status));
  if (U_SUCCESS(status) && impl_->integer) {
    impl_->integer->setGroupingUsed(false);
    impl_->integer->setMaximumFractionDigits(0);
  } else {
    impl_->integer.reset();
  }
  status = U_ZERO_ERROR;
  impl_->decimal.reset(icu::NumberFormat::createInstance(locale, UNUM_DECIMAL, status));
  if (U_FAILURE(status)) impl_->decimal.reset();
  if (const auto* format = dynamic_cast<const icu::DecimalFormat*>(impl_->decimal.get())) {
    const icu::DecimalFormatSymbols* symbols = format->getDecimalFormatSymbols();
    const icu::UnicodeString& separator = symbols->getConstSymbol(icu::DecimalFormatSymbols::kDecimalSeparatorSymbol);
    const icu::UnicodeString& zero = symbols->getConstSymbol(icu::DecimalFormatSymbols::kZeroDigitSymbol);
    const icu::UnicodeString& grouping = symbols->getConstSymbol(icu::DecimalFormatSymbols::kGroupingSeparatorSymbol);
    if (separator.length() == 1 && separator[0] < 0x80 && (separator[0] < u'0' || separator[0] > u'9') &&
        zero == icu::UnicodeString(u'0') && separator != grouping) {
      impl_->asciiSeparator = static_cast<char>(separator[0]);
    }
  }
}

IcuNumberFormatting::~IcuNumberFormatting() = default;

std::string IcuNumberFormatting::integerText(std::uint64_t value) const {
  std::lock_guard lock(impl_->mutex);
  if (!impl_->integer) return std::to_string(value);
  icu::UnicodeString text;
  impl_->integer->format(static_cast<int64_t>(value > INT64_MAX ? INT64_MAX : value), text);
  std::string out;
  text.toUTF8String(out);
  return out;
}

std::optional<double> IcuNumberFormatting::parseDecimal(std::string_view text) const {
  if (text.empty()) return std::nullopt;
  // The server's distances are plain digits: read without ICU, which takes microseconds a text.
  if (auto plain = impl_->plainDecimal(text)) return plain;
  const icu::UnicodeString input = icu::UnicodeString::fromUTF8(icu::StringPiece(text.data(), static_cast<int32_t>(text.size())));
  std::lock_guard lock(impl_->mutex);
  if (!impl_->decimal) return std::nullopt;
  icu::Formattable result;
  icu::ParsePosition position(0);
  impl_->decimal->parse(input, result, position);
  if (position.getIndex() != input.length() || position.getErrorIndex() >= 0) return std::nullopt;
  UErrorCode status = U_ZERO_ERROR;
  const double value = result.getDouble(status);
  if (U_FAILURE(status)) return std::nullopt;
  return value;
}

}  // namespace kyn::platform
