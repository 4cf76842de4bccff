// Which clients get a compressed answer.
#include "sim/Compression.h"

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

TEST(CompressionTest, GzipGoesOnlyToClientsThatTakeIt) {
  const struct {
    const char* header;
    bool gzip;
  } cases[] = {
      {"", false},           {"br", false},           {"deflate, gzip", true},     {"GZip;q=0.5", true},
      {"gzip;q=0", false},   {"gzip; q=0.000", false}, {"*", true},                {"br, *;q=0", false},
      {"x-gzip", true},      {"gzipped", false},
  };
  for (const auto& c : cases) EXPECT_EQ(acceptsGzip(c.header), c.gzip) << '"' << c.header << '"';
}

}  // namespace
}  // namespace kyn::sim
