// Writes one domain through the file-backed preferences store in an endless loop, for tests that kill
// a writer at random moments. Usage: kyn_prefs_writer <directory> <domain>. Each write sets "value" to
// "written-<n>" (n counting from 0) beside a padding long enough to span several pages. After the
// first write it prints how long that write took in microseconds, so that the caller knows the loop
// is running and over what span to pick its moments.
#include "platform/prefs/FilePreferencesStore.h"

#include <chrono>
#include <cstdio>
#include <string>

int main(int argc, char** argv) {
  if (argc != 3) {
    std::fprintf(stderr, "usage: %s <directory> <domain>\n", argv[0]);
    return 2;
  }
  using kyn::Value;
  kyn::platform::FilePreferencesStore store(argv[1]);
  const std::string domain = argv[2];
  store.setValue(domain, "padding", Value(std::string(16384, 'p')));
  for (long n = 0;; ++n) {
    const auto start = std::chrono::steady_clock::now();
    store.setValue(domain, "value", Value("written-" + std::to_string(n)));
    if (!store.synchronize(domain)) return 1;
    if (n == 0) {
      const auto took = std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - start);
      std::printf("%lld\n", static_cast<long long>(took.count()));
      std::fflush(stdout);
    }
  }
}
