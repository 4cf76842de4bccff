#include "platform/contacts/VCard.h"
#include "support/Fakes.h"

#include <gtest/gtest.h>

namespace kyn::platform {
namespace {

using Labeled = std::vector<LabeledValue>;

// The one contact of `text`; fails the test when there is not exactly one or a card was skipped.
Contact parseOne(std::string_view text) {
  const VCardParseResult result = parseVCards(text, "book.vcf");
  EXPECT_EQ(result.contacts.size(), 1u) << text;
  EXPECT_TRUE(result.skipped.empty()) << (result.skipped.empty() ? "" : result.skipped.front());
  return result.contacts.empty() ? Contact{} : result.contacts.front();
}

std::vector<std::uint8_t> bytesOf(const ImageBytes& image) { return image ? *image : std::vector<std::uint8_t>{}; }

const std::vector<std::uint8_t> kPicture = {0xFF, 0xD8, 0xFF, 0xE0, 0x00, 0x10, 'J', 'F', 'I', 'F', 0x00, 0xFB, 0xFF, 0xD9};
constexpr const char* kPictureBase64 = "/9j/4AAQSkZJRgD7/9k=";
const std::vector<std::uint8_t> kOther = {1, 2, 3};
constexpr const char* kOtherBase64 = "AQID";


TEST(VCardLines, AnyLineEndingAndFoldsWithSpaceOrTabJoinTheirLine) {
  const Contact c = parseOne("BEGIN:VCARD\nVERSION:3.0\r\nFN:Ada\r\n  Lovelace\rNOTE:one\n\ttwo\r\n three\r"
                             "EMAIL:ada@exam\r\n ple.com\nEND:VCARD");
  EXPECT_EQ(c.formattedName, "Ada Lovelace");  // the break and one blank go, the second blank stays
  EXPECT_EQ(c.note, "onetwothree");
  EXPECT_EQ(c.emailAddresses, (Labeled{{std::nullopt, "ada@example.com"}}));
}

TEST(VCardLines, FoldsInOddPlaces) {
  // Inside a parameter, inside the property name, and a continuation right after BEGIN, which has
  // nothing to continue and so stands as a line of its own.
  const Contact c = parseOne("BEGIN:VCARD\r\n FN:Grace Hopper\r\nTEL;TY\r\n PE=CE\r\n LL:+1 503 555 0101\r\n"
                             "EMA\r\n IL:g@example.org\r\nEND:VCARD\r\n");
  EXPECT_EQ(c.formattedName, "Grace Hopper");
  EXPECT_EQ(c.phoneNumbers, (Labeled{{"mobile", "+1 503 555 0101"}}));
  EXPECT_EQ(c.emailAddresses, (Labeled{{std::nullopt, "g@example.org"}}));
}

TEST(VCardLines, BeginAndEndIgnoreCaseAndJunkBetweenCardsIsIgnored) {
  const auto result = parseVCards(
      "garbage before\r\nFN:Not In A Card\r\nbegin:vCard\r\nFN:One\r\nEnd:VCard\r\n\r\n-- junk --\r\n"
      "  BEGIN:VCARD  \r\nFN:Two\r\n\tEND:VCARD\r\ntrailing junk",  // indented, yet no fold
      "mixed.vcf");
  ASSERT_EQ(result.contacts.size(), 2u);
  EXPECT_EQ(std::tie(result.contacts[0].formattedName, result.contacts[1].formattedName), std::tuple("One", "Two"));
  EXPECT_TRUE(result.skipped.empty());
  EXPECT_NE(result.unread.find("line 1"), std::string::npos) << result.unread;  // ignored, yet reported
}

TEST(VCardLines, EmptyAndJunkTextsHoldNoCards) {
  for (std::string_view text : {std::string_view(""), std::string_view("\r\n \r\n"), std::string_view("END:VCARD\r\n"),
                                 std::string_view("hello\0world", 11)}) {
    const auto result = parseVCards(text, "x.vcf");
    EXPECT_TRUE(result.contacts.empty() && result.skipped.empty());
    EXPECT_EQ(result.unread.empty(), text.find_first_not_of("\r\n ") == std::string_view::npos) << result.unread;
  }
  // A card with nothing in it is still a card; a line in it that is no property is reported.
  const auto empty = parseVCards("BEGIN:VCARD\r\nEND:VCARD\r\n", "x.vcf");
  ASSERT_EQ(empty.contacts.size(), 1u);
  EXPECT_EQ(empty.contacts[0].identifier, "x.vcf#0");
  EXPECT_TRUE(empty.unread.empty());
  const auto junk = parseVCards(test::vcard("FN:A\r\n") + test::vcard("FN:B\r\nno property here\r\n"), "x.vcf");
  EXPECT_EQ(junk.contacts.size(), 2u);
  EXPECT_NE(junk.unread.find("line 5"), std::string::npos) << junk.unread;
}

// UTF-16 bytes of `text` in the given order.
std::string utf16Bytes(std::u16string_view text, bool bigEndian) {
  std::string bytes;
  for (const char16_t unit : text) {
    const char high = static_cast<char>(unit >> 8), low = static_cast<char>(unit & 0xFF);
    bytes += bigEndian ? high : low;
    bytes += bigEndian ? low : high;
  }
  return bytes;
}

TEST(VCardLines, Utf16InEitherOrderAndUtf8WithByteOrderMarks) {
  // The CHARSET of a plain value no longer applies once the text is UTF-16; a quoted-printable one's does.
  const std::u16string text =
      u"\uFEFFBEGIN:VCARD\r\nFN;CHARSET=ISO-8859-1:Zo\u00EB \U0001F600\r\n"
      u"N;ENCODING=QUOTED-PRINTABLE;CHARSET=ISO-8859-1:M=FCller;Ada\r\nEND:VCARD\r\n";
  for (const bool bigEndian : {false, true}) {
    for (const bool mark : {true, false}) {
      SCOPED_TRACE(std::string(bigEndian ? "big" : "little") + (mark ? " endian with mark" : " endian without"));
      const auto result = parseVCards(utf16Bytes(mark ? text : text.substr(1), bigEndian), "x.vcf");
      ASSERT_EQ(result.contacts.size(), 1u);
      EXPECT_EQ(result.contacts[0].formattedName, "Zo\xC3\xAB \xF0\x9F\x98\x80");
      EXPECT_EQ(result.contacts[0].familyName, "M\xC3\xBCller");
      EXPECT_TRUE(result.unread.empty()) << result.unread;
    }
  }

  // Unpaired surrogates, a high one last, and an odd last byte: each a U+FFFD, and reported.
  const std::u16string broken = u"BEGIN:VCARD\r\nFN:a\xD800" u"b\xDC00\r\nEND:VCARD\r\n\xD83D";
  const auto result = parseVCards("\xFF\xFE" + utf16Bytes(broken, false) + "!", "x.vcf");
  ASSERT_EQ(result.contacts.size(), 1u);
  EXPECT_EQ(result.contacts[0].formattedName, "a\xEF\xBF\xBD" "b\xEF\xBF\xBD");
  EXPECT_FALSE(result.unread.empty());

  // UTF-8 with its mark, twice: files joined as they were exported.
  const std::string utf8 = "\xEF\xBB\xBF" + test::vcard("FN:One\r\n");
  const auto joined = parseVCards(utf8 + utf8, "x.vcf");
  EXPECT_EQ(joined.contacts.size(), 2u);
  EXPECT_TRUE(joined.unread.empty()) << joined.unread;
}

TEST(VCardLines, CutOffCardsAreReportedAndTheCardsAroundThemRead) {
  const auto result = parseVCards(
      "BEGIN:VCARD\nFN:First\nEND:VCARD\n"
      "BEGIN:VCARD\nFN:Cut Off\nEMAIL:cut@example.com\n"  // no END: the next BEGIN shows it was cut off
      "BEGIN:VCARD\nFN:Third\nEND:VCARD\n"
      "BEGIN:VCARD\nFN:Last Without End\n",
      "cut.vcf");
  ASSERT_EQ(result.contacts.size(), 2u);
  EXPECT_EQ(std::tie(result.contacts[0].formattedName, result.contacts[1].formattedName), std::tuple("First", "Third"));
  EXPECT_EQ(result.contacts[1].identifier, "cut.vcf#2");  // positions count the skipped card too
  EXPECT_EQ(result.skipped, (std::vector<std::string>{"cut.vcf: the card that begins on line 4 has no END:VCARD",
                                                      "cut.vcf: the card that begins on line 10 has no END:VCARD"}));
}

TEST(VCardLines, AnEmbeddedAgentCardIsSkippedUpToItsEnd) {
  const Contact c = parseOne(test::vcard("FN:Boss\r\nAGENT:\r\nBEGIN:VCARD\r\nVERSION:2.1\r\nFN:Assistant\r\n"
                                  "TEL:+1 503 555 0102\r\nEND:VCARD\r\nTEL:+1 503 555 0103\r\n",
                                  "2.1"));
  EXPECT_EQ(c.formattedName, "Boss");
  EXPECT_EQ(c.phoneNumbers, (Labeled{{std::nullopt, "+1 503 555 0103"}}));
  const Contact sameLine = parseOne(test::vcard("FN:Boss\r\nAGENT:BEGIN:VCARD\r\nFN:Assistant\r\nEND:VCARD\r\nNOTE:after\r\n"));
  EXPECT_EQ(sameLine.formattedName, "Boss");
  EXPECT_EQ(sameLine.note, "after");
  // After the embedded card, a BEGIN:VCARD again means the card was cut off.
  const auto cut = parseVCards("BEGIN:VCARD\r\nAGENT:\r\nBEGIN:VCARD\r\nEND:VCARD\r\n" + test::vcard("FN:Next\r\n"), "a.vcf");
  EXPECT_TRUE(cut.contacts.size() == 1 && cut.contacts[0].formattedName == "Next" && cut.skipped.size() == 1);
}

TEST(VCardLines, CardsWithoutUidAreNamedByTheirSourceAndPosition) {
  const auto result = parseVCards(test::vcard("FN:A\r\n") + test::vcard("UID:urn:uuid:5F1C\\,x \r\nFN:B\r\n") + test::vcard("FN:A\r\n") +
                                      test::vcard("UID:same\r\nFN:C\r\n") + test::vcard("UID:same\r\nFN:D\r\n") + test::vcard("UID:\r\n"),
                                  "friends/list.vcf");
  std::vector<std::string> ids;
  for (const Contact& c : result.contacts) ids.push_back(c.identifier);
  // A UID as written, blanks around it trimmed; same identifiers stay separate cards here (the store
  // unifies them).
  EXPECT_EQ(ids, (std::vector<std::string>{"friends/list.vcf#0", "urn:uuid:5F1C\\,x", "friends/list.vcf#2", "same",
                                           "same", "friends/list.vcf#5"}));
}


TEST(VCardProperties, ParametersInEveryFormExportersWrite) {
  const Contact c = parseOne(test::vcard(
      "tel;type=home,work:1\r\n"                  // lower case, a list
      "TEL;TYPE=WORK;TYPE=FAX:2\r\n"              // repeated TYPE
      "TEL;CELL;PREF:3\r\n"                       // 2.1 bare parameters
      "TEL;TYPE=\"work,voice\";PREF=1:4\r\n"      // a quoted list
      "TEL;X-X=\"a;b:c\";TYPE=PAGER:5\r\n"        // ';' and ':' inside quotes
      "TEL;X-BROKEN=\"never closed;TYPE=HOME:6\r\n"  // an unclosed quote does not hide the value
      "item1.TEL:7\r\n"
      "TEL;TYPE=Xfax\":8\r\nTEL;TYPE=\"faxX:9\r\n"  // a quote at one end only stays in the value
      "EMAIL;INTERNET;PREF:a@example.com\r\n"
      "ITEM1.x-ablabel:Cabin\r\n"));
  EXPECT_EQ(c.phoneNumbers, (Labeled{{"home", "1"}, {"work fax", "2"}, {"mobile", "3"}, {"work", "4"}, {"pager", "5"},
                                     {std::nullopt, "6"}, {"Cabin", "7"}, {std::nullopt, "8"}, {std::nullopt, "9"}}));
  EXPECT_EQ(c.emailAddresses, (Labeled{{std::nullopt, "a@example.com"}}));
}

TEST(VCardProperties, LabelsFromTypesAndFromGroupLabels) {
  const Contact c = parseOne(test::vcard(
      "TEL;TYPE=HOME;TYPE=FAX:1\r\nTEL;TYPE=FAX:2\r\nTEL;TYPE=MAIN:3\r\nTEL;TYPE=OTHER:4\r\n"
      "TEL;TYPE=VOICE,MSG,X400:5\r\nTEL;TYPE=CELL,WORK:6\r\n"
      "item2.X-ABDATE:2001-06-02\r\nitem2.X-ABLabel:_$!<Anniversary>!$_\r\n"
      "item3.X-ABLabel:My Label\r\nitem3.URL:https://example.org\r\n"  // the label may come first
      "item4.URL;TYPE=HOME:https://example.net\r\n"                   // a group without label
      "item5.X-ABLabel:_$!<Half\r\nitem5.URL:https://example.com\r\n"));  // half a standard label stays
  EXPECT_EQ(c.phoneNumbers, (Labeled{{"home fax", "1"}, {"fax", "2"}, {"main", "3"}, {"other", "4"}, {std::nullopt, "5"},
                                     {"mobile", "6"}}));
  EXPECT_EQ(c.dates, (Labeled{{"Anniversary", "2001-06-02"}}));
  EXPECT_EQ(c.urlAddresses, (Labeled{{"My Label", "https://example.org"}, {"home", "https://example.net"},
                                     {"_$!<Half", "https://example.com"}}));
}

TEST(VCardProperties, EscapesAndStructuredValues) {
  const Contact c = parseOne(test::vcard(
      "N:O\\;Neil;Mary,Ann;Jo\\,Beth;Dr.;Jr.,PhD\r\n"
      "NOTE:a\\nb\\Nc\\,d\\;e\\\\f\\\"g\\:h\\\r\n"
      "URL:http\\://example.com/a\\,b\r\n"
      "ORG:Acme\\; Sons;Research;Lab 2\r\n"
      "ADR;TYPE=HOME:PO 7;Apt 3;12 Elm St\\nBack door;Springfield;OR;97400;Testland\r\n"
      "ADR:;;;Lakeview;;97401\r\n"  // trailing empty components left out
      "ADR:;;;;;;\r\n"
      "ADR:;;1 Main St;;;;;Extra;More\r\n"
      "NICKNAME:\tAl\\n\r\n"));  // blanks and line breaks around a value go, also escaped ones
  EXPECT_EQ(c.familyName, "O;Neil");
  EXPECT_EQ(c.givenName, "Mary Ann");  // list items joined with a space
  EXPECT_EQ(c.middleName, "Jo,Beth");  // an escaped comma is no separator
  EXPECT_EQ(c.namePrefix, "Dr.");
  EXPECT_EQ(c.nameSuffix, "Jr. PhD");
  EXPECT_EQ(c.note, "a\nb\nc,d;e\\f\"g:h\\");  // a last lone backslash stays
  EXPECT_EQ(c.nickname, "Al");
  EXPECT_EQ(c.urlAddresses, (Labeled{{std::nullopt, "http://example.com/a,b"}}));
  EXPECT_EQ(c.organizationName, "Acme; Sons");
  EXPECT_EQ(c.departmentName, "Research, Lab 2");
  // Address components in label order; empty ones leave no blank lines; an empty address is none;
  // components past the seventh join the country.
  EXPECT_EQ(c.postalAddresses, (Labeled{{"home", "PO 7\nApt 3\n12 Elm St\nBack door\nSpringfield, OR 97400\nTestland"},
                                        {std::nullopt, "Lakeview, 97401"},
                                        {std::nullopt, "1 Main St\nExtra More"}}));
}

TEST(VCardProperties, EveryFieldOfAContact) {
  const Contact c = parseOne(test::vcard(
      "FN:Dr. Alice Q. Example\r\nN:Example;Alice;Quinn;Dr.;\r\nNICKNAME:Al\r\nX-MAIDENNAME:Sample\r\n"
      "X-PHONETIC-FIRST-NAME:A-lis\r\nX-PHONETIC-MIDDLE-NAME:Kwin\r\nX-PHONETIC-LAST-NAME:Ex-am-pel\r\n"
      "TITLE:Surveyor\r\nBDAY:1985-04-12\r\nNOTE:Met at the lake.\r\nUID:alice-1\r\n"
      "EMAIL;TYPE=WORK:alice@example.com\r\nEMAIL:mailto:alice@example.org\r\n"
      "ANNIVERSARY:2010-05-01\r\nX-ANNIVERSARY:2011-05-01\r\n"
      "RELATED;TYPE=spouse:urn:uuid:1234\r\nX-ABRELATEDNAMES:Bob\r\nX-SPOUSE:Carol\r\n"
      "IMPP;TYPE=home:xmpp:alice@example.com\r\nX-AIM:alice.aim\r\nX-JABBER:alice@example.net\r\n"
      "X-ICQ:12345\r\nX-MS-IMADDRESS:alice@example.org\r\n"
      "X-SOCIALPROFILE;TYPE=PREF;TYPE=chirper:https://social.example.com/alice\r\n"
      "X-UNKNOWN:ignored\r\nCATEGORIES:a,b\r\nORG:Acme\r\n"
      "FN:Second\r\nN:Two;Other;Wrong;Mr.;Jr.\r\nORG:Other;Dept\r\n"));  // the first value of a single-valued field wins
  EXPECT_EQ(c.identifier, "alice-1");
  EXPECT_EQ(c.contactType, ContactType::Person);
  EXPECT_EQ((std::vector{c.formattedName, c.familyName, c.givenName, c.middleName, c.nameSuffix, c.organizationName,
                         c.nickname, c.previousFamilyName, c.phoneticGivenName, c.phoneticMiddleName,
                         c.phoneticFamilyName, c.jobTitle, c.birthday, c.note}),
            (std::vector<std::optional<std::string>>{"Dr. Alice Q. Example", "Example", "Alice", "Quinn",
                                                     std::nullopt,  // empty components stay absent
                                                     "Acme", "Al", "Sample", "A-lis", "Kwin", "Ex-am-pel", "Surveyor",
                                                     "1985-04-12", "Met at the lake."}));
  EXPECT_EQ(c.emailAddresses, (Labeled{{"work", "alice@example.com"}, {std::nullopt, "alice@example.org"}}));
  EXPECT_EQ(c.dates, (Labeled{{"anniversary", "2010-05-01"}, {"anniversary", "2011-05-01"}}));
  EXPECT_EQ(c.relations, (Labeled{{"spouse", "urn:uuid:1234"}, {std::nullopt, "Bob"}, {"spouse", "Carol"}}));
  EXPECT_EQ(c.instantMessageAddresses, (Labeled{{"home", "xmpp:alice@example.com"}, {std::nullopt, "alice.aim"},
                                                {std::nullopt, "alice@example.net"}, {std::nullopt, "12345"},
                                                {std::nullopt, "alice@example.org"}}));
  EXPECT_EQ(c.socialProfiles, (Labeled{{"chirper", "https://social.example.com/alice"}}));
  EXPECT_FALSE(c.departmentName || c.imageData);
  EXPECT_FALSE(parseOne(test::vcard("N:;;;Dr.;\r\nN:Later\r\n")).familyName);  // a title alone makes the first N
}

TEST(VCardProperties, OrganisationsByKindOrShowAs) {
  EXPECT_EQ(parseOne(test::vcard("KIND:org\r\nFN:Example Inc.\r\n", "4.0")).contactType, ContactType::Organization);
  EXPECT_EQ(parseOne(test::vcard("X-ABShowAs:COMPANY\r\nORG:Example Inc.\r\n")).contactType, ContactType::Organization);
  EXPECT_EQ(parseOne(test::vcard("KIND:individual\r\n", "4.0")).contactType, ContactType::Person);
}

TEST(VCardProperties, TelUrisLoseTheSchemeAndKeepTheirExtension) {
  const Contact c = parseOne(test::vcard("TEL;VALUE=uri;TYPE=\"work,voice\";PREF=1:tel:+1-503-555-0104;ext=102\r\n"
                                  "TEL;VALUE=uri:TEL:+1-503-555-0105;phone-context=example.com\r\n"
                                  "TEL:tel:+1%20503%20555%200106\r\n"
                                  "TEL:tel:+1-503-555-0108;ext=%E9\r\n"  // escapes that make no UTF-8
                                  "TEL:tel:+1-503-555-0109;ext=\r\n"
                                  "TEL: (503) 555-0107 \r\n",
                                  "4.0"));
  EXPECT_EQ(c.phoneNumbers, (Labeled{{"work", "+1-503-555-0104 ext. 102"}, {std::nullopt, "+1-503-555-0105"},
                                     {std::nullopt, "+1 503 555 0106"}, {std::nullopt, "+1-503-555-0108 ext. \xC3\xA9"},
                                     {std::nullopt, "+1-503-555-0109"}, {std::nullopt, "(503) 555-0107"}}));
}


TEST(VCardEncodings, QuotedPrintableWithSoftBreaksAndFolds) {
  const Contact c = parseOne(test::vcard(
      "NOTE;ENCODING=QUOTED-PRINTABLE:Line one=0D=0ALine=\r\n two =3D done=\r\n"  // soft break keeps the blank
      "=0D=0Athird\r\n"
      "FN;CHARSET=UTF-8;ENCODING=QUOTED-PRINTABLE:Ren=C3=\r\n"  // a soft break inside a character
      "=A9e=20Dupont\r\n"
      "N;QUOTED-PRINTABLE;CHARSET=UTF-8:De=\r\n"  // bare encoding; the blank after a soft break is text,
      " Abbott;Mary=\t \r\n"                     // even before two hex digits; blanks after "=" are not
      "Ann\r\n"
      "TITLE;ENCODING=QUOTED-PRINTABLE:Ends with soft break= \r\n"
      "\r\n"
      "ORG;ENCODING=QUOTED-PRINTABLE:Bad =ZZ escape=4\r\n"
      "X-MAIDENNAME;ENCODING=QUOTED-PRINTABLE:a=0Db\r\n"  // a lone CR is a line break too
      "NICKNAME;ENCODING=QUOTED-PRINTABLE:dangling=\r\n",  // a soft break never swallows the card's end
      "2.1"));
  EXPECT_EQ(c.note, "Line one\nLine two = done\nthird");
  EXPECT_EQ(c.formattedName, "Ren\xC3\xA9" "e Dupont");
  EXPECT_EQ(c.familyName, "De Abbott");
  EXPECT_EQ(c.givenName, "MaryAnn");
  EXPECT_EQ(c.jobTitle, "Ends with soft break");
  EXPECT_EQ(c.organizationName, "Bad =ZZ escape=4");  // broken escapes stay as written
  EXPECT_EQ(c.nickname, "dangling");
  EXPECT_EQ(c.previousFamilyName, "a\nb");
}

TEST(VCardEncodings, CharsetsAndBytesThatAreNoUtf8) {
  const Contact c = parseOne(test::vcard(
      "FN;CHARSET=ISO-8859-1:Jos\xE9 Garc\xED" "a\r\n"
      "NOTE;CHARSET=Shift_JIS:\x93\xFA\x96\x7B\r\n"                 // "Japan" in Shift_JIS
      "N:\x93Quoted\x94;Ren\xE9\r\n"                                // no charset, no UTF-8: windows-1252
      "ORG;CHARSET=UTF-8:Caf\xC3\xA9 \xFF\xC3 end\r\n"              // declared UTF-8: ill-formed parts marked
      "TITLE;CHARSET=x-no-such-charset-with-a-name-much-longer-than-any-character-set-has:Se\xC3\xB1or\r\n"  // as if none
      "X-MAIDENNAME;CHARSET=US-ASCII:Fran\xE7ois\r\n"               // a false US-ASCII: as if none
      "X-SOCIALPROFILE;TYPE=\xE9t\xE9:https://example.com/p\r\n"      // a parameter is no UTF-8 either
      "NICKNAME;CHARSET=../../../etc/passwd:Pe\xF1" "a\r\n"         // never a file name for ICU
      "X-PHONETIC-FIRST-NAME;CHARSET=UTF-8;ENCODING=QUOTED-PRINTABLE:=C3=91=80\r\n",
      "2.1"));
  EXPECT_EQ(c.formattedName, "Jos\xC3\xA9 Garc\xC3\xAD" "a");
  EXPECT_EQ(c.note, "\xE6\x97\xA5\xE6\x9C\xAC");
  EXPECT_EQ(c.familyName, "\xE2\x80\x9CQuoted\xE2\x80\x9D");
  EXPECT_EQ(c.givenName, "Ren\xC3\xA9");
  EXPECT_EQ(c.organizationName, "Caf\xC3\xA9 \xEF\xBF\xBD\xEF\xBF\xBD end");
  EXPECT_EQ(c.jobTitle, "Se\xC3\xB1or");
  EXPECT_EQ(c.previousFamilyName, "Fran\xC3\xA7ois");
  EXPECT_EQ(c.socialProfiles, (Labeled{{"\xC3\xA9t\xC3\xA9", "https://example.com/p"}}));
  EXPECT_EQ(c.nickname, "Pe\xC3\xB1" "a");
  EXPECT_EQ(c.phoneticGivenName, "\xC3\x91\xEF\xBF\xBD");
}


TEST(VCardPictures, Base64InEveryLayout) {
  const std::string data = kPictureBase64;
  const std::string folded = data.substr(0, 5) + "\r\n    " + data.substr(5, 6) + "\r\n\t" + data.substr(11);
  // 3.0 folded with any indentation.
  EXPECT_EQ(bytesOf(parseOne(test::vcard("PHOTO;ENCODING=b;TYPE=JPEG:" + folded + "\r\n")).imageData), kPicture);
  // 2.1: lines without indentation up to a blank line, then more properties.
  const Contact old = parseOne(test::vcard("PHOTO;ENCODING=BASE64;JPEG:\r\n" + data.substr(0, 8) + "\r\n" + data.substr(8) +
                                        "\r\n\r\nFN:After Photo\r\n",
                                    "2.1"));
  EXPECT_EQ(bytesOf(old.imageData), kPicture);
  EXPECT_EQ(old.formattedName, "After Photo");
  // 4.0 data: URI, and a writer that left the encoding out.
  EXPECT_EQ(bytesOf(parseOne(test::vcard("PHOTO:data:image/jpeg;base64," + folded + "\r\n", "4.0")).imageData), kPicture);
  EXPECT_EQ(bytesOf(parseOne(test::vcard("PHOTO;TYPE=JPEG:" + data + "\r\n")).imageData), kPicture);
}

TEST(VCardPictures, FirstPhotoIsThePictureAndTypeThumbnailTheSmallOne) {
  const Contact c = parseOne(test::vcard(std::string("PHOTO;VALUE=uri:https://example.com/remote.jpg\r\n"  // never fetched
                                  "PHOTO:https://example.com/also-remote.jpg\r\n"
                                  "PHOTO;ENCODING=b;TYPE=THUMBNAIL:") + kOtherBase64 + "\r\n"
                                  "PHOTO;ENCODING=b:" + kPictureBase64 + "\r\n"
                                  "PHOTO;ENCODING=b:" + kOtherBase64 + "\r\n"));
  EXPECT_EQ(bytesOf(c.imageData), kPicture);
  EXPECT_EQ(bytesOf(c.thumbnailImageData), kOther);
  // A thumbnail alone leaves the full picture empty; empty or undecodable data gives no picture.
  EXPECT_FALSE(parseOne(test::vcard(std::string("PHOTO;TYPE=thumbnail;ENCODING=b:") + kOtherBase64 + "\r\n")).imageData);
  EXPECT_FALSE(parseOne(test::vcard("PHOTO;ENCODING=b:\r\nPHOTO:data:image/png;base64,\r\nPHOTO:data:nocomma\r\n")).imageData);
  // A data URI without a media type or base64 holds its bytes percent-encoded.
  EXPECT_EQ(bytesOf(parseOne(test::vcard("PHOTO:data:,%01%02%03\r\n", "4.0")).imageData), kOther);
  EXPECT_EQ(bytesOf(parseOne(test::vcard(std::string("PHOTO:data:;base64,") + kOtherBase64 + "\r\n", "4.0")).imageData), kOther);
  EXPECT_EQ(bytesOf(parseOne(test::vcard("PHOTO;ENCODING=QUOTED-PRINTABLE:=01=02=03\r\n", "2.1")).imageData), kOther);
}

TEST(VCardPictures, ATenMegabytePhotoOfEveryBase64LetterIsRead) {
  // The letters in order are the 6-bit values 0 to 63, packed four to three bytes; folded lines.
  std::vector<std::uint8_t> block, big;
  for (std::uint32_t v = 0; v < 64; v += 4) {
    const std::uint32_t n = (v << 18) | ((v + 1) << 12) | ((v + 2) << 6) | (v + 3);
    block.insert(block.end(), {std::uint8_t(n >> 16), std::uint8_t(n >> 8), std::uint8_t(n)});
  }
  std::string folded;
  for (std::size_t i = 0; i < (10u << 20) / 48; ++i) {
    folded += "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/\r\n ";
    big.insert(big.end(), block.begin(), block.end());
  }
  EXPECT_EQ(bytesOf(parseOne(test::vcard("PHOTO;ENCODING=b:" + folded + "\r\n")).imageData), big);
}


TEST(VCardBadInput, ACardOverTheSizeLimitIsSkippedAndTheNextOneRead) {
  // The second huge card is cut off by the BEGIN of the next card, the last one by the end of the text.
  const std::string huge = "BEGIN:VCARD\r\nFN:Huge\r\nPHOTO;ENCODING=b:" + std::string(std::size_t{33} << 20, 'A') + "\r\n";
  const auto result = parseVCards(huge + "END:VCARD\r\n" + huge + "BEGIN:VCARD\r\nFN:Small\r\nEND:VCARD\r\n" + huge,
                                  "huge.vcf");
  ASSERT_EQ(result.contacts.size(), 1u);
  EXPECT_EQ(result.contacts[0].formattedName, "Small");
  EXPECT_EQ(result.contacts[0].identifier, "huge.vcf#2");
  EXPECT_EQ(result.skipped, (std::vector<std::string>{"huge.vcf: the card that begins on line 1 is larger than 32 MiB",
                                                      "huge.vcf: the card that begins on line 5 is larger than 32 MiB",
                                                      "huge.vcf: the card that begins on line 11 is larger than 32 MiB"}));
}

}  // namespace
}  // namespace kyn::platform
