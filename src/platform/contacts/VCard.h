#pragma once

#include "platform/contacts/Contact.h"

#include <string>
#include <string_view>
#include <vector>

namespace kyn::platform {

/// What one vCard text holds: its cards as contacts (one per card, not yet unified), a line for
/// every card that was skipped, and one line that tells what else could not be read (text outside
/// any card, lines that are no property, broken UTF-16), empty when there is nothing to tell.
struct VCardParseResult {
  std::vector<Contact> contacts;
  std::vector<std::string> skipped;
  std::string unread;
};

/// Reads every card of a vCard text (versions 2.1, 3.0 and 4.0 as real exporters write them), in
/// UTF-8 (with or without a byte-order mark) or UTF-16 (either byte order).
/// A card without UID gets the identifier `sourceName` + "#" + its position in the text (counted from 0
/// over every card, skipped ones included, so that the others keep their identifiers).
[[nodiscard]] VCardParseResult parseVCards(std::string_view text, std::string_view sourceName);

}  // namespace kyn::platform
