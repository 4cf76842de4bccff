// Writes one domain through the file-backed preferences store in an endless loop until an alarm
// ends it abruptly, for the test that ends writers at random moments. Usage:
// kyn_prefs_writer <directory> <domain> <seed>. Each write sets "value" to "written-<n>" beside a
// padding long enough to span several pages. Once the first write is done, an alarm (whose default
// action ends the process at once, like SIGKILL) is set to go off after a random part of the time
// that write took, so that it mostly strikes in the middle of a later write.
#include "platform/prefs/FilePreferencesStore.h"

#include <sys/time.h>

#include <chrono>
#include <cstdio>
#include <random>
#include <string>

int main(int argc, char** argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: %s <directory> <domain> <seed>\n", argv[0]);
    return 2;
  }
  using kyn::Value;
  kyn::platform::FilePreferencesStore store(argv[1]);
  const std::string domain = argv[2];
  std::mt19937 random(static_cast<unsigned>(std::stoul(argv[3])));
  store.setValue(domain, "padding", Value(std::string(16384, 'p')));
  for (long n = 0;; ++n) {
    const auto start = std::chrono::steady_clock::now();
    store.setValue(domain, "value", Value("written-" + std::to_string(n)));
    if (!store.synchronize(domain)) return 1;
    if (n == 0) {
      const auto took = std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - start);
      itimerval alarm{};
      const long micros = 1 + static_cast<long>(random() % static_cast<unsigned long>(took.count() + 1));
      alarm.it_value.tv_sec = micros / 1'000'000;
      alarm.it_value.tv_usec = micros % 1'000'000;
      setitimer(ITIMER_REAL, &alarm, nullptr);
    }
  }
}
