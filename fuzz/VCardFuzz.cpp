// Reads arbitrary bytes as vCard text. Whatever the bytes, charsets and encodings: every contact has
// an identifier, all of its text is valid UTF-8, a picture is never empty, and every skipped card
// has its report line, as has whatever else was not read.
#include "platform/contacts/VCard.h"
#include "platform/text/StringEscapes.h"

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace {

using namespace kyn::platform;

void check(bool condition) {
  if (!condition) __builtin_trap();
}

void checkText(const std::optional<std::string>& text) {
  if (text) check(!text->empty() && isValidUtf8(*text));
}

void checkList(const std::vector<LabeledValue>& list) {
  for (const LabeledValue& item : list) {
    check(!item.value.empty() && isValidUtf8(item.value));
    if (item.label) check(isValidUtf8(*item.label));
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const VCardParseResult result = parseVCards(text, "fuzz.vcf");
  for (const Contact& c : result.contacts) {
    check(!c.identifier.empty() && isValidUtf8(c.identifier));
    for (const auto* field : {&c.namePrefix, &c.givenName, &c.middleName, &c.familyName, &c.previousFamilyName,
                              &c.nameSuffix, &c.nickname, &c.phoneticGivenName, &c.phoneticMiddleName,
                              &c.phoneticFamilyName, &c.organizationName, &c.departmentName, &c.jobTitle,
                              &c.birthday, &c.note, &c.formattedName}) {
      checkText(*field);
    }
    for (const auto* list : {&c.phoneNumbers, &c.emailAddresses, &c.postalAddresses, &c.dates, &c.urlAddresses,
                             &c.relations, &c.socialProfiles, &c.instantMessageAddresses}) {
      checkList(*list);
    }
    check(!c.imageData || !c.imageData->empty());
    check(!c.thumbnailImageData || !c.thumbnailImageData->empty());
  }
  for (const std::string& line : result.skipped) check(line.starts_with("fuzz.vcf: "));
  check(result.unread.empty() || (result.unread.starts_with("fuzz.vcf: ") && isValidUtf8(result.unread)));
  return 0;
}
