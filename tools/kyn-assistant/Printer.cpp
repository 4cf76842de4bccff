// The reply for a person to read, in the assistant's language.
#include "Commands.h"
#include "Host.h"

#include <cctype>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <memory>

namespace kyn::cli {
namespace {

std::string failureInWords(const Texts& texts, const Json& reply) {
  if (reply.contains("reason")) {
    // The plug-in's reasons are English; the one a user meets is said in the user's language.
    const std::string reason = reply.value("reason", std::string());
    return reason == Texts("en")[Text::NeedTarget] ? std::string(texts[Text::NeedTarget]) : reason;
  }
  const auto code = reply.value("errorCode", 0LL);
  constexpr long long kFirst = 1001;
  constexpr Text kByCode[] = {Text::NotLoggedIn,   Text::RestrictedInRegion, Text::RestrictedInAccount,
                              Text::Locked,        Text::NotAvailable,       Text::NotAFriend,
                              Text::NoFriends,     Text::GeoFenceNotCreated, Text::LabelNotFound,
                              Text::AddressNotFound};
  if (code >= kFirst && code < kFirst + static_cast<long long>(std::size(kByCode))) {
    return std::string(texts[kByCode[code - kFirst]]);
  }
  return texts.format(Text::FailedWithCode, std::to_string(code));
}

std::optional<Json> describe(Session& session, const Json& location, const Json& command) {
  // Distances are told from where the user said they are.
  const Json* here = command.is_object() && command.contains("currentLocation") ? &command["currentLocation"] : nullptr;
  const std::string hereText = here != nullptr && here->is_object() ? here->dump() : std::string();
  const auto text = session.plugin.take(session.plugin.describeLocation(location.dump().c_str(), 1,
                                                                        hereText.empty() ? nullptr : hereText.c_str()));
  if (!text) return std::nullopt;
  Json value = Json::parse(*text, nullptr, false);
  return value.is_object() ? std::optional<Json>(value) : std::nullopt;
}

void printSearch(Session& session, const Json& command, const Json& reply, std::ostream& out) {
  const Texts& texts = session.texts;
  const Json locations = reply.value("kynLocations", Json::array());
  if (locations.empty()) out << texts[Text::NoLocations] << "\n";
  for (const auto& location : locations) {
    const Json described = describe(session, location, command).value_or(Json::object());
    std::string line = described.value("name", std::string(texts[Text::Unknown]));
    line += " — " + described.value("place", std::string("?"));
    if (location.contains("latitude") && location.contains("longitude")) {
      char coordinates[96];
      std::snprintf(coordinates, sizeof coordinates, " · %.5f, %.5f", location["latitude"].get<double>(),
                    location["longitude"].get<double>());
      line += coordinates;
    }
    const std::string age = described.value("age", std::string()), time = described.value("time", std::string());
    if (!age.empty()) line += " · " + age + (time.empty() ? "" : " (" + time + ")");
    else if (!time.empty()) line += " · " + time;
    if (described.contains("distance")) line += " · " + described.value("distance", std::string());
    out << line << "\n";
  }
  const auto* requested = command.contains("requestedLocation") ? &command["requestedLocation"] : nullptr;
  if (requested != nullptr && requested->is_object() && requested->contains("label") && reply.contains("atRequestedLocation")) {
    const std::string place = requested->value("label", std::string());
    out << texts.format(reply.value("atRequestedLocation", false) ? Text::AtPlaceYes : Text::AtPlaceNo, place) << "\n";
  }
}

/// The file extension of a picture's data, by its format's signature.
std::string_view pictureExtension(const unsigned char* bytes, std::size_t size) {
  const auto startsWith = [&](std::string_view magic) {
    return size >= magic.size() && std::memcmp(bytes, magic.data(), magic.size()) == 0;
  };
  if (startsWith("\xFF\xD8\xFF")) return "jpg";
  if (startsWith("\x89PNG")) return "png";
  if (startsWith("GIF8")) return "gif";
  if (startsWith("BM")) return "bmp";
  if (size >= 2 && bytes[0] == 'P' && bytes[1] >= '1' && bytes[1] <= '6') return "pnm";
  return "img";
}

/// The friend's handle as a file name: characters other than letters, digits and "@.+-_" become "_".
std::string pictureName(const Json& location, std::size_t index) {
  std::string name;
  const Json* handle = location.contains("friend") && location["friend"].is_object() && location["friend"].contains("data")
                           ? &location["friend"]["data"]
                           : nullptr;
  if (handle != nullptr && handle->is_string()) {
    for (const unsigned char c : handle->get<std::string>()) {
      const bool keep = std::isalnum(c) != 0 || c == '@' || c == '.' || c == '+' || c == '-' || c == '_';
      name.push_back(keep ? static_cast<char>(c) : '_');
    }
  }
  if (name.empty() || name.front() == '.') name = "friend-" + std::to_string(index + 1);
  return name;
}

}  // namespace

void savePictures(Session& session, const Json& reply, const std::filesystem::path& directory, std::ostream* report,
                  std::ostream& errors) {
  const Json locations = reply.value("kynLocations", Json::array());
  for (std::size_t i = 0; i < locations.size(); ++i) {
    const std::string location = locations[i].dump();
    std::size_t size = 0;
    std::unique_ptr<unsigned char, decltype(session.plugin.free)> bytes(
        session.plugin.friendPicture(location.c_str(), &size, nullptr, nullptr), session.plugin.free);
    if (!bytes) continue;
    const auto file = directory / (pictureName(locations[i], i) + "." + std::string(pictureExtension(bytes.get(), size)));
    std::ofstream out(file, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(bytes.get()), static_cast<std::streamsize>(size));
    out.close();
    if (!out) {
      errors << "kyn-assistant: " << session.texts.format(Text::CannotWrite, file.string()) << "\n";
      continue;
    }
    if (report != nullptr) {
      const Json described = describe(session, locations[i], Json()).value_or(Json::object());
      *report << session.texts.format(Text::PictureSaved, described.value("name", std::string(session.texts[Text::Unknown])),
                                      file.string())
              << "\n";
    }
  }
}

void printReply(Session& session, const Json& command, const Json& reply, std::ostream& out) {
  const std::string kind = reply.value("class", "");
  if (kind == "AXCommandFailed") {
    out << failureInWords(session.texts, reply) << "\n";
  } else if (kind == "AXKynSearchCompleted") {
    printSearch(session, command, reply, out);
  } else if (kind == "AXKynVisibilitySetCompleted") {
    out << session.texts[flagOf(command, "visible") ? Text::LocationShown : Text::LocationHidden] << "\n";
  } else if (kind == "AXKynGeoFenceSetCompleted") {
    printGeoFence(session, command, reply, out);
  } else {
    out << reply.dump(2) << "\n";
  }
}

}  // namespace kyn::cli
