#include "platform/contacts/VCard.h"

#include "platform/text/StringEscapes.h"

#include <unicode/ucnv.h>
#include <unicode/unistr.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <new>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

// How the reader treats what real exporters write:
// - The text is UTF-8, with or without a byte-order mark, or UTF-16 in either byte order (told by its
//   byte-order mark, or by a NUL byte beside the first character when it has none). A UTF-16 text is
//   read as UTF-8; the CHARSET of a value that is not quoted-printable or base64 then no longer
//   applies, since the value's characters are known. Unpaired surrogates read as U+FFFD.
// - Lines end in CRLF, LF or CR, mixed freely. A line that starts with a space or tab continues the
//   previous one (the break and that one blank are removed). A quoted-printable value that ends in
//   "=", maybe followed by blanks, continues on the next line whatever that line starts with: a soft
//   line break, which removes the "=", the blanks after it and the break, and nothing else. A base64
//   value goes on over following lines made only of base64 characters until a blank line (2.1).
// - Cards that end without END:VCARD, and cards over 32 MiB, are skipped and reported; text
//   between cards is ignored (and reported, see below). A card without UID is named "<source>#<position>", counted from 0
//   over every card of the text, skipped ones included.
// - A line that reads BEGIN:VCARD or END:VCARD (any case, blanks around it ignored) always opens or
//   closes a card, even indented: a hand-indented file loses no card that way. A byte-order mark
//   before it is ignored too (files joined with their marks).
// - What the reader cannot read besides whole cards (text outside any card, lines in a card that are
//   no property, bytes that are no UTF-16) is reported once per text, counted, with the first place.
// - A BEGIN:VCARD right after an empty AGENT property (or "AGENT:BEGIN:VCARD") opens an embedded
//   card, which is skipped up to its END. Any other BEGIN:VCARD inside a card means the card was cut
//   off: it is reported and the new card is read.
// - Values are decoded (quoted-printable, base64), converted from their CHARSET to UTF-8, then split
//   at unescaped ";" and "," and unescaped ("\n" is a line break, "\x" is x).
// - Pictures: the first PHOTO is the full picture; a PHOTO with TYPE=thumbnail is the small one.
//   Inline data only (base64 or a data: URI); a PHOTO that names a URI elsewhere is ignored, never
//   fetched.
// - Phone numbers written as tel: URIs lose the "tel:" and their URI parameters; an extension
//   ";ext=102" is kept as " ext. 102", which the phone-number parser reads back as an extension.
// - Labels: CELL is "mobile"; HOME, WORK, PAGER, MAIN, OTHER are "home", "work", "pager", "main",
//   "other"; FAX is "fax", "home fax" or "work fax". PREF, INTERNET, VOICE and the like are no labels.
//   An "itemN.X-ABLabel" names the other properties of group itemN, "_$!<Label>!$_" read as "Label".

namespace kyn::platform {
namespace {

constexpr std::size_t kMaxCardBytes = std::size_t{32} << 20;

// ---------------------------------------------------------------------------------------------
// ASCII helpers (property names, parameters and keywords are ASCII and case-insensitive).

char upperAscii(char c) { return (c >= 'a' && c <= 'z') ? static_cast<char>(c - 'a' + 'A') : c; }

bool equalsIgnoringCase(std::string_view a, std::string_view b) {
  if (a.size() != b.size()) return false;
  for (std::size_t i = 0; i < a.size(); ++i) {
    if (upperAscii(a[i]) != upperAscii(b[i])) return false;
  }
  return true;
}

bool startsWithIgnoringCase(std::string_view text, std::string_view prefix) {
  return text.size() >= prefix.size() && equalsIgnoringCase(text.substr(0, prefix.size()), prefix);
}

std::string upper(std::string_view text) {
  std::string out(text);
  for (char& c : out) c = upperAscii(c);
  return out;
}

bool isBlank(char c) { return c == ' ' || c == '\t'; }
bool isSpace(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

std::string_view trim(std::string_view text) {
  while (!text.empty() && isSpace(text.front())) text.remove_prefix(1);
  while (!text.empty() && isSpace(text.back())) text.remove_suffix(1);
  return text;
}

int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  return -1;
}

int base64Value(char c) {
  if (c >= 'A' && c <= 'Z') return c - 'A';
  if (c >= 'a' && c <= 'z') return c - 'a' + 26;
  if (c >= '0' && c <= '9') return c - '0' + 52;
  if (c == '+' || c == '-') return 62;
  if (c == '/' || c == '_') return 63;
  return -1;
}

// A line that can only be more base64 data (a property line always holds a ':').
bool isBase64Line(std::string_view line) {
  return std::all_of(line.begin(), line.end(), [](char c) { return c == '=' || base64Value(c) >= 0; });
}

// ---------------------------------------------------------------------------------------------
// Transfer encodings.

// Whitespace and characters outside the alphabet are skipped; decoding stops at the padding.
std::vector<std::uint8_t> decodeBase64(std::string_view text) {
  std::vector<std::uint8_t> out;
  out.reserve(text.size() / 4 * 3);
  std::uint32_t bits = 0;
  int count = 0;
  for (char c : text) {
    if (c == '=') break;
    const int v = base64Value(c);
    if (v < 0) continue;
    bits = (bits << 6) | static_cast<std::uint32_t>(v);
    if (++count == 4) {
      out.push_back(static_cast<std::uint8_t>(bits >> 16));
      out.push_back(static_cast<std::uint8_t>(bits >> 8));
      out.push_back(static_cast<std::uint8_t>(bits));
      bits = 0;
      count = 0;
    }
  }
  if (count == 2) {
    out.push_back(static_cast<std::uint8_t>(bits >> 4));
  } else if (count == 3) {
    out.push_back(static_cast<std::uint8_t>(bits >> 10));
    out.push_back(static_cast<std::uint8_t>(bits >> 2));
  }
  return out;
}

// "=XX" is a byte. A "=" with nothing but blanks after it is a soft break with nothing after it
// (the soft breaks between lines are gone once the lines are joined); any other "=" stays as it is.
std::string decodeQuotedPrintable(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (c != '=') {
      out.push_back(c);
      continue;
    }
    if (i + 2 < text.size() && hexValue(text[i + 1]) >= 0 && hexValue(text[i + 2]) >= 0) {
      out.push_back(static_cast<char>(hexValue(text[i + 1]) * 16 + hexValue(text[i + 2])));
      i += 2;
    } else if (text.find_first_not_of(" \t", i + 1) == std::string_view::npos) {
      break;
    } else {
      out.push_back(c);
    }
  }
  return out;
}

// A quoted-printable soft line break at the end of `line`: "=" with nothing after it but blanks (which
// a transport may have added). Where the "=" stands, or nothing.
std::optional<std::size_t> softBreakAt(std::string_view line) {
  const std::size_t last = line.find_last_not_of(" \t");
  if (last == std::string_view::npos || line[last] != '=') return std::nullopt;
  return last;
}

// %XX escapes of a URI; a broken escape stays as written.
std::string decodePercent(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '%' && i + 2 < text.size() && hexValue(text[i + 1]) >= 0 && hexValue(text[i + 2]) >= 0) {
      out.push_back(static_cast<char>(hexValue(text[i + 1]) * 16 + hexValue(text[i + 2])));
      i += 2;
    } else {
      out.push_back(text[i]);
    }
  }
  return out;
}

// ---------------------------------------------------------------------------------------------
// Character sets.

std::string utf8FromUnicode(const icu::UnicodeString& text) {
  std::string out;
  text.toUTF8String(out);  // unpaired surrogates become U+FFFD
  return out;
}

// Well-formed UTF-8 with every ill-formed sequence replaced by U+FFFD.
std::string repairUtf8(std::string bytes) {
  if (isValidUtf8(bytes)) return bytes;
  return utf8FromUnicode(icu::UnicodeString::fromUTF8(icu::StringPiece(bytes.data(), static_cast<int32_t>(bytes.size()))));
}

// The bytes read with an ICU converter; nothing when ICU has no converter of that name. Only names
// in ICU's alias table are opened, so that a card cannot make ICU look for a data file of its choice.
std::optional<std::string> convertWith(const char* charset, std::string_view bytes) {
  UErrorCode status = U_ZERO_ERROR;
  if (ucnv_countAliases(charset, &status) == 0 || U_FAILURE(status)) return std::nullopt;
  status = U_ZERO_ERROR;
  std::unique_ptr<UConverter, decltype(&ucnv_close)> converter(ucnv_open(charset, &status), &ucnv_close);
  if (U_FAILURE(status) || !converter) return std::nullopt;
  status = U_ZERO_ERROR;
  const icu::UnicodeString text(bytes.data(), static_cast<int32_t>(bytes.size()), converter.get(), status);
  if (U_FAILURE(status)) return std::nullopt;
  return repairUtf8(utf8FromUnicode(text));
}

// Text bytes in `charset` as UTF-8. Without a charset (or with one that ICU does not know) the
// bytes are UTF-8 when they are valid UTF-8 and windows-1252 otherwise, the usual other choice of
// old exporters; declared UTF-8 keeps its valid parts and marks the rest with U+FFFD.
std::string toUtf8(std::string bytes, std::string_view charset) {
  // Old exporters declare US-ASCII for text that is not: read it as if no charset were given.
  if (equalsIgnoringCase(charset, "US-ASCII") || equalsIgnoringCase(charset, "ASCII")) charset = {};
  if (charset.empty() || equalsIgnoringCase(charset, "UTF-8") || equalsIgnoringCase(charset, "UTF8")) {
    if (isValidUtf8(bytes)) return bytes;
    if (!charset.empty()) return repairUtf8(std::move(bytes));
  } else {
    // A name longer than any character set's is not looked up at all.
    if (charset.size() < 64) {
      if (auto converted = convertWith(std::string(charset).c_str(), bytes)) return *converted;
    }
    if (isValidUtf8(bytes)) return bytes;
  }
  // ICU's windows-1252 converter maps every byte (the few unassigned ones to U+FFFD). Only an ICU
  // built without that converter gets past it; then the text is at least valid UTF-8.
  if (auto converted = convertWith("windows-1252", bytes)) return *converted;
  return repairUtf8(std::move(bytes));
}

// ---------------------------------------------------------------------------------------------
// Value escapes.

// Splits at every `separator` that no backslash escapes; the parts keep their escapes.
std::vector<std::string_view> splitUnescaped(std::string_view text, char separator) {
  std::vector<std::string_view> parts;
  std::size_t start = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '\\') {
      ++i;
    } else if (text[i] == separator) {
      parts.push_back(text.substr(start, i - start));
      start = i + 1;
    }
  }
  parts.push_back(text.substr(start));
  return parts;
}

// "\n" and "\N" are line breaks, a backslash before any other character is that character; line
// breaks of every convention become "\n".
std::string unescape(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    char c = text[i];
    if (c == '\\' && i + 1 < text.size()) {
      c = text[++i];
      out.push_back(c == 'n' || c == 'N' ? '\n' : c);
    } else if (c == '\r') {
      out.push_back('\n');
      if (i + 1 < text.size() && text[i + 1] == '\n') ++i;
    } else {
      out.push_back(c);
    }
  }
  return out;
}

std::string unescapeTrimmed(std::string_view text) { return std::string(trim(unescape(text))); }

// ---------------------------------------------------------------------------------------------
// Properties.

enum class Encoding { None, QuotedPrintable, Base64 };

// Finds where the name and parameters of a property line end: the first ':' outside quotes. A quote
// that is never closed does not hide the line's value: then the first ':' of all counts. Scans
// only what was added since the last call, so that a line that grows by many folds costs no more.
class HeadScanner {
 public:
  std::optional<std::size_t> scan(std::string_view line) {
    for (; pos_ < line.size() && !end_; ++pos_) {
      const char c = line[pos_];
      if (c == ':' && !firstColon_) firstColon_ = pos_;
      if (inQuotes_) {
        if (c == '"') inQuotes_ = false;
      } else if (c == ':') {
        end_ = pos_;
      } else if (c == ';') {
        inParameters_ = true;
      } else if (c == '"' && inParameters_) {
        inQuotes_ = true;
      }
    }
    if (end_) return end_;
    if (inQuotes_) return firstColon_;
    return std::nullopt;
  }

 private:
  std::size_t pos_ = 0;
  bool inParameters_ = false;
  bool inQuotes_ = false;
  std::optional<std::size_t> end_;
  std::optional<std::size_t> firstColon_;
};

std::optional<std::size_t> headEnd(std::string_view line) { return HeadScanner().scan(line); }

struct Property {
  std::string group;  // upper case, empty when none
  std::string name;   // upper case
  std::vector<std::string> types;  // upper case; 2.1 bare parameters count as types
  Encoding encoding = Encoding::None;
  std::string charset;
  std::string valueType;  // VALUE=, upper case
  std::string_view value;

  [[nodiscard]] bool hasType(std::string_view type) const {
    return std::find(types.begin(), types.end(), type) != types.end();
  }
};

// Splits the head at ';' (or `separator`) outside double quotes.
std::vector<std::string_view> splitOutsideQuotes(std::string_view text, char separator) {
  std::vector<std::string_view> parts;
  bool inQuotes = false;
  std::size_t start = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '"') {
      inQuotes = !inQuotes;
    } else if (text[i] == separator && !inQuotes) {
      parts.push_back(text.substr(start, i - start));
      start = i + 1;
    }
  }
  parts.push_back(text.substr(start));
  return parts;
}

std::string_view unquote(std::string_view text) {
  text = trim(text);
  if (text.size() >= 2 && text.front() == '"' && text.back() == '"') text = text.substr(1, text.size() - 2);
  return text;
}

Encoding encodingNamed(std::string_view name) {
  if (equalsIgnoringCase(name, "QUOTED-PRINTABLE")) return Encoding::QuotedPrintable;
  if (equalsIgnoringCase(name, "BASE64") || equalsIgnoringCase(name, "B")) return Encoding::Base64;
  return Encoding::None;
}

void readParameters(std::string_view head, Property& property) {
  const auto segments = splitOutsideQuotes(head, ';');
  std::string_view name = trim(segments.front());
  if (const std::size_t dot = name.rfind('.'); dot != std::string_view::npos) {
    property.group = upper(name.substr(0, dot));
    name = name.substr(dot + 1);
  }
  property.name = upper(name);
  for (std::size_t i = 1; i < segments.size(); ++i) {
    const std::string_view parameter = trim(segments[i]);
    if (parameter.empty()) continue;
    const std::size_t equals = parameter.find('=');
    if (equals == std::string_view::npos) {
      // 2.1 writes bare values: "TEL;CELL;PREF", "PHOTO;BASE64", "NOTE;QUOTED-PRINTABLE".
      if (const Encoding encoding = encodingNamed(parameter); encoding != Encoding::None) {
        property.encoding = encoding;
      } else {
        property.types.push_back(upper(unquote(parameter)));
      }
      continue;
    }
    const std::string_view key = trim(parameter.substr(0, equals));
    const std::string_view value = parameter.substr(equals + 1);
    if (equalsIgnoringCase(key, "TYPE")) {
      // TYPE=home,work and TYPE="work,voice" both list several types.
      for (std::string_view item : splitOutsideQuotes(value, ',')) {
        for (std::string_view type : splitOutsideQuotes(unquote(item), ',')) {
          type = trim(type);
          if (!type.empty()) property.types.push_back(upper(type));
        }
      }
    } else if (equalsIgnoringCase(key, "ENCODING")) {
      property.encoding = encodingNamed(unquote(value));
    } else if (equalsIgnoringCase(key, "CHARSET")) {
      property.charset = std::string(unquote(value));
    } else if (equalsIgnoringCase(key, "VALUE")) {
      property.valueType = upper(unquote(value));
    }
  }
}

std::optional<Property> parseProperty(std::string_view line) {
  const auto end = headEnd(line);
  if (!end || *end == 0) return std::nullopt;
  Property property;
  readParameters(line.substr(0, *end), property);
  if (property.name.empty()) return std::nullopt;
  property.value = line.substr(*end + 1);
  return property;
}

// The property's value as bytes, its transfer encoding undone.
std::string valueBytes(const Property& property) {
  switch (property.encoding) {
    case Encoding::QuotedPrintable:
      return decodeQuotedPrintable(property.value);
    case Encoding::Base64: {
      const auto bytes = decodeBase64(property.value);
      return std::string(bytes.begin(), bytes.end());
    }
    case Encoding::None:
      break;
  }
  return std::string(property.value);
}

// The property's value as UTF-8 text, escapes still in place.
std::string valueText(const Property& property) { return toUtf8(valueBytes(property), property.charset); }

// ---------------------------------------------------------------------------------------------
// Labels.

std::optional<std::string> labelOfTypes(const Property& property) {
  if (property.hasType("FAX")) {
    if (property.hasType("HOME")) return "home fax";
    if (property.hasType("WORK")) return "work fax";
    return "fax";
  }
  if (property.hasType("CELL")) return "mobile";
  if (property.hasType("PAGER")) return "pager";
  if (property.hasType("MAIN")) return "main";
  if (property.hasType("HOME")) return "home";
  if (property.hasType("WORK")) return "work";
  if (property.hasType("OTHER")) return "other";
  return std::nullopt;
}

// "_$!<Anniversary>!$_" is how exporters write the standard labels; the words inside are the label.
std::string cleanLabel(std::string_view label) {
  label = trim(label);
  if (label.starts_with("_$!<") && label.ends_with(">!$_") && label.size() >= 8) {
    label = label.substr(4, label.size() - 8);
  }
  return std::string(label);
}

// ---------------------------------------------------------------------------------------------
// Property values.

// A phone number as written, or the number of a tel: URI with its extension kept readable.
std::string phoneValue(const Property& property) {
  std::string text = unescapeTrimmed(valueText(property));
  if (!startsWithIgnoringCase(text, "tel:")) return text;
  const std::string_view uri = std::string_view(text).substr(4);
  const auto parts = splitUnescaped(uri, ';');
  std::string number = decodePercent(trim(parts.front()));
  for (std::size_t i = 1; i < parts.size(); ++i) {
    const std::string_view parameter = trim(parts[i]);
    if (startsWithIgnoringCase(parameter, "ext=") && parameter.size() > 4) {
      number += " ext. " + decodePercent(parameter.substr(4));
    }
  }
  // Escapes may have made bytes that are no UTF-8.
  return std::string(trim(toUtf8(std::move(number), {})));
}

std::string emailValue(const Property& property) {
  std::string text = unescapeTrimmed(valueText(property));
  if (startsWithIgnoringCase(text, "mailto:")) text = std::string(trim(std::string_view(text).substr(7)));
  return text;
}

// Name components: "a,b" lists read as "a b".
std::string joinedList(std::string_view component) {
  std::string out;
  for (std::string_view item : splitUnescaped(component, ',')) {
    const std::string text = unescapeTrimmed(item);
    if (text.empty()) continue;
    if (!out.empty()) out += ' ';
    out += text;
  }
  return out;
}

// An address as one text in the order of a postal label: post-office box, extended address,
// street, then "locality, region postal-code", then country, one per line.
std::string addressText(std::string_view value) {
  auto parts = splitUnescaped(value, ';');
  parts.resize(std::max<std::size_t>(parts.size(), 7));
  std::array<std::string, 7> c;
  for (std::size_t i = 0; i < 7; ++i) c[i] = unescapeTrimmed(parts[i]);
  // Components past the seventh are not standard; keep them rather than lose them.
  for (std::size_t i = 7; i < parts.size(); ++i) {
    const std::string extra = unescapeTrimmed(parts[i]);
    if (!extra.empty()) c[6] += (c[6].empty() ? "" : " ") + extra;
  }
  std::string cityLine = c[3];
  std::string regionAndCode = c[4];
  if (!c[5].empty()) regionAndCode += (regionAndCode.empty() ? "" : " ") + c[5];
  if (!regionAndCode.empty()) cityLine += (cityLine.empty() ? "" : ", ") + regionAndCode;
  std::string out;
  for (const std::string* line : {&c[0], &c[1], &c[2], &cityLine, &c[6]}) {
    if (line->empty()) continue;
    if (!out.empty()) out += '\n';
    out += *line;
  }
  return out;
}

// The picture bytes of a PHOTO: base64, a data: URI, or (from writers that leave out the
// encoding) bare base64. Nothing for a picture elsewhere (http:, file:, cid:), which is never fetched.
std::optional<std::vector<std::uint8_t>> pictureBytes(const Property& property) {
  std::vector<std::uint8_t> bytes;
  if (property.encoding == Encoding::Base64) {
    bytes = decodeBase64(property.value);
  } else if (property.encoding == Encoding::QuotedPrintable) {
    const std::string decoded = decodeQuotedPrintable(property.value);
    bytes.assign(decoded.begin(), decoded.end());
  } else {
    const std::string_view value = trim(property.value);
    if (startsWithIgnoringCase(value, "data:")) {
      const std::size_t comma = value.find(',');
      if (comma == std::string_view::npos) return std::nullopt;
      const std::string_view header = value.substr(5, comma - 5);
      const std::string_view payload = value.substr(comma + 1);
      if (header.size() >= 7 && equalsIgnoringCase(header.substr(header.size() - 7), ";base64")) {
        bytes = decodeBase64(payload);
      } else {
        const std::string decoded = decodePercent(payload);
        bytes.assign(decoded.begin(), decoded.end());
      }
    } else if (property.valueType == "URI" || property.valueType == "URL" ||
               value.find(':') != std::string_view::npos) {
      return std::nullopt;
    } else {
      bytes = decodeBase64(value);
    }
  }
  if (bytes.empty()) return std::nullopt;
  return bytes;
}

void setOnce(std::optional<std::string>& field, std::string value) {
  if (!field && !value.empty()) field = std::move(value);
}

void addValue(std::vector<LabeledValue>& list, std::optional<std::string> label, std::string value) {
  if (value.empty()) return;
  list.push_back(LabeledValue{std::move(label), std::move(value)});
}

// ---------------------------------------------------------------------------------------------
// A card's logical lines into a contact.

// `unicodeText`: the text was read from UTF-16, so values that carry no transfer encoding are text
// already, whatever their CHARSET says. `unreadLines` counts the lines that are no property.
Contact contactOfCard(const std::vector<std::string>& lines, std::string_view sourceName, std::size_t index,
                      bool unicodeText, std::size_t& unreadLines) {
  std::vector<Property> properties;
  properties.reserve(lines.size());
  std::map<std::string, std::string> groupLabels;
  for (const std::string& line : lines) {
    auto property = parseProperty(line);
    if (!property) {
      ++unreadLines;
      continue;
    }
    if (unicodeText && property->encoding == Encoding::None) property->charset.clear();
    if (property->name == "X-ABLABEL") {
      if (!property->group.empty() && !groupLabels.contains(property->group)) {
        std::string label = cleanLabel(unescape(valueText(*property)));
        if (!label.empty()) groupLabels.emplace(property->group, std::move(label));
      }
      continue;
    }
    properties.push_back(std::move(*property));
  }

  Contact contact;
  std::optional<std::string> uid;
  for (const Property& p : properties) {
    const std::string& name = p.name;
    auto label = [&]() -> std::optional<std::string> {
      if (!p.group.empty()) {
        if (auto it = groupLabels.find(p.group); it != groupLabels.end()) return it->second;
      }
      return labelOfTypes(p);
    };
    // The first type that is not a preference, as written: the label of relations and profiles.
    auto labelOrFirstType = [&]() -> std::optional<std::string> {
      if (auto l = label()) return l;
      for (const std::string& type : p.types) {
        if (type.empty() || type == "PREF") continue;
        std::string lower = type;
        std::transform(lower.begin(), lower.end(), lower.begin(),
                       [](char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c; });
        return toUtf8(std::move(lower), {});  // parameters carry no charset of their own
      }
      return std::nullopt;
    };

    if (name == "FN") {
      setOnce(contact.formattedName, unescapeTrimmed(valueText(p)));
    } else if (name == "N") {
      if (contact.familyName || contact.givenName || contact.middleName || contact.namePrefix || contact.nameSuffix) {
        continue;  // the first N names the contact
      }
      const std::string text = valueText(p);
      auto parts = splitUnescaped(text, ';');
      parts.resize(std::max<std::size_t>(parts.size(), 5));
      setOnce(contact.familyName, joinedList(parts[0]));
      setOnce(contact.givenName, joinedList(parts[1]));
      setOnce(contact.middleName, joinedList(parts[2]));
      setOnce(contact.namePrefix, joinedList(parts[3]));
      setOnce(contact.nameSuffix, joinedList(parts[4]));
    } else if (name == "NICKNAME") {
      setOnce(contact.nickname, unescapeTrimmed(valueText(p)));
    } else if (name == "ORG") {
      if (contact.organizationName || contact.departmentName) continue;
      const std::string text = valueText(p);
      const auto units = splitUnescaped(text, ';');
      setOnce(contact.organizationName, unescapeTrimmed(units.front()));
      std::string department;
      for (std::size_t i = 1; i < units.size(); ++i) {
        const std::string unit = unescapeTrimmed(units[i]);
        if (unit.empty()) continue;
        if (!department.empty()) department += ", ";
        department += unit;
      }
      setOnce(contact.departmentName, std::move(department));
    } else if (name == "TITLE") {
      setOnce(contact.jobTitle, unescapeTrimmed(valueText(p)));
    } else if (name == "NOTE") {
      setOnce(contact.note, unescapeTrimmed(valueText(p)));
    } else if (name == "BDAY") {
      setOnce(contact.birthday, unescapeTrimmed(valueText(p)));
    } else if (name == "UID") {
      if (!uid) {
        std::string text(trim(valueText(p)));
        if (!text.empty()) uid = std::move(text);
      }
    } else if (name == "KIND") {
      const std::string text = unescapeTrimmed(valueText(p));
      if (equalsIgnoringCase(text, "org") || equalsIgnoringCase(text, "organization")) {
        contact.contactType = ContactType::Organization;
      }
    } else if (name == "X-ABSHOWAS") {
      if (equalsIgnoringCase(unescapeTrimmed(valueText(p)), "COMPANY")) contact.contactType = ContactType::Organization;
    } else if (name == "TEL") {
      addValue(contact.phoneNumbers, label(), phoneValue(p));
    } else if (name == "EMAIL") {
      addValue(contact.emailAddresses, label(), emailValue(p));
    } else if (name == "ADR") {
      addValue(contact.postalAddresses, label(), addressText(valueText(p)));
    } else if (name == "URL") {
      addValue(contact.urlAddresses, label(), unescapeTrimmed(valueText(p)));
    } else if (name == "X-PHONETIC-FIRST-NAME") {
      setOnce(contact.phoneticGivenName, unescapeTrimmed(valueText(p)));
    } else if (name == "X-PHONETIC-MIDDLE-NAME") {
      setOnce(contact.phoneticMiddleName, unescapeTrimmed(valueText(p)));
    } else if (name == "X-PHONETIC-LAST-NAME") {
      setOnce(contact.phoneticFamilyName, unescapeTrimmed(valueText(p)));
    } else if (name == "X-MAIDENNAME") {
      setOnce(contact.previousFamilyName, unescapeTrimmed(valueText(p)));
    } else if (name == "ANNIVERSARY" || name == "X-ANNIVERSARY") {
      addValue(contact.dates, label().value_or("anniversary"), unescapeTrimmed(valueText(p)));
    } else if (name == "X-ABDATE") {
      addValue(contact.dates, label(), unescapeTrimmed(valueText(p)));
    } else if (name == "X-ABRELATEDNAMES" || name == "RELATED") {
      addValue(contact.relations, labelOrFirstType(), unescapeTrimmed(valueText(p)));
    } else if (name == "X-SPOUSE") {
      addValue(contact.relations, label().value_or("spouse"), unescapeTrimmed(valueText(p)));
    } else if (name == "IMPP" || name == "X-AIM" || name == "X-JABBER" || name == "X-ICQ" || name == "X-MS-IMADDRESS") {
      addValue(contact.instantMessageAddresses, label(), unescapeTrimmed(valueText(p)));
    } else if (name == "X-SOCIALPROFILE") {
      addValue(contact.socialProfiles, labelOrFirstType(), unescapeTrimmed(valueText(p)));
    } else if (name == "PHOTO") {
      const bool thumbnail = p.hasType("THUMBNAIL");
      ImageBytes& slot = thumbnail ? contact.thumbnailImageData : contact.imageData;
      if (slot) continue;
      if (auto bytes = pictureBytes(p)) slot = std::make_shared<const std::vector<std::uint8_t>>(std::move(*bytes));
    }
  }
  contact.identifier = uid ? *uid : std::string(sourceName) + "#" + std::to_string(index);
  return contact;
}

// ---------------------------------------------------------------------------------------------
// Physical lines, cards and logical lines.

// Physical lines of the text; CRLF, LF and CR all end a line.
class LineReader {
 public:
  explicit LineReader(std::string_view text) : text_(text) {}

  // The next line without its break; `start` is its offset and `number` counts from 1.
  bool next(std::string_view& line) {
    if (pos_ >= text_.size()) return false;
    start_ = pos_;
    std::size_t end = pos_;
    while (end < text_.size() && text_[end] != '\r' && text_[end] != '\n') ++end;
    line = text_.substr(pos_, end - pos_);
    pos_ = end;
    if (pos_ < text_.size()) {
      if (text_[pos_] == '\r' && pos_ + 1 < text_.size() && text_[pos_ + 1] == '\n') ++pos_;
      ++pos_;
    }
    ++number_;
    return true;
  }
  [[nodiscard]] std::size_t start() const { return start_; }
  [[nodiscard]] std::size_t end() const { return pos_; }
  [[nodiscard]] std::size_t number() const { return number_; }

 private:
  std::string_view text_;
  std::size_t pos_ = 0;
  std::size_t start_ = 0;
  std::size_t number_ = 0;
};

constexpr std::string_view kUtf8ByteOrderMark = "\xEF\xBB\xBF";

bool isMarker(std::string_view line, std::string_view marker) {
  line = trim(line);
  if (line.starts_with(kUtf8ByteOrderMark)) line = trim(line.substr(kUtf8ByteOrderMark.size()));
  return equalsIgnoringCase(line, marker);
}

// A property line that opens an embedded card: "AGENT:" with nothing after it, or "AGENT:BEGIN:VCARD".
enum class AgentLine { No, Opens, OpensOnThisLine };
AgentLine agentLine(std::string_view line) {
  if (line.empty() || isBlank(line.front())) return AgentLine::No;
  const auto end = headEnd(line);
  if (!end) return AgentLine::No;
  std::string_view name = trim(line.substr(0, std::min(*end, line.find(';'))));
  if (const std::size_t dot = name.rfind('.'); dot != std::string_view::npos) name = name.substr(dot + 1);
  if (!equalsIgnoringCase(name, "AGENT")) return AgentLine::No;
  const std::string_view value = trim(line.substr(*end + 1));
  if (value.empty()) return AgentLine::Opens;
  if (equalsIgnoringCase(value, "BEGIN:VCARD")) return AgentLine::OpensOnThisLine;
  return AgentLine::No;
}

// Joins a card's physical lines into logical lines: folds, quoted-printable soft breaks and bare
// base64 continuation lines.
class LogicalLines {
 public:
  void add(std::string_view line) {
    if (line.empty()) {
      finish();  // a blank line ends a value (2.1 base64 ends so)
      return;
    }
    const bool continuation = isBlank(line.front());
    if (open_) {
      if (const auto softBreak = softBreakAt(current_); softBreak && encoding() == Encoding::QuotedPrintable) {
        current_.resize(*softBreak);
        current_.append(line);
        return;
      }
      if (continuation) {
        current_.append(line.substr(1));
        return;
      }
      if (isBase64Line(line) && encoding() == Encoding::Base64) {
        current_.append(line);
        return;
      }
    }
    finish();
    // A continuation with nothing before it starts a line of its own.
    while (!line.empty() && isBlank(line.front())) line.remove_prefix(1);
    if (line.empty()) return;
    current_.assign(line);
    open_ = true;
  }

  void finish() {
    if (!open_) return;
    lines_.push_back(std::move(current_));
    current_.clear();
    open_ = false;
    head_ = HeadScanner();
    encoding_.reset();
  }

  [[nodiscard]] std::vector<std::string>& lines() { return lines_; }

  void clear() {
    lines_.clear();
    current_.clear();
    open_ = false;
    head_ = HeadScanner();
    encoding_.reset();
  }

 private:
  // The transfer encoding of the open line, read once its head is complete.
  Encoding encoding() {
    if (encoding_) return *encoding_;
    const auto end = head_.scan(current_);
    if (!end) return Encoding::None;
    Property property;
    readParameters(std::string_view(current_).substr(0, *end), property);
    encoding_ = property.encoding;
    return *encoding_;
  }

  std::vector<std::string> lines_;
  std::string current_;
  bool open_ = false;
  HeadScanner head_;
  std::optional<Encoding> encoding_;
};

class CardReader {
 public:
  // `invalidUnits`: how many code units of a UTF-16 text were no character.
  CardReader(std::string_view text, std::string_view sourceName, bool unicodeText, std::size_t invalidUnits)
      : reader_(text), source_(sourceName), unicodeText_(unicodeText), invalidUnits_(invalidUnits) {}

  VCardParseResult run() {
    std::string_view line;
    while (reader_.next(line)) {
      switch (state_) {
        case State::Outside:
          if (isMarker(line, "BEGIN:VCARD")) {
            begin();
          } else if (!trim(line).empty()) {
            if (outsideLines_++ == 0) firstOutsideLine_ = reader_.number();
          }
          break;
        case State::InCard:
          inCard(line);
          break;
        case State::Embedded:
          if (isMarker(line, "BEGIN:VCARD") || agentLine(line) == AgentLine::OpensOnThisLine) {
            ++depth_;
          } else if (isMarker(line, "END:VCARD") && --depth_ == 0) {
            state_ = State::InCard;
          }
          break;
        case State::TooLarge:
          if (isMarker(line, "END:VCARD")) {
            skip("is larger than 32 MiB");
            state_ = State::Outside;
          } else if (isMarker(line, "BEGIN:VCARD")) {
            skip("is larger than 32 MiB");  // and cut off: the new card is read
            begin();
          }
          break;
      }
    }
    if (state_ == State::TooLarge) {
      skip("is larger than 32 MiB");
    } else if (state_ != State::Outside) {
      skip("has no END:VCARD");
    }
    if (outsideLines_ > 0) {
      unread(counted(outsideLines_, "line") + " outside any card, the first on line " + std::to_string(firstOutsideLine_));
    }
    if (propertylessLines_ > 0) {
      unread(counted(propertylessLines_, "line") + " in cards that are no property, the first in the card that begins on line " +
             std::to_string(firstPropertylessCard_));
    }
    if (invalidUnits_ > 0) unread(counted(invalidUnits_, "UTF-16 code unit") + " that are no character, read as U+FFFD");
    return std::move(result_);
  }

 private:
  enum class State { Outside, InCard, Embedded, TooLarge };

  void begin() {
    state_ = State::InCard;
    cardStart_ = reader_.start();
    cardLine_ = reader_.number();
    cardIndex_ = cardCount_++;
    lines_.clear();
    previousOpensAgent_ = false;
  }

  void inCard(std::string_view line) {
    if (reader_.end() - cardStart_ > kMaxCardBytes) {
      lines_.clear();
      state_ = State::TooLarge;
      if (isMarker(line, "END:VCARD")) {
        skip("is larger than 32 MiB");
        state_ = State::Outside;
      }
      return;
    }
    if (isMarker(line, "END:VCARD")) {
      lines_.finish();
      try {
        std::size_t unreadLines = 0;
        result_.contacts.push_back(contactOfCard(lines_.lines(), source_, cardIndex_, unicodeText_, unreadLines));
        if (unreadLines > 0 && propertylessLines_ == 0) firstPropertylessCard_ = cardLine_;
        propertylessLines_ += unreadLines;
      } catch (const std::exception&) {
        skip("could not be read");  // out of memory: the card is lost, the rest is read
      }
      lines_.clear();
      state_ = State::Outside;
      return;
    }
    if (isMarker(line, "BEGIN:VCARD")) {
      if (previousOpensAgent_) {
        lines_.finish();
        state_ = State::Embedded;
        depth_ = 1;
        previousOpensAgent_ = false;
        return;
      }
      skip("has no END:VCARD");  // cut off: the new card is read on its own
      begin();
      return;
    }
    const AgentLine agent = agentLine(line);
    if (agent == AgentLine::OpensOnThisLine) {
      lines_.finish();
      state_ = State::Embedded;
      depth_ = 1;
      return;
    }
    previousOpensAgent_ = agent == AgentLine::Opens;
    if (previousOpensAgent_) return;  // the AGENT line itself carries nothing
    lines_.add(line);
  }

  static std::string counted(std::size_t count, std::string_view noun) {
    return std::to_string(count) + " " + std::string(noun) + (count == 1 ? "" : "s");
  }

  // Adds a reason to the one line that tells what else could not be read.
  void unread(const std::string& reason) {
    result_.unread += result_.unread.empty() ? std::string(source_) + ": not read: " : std::string("; ");
    result_.unread += reason;
  }

  void skip(std::string_view reason) {
    result_.skipped.push_back(std::string(source_) + ": the card that begins on line " + std::to_string(cardLine_) +
                              " " + std::string(reason));
  }

  LineReader reader_;
  std::string_view source_;
  bool unicodeText_;
  std::size_t invalidUnits_;
  VCardParseResult result_;
  LogicalLines lines_;
  State state_ = State::Outside;
  std::size_t cardStart_ = 0;
  std::size_t cardLine_ = 0;
  std::size_t cardIndex_ = 0;
  std::size_t cardCount_ = 0;
  int depth_ = 0;
  bool previousOpensAgent_ = false;
  std::size_t outsideLines_ = 0;
  std::size_t firstOutsideLine_ = 0;
  std::size_t propertylessLines_ = 0;
  std::size_t firstPropertylessCard_ = 0;
};

// UTF-16 text as UTF-8; an unpaired surrogate or a last odd byte becomes U+FFFD and is counted.
std::string utf8FromUtf16(std::string_view bytes, bool bigEndian, std::size_t& invalid) {
  const auto units = static_cast<int32_t>(bytes.size() / 2);
  icu::UnicodeString text;
  char16_t* buffer = text.getBuffer(units);
  if (buffer == nullptr) throw std::bad_alloc();
  for (int32_t i = 0; i < units; ++i) {
    const auto first = static_cast<unsigned char>(bytes[2 * i]);
    const auto second = static_cast<unsigned char>(bytes[2 * i + 1]);
    buffer[i] = static_cast<char16_t>(bigEndian ? (first << 8) | second : (second << 8) | first);
  }
  text.releaseBuffer(units);
  for (int32_t i = 0; i < text.length(); i = text.moveIndex32(i, 1)) {
    if (U_IS_SURROGATE(text.char32At(i))) ++invalid;  // a pair reads as one supplementary character
  }
  if (bytes.size() % 2 != 0) {
    text.append(char16_t{0xFFFD});
    ++invalid;
  }
  return utf8FromUnicode(text);
}

enum class TextEncoding { Utf8, Utf16LittleEndian, Utf16BigEndian };

// The encoding of a text by its byte-order mark, which is then dropped from `text`. Without one,
// UTF-16 shows in a NUL byte beside the first character (a vCard starts with ASCII).
TextEncoding textEncoding(std::string_view& text) {
  if (text.starts_with(kUtf8ByteOrderMark)) {
    text.remove_prefix(kUtf8ByteOrderMark.size());
    return TextEncoding::Utf8;
  }
  if (text.starts_with("\xFF\xFE") || text.starts_with("\xFE\xFF")) {
    const bool bigEndian = text[0] == '\xFE';
    text.remove_prefix(2);
    return bigEndian ? TextEncoding::Utf16BigEndian : TextEncoding::Utf16LittleEndian;
  }
  if (text.size() >= 2 && (text[0] == '\0') != (text[1] == '\0')) {
    return text[0] == '\0' ? TextEncoding::Utf16BigEndian : TextEncoding::Utf16LittleEndian;
  }
  return TextEncoding::Utf8;
}

}  // namespace

VCardParseResult parseVCards(std::string_view text, std::string_view sourceName) {
  try {
    const TextEncoding encoding = textEncoding(text);
    if (encoding == TextEncoding::Utf8) return CardReader(text, sourceName, false, 0).run();
    std::size_t invalid = 0;
    const std::string utf8 = utf8FromUtf16(text, encoding == TextEncoding::Utf16BigEndian, invalid);
    return CardReader(utf8, sourceName, true, invalid).run();
  } catch (const std::exception&) {
    VCardParseResult result;
    result.skipped.push_back(std::string(sourceName) + ": could not be read (out of memory)");
    return result;
  }
}

}  // namespace kyn::platform
