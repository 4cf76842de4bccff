// Contact look-ups in a 10,000-card address book: the load (reading, parsing, unifying, indexing
// e-mail addresses and identifiers), the phone index that the first phone look-up builds, and one
// look-up by e-mail address, phone number and identifier with the full key list of the contacts
// utilities.
#include "host/Process.h"
#include "platform/contacts/VCardContactStore.h"
#include "platform/log/Log.h"

#include <benchmark/benchmark.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

namespace {

using namespace kyn::platform;

constexpr int kCards = 10'000;

std::string phoneOf(int i) {
  char text[32];
  std::snprintf(text, sizeof text, "(503) 5%02d-%04d", i / 10'000 % 100, i % 10'000);
  return text;
}

std::string emailOf(int i) { return "Friend." + std::to_string(i) + "@Example.com"; }

// A card like the ones sync tools write: names, two numbers, two addresses, a postal address, a
// note, and a small picture on every tenth card.
std::string cardText(int i) {
  std::string card = "BEGIN:VCARD\r\nVERSION:3.0\r\nUID:card-" + std::to_string(i) + "\r\n";
  card += "FN:Friend Number " + std::to_string(i) + "\r\nN:Number " + std::to_string(i) + ";Friend;;;\r\n";
  card += "ORG:Example Works;Team " + std::to_string(i % 40) + "\r\nTITLE:Engineer\r\n";
  card += "TEL;TYPE=CELL:" + phoneOf(i) + "\r\nTEL;TYPE=WORK,VOICE:+1 503 555 " + std::to_string(1000 + i % 9000) + "\r\n";
  card += "EMAIL;TYPE=INTERNET,HOME:" + emailOf(i) + "\r\nEMAIL;TYPE=WORK:f" + std::to_string(i) + "@example.org\r\n";
  card += "ADR;TYPE=HOME:;;" + std::to_string(i) + " Elm Street;Springfield;OR;97400;Testland\r\n";
  card += "NOTE:Met at the lake\\, long ago.\\nSecond line of the note.\r\n";
  if (i % 10 == 0) {
    card += "PHOTO;ENCODING=b;TYPE=JPEG:";
    for (int line = 0; line < 54; ++line) card += "/9j/4AAQSkZJRgABAQEAYABgAAD/2wBDAAgGBgcGBQgHBwcJCQgKDBQNDAsLDBkSEw8U\r\n ";
    card += "AAAA\r\n";
  }
  return card + "END:VCARD\r\n";
}

// The generated book, written once per run to a temporary folder (one file per card, the layout
// of sync tools) and to a single file, and removed at exit.
class Book {
 public:
  Book() {
    Log::shared().setMinimumLevel(LogLevel::Error);
    root_ = dir_.path();
    std::filesystem::create_directories(root_ / "folder");
    std::ofstream single(root_ / "single.vcf", std::ios::binary);
    for (int i = 0; i < kCards; ++i) {
      const std::string card = cardText(i);
      std::ofstream(root_ / "folder" / ("card-" + std::to_string(i) + ".vcf"), std::ios::binary) << card;
      single << card;
    }
  }
  [[nodiscard]] std::filesystem::path folder() const { return root_ / "folder"; }
  [[nodiscard]] std::filesystem::path single() const { return root_ / "single.vcf"; }

 private:
  kyn::host::TempDir dir_{"kyn-bench"};
  std::filesystem::path root_;
};

const Book& book() {
  static const Book instance;
  return instance;
}

// The key list of the contacts utilities.
const ContactKeys& utilityKeys() {
  static const ContactKeys keys = [] {
    using namespace ContactKey;
    ContactKeys k;
    for (std::string_view key :
         {FullNameFormatterKeys, NamePrefix, GivenName, MiddleName, FamilyName, PreviousFamilyName, NameSuffix,
          Nickname, PhoneticGivenName, PhoneticMiddleName, OrganizationName, DepartmentName, JobTitle, Birthday,
          NonGregorianBirthday, Note, ImageCropRect, ImageData, ThumbnailImageData, PreferredLikenessSource,
          PreferredPersonaIdentifier, ContactKey::ContactType, PhoneNumbers, EmailAddresses, PostalAddresses, Dates,
          UrlAddresses, Relations, SocialProfiles, InstantMessageAddresses}) {
      k.emplace_back(key);
    }
    return k;
  }();
  return keys;
}

void BM_LoadFolder(benchmark::State& state) {
  const auto path = book().folder();
  for (auto _ : state) {
    VCardContactStore store(path, "us");
    benchmark::DoNotOptimize(store.load());
  }
}
BENCHMARK(BM_LoadFolder)->Unit(benchmark::kMillisecond);

void BM_LoadSingleFile(benchmark::State& state) {
  const auto path = book().single();
  for (auto _ : state) {
    VCardContactStore store(path, "us");
    benchmark::DoNotOptimize(store.load());
  }
}
BENCHMARK(BM_LoadSingleFile)->Unit(benchmark::kMillisecond);

// The cost that the first phone look-up adds: reading every number of the book.
void BM_LoadSingleFileThenFirstPhoneLookUp(benchmark::State& state) {
  const auto path = book().single();
  for (auto _ : state) {
    VCardContactStore store(path, "us");
    benchmark::DoNotOptimize(store.unifiedContactsMatchingPhoneNumber(phoneOf(1), utilityKeys(), nullptr));
  }
}
BENCHMARK(BM_LoadSingleFileThenFirstPhoneLookUp)->Unit(benchmark::kMillisecond);

VCardContactStore& loadedStore() {
  static VCardContactStore* store = [] {
    auto* s = new VCardContactStore(book().single(), "us");
    s->load();
    (void)s->unifiedContactsMatchingPhoneNumber(phoneOf(0), utilityKeys(), nullptr);  // builds the phone index
    return s;
  }();
  return *store;
}

void BM_LookUpByEmail(benchmark::State& state) {
  auto& store = loadedStore();
  int i = 0;
  for (auto _ : state) {
    auto found = store.unifiedContactsMatchingEmailAddress(emailOf(i), utilityKeys(), nullptr);
    if (found.size() != 1) state.SkipWithError("not found");
    i = (i + 7919) % kCards;
  }
}
BENCHMARK(BM_LookUpByEmail)->Unit(benchmark::kMicrosecond);

void BM_LookUpByPhone(benchmark::State& state) {
  auto& store = loadedStore();
  int i = 0;
  for (auto _ : state) {
    auto found = store.unifiedContactsMatchingPhoneNumber(phoneOf(i), utilityKeys(), nullptr);
    if (found.size() != 1) state.SkipWithError("not found");
    i = (i + 7919) % kCards;
  }
}
BENCHMARK(BM_LookUpByPhone)->Unit(benchmark::kMicrosecond);

void BM_LookUpByIdentifier(benchmark::State& state) {
  auto& store = loadedStore();
  int i = 0;
  for (auto _ : state) {
    auto found = store.unifiedContactWithIdentifier("card-" + std::to_string(i), utilityKeys(), nullptr);
    if (!found) state.SkipWithError("not found");
    i = (i + 7919) % kCards;
  }
}
BENCHMARK(BM_LookUpByIdentifier)->Unit(benchmark::kMicrosecond);

}  // namespace
