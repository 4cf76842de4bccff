#pragma once

// The phone number reader's cache of its last results.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace kyn::platform {

/// The last results, kept while they are used. Every command reads its friends' numbers again, and
/// the parser takes some 20 µs a number, so results are kept: enough for the numbers of a large
/// friends list, each about a hundred bytes. The keys' hashes lie in one array of their own (open
/// addressing), so that a look-up reads a few cache lines and moves nothing. When the cache is full,
/// a clock hand takes the first result not used since it last passed (a second chance): close to
/// the least recently used one. A list longer than the cache misses often, as with any such cache.
template <std::size_t Capacity, class Hash = std::hash<std::string_view>>
class ResultCache {
 public:
  explicit ResultCache(Hash hash = {}) : hash_(std::move(hash)) {}

  std::optional<std::optional<std::string>> find(std::string_view key) {
    const std::uint64_t hash = hashOf(key);
    std::lock_guard lock(mutex_);
    if (hashes_.empty()) return std::nullopt;
    const std::size_t at = place(key, hash);
    if (hashes_[at] == kFree) return std::nullopt;
    Entry& entry = entries_[at];
    entry.recent = true;
    return entry.result;
  }
  void insert(std::string key, std::optional<std::string> result) {
    const std::uint64_t hash = hashOf(key);
    std::lock_guard lock(mutex_);
    if (!hashes_.empty() && hashes_[place(key, hash)] != kFree) return;
    if (count_ == Capacity) {
      evictOne();
    } else if (2 * (count_ + 1) > hashes_.size()) {
      resize(std::max<std::size_t>(64, 2 * hashes_.size()));
    }
    const std::size_t at = place(key, hash);
    hashes_[at] = hash;
    entries_[at] = Entry{std::move(key), std::move(result), true};  // new: not the next to go
    ++count_;
  }

 private:
  static constexpr std::uint64_t kFree = 0;  // no key's hash (`hashOf`)
  struct Entry {
    std::string key;
    std::optional<std::string> result;
    bool recent = false;  // used since the clock hand last passed
  };

  std::uint64_t hashOf(std::string_view key) const noexcept {
    const std::uint64_t hash = hash_(key);
    return hash == kFree ? 1 : hash;
  }
  /// The slot that holds `key`, else the free one where it goes; at least half the slots are free.
  [[nodiscard]] std::size_t place(std::string_view key, std::uint64_t hash) const noexcept {
    const std::size_t mask = hashes_.size() - 1;
    for (std::size_t i = hash & mask;; i = (i + 1) & mask) {
      if (hashes_[i] == kFree || (hashes_[i] == hash && entries_[i].key == key)) return i;
    }
  }
  void resize(std::size_t slots) {
    std::vector<std::uint64_t> hashes(slots, kFree);
    std::vector<Entry> entries(slots);
    hashes.swap(hashes_);
    entries.swap(entries_);
    for (std::size_t i = 0; i < hashes.size(); ++i) {
      if (hashes[i] == kFree) continue;
      const std::size_t at = place(entries[i].key, hashes[i]);
      hashes_[at] = hashes[i];
      entries_[at] = std::move(entries[i]);
    }
    hand_ = 0;
  }
  /// The clock hand moves to the first result not used since it last passed, and takes it out.
  void evictOne() {
    const std::size_t mask = hashes_.size() - 1;
    for (;; hand_ = (hand_ + 1) & mask) {
      if (hashes_[hand_] == kFree) continue;
      if (std::exchange(entries_[hand_].recent, false)) continue;
      erase(hand_);
      return;
    }
  }
  /// Takes out the result in slot `i`, moving back the ones after it that belong nearer their home
  /// slot, so that no look-up stops at the gap.
  void erase(std::size_t i) {
    const std::size_t mask = hashes_.size() - 1;
    hashes_[i] = kFree;
    entries_[i] = Entry{};
    --count_;
    for (std::size_t j = (i + 1) & mask; hashes_[j] != kFree; j = (j + 1) & mask) {
      const std::size_t home = hashes_[j] & mask;
      // The one at j may fill the gap at i when i lies on its way from home to j.
      if (((j - home) & mask) >= ((j - i) & mask)) {
        hashes_[i] = hashes_[j];
        entries_[i] = std::move(entries_[j]);
        hashes_[j] = kFree;
        entries_[j] = Entry{};
        i = j;
      }
    }
  }

  Hash hash_;
  std::mutex mutex_;
  std::vector<std::uint64_t> hashes_;  // per slot: the key's hash, or kFree
  std::vector<Entry> entries_;         // per slot
  std::size_t count_ = 0;
  std::size_t hand_ = 0;
};

}  // namespace kyn::platform
