// `account`: signing in and out, and showing who is signed in.
#include "Commands.h"

#include <termios.h>
#include <unistd.h>

#include <iostream>

namespace kyn::cli {
namespace {

/// The token from standard input: typed without echo at a terminal, else the whole input, without
/// the blanks and line ends around it.
std::string readToken(const Texts& texts) {
  std::string token;
  if (::isatty(STDIN_FILENO) != 0) {
    std::cerr << texts[Text::TokenPrompt] << std::flush;
    termios saved{};
    const bool quiet = ::tcgetattr(STDIN_FILENO, &saved) == 0;
    if (quiet) {
      termios silent = saved;
      silent.c_lflag &= ~static_cast<tcflag_t>(ECHO);
      ::tcsetattr(STDIN_FILENO, TCSAFLUSH, &silent);
    }
    std::getline(std::cin, token);
    if (quiet) ::tcsetattr(STDIN_FILENO, TCSAFLUSH, &saved);
    std::cerr << "\n";
  } else {
    char chunk[1024];
    while (std::cin.read(chunk, sizeof chunk) || std::cin.gcount() > 0) {
      token.append(chunk, static_cast<std::size_t>(std::cin.gcount()));
      if (token.size() > 8192) break;  // no token is that long; the check below refuses it
    }
  }
  const auto first = token.find_first_not_of(" \t\r\n");
  const auto last = token.find_last_not_of(" \t\r\n");
  return first == std::string::npos ? std::string() : token.substr(first, last - first + 1);
}

}  // namespace

AccountCommand::AccountCommand(CLI::App& app)
    : sub_(app.add_subcommand("account", "Signs an account in or out, or shows who is signed in.")) {
  login_ = sub_->add_subcommand("login", "Signs in; the application token is read from standard input.");
  login_->add_option("--person-id", personId_, "The account's person identifier")->required();
  login_->add_option("--username", username_, "The account's user name")->required();
  login_->add_option("--host", host_, "The service's server: HOST or HOST:PORT")->required();
  show_ = sub_->add_subcommand("show", "Shows the signed-in account, never its token.");
  sub_->add_subcommand("logout", "Signs out: removes the account and its token.");
  sub_->require_subcommand(1);
}

int AccountCommand::run(Session& session) {
  const Texts& texts = session.texts;
  auto& plugin = session.plugin;
  if (login_->parsed()) {
    const std::string token = readToken(texts);
    const int result = plugin.signIn(personId_.c_str(), username_.c_str(), host_.c_str(), token.c_str());
    switch (result) {
      case KYN_SIGN_IN_OK:
        std::cout << texts.format(Text::SignedIn, personId_, host_) << "\n";
        return kSuccess;
      case KYN_SIGN_IN_BAD_PERSON_ID: throw UsageError(texts.format(Text::BadPersonId, personId_));
      case KYN_SIGN_IN_BAD_USERNAME: throw UsageError(texts.format(Text::BadUsername, username_));
      case KYN_SIGN_IN_BAD_HOST: throw UsageError(texts.format(Text::BadHost, host_));
      case KYN_SIGN_IN_BAD_TOKEN: throw UsageError(std::string(texts[Text::BadToken]));
      default: std::cerr << "kyn-assistant: " << texts[Text::NotWritten] << "\n"; return kCommandFailed;
    }
  }
  if (show_->parsed()) {
    const auto text = plugin.take(plugin.account());
    if (!text) {
      std::cout << texts[Text::NoOneSignedIn] << "\n";
      return kCommandFailed;
    }
    const Json account = Json::parse(*text, nullptr, false);
    if (session.options.json) {
      std::cout << account.dump(2) << "\n";
      return kSuccess;
    }
    auto yesNo = [&](const char* key) { return std::string(texts[account.value(key, false) ? Text::Yes : Text::No]); };
    std::cout << texts.format(Text::AccountPerson, account.value("personId", "?")) << "\n"
              << texts.format(Text::AccountUsername, account.value("username", "?")) << "\n"
              << texts.format(Text::AccountHost, account.value("serviceHost", "?")) << "\n"
              << texts[account.value("token", "") == "readable" ? Text::TokenReadable : Text::TokenUnreadable] << "\n"
              << texts.format(Text::AccountProvisioned, yesNo("provisioned")) << "\n"
              << texts.format(Text::AccountRestricted, yesNo("restricted")) << "\n";
    return kSuccess;
  }
  std::cout << texts[plugin.signOut() == 0 ? Text::SignedOut : Text::NoOneSignedIn] << "\n";
  return kSuccess;
}

}  // namespace kyn::cli
