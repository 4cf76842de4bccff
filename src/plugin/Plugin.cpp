// The plug-in's C entry points. Nothing thrown inside reaches the host: every entry point catches,
// and every taken command is answered exactly once.
#include "plugin/kyn_plugin.h"

#include "account/Common.h"
#include "contacts/ContactsUtilities.h"
#include "datasource/KYNAXDataSource.h"
#include "handlers/KYNAXSearch.h"
#include "handlers/KYNAXVisibility.h"
#include "handlers/KYNAXSetGeoFence.h"
#include "model/KYNAXLocation.h"
#include "platform/Services.h"
#include "platform/sysinfo/LinuxSystemInfo.h"
#include "platform/value/Json.h"
#include "utils/KYNAXUtils.h"

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <filesystem>

namespace kyn::plugin {
namespace {

using platform::services;

constexpr std::size_t kMaxCommandBytes = 1u << 20;
/// The reply when not even a reply can be made.
constexpr const char* kInternalErrorReply = R"({"class":"AXCommandFailed","reason":"Internal error"})";

/// Delivers the one reply of a command to the host; a second attempt is dropped and logged.
class ReplyOnce {
 public:
  ReplyOnce(kyn_reply_callback callback, void* context) : callback_(callback), context_(context) {}

  void deliver(const AXReply& reply) noexcept {
    if (delivered_.exchange(true)) {
      try {
        services().log().error("A second reply to one command was dropped: %@", reply.json());
      } catch (...) {
      }
      return;
    }
    try {
      std::string text;
      try {
        text = reply.json();
      } catch (...) {
        // No memory for the text: the assistant still gets its one reply.
        return callback_(kInternalErrorReply, context_);
      }
      callback_(text.c_str(), context_);
    } catch (...) {
      services().log().error("The assistant's reply callback failed");
    }
  }

  void fail(std::string reason) noexcept {
    try {
      services().log().error("Command refused: %@", reason);
      deliver(AXCommandFailed::commandFailedWithReason(std::move(reason)));
    } catch (...) {
      deliver(Value{{"class", "AXCommandFailed"}, {"reason", "Internal error"}});
    }
  }

 private:
  kyn_reply_callback callback_;
  void* context_;
  std::atomic<bool> delivered_{false};
};

/// Forwards log lines to the host.
class CallbackLogSink final : public platform::LogSink {
 public:
  CallbackLogSink(kyn_log_callback callback, void* context) : callback_(callback), context_(context) {}
  void write(const platform::LogRecord& record) noexcept override {
    try {
      callback_(static_cast<int>(record.level), record.message.c_str(), context_);
    } catch (...) {
    }
  }

 private:
  kyn_log_callback callback_;
  void* context_;
};

char* copyText(const std::string& text) {
  char* out = static_cast<char*>(std::malloc(text.size() + 1));
  if (out != nullptr) std::memcpy(out, text.c_str(), text.size() + 1);
  return out;
}

constexpr platform::JsonLimits kDescribeLimits{kMaxCommandBytes, 64};

/// A friend location of a reply, wrapped as it is; nothing for a text that is no JSON object.
std::shared_ptr<KYNAXLocation> friendLocationFromJson(const char* json) {
  const auto parsed = platform::parseJsonDocument(json, kDescribeLimits);
  if (!parsed || !parsed->root().isObject()) return nullptr;
  return KYNAXLocation::locationWithAvixLocation(AXKynLocation::fromDictionary(parsed->root()));
}

std::shared_ptr<AXPerson> personForContact(const platform::Contact& contact) {
  auto person = std::make_shared<AXPerson>();
  ContactsUtilities::fillPersonFromContact(contact, *person);
  person->emails.emplace();
  for (const auto& e : contact.emailAddresses) {
    person->emails->push_back(std::make_shared<AXEmail>());
    person->emails->back()->emailAddress = e.value;
  }
  person->phones.emplace();
  for (const auto& p : contact.phoneNumbers) {
    person->phones->push_back(std::make_shared<AXPhone>());
    person->phones->back()->number = p.value;
  }
  return person;
}

void perform(const char* commandJson, const std::shared_ptr<ReplyOnce>& reply) {
  // The records are read straight from the parsed text, which lives until they are.
  const auto document = platform::parseJsonDocument(commandJson, platform::JsonLimits{kMaxCommandBytes, 64});
  const platform::JsonView command = document ? document->root() : platform::JsonView();
  if (!command.isObject()) return reply->fail("The command is not a JSON object");
  const auto className = platform::stringValue(command.member("class"));
  if (!className) return reply->fail("The command names no class");

  if (*className == AXKynSearch::kClassName) {
    auto search = std::make_shared<KYNAXSearch>();
    AXKynSearch::readFields(*search, command);
    search->performWithCompletion([reply](const AXReply& r) { reply->deliver(r); });
    return;
  }
  if (*className == AXKynVisibilityStateSet::kClassName) {
    auto visibility = std::make_shared<KYNAXVisibility>();
    AXKynVisibilityStateSet::readFields(*visibility, command);
    // Without the flag the command would read as "hide": refused rather than guessed.
    if (!visibility->visible) return reply->fail("The visibility command needs \"visible\": true or false");
    visibility->performWithCompletion([reply](const AXReply& r) { reply->deliver(r); });
    return;
  }
  if (*className == AXKynGeoFenceSet::kClassName) {
    auto fence = std::make_shared<KYNAXSetGeoFence>();
    AXKynGeoFenceSet::readFields(*fence, command);
    // Without the flag the command would switch the fence off: refused rather than guessed.
    if (!fence->enable) return reply->fail("The geofence command needs \"enable\": true or false");
    fence->performWithCompletion([reply](const AXReply& r) { reply->deliver(r); });
    return;
  }
  reply->fail("Unknown command class: " + *className);
}

}  // namespace
}  // namespace kyn::plugin

using namespace kyn;
using kyn::plugin::ReplyOnce;
using platform::services;

extern "C" {

const char* kyn_plugin_version(void) { return KYN_VERSION; }

int kyn_plugin_configure(const char* config_dir, const char* language) {
  try {
    std::filesystem::path directory = config_dir ? std::filesystem::path(config_dir)
                                                 : platform::Configuration::defaultDirectory();
    std::error_code ec;
    if (config_dir != nullptr && !std::filesystem::is_directory(directory, ec)) return -1;
    services().configure(directory);
    if (language != nullptr && *language != '\0') services().assistantPreferences.get()->setLanguageCode(language);
    // Commands from now on use the new transport settings; the account is read afresh anyway.
    KYNAXDataSource::dataSource().setServerInteractionController(
        platform::makeServerInteractionController(services().configuration()->transport()));
    return 0;
  } catch (...) {
    return -1;
  }
}

char* kyn_plugin_language(void) {
  try {
    return plugin::copyText(services().assistantPreferences.get()->languageCode().value_or(std::string()));
  } catch (...) {
    return nullptr;
  }
}

int kyn_plugin_set_log_level(const char* level) {
  if (level == nullptr) return -1;
  const auto parsed = platform::logLevelFromName(level);
  if (!parsed) return -1;
  services().log().setMinimumLevel(*parsed);
  return 0;
}

void kyn_plugin_set_log_callback(kyn_log_callback callback, void* context) {
  try {
    services().log().setSink(callback ? std::make_shared<plugin::CallbackLogSink>(callback, context)
                                      : platform::makeSystemLogSink());
  } catch (...) {
  }
}

int kyn_plugin_perform(const char* command_json, kyn_reply_callback reply, void* context) {
  if (command_json == nullptr || reply == nullptr) return -1;
  std::shared_ptr<ReplyOnce> once;
  try {
    once = std::make_shared<ReplyOnce>(reply, context);
    plugin::perform(command_json, once);
  } catch (const std::exception& e) {
    if (once) once->fail(std::string("Internal error: ") + e.what());
    else reply(plugin::kInternalErrorReply, context);
  } catch (...) {
    if (once) once->fail("Internal error");
    else reply(plugin::kInternalErrorReply, context);
  }
  return 0;
}

char* kyn_plugin_describe_location(const char* location_json, int located, const char* current_location_json) {
  if (location_json == nullptr) return nullptr;
  try {
    const auto record = plugin::friendLocationFromJson(location_json);
    if (!record) return nullptr;
    Value out = Value::object();
    if (auto name = record->friendName()) out["name"] = *name;
    if (auto handle = record->friendHandlePretty()) out["handle"] = *handle;
    if (auto place = record->friendLocation(located != 0)) out["place"] = *place;
    if (record->avixLocation->locationDate) {
      const Value age = KYNAXUtils::dictionaryWithAgeStringsForDate(record->avixLocation->locationDate);
      out["age"] = age[std::string(LabelStringKey)];
      out["spokenAge"] = age[std::string(LabelAccessibilityStringKey)];
    }
    if (auto time = record->prettyTimestamp()) out["time"] = *time;
    if (current_location_json != nullptr) {
      const auto here = platform::parseJsonDocument(current_location_json, plugin::kDescribeLimits);
      if (here && here->root().isObject()) {
        const auto from = KYNAXUtils::coreLocationForAXLocation(AXLocation::fromDictionary(here->root()));
        if (auto distance = record->distanceFromLocation(from)) out["distance"] = *distance;
      }
    }
    return plugin::copyText(platform::toJson(out));
  } catch (...) {
    return nullptr;
  }
}

unsigned char* kyn_plugin_friend_picture(const char* location_json, size_t* size, int* width, int* height) {
  if (location_json == nullptr) return nullptr;
  try {
    const auto record = plugin::friendLocationFromJson(location_json);
    const auto image = record ? record->friendImage() : nullptr;
    if (!image || !image->encoded || image->encoded->empty()) return nullptr;
    const auto& bytes = *image->encoded;
    auto* out = static_cast<unsigned char*>(std::malloc(bytes.size()));
    if (out == nullptr) return nullptr;
    std::memcpy(out, bytes.data(), bytes.size());
    if (size != nullptr) *size = bytes.size();
    if (width != nullptr) *width = image->width;
    if (height != nullptr) *height = image->height;
    return out;
  } catch (...) {
    return nullptr;
  }
}

char* kyn_plugin_find_people(const char* name) {
  if (name == nullptr) return nullptr;
  try {
    Value people = Value::array();
    for (const auto& contact : ContactsUtilities::contactsForName(name)) {
      if (contact) people.push_back(plugin::personForContact(*contact)->dictionary());
    }
    return plugin::copyText(platform::toJson(people));
  } catch (...) {
    return nullptr;
  }
}

char* kyn_plugin_find_person(const char* handle) {
  if (handle == nullptr) return nullptr;
  try {
    const std::string text(handle);
    const auto contact = Common::sharedInstance().isHandleEmail(text) ? ContactsUtilities::contactForEmail(text)
                                                                      : ContactsUtilities::contactForPhone(text);
    if (!contact) return nullptr;
    return plugin::copyText(platform::toJson(plugin::personForContact(*contact)->dictionary()));
  } catch (...) {
    return nullptr;
  }
}

int kyn_plugin_sign_in(const char* person_id, const char* username, const char* host, const char* token) {
  if (person_id == nullptr) return KYN_SIGN_IN_BAD_PERSON_ID;
  if (username == nullptr) return KYN_SIGN_IN_BAD_USERNAME;
  if (host == nullptr) return KYN_SIGN_IN_BAD_HOST;
  if (token == nullptr) return KYN_SIGN_IN_BAD_TOKEN;
  try {
    const platform::SignIn signIn{person_id, username, host, token};
    switch (platform::checkSignIn(signIn)) {
      case platform::SignInProblem::PersonId: return KYN_SIGN_IN_BAD_PERSON_ID;
      case platform::SignInProblem::Username: return KYN_SIGN_IN_BAD_USERNAME;
      case platform::SignInProblem::ServiceHost: return KYN_SIGN_IN_BAD_HOST;
      case platform::SignInProblem::Token: return KYN_SIGN_IN_BAD_TOKEN;
      case platform::SignInProblem::None: break;
    }
    return platform::writeSignIn(services().configuration()->directory(), signIn) ? KYN_SIGN_IN_OK
                                                                                    : KYN_SIGN_IN_NOT_WRITTEN;
  } catch (...) {
    return KYN_SIGN_IN_NOT_WRITTEN;
  }
}

char* kyn_plugin_account(void) {
  try {
    const auto configuration = services().configuration();
    const auto file = platform::readAccountFile(configuration->accountFile());
    if (!file) return nullptr;
    Value out = Value::object();
    if (file->personId) out["personId"] = *file->personId;
    if (file->username) out["username"] = *file->username;
    if (file->serviceHost) out["serviceHost"] = *file->serviceHost;
    out["provisioned"] = file->provisioned.value_or(true);
    out["restricted"] = file->restricted.value_or(false);
    out["token"] = platform::readApplicationToken(configuration->tokenFile()) ? "readable" : "unreadable";
    return plugin::copyText(platform::toJson(out));
  } catch (...) {
    return nullptr;
  }
}

int kyn_plugin_sign_out(void) {
  try {
    return platform::removeSignIn(services().configuration()->directory()) ? 0 : 1;
  } catch (...) {
    return 1;
  }
}

void kyn_plugin_free(void* memory) { std::free(memory); }

void kyn_plugin_shutdown(void) {
  try {
    KYNAXDataSource::dataSource().setServerInteractionController(
        platform::makeServerInteractionController(services().configuration()->transport()));
  } catch (...) {
  }
}

}  // extern "C"
