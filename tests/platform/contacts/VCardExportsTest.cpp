// The reader and the store against address books written by real exporters, read where they stand
// in the shared test data (never copied into the project).
#include "platform/contacts/VCardContactStore.h"
#include "platform/contacts/VCard.h"
#include "platform/image/Image.h"
#include "platform/text/StringEscapes.h"
#include "support/PlatformTest.h"

#include <algorithm>
#include <sstream>

namespace kyn::platform {
namespace {

const ContactKeys kKeys = {std::string(ContactKey::FullNameFormatterKeys), std::string(ContactKey::ImageData)};

// Cards as a plain count of BEGIN:VCARD lines (the samples embed no cards in others).
std::size_t countBeginLines(const std::string& text) {
  std::size_t count = 0;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    while (!line.empty() && (line.back() == '\r' || line.back() == ' ')) line.pop_back();
    std::transform(line.begin(), line.end(), line.begin(), [](unsigned char c) { return std::toupper(c); });
    if (line == "BEGIN:VCARD") ++count;
  }
  return count;
}

bool contains(const std::vector<std::shared_ptr<const Contact>>& found, const std::string& identifier) {
  return std::any_of(found.begin(), found.end(), [&](const auto& c) { return c->identifier == identifier; });
}

// The samples' .vcf files in name order; nothing when the shared test data is not here.
std::optional<std::vector<std::filesystem::path>> sampleFiles() {
  const auto folder = test::sharedTestData("vcards");
  if (!folder) return std::nullopt;
  std::vector<std::filesystem::path> files;
  for (const auto& entry : std::filesystem::directory_iterator(*folder)) {
    if (entry.path().extension() == ".vcf") files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  return files;
}

using VCardExports = test::PlatformTest;  // keeps the log lines of the loads out of the output

TEST_F(VCardExports, EveryContactIsFoundByEachOfItsAddressesAndNumbers) {
  const auto samples = sampleFiles();
  if (!samples) GTEST_SKIP() << "the shared test data (testdata/vcards beside the project) is not here";
  const auto& files = *samples;
  ASSERT_FALSE(files.empty());

  std::size_t contacts = 0, named = 0, decodedPhotos = 0;
  for (const auto& file : files) {
    SCOPED_TRACE(file.filename().string());
    const std::string text = test::readFile(file);
    const VCardParseResult parsed = parseVCards(text, file.filename().string());
    EXPECT_TRUE(parsed.skipped.empty());
    EXPECT_TRUE(parsed.unread.empty()) << parsed.unread;
    EXPECT_EQ(parsed.contacts.size(), countBeginLines(text));

    VCardContactStore store(file, "us");
    for (const Contact& card : parsed.contacts) {
      SCOPED_TRACE(card.identifier);
      ++contacts;
      const auto contact = store.unifiedContactWithIdentifier(card.identifier, kKeys, nullptr);
      ASSERT_TRUE(contact);
      for (const auto& email : card.emailAddresses) {
        EXPECT_TRUE(isValidUtf8(email.value));
        EXPECT_TRUE(contains(store.unifiedContactsMatchingEmailAddress(email.value, kKeys, nullptr), card.identifier))
            << email.value;
      }
      for (const auto& phone : card.phoneNumbers) {
        EXPECT_TRUE(contains(store.unifiedContactsMatchingPhoneNumber(phone.value, kKeys, nullptr), card.identifier))
            << phone.value;
      }

      const auto name = fullNameOfContact(*contact, "en_US");
      if (card.formattedName) {
        EXPECT_EQ(name, card.formattedName);
      } else if (card.givenName || card.familyName || card.organizationName) {
        EXPECT_TRUE(name && !name->empty());
      }
      if (name) {
        ++named;
        EXPECT_TRUE(isValidUtf8(*name));
      }

      // A photo decodes, or it is a JPEG that the sample cut short: its start is intact (so the
      // base64 was read right) and its end marker is missing.
      if (contact->imageData) {
        const auto& bytes = *contact->imageData;
        if (const auto image = decodeImage(bytes)) {
          ++decodedPhotos;
          EXPECT_GT(image->width, 0);
          EXPECT_GT(image->height, 0);
        } else {
          ASSERT_GE(bytes.size(), 4u);
          EXPECT_EQ(bytes[0], 0xFF);
          EXPECT_EQ(bytes[1], 0xD8);
          EXPECT_FALSE(bytes[bytes.size() - 2] == 0xFF && bytes[bytes.size() - 1] == 0xD9);
        }
      }
    }
  }
  EXPECT_GT(contacts, files.size() - 1);
  EXPECT_GT(named, contacts / 2);
  EXPECT_GT(decodedPhotos, 0u);
}

}  // namespace
}  // namespace kyn::platform
