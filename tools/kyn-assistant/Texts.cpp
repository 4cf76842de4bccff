#include "Texts.h"

#include <array>
#include <cctype>

namespace kyn::cli {
namespace {

struct Row {
  Text key;
  std::array<std::string_view, 3> texts;  // English, German, French
};

// clang-format off
constexpr Row kTable[] = {
  {Text::NotLoggedIn, {"You are not signed in to Kyn, or the server did not accept the sign-in.",
                       "Du bist nicht bei Kyn angemeldet, oder der Server hat die Anmeldung nicht angenommen.",
                       "Vous n’êtes pas connecté à Kyn, ou le serveur a refusé la connexion."}},
  {Text::RestrictedInRegion, {"Kyn is not offered in your region.",
                              "Kyn wird in deiner Region nicht angeboten.",
                              "Kyn n’est pas proposé dans votre région."}},
  {Text::RestrictedInAccount, {"Your account is not set up for location sharing.",
                               "Dein Konto ist nicht für das Teilen von Standorten eingerichtet.",
                               "Votre compte n’est pas configuré pour le partage de position."}},
  {Text::Locked, {"Your Kyn sign-in is locked: the application token cannot be read.",
                  "Deine Kyn-Anmeldung ist gesperrt: Das Anwendungstoken kann nicht gelesen werden.",
                  "Votre connexion Kyn est verrouillée : le jeton d’application est illisible."}},
  {Text::NotAvailable, {"The Kyn service is not available right now. Try again later.",
                        "Der Kyn-Dienst ist gerade nicht verfügbar. Versuche es später noch einmal.",
                        "Le service Kyn n’est pas disponible pour le moment. Réessayez plus tard."}},
  {Text::NotAFriend, {"That person does not share a location with you.",
                      "Diese Person teilt ihren Standort nicht mit dir.",
                      "Cette personne ne partage pas sa position avec vous."}},
  {Text::NoFriends, {"None of your friends share their location with you.",
                     "Keiner deiner Freunde teilt seinen Standort mit dir.",
                     "Aucun de vos amis ne partage sa position avec vous."}},
  {Text::GeoFenceNotCreated, {"The notification could not be set up.",
                              "Die Mitteilung konnte nicht eingerichtet werden.",
                              "La notification n’a pas pu être configurée."}},
  {Text::LabelNotFound, {"That place label is not known.",
                         "Dieser Ortsname ist nicht bekannt.",
                         "Ce nom de lieu est inconnu."}},
  {Text::AddressNotFound, {"That address could not be found.",
                           "Diese Adresse wurde nicht gefunden.",
                           "Cette adresse est introuvable."}},
  {Text::FailedWithCode, {"The command failed (code %s).",
                          "Der Befehl ist fehlgeschlagen (Code %s).",
                          "La commande a échoué (code %s)."}},
  {Text::NeedTarget, {"Need at least emails or current location",
                      "Nenne mindestens eine E-Mail-Adresse, eine Telefonnummer oder deinen Standort.",
                      "Indiquez au moins une adresse e-mail, un numéro de téléphone ou votre position."}},
  {Text::NoLocations, {"No location came back for the friends you asked about.",
                       "Für die erfragten Freunde kam kein Standort zurück.",
                       "Aucune position n’a été renvoyée pour les amis demandés."}},
  {Text::AtPlaceYes, {"At %s: yes", "Bei „%s“: ja", "À « %s » : oui"}},
  {Text::AtPlaceNo, {"At %s: no", "Bei „%s“: nein", "À « %s » : non"}},
  {Text::Unknown, {"(unknown)", "(unbekannt)", "(inconnu)"}},
  {Text::NoName, {"(no name)", "(ohne Namen)", "(sans nom)"}},
  {Text::NoOneNamed, {"No one named \"%s\" in your contacts; give an e-mail address or a phone number instead.",
                      "Niemand namens „%s“ in deinen Kontakten; gib stattdessen eine E-Mail-Adresse oder Telefonnummer an.",
                      "Personne ne s’appelle « %s » dans vos contacts ; indiquez plutôt une adresse e-mail ou un numéro de téléphone."}},
  {Text::SeveralPeople, {"\"%s\" could mean several people:",
                         "„%s“ kann mehrere Personen meinen:",
                         "« %s » peut désigner plusieurs personnes :"}},
  {Text::SayWhichOne, {"Say which one with more of the name, an e-mail address or a phone number.",
                       "Sag mit mehr vom Namen, einer E-Mail-Adresse oder Telefonnummer, wen du meinst.",
                       "Précisez avec une plus grande partie du nom, une adresse e-mail ou un numéro de téléphone."}},
  {Text::SeeVerbose, {"(run with --verbose to see the plug-in's log)",
                      "(mit --verbose erscheint das Protokoll des Plug-ins)",
                      "(lancez avec --verbose pour voir le journal du module)"}},
  {Text::CannotLoad, {"cannot load the plug-in %s: %s",
                      "das Plug-in %s lässt sich nicht laden: %s",
                      "impossible de charger le module %s : %s"}},
  {Text::NoAnswer, {"no answer from the plug-in within %s s",
                    "keine Antwort vom Plug-in innerhalb von %s s",
                    "aucune réponse du module en %s s"}},
  {Text::NoConfigDirectory, {"the configuration directory %s does not exist",
                             "das Konfigurationsverzeichnis %s existiert nicht",
                             "le dossier de configuration %s n’existe pas"}},
  {Text::BadHere, {"--here wants LAT,LON or LAT,LON,ACCURACY, not \"%s\"",
                   "--here erwartet BREITE,LÄNGE oder BREITE,LÄNGE,GENAUIGKEIT, nicht „%s“",
                   "--here attend LAT,LON ou LAT,LON,PRÉCISION, et non « %s »"}},
  {Text::BadPlaceAt, {"--place-at wants LAT,LON, not \"%s\"",
                      "--place-at erwartet BREITE,LÄNGE, nicht „%s“",
                      "--place-at attend LAT,LON, et non « %s »"}},
  {Text::CannotRead, {"cannot read %s", "%s lässt sich nicht lesen", "impossible de lire %s"}},
  {Text::CannotWrite, {"cannot write %s", "%s lässt sich nicht schreiben", "impossible d’écrire %s"}},
  {Text::PictureSaved, {"Picture of %s: %s", "Bild von %s: %s", "Photo de %s : %s"}},
  {Text::TokenPrompt, {"Application token: ", "Anwendungstoken: ", "Jeton d’application : "}},
  {Text::SignedIn, {"Signed in as %s on %s.", "Angemeldet als %s bei %s.", "Connecté en tant que %s sur %s."}},
  {Text::BadPersonId, {"The person id \"%s\" is empty, too long or holds control characters; the account is unchanged.",
                       "Die Personen-ID „%s“ ist leer, zu lang oder enthält Steuerzeichen; das Konto bleibt unverändert.",
                       "L’identifiant « %s » est vide, trop long ou contient des caractères de contrôle ; le compte reste inchangé."}},
  {Text::BadUsername, {"The user name \"%s\" is empty, too long or holds control characters; the account is unchanged.",
                       "Der Benutzername „%s“ ist leer, zu lang oder enthält Steuerzeichen; das Konto bleibt unverändert.",
                       "Le nom d’utilisateur « %s » est vide, trop long ou contient des caractères de contrôle ; le compte reste inchangé."}},
  {Text::BadHost, {"The server must be HOST or HOST:PORT, without https:// and without a path, not \"%s\"; the account is unchanged.",
                   "Der Server muss HOST oder HOST:PORT sein, ohne https:// und ohne Pfad, nicht „%s“; das Konto bleibt unverändert.",
                   "Le serveur doit être HÔTE ou HÔTE:PORT, sans https:// ni chemin, et non « %s » ; le compte reste inchangé."}},
  {Text::BadToken, {"The token read from standard input is empty, too long or holds blanks; the account is unchanged.",
                    "Das von der Standardeingabe gelesene Token ist leer, zu lang oder enthält Leerzeichen; das Konto bleibt unverändert.",
                    "Le jeton lu sur l’entrée standard est vide, trop long ou contient des espaces ; le compte reste inchangé."}},
  {Text::NotWritten, {"The account could not be written (run with --verbose to see why); the old account is unchanged.",
                      "Das Konto ließ sich nicht schreiben (--verbose zeigt den Grund); das alte Konto bleibt unverändert.",
                      "Le compte n’a pas pu être écrit (--verbose indique pourquoi) ; l’ancien compte reste inchangé."}},
  {Text::NoOneSignedIn, {"No one is signed in.", "Niemand ist angemeldet.", "Personne n’est connecté."}},
  {Text::SignedOut, {"Signed out.", "Abgemeldet.", "Déconnecté."}},
  {Text::AccountPerson, {"Person id:   %s", "Personen-ID: %s", "Identifiant : %s"}},
  {Text::AccountUsername, {"User name:   %s", "Benutzer:    %s", "Utilisateur : %s"}},
  {Text::AccountHost, {"Server:      %s", "Server:      %s", "Serveur :     %s"}},
  {Text::TokenReadable, {"Token:       stored, readable by you alone", "Token:       gespeichert, nur für dich lesbar",
                         "Jeton :       enregistré, lisible par vous seul"}},
  {Text::TokenUnreadable, {"Token:       missing or readable by others (sign in again)",
                           "Token:       fehlt oder für andere lesbar (melde dich erneut an)",
                           "Jeton :       absent ou lisible par d’autres (reconnectez-vous)"}},
  {Text::AccountProvisioned, {"Location sharing: %s", "Standortfreigabe: %s", "Partage de position : %s"}},
  {Text::AccountRestricted, {"Restricted:  %s", "Eingeschränkt: %s", "Restreint :   %s"}},
  {Text::Yes, {"yes", "ja", "oui"}},
  {Text::No, {"no", "nein", "non"}},
  // visibility
  {Text::LocationHidden, {"Your location is now hidden from your friends.",
                          "Dein Standort ist jetzt vor deinen Freunden verborgen.",
                          "Votre position est désormais masquée pour vos amis."}},
  {Text::LocationShown, {"Your friends can see your location again.",
                         "Deine Freunde können deinen Standort wieder sehen.",
                         "Vos amis peuvent de nouveau voir votre position."}},
  // geofence
  {Text::FenceMeArrives, {"I'll tell you when %s arrives at %s.",
                          "Ich sage dir Bescheid, wenn %s bei „%s“ ankommt.",
                          "Je vous préviendrai quand %s arrivera à « %s »."}},
  {Text::FenceMeLeaves, {"I'll tell you when %s leaves %s.",
                         "Ich sage dir Bescheid, wenn %s „%s“ verlässt.",
                         "Je vous préviendrai quand %s quittera « %s »."}},
  {Text::FenceMeNow, {"I'll tell you as soon as %s is at %s.",
                      "Ich sage dir Bescheid, sobald %s bei „%s“ ist.",
                      "Je vous préviendrai dès que %s sera à « %s »."}},
  {Text::FenceThemArrives, {"I'll tell %s when you arrive at %s.",
                            "Ich sage %s Bescheid, wenn du bei „%s“ ankommst.",
                            "Je préviendrai %s quand vous arriverez à « %s »."}},
  {Text::FenceThemLeaves, {"I'll tell %s when you leave %s.",
                           "Ich sage %s Bescheid, wenn du „%s“ verlässt.",
                           "Je préviendrai %s quand vous quitterez « %s »."}},
  {Text::FenceThemNow, {"I'll tell %s as soon as you are at %s.",
                        "Ich sage %s Bescheid, sobald du bei „%s“ bist.",
                        "Je préviendrai %s dès que vous serez à « %s »."}},
  {Text::FenceOffMeArrives, {"I'll no longer tell you when %s arrives at %s.",
                             "Ich sage dir nicht mehr Bescheid, wenn %s bei „%s“ ankommt.",
                             "Je ne vous préviendrai plus quand %s arrivera à « %s »."}},
  {Text::FenceOffMeLeaves, {"I'll no longer tell you when %s leaves %s.",
                            "Ich sage dir nicht mehr Bescheid, wenn %s „%s“ verlässt.",
                            "Je ne vous préviendrai plus quand %s quittera « %s »."}},
  {Text::FenceOffMeNow, {"I'll no longer tell you when %s is at %s.",
                         "Ich sage dir nicht mehr Bescheid, wenn %s bei „%s“ ist.",
                         "Je ne vous préviendrai plus quand %s sera à « %s »."}},
  {Text::FenceOffThemArrives, {"I'll no longer tell %s when you arrive at %s.",
                               "Ich sage %s nicht mehr Bescheid, wenn du bei „%s“ ankommst.",
                               "Je ne préviendrai plus %s quand vous arriverez à « %s »."}},
  {Text::FenceOffThemLeaves, {"I'll no longer tell %s when you leave %s.",
                              "Ich sage %s nicht mehr Bescheid, wenn du „%s“ verlässt.",
                              "Je ne préviendrai plus %s quand vous quitterez « %s »."}},
  {Text::FenceOffThemNow, {"I'll no longer tell %s when you are at %s.",
                           "Ich sage %s nicht mehr Bescheid, wenn du bei „%s“ bist.",
                           "Je ne préviendrai plus %s quand vous serez à « %s »."}},
  {Text::FenceSet, {"The notification about %s at %s is set.",
                    "Die Mitteilung über %s bei „%s“ ist eingerichtet.",
                    "La notification concernant %s à « %s » est configurée."}},
  {Text::FenceOff, {"The notifications about %s at %s are switched off.",
                    "Die Mitteilungen über %s bei „%s“ sind ausgeschaltet.",
                    "Les notifications concernant %s à « %s » sont désactivées."}},
  {Text::FenceOnce, {"Only the first time.", "Nur beim ersten Mal.", "Seulement la première fois."}},
  {Text::BadAddress, {"--address wants \"street, city[, state][, postal code][, country code]\", not \"%s\"",
                      "--address erwartet „Straße, Ort[, Region][, Postleitzahl][, Ländercode]“, nicht „%s“",
                      "--address attend « rue, ville[, région][, code postal][, code pays] », et non « %s »"}},
};
// clang-format on

static_assert(std::size(kTable) == static_cast<std::size_t>(Text::Count), "every text has a row");

constexpr bool rowsInOrder() {
  for (std::size_t i = 0; i < std::size(kTable); ++i) {
    if (static_cast<std::size_t>(kTable[i].key) != i) return false;
  }
  return true;
}
static_assert(rowsInOrder(), "the rows follow the order of Text");

}  // namespace

Texts::Texts(std::string_view languageTag) {
  std::string primary;
  for (char c : languageTag.substr(0, languageTag.find_first_of("-_"))) {
    primary.push_back(static_cast<char>(std::tolower(static_cast<unsigned char>(c))));
  }
  if (primary == "de") {
    column_ = 1;
    language_ = "de";
  } else if (primary == "fr") {
    column_ = 2;
    language_ = "fr";
  } else {
    language_ = "en";
  }
}

std::string_view Texts::operator[](Text text) const {
  return kTable[static_cast<std::size_t>(text)].texts[static_cast<std::size_t>(column_)];
}

std::string Texts::fill(std::string_view pattern, std::initializer_list<std::string_view> args) {
  std::string out;
  auto next = args.begin();
  for (std::size_t i = 0; i < pattern.size(); ++i) {
    if (pattern[i] == '%' && i + 1 < pattern.size() && pattern[i + 1] == 's' && next != args.end()) {
      out += *next++;
      ++i;
    } else {
      out += pattern[i];
    }
  }
  return out;
}

}  // namespace kyn::cli
