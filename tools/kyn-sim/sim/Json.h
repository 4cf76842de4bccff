#pragma once

#include <nlohmann/json.hpp>

namespace kyn::sim {

/// Keeps members in insertion order, so answers read like the documents they were built from.
using Json = nlohmann::ordered_json;

}  // namespace kyn::sim
