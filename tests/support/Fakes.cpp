#include "support/Fakes.h"

#include "platform/net/JsonCommand.h"

#include <chrono>
#include <fstream>

namespace kyn::test {

std::shared_ptr<AXPerson> makePerson(std::vector<std::optional<std::string>> emails,
                                     std::vector<std::optional<std::string>> phones, std::optional<std::string> fullName) {
  auto person = std::make_shared<AXPerson>();
  person->fullName = std::move(fullName);
  if (!emails.empty()) person->emails.emplace();
  for (auto& address : emails) {
    person->emails->push_back(std::make_shared<AXEmail>());
    person->emails->back()->emailAddress = std::move(address);
  }
  if (!phones.empty()) person->phones.emplace();
  for (auto& number : phones) {
    person->phones->push_back(std::make_shared<AXPhone>());
    person->phones->back()->number = std::move(number);
  }
  return person;
}

platform::Date utcDate(int year, int month, int day, int hour, int minute, double second) {
  using namespace std::chrono;
  const sys_days days = year_month_day{std::chrono::year{year}, std::chrono::month{static_cast<unsigned>(month)},
                                       std::chrono::day{static_cast<unsigned>(day)}};
  const double since1970 = static_cast<double>(days.time_since_epoch().count()) * 86400.0 + hour * 3600.0 +
                           minute * 60.0 + second;
  return since1970 - platform::kReferenceDateSince1970;
}

void postRedirect(const std::string& from, const std::optional<std::string>& to) {
  auto command = std::make_shared<platform::KYJSONCommand>();
  if (to) command->setRedirect(from, *to);
  platform::services().notificationCenter().post({std::string(platform::KYCommandRedirectedNotification), command});
}

platform::Location fix(double latitude, double longitude, double accuracy, std::optional<platform::Date> timestamp) {
  platform::Location l;
  l.coordinate = {latitude, longitude};
  l.horizontalAccuracy = accuracy;
  l.timestamp = timestamp;
  return l;
}

std::string vcard(std::string_view properties, std::string_view version) {
  return "BEGIN:VCARD\r\nVERSION:" + std::string(version) + "\r\n" + std::string(properties) + "END:VCARD\r\n";
}

std::string readFile(const std::filesystem::path& file) {
  std::ifstream in(file, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), {});
}

std::optional<std::filesystem::path> sharedTestData(std::string_view subfolder) {
  std::filesystem::path dir = std::filesystem::path(KYN_SHARED_TESTDATA) / subfolder;
  std::error_code ec;
  if (!std::filesystem::is_directory(dir, ec)) return std::nullopt;
  return dir;
}

}  // namespace kyn::test
