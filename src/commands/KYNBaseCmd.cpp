#include "commands/KYNBaseCmd.h"

#include "account/Common.h"
#include "platform/Services.h"
#include "utils/KYNAXUtils.h"

namespace kyn {

KYNBaseCmd::KYNBaseCmd() {
  Common& common = Common::sharedInstance();
  setScheme("https");
  setUsername(common.personID());
  setPassword(common.appToken());
  setHost(common.redirectedHost());
  if (!host()) setHost(common.kynHost());
}

Value KYNBaseCmd::headers() const {
  Value headers = KYJSONCommand::headers();
  headers["X-Zanto-Vorn-API-Ver"] = "4.0";
  headers["X-Zanto-AuthScheme"] = "Forever";
  return headers;
}

Value KYNBaseCmd::jsonBodyDictionary() const {
  Value body = KYJSONCommand::jsonBodyDictionary();
  body["clientContext"] = staticClientContext();
  return body;
}

double KYNBaseCmd::minCallbackInterval() {
  const auto ms = platform::numberValue(jsonResponse().member("serverContext").member("minCallbackIntervalInMS"));
  return ms ? *ms / 1000.0 : 0.0;
}

void KYNBaseCmd::takeServerContext(platform::JsonView response, const Value& added, bool logged) {
  std::optional<Value> context;
  if (const platform::JsonView serverContext = response.member("serverContext"); serverContext.isObject()) {
    context = serverContext.toValue();  // a tree: of a repeated key only the last value goes on
    if (added.is_object()) {
      for (const auto& [key, value] : added.items()) (*context)[key] = value;
    }
  }
  if (logged) platform::services().log().notice("serverContextDictionary: %@", context ? &*context : nullptr);
  setContextIdentifierURL(KYNAXUtils::contextIdentifierURLForDictionary(context ? &*context : nullptr));
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
