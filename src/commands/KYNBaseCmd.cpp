#include "commands/KYNBaseCmd.h"

#include "account/Common.h"
#include "platform/Services.h"
#include "utils/KYNAXUtils.h"

#include <algorithm>

namespace kyn {

KYNBaseCmd::KYNBaseCmd() {
  Common& common = Common::sharedInstance();
  auto [personID, appToken, kynHost] = common.credentials();
  setScheme("https");
  setUsername(std::move(personID));
  setPassword(std::move(appToken));
  setHost(common.redirectedHost());
  if (!host()) setHost(std::move(kynHost));
}

Value KYNBaseCmd::headers() const {
  Value headers = KYJSONCommand::headers();
  headers["X-Zanto-Vorn-API-Ver"] = "4.0";
  headers["X-Zanto-AuthScheme"] = "Forever";
  return headers;
}

Value KYNBaseCmd::jsonBodyDictionary() const {
  Value body = KYJSONCommand::jsonBodyDictionary();
  // Room for the members of any command's body at once: a body that grows copies what it holds.
  constexpr std::size_t kBodyMembers = 16;
  platform::reserveMembers(body, body.size() + kBodyMembers);
  body["clientContext"] = staticClientContext();
  return body;
}

double KYNBaseCmd::minCallbackInterval() {
  const auto ms = platform::numberValue(jsonResponse().member("serverContext").member("minCallbackIntervalInMS"));
  return ms ? *ms / 1000.0 : 0.0;
}

void KYNBaseCmd::takeServerContext(platform::JsonView response, std::optional<platform::JsonEntry> added, bool logged) {
  auto& log = platform::services().log();
  const platform::JsonView serverContext = response.member("serverContext");
  if (!serverContext.isObject()) {
    if (logged) log.notice("serverContextDictionary: %@", static_cast<const Value*>(nullptr));
    setContextIdentifierURL(std::nullopt);
    return;
  }
  // The context as a copy would hold it (of a repeated key only the last value), read in place.
  std::vector<platform::JsonEntry> members = platform::uniqueMembers(serverContext);
  if (added) {
    const auto same = std::find_if(members.begin(), members.end(), [&](const auto& m) { return m.key == added->key; });
    if (same != members.end()) same->value = added->value;
    else members.push_back(*added);
  }
  if (logged && log.isEnabled(platform::LogLevel::Default)) {
    Value context = Value::object();
    for (const auto& [key, value] : members) context[std::string(key)] = value.toValue();
    log.notice("serverContextDictionary: %@", &context);
  }
  setContextIdentifierURL(KYNAXUtils::contextIdentifierURLForMembers(members));
}

Value KYNBaseCmd::makeClientContext() {
  Common& common = Common::sharedInstance();
  Value context = Value::object();
  auto add = [&](const char* key, const std::optional<std::string>& value) {
    if (value) context[key] = *value;
  };
  add("deviceUDID", common.deviceUDID());
  add("productType", common.productType());
  add("osVersion", common.osVersion());
  add("buildVersion", common.buildVersion());
  add("locale", platform::services().assistantPreferences.get()->languageCode());
  return context;
}

const Value& KYNBaseCmd::staticClientContext() {
  static const Value context = makeClientContext();
  return context;
}

}  // namespace kyn
