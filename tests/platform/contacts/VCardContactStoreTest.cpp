#include "platform/contacts/VCardContactStore.h"
#include "support/PlatformTest.h"
#include "platform/locale/IcuLocaleInfo.h"

#include <algorithm>
#include <atomic>
#include <thread>

namespace kyn::platform {
namespace {

using Contacts = std::vector<std::shared_ptr<const Contact>>;

const ContactKeys kAllKeys = {std::string(ContactKey::FullNameFormatterKeys), std::string(ContactKey::PhoneNumbers),
                              std::string(ContactKey::EmailAddresses), std::string(ContactKey::ImageData)};

std::vector<std::string> identifiersOf(const Contacts& contacts) {
  std::vector<std::string> ids;
  for (const auto& c : contacts) ids.push_back(c->identifier);
  return ids;
}

class VCardContactStoreTest : public test::PlatformTest {
 protected:
  Contacts byEmail(VCardContactStore& store, std::string_view email) {
    return store.unifiedContactsMatchingEmailAddress(email, kAllKeys, nullptr);
  }
  Contacts byPhone(VCardContactStore& store, std::string_view phone) {
    return store.unifiedContactsMatchingPhoneNumber(phone, kAllKeys, nullptr);
  }
  std::ptrdiff_t logLinesContaining(std::string_view text) const {
    return std::ranges::count_if(logMessages(), [&](const std::string& line) { return line.find(text) != std::string::npos; });
  }

  test::TempDir book;
};

TEST_F(VCardContactStoreTest, AFolderIsReadRecursivelyInFileNameOrderAndAFileOnItsOwn) {
  for (const char* name : {"y.vcf", "d.vcf", "b.vcf"}) book.write(name, test::vcard("EMAIL:shared@example.com\r\n"));
  book.write("a.VCF", test::vcard("FN:Ay\r\nEMAIL:shared@example.com\r\n") + test::vcard("FN:Ay Two\r\nEMAIL:shared@example.com\r\n"));
  book.write("sub/c.vcf", test::vcard("FN:Sea\r\nEMAIL:shared@example.com\r\n"));
  book.write("notes.txt", test::vcard("FN:Not A Contact\r\nEMAIL:shared@example.com\r\n"));
  book.write("z\xE9.vcf", test::vcard("EMAIL:shared@example.com\r\n"));  // a file name that is no UTF-8
  VCardContactStore folder(book.path(), "us");
  EXPECT_EQ(folder.load(), 7u);
  EXPECT_EQ(identifiersOf(byEmail(folder, "shared@example.com")),
            (std::vector<std::string>{"a.VCF#0", "a.VCF#1", "b.vcf#0", "d.vcf#0", "sub/c.vcf#0", "y.vcf#0", "z%E9.vcf#0"}));

  VCardContactStore single(book.path() / "sub" / "c.vcf", "us");
  EXPECT_EQ(single.load(), 1u);
  EXPECT_EQ(identifiersOf(byEmail(single, "shared@example.com")), (std::vector<std::string>{"c.vcf#0"}));
}

TEST_F(VCardContactStoreTest, AMissingBookIsEmptyAndNoError) {
  VCardContactStore store(book.path() / "nowhere", "us");
  EXPECT_EQ(store.load(), 0u);
  EXPECT_TRUE(byEmail(store, "a@example.com").empty() && byPhone(store, "+1 503 555 0100").empty());
  EXPECT_FALSE(store.unifiedContactWithIdentifier("x", kAllKeys, nullptr));
  EXPECT_TRUE(log->contains((book.path() / "nowhere").string()));  // the user is told where it was looked for
  EXPECT_TRUE(log->messages(LogLevel::Error).empty());
}

TEST_F(VCardContactStoreTest, CardsWithOneIdentifierAreOneContact) {
  const std::string photo = "PHOTO;ENCODING=b:/9j/4A==\r\n";
  book.write("1.vcf", test::vcard("UID:u-1\r\nN:;Ann\r\nTEL;TYPE=CELL:+1 503 555 0110\r\nEMAIL:ann@example.com\r\n" +
                           photo));
  book.write("2.vcf", test::vcard("UID:other\r\nFN:Someone Else\r\n"));
  book.write("3.vcf", test::vcard("UID:u-1\r\nFN:Ann Example\r\nN:Other;Name;;Dr.;III\r\nTITLE:Pilot\r\nORG:Air;Ops\r\nX-MAIDENNAME:Sample\r\n"
                           "X-PHONETIC-MIDDLE-NAME:Ree\r\nX-PHONETIC-LAST-NAME:Ek\r\nNOTE:n\r\nNICKNAME:Annie\r\n"
                           "TEL;TYPE=CELL:+1 503 555 0110\r\nTEL;TYPE=HOME:+1 503 555 0110\r\nEMAIL:ann@example.org\r\n"
                           "PHOTO;ENCODING=b:iVBORw==\r\n"));
  VCardContactStore store(book.path(), "us");
  EXPECT_EQ(store.load(), 2u);
  const auto ann = store.unifiedContactWithIdentifier("u-1", {"givenName", "familyName", "namePrefix", "jobTitle", "previousFamilyName",
                                                              "note", "nickname", "nameSuffix", "phoneticMiddleName", "phoneticFamilyName", "organizationName", "departmentName", "phoneNumbers", "emailAddresses", "imageData"},
                                                      nullptr);
  ASSERT_TRUE(ann);
  // The first card's given name; the rest only the later card has.
  EXPECT_EQ((std::vector{ann->givenName, ann->familyName, ann->namePrefix, ann->jobTitle, ann->previousFamilyName, ann->note, ann->nickname,
                         ann->nameSuffix, ann->phoneticMiddleName, ann->phoneticFamilyName, ann->organizationName,
                         ann->departmentName}),
            (std::vector<std::optional<std::string>>{"Ann", "Other", "Dr.", "Pilot", "Sample", "n", "Annie", "III", "Ree", "Ek",
                                                     "Air", "Ops"}));
  EXPECT_EQ(ann->phoneNumbers, (std::vector<LabeledValue>{{"mobile", "+1 503 555 0110"}, {"home", "+1 503 555 0110"}}));
  EXPECT_EQ(ann->emailAddresses.size(), 2u);
  ASSERT_TRUE(ann->imageData);
  EXPECT_EQ(*ann->imageData, (std::vector<std::uint8_t>{0xFF, 0xD8, 0xFF, 0xE0}));
  // Found by the later card's address as well, once.
  EXPECT_EQ(identifiersOf(byEmail(store, "ann@example.org")), (std::vector<std::string>{"u-1"}));
}

TEST_F(VCardContactStoreTest, EmailAddressesMatchIgnoringCaseInAnyScript) {
  // An address longer than any mail system takes still matches ignoring case.
  const std::string longAddress = std::string(300, 'l') + "@example.COM";
  book.write("a.vcf", test::vcard("UID:a\r\nEMAIL:Mixed.Case@Example.COM\r\nEMAIL: mixed.case@example.com \r\n") +
                          test::vcard("UID:b\r\nEMAIL;CHARSET=UTF-8:J\xC3\x96RG@example.org\r\nEMAIL:Stra\xC3\x9F" "e@example.net\r\n") +
                          test::vcard("UID:c\r\nEMAIL:mailto:MIXED.case@example.com\r\n") +
                          test::vcard("UID:d\r\nEMAIL:" + std::string(300, 'L') + "@Example.com\r\n"));
  VCardContactStore store(book.path(), "us");
  const std::pair<const char*, std::vector<std::string>> cases[] = {
      {"mixed.case@example.com", {"a", "c"}}, {"MIXED.CASE@EXAMPLE.COM ", {"a", "c"}}, {"j\xC3\xB6rg@EXAMPLE.org", {"b"}},
      {"STRASSE@example.net", {"b"}}, {"", {}}, {"mixed.case@example", {}}, {longAddress.c_str(), {"d"}}};
  for (const auto& [address, ids] : cases) EXPECT_EQ(identifiersOf(byEmail(store, address)), ids) << address;
}

TEST_F(VCardContactStoreTest, PhoneNumbersMatchAsNumbersInTheStoresRegion) {
  const std::string cards = test::vcard("UID:us\r\nTEL:+1 408-555-0100\r\n") + test::vcard("UID:local\r\nTEL:040 555 0199\r\n") +
                            test::vcard("UID:ext\r\nTEL;VALUE=uri:tel:+1-408-555-0101;ext=7\r\n") +
                            test::vcard("UID:p\r\nTEL;WORK:BusinessPhone\r\nTEL;HOME: HomePhone\r\n");
  book.write("a.vcf", cards);
  VCardContactStore us(book.path(), "us");
  EXPECT_EQ(identifiersOf(byPhone(us, "(408) 555-0100")), (std::vector<std::string>{"us"}));
  EXPECT_EQ(identifiersOf(byPhone(us, "+1 408 555 0101")), (std::vector<std::string>{"ext"}));
  EXPECT_TRUE(byPhone(us, "(408) 555-0102").empty());
  // Texts that are no phone numbers match themselves.
  EXPECT_EQ(identifiersOf(byPhone(us, "BusinessPhone")), (std::vector<std::string>{"p"}));
  EXPECT_EQ(identifiersOf(byPhone(us, "HomePhone ")), (std::vector<std::string>{"p"}));
  EXPECT_TRUE(byPhone(us, "OtherPhone").empty());
  EXPECT_TRUE(byPhone(us, "").empty());

  // In Germany "(408) 555-0100" is a German number, and "040 555 0199" one of its local numbers.
  VCardContactStore de(book.path(), "de");
  EXPECT_TRUE(byPhone(de, "(408) 555-0100").empty());
  EXPECT_EQ(identifiersOf(byPhone(de, "+14085550100")), (std::vector<std::string>{"us"}));
  EXPECT_EQ(identifiersOf(byPhone(de, "+49 40 5550199")), (std::vector<std::string>{"local"}));
  EXPECT_TRUE(byPhone(us, "+49 40 5550199").empty());
}

TEST_F(VCardContactStoreTest, LookUpsReturnOnlyTheRequestedKeys) {
  book.write("a.vcf", test::vcard("UID:id-1\r\nFN:Zoe Sample\r\nN:Sample;Zoe\r\nORG:Sample Works\r\nNOTE:private\r\n"
                           "EMAIL:zoe@example.com\r\nTEL:+1 503 555 0120\r\n"));
  VCardContactStore store(book.path(), "us");

  std::string error;
  const auto named = store.unifiedContactWithIdentifier("id-1", {std::string(ContactKey::GivenName)}, &error);
  ASSERT_TRUE(named);
  EXPECT_EQ(named->identifier, "id-1");
  EXPECT_EQ(named->givenName, "Zoe");
  EXPECT_FALSE(named->familyName);
  EXPECT_EQ(store.unifiedContactsMatchingPhoneNumber("+15035550120", kAllKeys, &error).size(), 1u);
  EXPECT_TRUE(error.empty());

  const auto formatted = store.unifiedContactsMatchingPhoneNumber(
      "+15035550120", {std::string(ContactKey::FullNameFormatterKeys), "noSuchKey"}, &error);
  ASSERT_EQ(formatted.size(), 1u);
  EXPECT_EQ(fullNameOfContact(*formatted[0], "en_US"), "Zoe Sample");
  EXPECT_FALSE(formatted[0]->note);
  EXPECT_NE(error.find("noSuchKey"), std::string::npos);  // reported, and still answered
  EXPECT_FALSE(store.unifiedContactWithIdentifier("id-2", kAllKeys, nullptr));
  EXPECT_FALSE(store.unifiedContactWithIdentifier("", kAllKeys, nullptr));

  // A prepared set is projected by its own keys, also after other keys were asked for in between.
  const ContactKeySet givenOnly({std::string(ContactKey::GivenName)});
  const ContactKeySet all(kAllKeys);
  for (int round = 0; round < 2; ++round) {
    const auto given = store.unifiedContactWithIdentifier("id-1", givenOnly, nullptr);
    ASSERT_TRUE(given);
    EXPECT_EQ(given->givenName, "Zoe");
    EXPECT_TRUE(given->emailAddresses.empty());
    const auto byAddress = store.unifiedContactsMatchingEmailAddress("ZOE@example.com", all, nullptr);
    ASSERT_EQ(byAddress.size(), 1u);
    EXPECT_EQ(byAddress[0]->emailAddresses.size(), 1u);
    EXPECT_FALSE(byAddress[0]->note);
    EXPECT_TRUE(store.unifiedContactsMatchingPhoneNumber("+15035550120", givenOnly, nullptr)[0]->phoneNumbers.empty());
    EXPECT_EQ(store.unifiedContactWithIdentifier("id-1", {std::string(ContactKey::Note)}, nullptr)->note, "private");
  }
}

TEST_F(VCardContactStoreTest, BadFilesAndCardsAreLoggedOnceAndTheRestStillWorks) {
  book.write("good.vcf", test::vcard("UID:g\r\nEMAIL:good@example.com\r\n") + "BEGIN:VCARD\r\nFN:Secret Name\r\n");
  book.write("junk.vcf", "Secret junk\r\n" + test::vcard("no property, Secret\r\n") + "more junk\r\n");
  const auto big = book.write("big.vcf", test::vcard("UID:big\r\nEMAIL:big@example.com\r\n"));
  std::filesystem::resize_file(big, (std::uint64_t{64} << 20) + 1);  // sparse: costs no disk
  std::filesystem::create_symlink(book.path() / "gone", book.path() / "dangling.vcf");
  VCardContactStore store(book.path(), "us");
  EXPECT_EQ(store.load(), 2u);
  EXPECT_EQ(identifiersOf(byEmail(store, "good@example.com")), (std::vector<std::string>{"g"}));
  EXPECT_TRUE(byEmail(store, "big@example.com").empty());  // a file over the size limit is not read
  EXPECT_EQ(store.load(), 2u);  // loads once

  // One error for each file, naming it; card contents never reach the log.
  EXPECT_EQ(log->messages(LogLevel::Error).size(), 4u);
  for (const char* file : {"junk.vcf", "big.vcf", "dangling.vcf", "good.vcf: the card that begins on line 6"}) {
    EXPECT_EQ(logLinesContaining(file), 1) << file;
  }
  EXPECT_EQ(logLinesContaining("Secret"), 0);
}

TEST_F(VCardContactStoreTest, ConcurrentFirstLookUpsAllSeeTheLoadedBook) {
  std::string cards;
  for (int i = 0; i < 300; ++i) {
    char phone[32];
    std::snprintf(phone, sizeof phone, "+1 503 555 %04d", i);
    cards += test::vcard("UID:c" + std::to_string(i) + "\r\nEMAIL:p" + std::to_string(i) + "@example.com\r\nTEL:" + phone + "\r\n");
  }
  book.write("many.vcf", cards);
  VCardContactStore store(book.path(), "us");
  std::atomic<int> failures{0};
  std::atomic<bool> go{false};
  std::vector<std::thread> threads;
  for (int t = 0; t < 8; ++t) {
    threads.emplace_back([&, t] {
      while (!go.load()) std::this_thread::yield();
      for (int i = t; i < 300; i += 8) {
        char phone[32];
        std::snprintf(phone, sizeof phone, "(503) 555-%04d", i);
        const std::string id = "c" + std::to_string(i);
        const bool ok = identifiersOf(byPhone(store, phone)) == std::vector<std::string>{id} &&
                        identifiersOf(byEmail(store, "P" + std::to_string(i) + "@example.com")) ==
                            std::vector<std::string>{id} &&
                        store.unifiedContactWithIdentifier(id, kAllKeys, nullptr) != nullptr;
        if (!ok) ++failures;
      }
    });
  }
  go = true;
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(failures.load(), 0);
  EXPECT_EQ(log->messages(LogLevel::Info).size(), 1u);  // loaded once
}

TEST_F(VCardContactStoreTest, TheServicesBuildTheStoreFromTheConfiguredFolder) {
  // The configured default: "contacts" in the configuration folder.
  configDir->write("contacts/friend.vcf", test::vcard("UID:f\r\nTEL:0171 5550123\r\n"));
  auto& services = platform::services();
  services.locale.set(std::make_shared<IcuLocaleInfo>("de_DE"));
  services.contactStore.set(nullptr);  // back to the configured store
  const auto store = services.contactStore.get();
  ASSERT_TRUE(store);
  const auto found = store->unifiedContactsMatchingPhoneNumber("+49 171 5550123", kAllKeys, nullptr);
  EXPECT_EQ(identifiersOf(found), (std::vector<std::string>{"f"}));
}

}  // namespace
}  // namespace kyn::platform
