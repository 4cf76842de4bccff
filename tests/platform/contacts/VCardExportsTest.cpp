// The reader and the store against address books written by real exporters, read where they stand
// in the shared test data (never copied into the project).
#include "platform/contacts/VCard.h"
#include "platform/contacts/VCardContactStore.h"
#include "platform/image/Image.h"
#include "platform/text/StringEscapes.h"
#include "support/PlatformTest.h"

#include <algorithm>
#include <sstream>

namespace kyn::platform {
namespace {

using VCardExports = test::PlatformTest;  // keeps the log lines of the loads out of the output

TEST_F(VCardExports, EveryCardIsReadAndFoundByEachOfItsAddressesAndNumbers) {
  const auto folder = test::sharedTestData("vcards");
  if (!folder) GTEST_SKIP() << "the shared test data (testdata/vcards beside the project) is not here";
  const ContactKeys keys = {std::string(ContactKey::FullNameFormatterKeys), std::string(ContactKey::ImageData)};
  const auto has = [](const auto& found, const std::string& id) {
    return std::any_of(found.begin(), found.end(), [&](const auto& c) { return c->identifier == id; });
  };
  const auto beginLines = [](const std::string& text) {  // the samples embed no cards in others
    std::size_t count = 0;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) {
      while (!line.empty() && (line.back() == '\r' || line.back() == ' ')) line.pop_back();
      std::transform(line.begin(), line.end(), line.begin(), [](unsigned char c) { return std::toupper(c); });
      count += line == "BEGIN:VCARD" ? 1 : 0;
    }
    return count;
  };
  std::size_t files = 0, contacts = 0, photos = 0;
  for (const auto& entry : std::filesystem::directory_iterator(*folder)) {
    if (entry.path().extension() != ".vcf") continue;
    SCOPED_TRACE(entry.path().filename().string());
    ++files;
    const std::string text = test::readFile(entry.path());
    const VCardParseResult parsed = parseVCards(text, entry.path().filename().string());
    EXPECT_TRUE(parsed.skipped.empty());
    EXPECT_TRUE(parsed.unread.empty()) << parsed.unread;
    EXPECT_EQ(parsed.contacts.size(), beginLines(text));

    VCardContactStore store(entry.path(), "us");
    for (const Contact& card : parsed.contacts) {
      SCOPED_TRACE(card.identifier);
      ++contacts;
      const auto contact = store.unifiedContactWithIdentifier(card.identifier, keys, nullptr);
      ASSERT_TRUE(contact);
      for (const auto& email : card.emailAddresses) {
        EXPECT_TRUE(has(store.unifiedContactsMatchingEmailAddress(email.value, keys, nullptr), card.identifier)) << email.value;
      }
      for (const auto& phone : card.phoneNumbers) {
        EXPECT_TRUE(has(store.unifiedContactsMatchingPhoneNumber(phone.value, keys, nullptr), card.identifier)) << phone.value;
      }
      const auto name = fullNameOfContact(*contact, "en_US");
      if (card.formattedName) {
        EXPECT_EQ(name, card.formattedName);
      }
      EXPECT_TRUE(!name || isValidUtf8(*name));
      // A photo decodes, or it is a JPEG the sample cut short: its start intact (the base64 was
      // read right), its end marker missing.
      if (const auto& bytes = contact->imageData) {
        if (decodeImage(*bytes)) {
          ++photos;
        } else {
          ASSERT_GE(bytes->size(), 4u);
          EXPECT_TRUE((*bytes)[0] == 0xFF && (*bytes)[1] == 0xD8);
          EXPECT_FALSE(bytes->at(bytes->size() - 2) == 0xFF && bytes->back() == 0xD9);
        }
      }
    }
  }
  EXPECT_GT(files, 0u);
  EXPECT_GE(contacts, files);
  EXPECT_GT(photos, 0u);
}

}  // namespace
}  // namespace kyn::platform
