#include "support/Fakes.h"

#include <sys/stat.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <stdexcept>

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

std::optional<std::filesystem::path> sharedTestData(std::string_view subfolder) {
  std::filesystem::path dir = std::filesystem::path(KYN_SHARED_TESTDATA) / subfolder;
  std::error_code ec;
  if (!std::filesystem::is_directory(dir, ec)) return std::nullopt;
  return dir;
}

}  // namespace kyn::test
